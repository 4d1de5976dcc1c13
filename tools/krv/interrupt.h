#pragma once

namespace krv::tool
{

// Notes SIGINT and SIGTERM instead of dying at once. A second one of the same kind ends the process as usual.
void WatchForInterrupt();

// Whether one was noted. To be asked between pieces of work.
bool WasInterrupted();

} // namespace krv::tool
