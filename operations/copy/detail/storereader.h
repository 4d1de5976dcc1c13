#pragma once

#include "operations/copy/conversion.h"

#include <functional>
#include <memory>
#include <vector>

namespace krv::datasources
{
class IRasterReader;
}

namespace krv::operations
{
class SourceFile;
}

namespace krv::operations::detail
{

class Target;

// Checks that a new file may have a name: that of none of the files it is made of. Throws RequestException and
// DataException.
void CheckTarget(const std::vector<std::string>& oSources, const std::string& target);

// Some channels of a new file, all of one type, and what makes them of a file.
struct StoredChannels
{
    // A reader with all that it stands on but the file, which outlives it. Called by any thread, each time with the
    // file opened once more; the readers are alike.
    using Open = std::function<std::shared_ptr<krv::datasources::IRasterReader>(const SourceFile& oFile)>;

    Open open;
    std::vector<unsigned int> channels; // of the new file, in the order of the reader's
};

// Stores a window of what readers of one size make of a file into a new file that was laid out for it: pixels, record,
// geocoding and reference system, and a mask of validity where no value says which pixels are valid, or values are
// encoded with loss; its valid pixels are those that are valid in any of the readers. Each thread of the target's
// executor reads and encodes; the file is the same, byte for byte, for any number of threads. pPart: a word for the
// progress.
void StoreReaders(const SourceFile& oFile, const std::vector<StoredChannels>& oStored, const PixelWindow& oWindow,
                  const Target& oTarget, const char* pPart);

} // namespace krv::operations::detail
