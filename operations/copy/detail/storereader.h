#pragma once

#include "operations/copy/conversion.h"

namespace krv::datasources
{
class IRasterReader;
}

namespace krv::operations::detail
{

class Target;

// Checks that a new file may have a name: that of none of the files it is made of. Throws RequestException and
// DataException.
void CheckTarget(const std::vector<std::string>& oSources, const std::string& target);

// Stores a window of what a reader makes into a new file that was laid out for it: pixels, record, geocoding and
// reference system, and a mask of validity where no value says which pixels are valid. pPart: a word for the progress.
void StoreReader(krv::datasources::IRasterReader& oReader, const PixelWindow& oWindow, const Target& oTarget,
                 const char* pPart);

} // namespace krv::operations::detail
