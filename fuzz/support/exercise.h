#pragma once

#include <functional>
#include <string>

namespace krv
{
class Exception;
}

namespace krv::datasources
{
class IDataset;
}

namespace krv::fuzz
{

using Refusal = std::function<void(const krv::Exception&)>;

// Asks for all that a dataset can tell, and for some pixels of everything that has any: channels with margins, levels,
// bitmaps. A krv::Exception at any point is an answer, which the function hears when there is one; every other
// exception gets out.
void ExerciseDataset(krv::datasources::IDataset& oDataset, const Refusal& oRefused);

// The same with a file, opened through the manager.
void ExerciseFile(const std::string& fileName);

} // namespace krv::fuzz
