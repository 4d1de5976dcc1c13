#pragma once

#include "tools/krv/copyplan.h"

#include <string>

namespace krv::tool
{

// How the copy is stored.
struct TargetForm
{
    std::string name;
    std::string format;  // short name; empty: by the name's extension, else TIF
    std::string options; // as the format takes them
};

// Copies channels of one or several files of one size into a new file: pixels, metadata, geocoding, reference system,
// colour tables, bitmaps and levels; with the option LAYOUT=COG levels are built when there are none. What the options
// leave open stays as the first file has it: codec, predictor, blocks and interleaving; a whole image is copied block
// by block as it is stored. Pixels are never encoded with loss unless the options ask for it, and then a mask says
// which are valid. Warns of what the target's format cannot hold. A file of that name is replaced when the copy is
// complete; on a failure, and when the user stops it, nothing changes. Throws UsageError for what makes no sense,
// DataException when the target is one of the sources or no plain file, and what formats throw.
void Convert(const CopyRequest& oRequest, const TargetForm& oForm);

} // namespace krv::tool
