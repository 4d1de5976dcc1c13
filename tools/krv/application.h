#pragma once

namespace krv::tool
{

// The whole command: parses the arguments, runs the verb and says what went wrong. Returns the exit code: 0 done,
// 1 failed, 2 wrong usage.
int RunApplication(int nArguments, char** pArguments);

} // namespace krv::tool
