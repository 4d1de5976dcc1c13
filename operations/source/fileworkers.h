#pragma once

#include "operations/source/sourcefile.h"
#include "toolkit/core/ownedorborrowed.h"
#include "toolkit/threading/statestore.h"

#include <functional>
#include <memory>
#include <utility>

namespace krv::operations
{

// Owns a file that was opened again; only points to the caller's own.
using FilePointer = krv::OwnedOrBorrowed<const SourceFile>;

// What each thread of a job needs for itself, readers of a file among it. The first worker stands on the file itself,
// the others each on one of their own, opened again; where that cannot be there is just the first.
// Example: FileWorkers<Reader> oWorkers(oFile, oMake); each task makes a Use of oWorkers and reads by that.
// Worker: not moved and used by one thread at a time, so that it needs no lock.
template <typename Worker>
class FileWorkers : public krv::threading::StateStore<Worker>
{
public:
    // The file outlives this. What making the first worker throws passes.
    // Called by any thread, by several at once.
    using MakeWorker = std::function<std::unique_ptr<Worker>(FilePointer poFile)>;
    FileWorkers(const SourceFile& oFile, const MakeWorker& oMake)
        : krv::threading::StateStore<Worker>(
              [&oFile, oMake]() -> std::unique_ptr<Worker>
              {
                  std::unique_ptr<SourceFile> poAgain = oFile.OpenAgain();
                  return poAgain != nullptr ? oMake(FilePointer(poAgain.release(), {true})) : nullptr;
              })
    {
        this->Add(oMake(FilePointer(&oFile, {false})));
    }
};

} // namespace krv::operations
