#pragma once

#include "datasources/api.h"

#include <string>
#include <vector>

namespace krv::datasources
{

class IRasterReader;
class IRasterWriter;

// Gives the image of a writer everything that the image of a reader is beside its pixels: the record (tags of the file
// and of channels, descriptions, no-data values, display defaults by the numbers that the channels have in the target),
// reference system and geocoding; and where the reader shows a dataset as it lies there, colour tables of its channels
// and sensor models. What a record says of pixel values, such as statistics, and the bookkeeping of levels stay behind.
// Bitmaps and levels are pixels, too. Channel n of the one is channel n of the other, as far as both have it.
//
// To be called when the image of a new file is laid out. Both stay the caller's. Returns a line for each thing that the
// target's format cannot keep, which is no failure: pixels can be written all the same. Throws DataException for images
// of two sizes, and what reading the source throws.
// Example: for (const auto& lost : CopyAllButPixels(*poReader, oWriter)) std::cerr << lost << "\n";
KRV_DATASOURCES_API std::vector<std::string> CopyAllButPixels(const IRasterReader& oSource, IRasterWriter& oTarget);

} // namespace krv::datasources
