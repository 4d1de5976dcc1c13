#pragma once

#include <string>

namespace krv::fuzz
{

// Opens a file through the manager and asks for all that it can tell, and for some pixels of everything that has any:
// channels with margins, levels, bitmaps. A krv::Exception at any point is an answer; every other one gets out.
void ExerciseFile(const std::string& fileName);

} // namespace krv::fuzz
