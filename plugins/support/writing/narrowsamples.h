#pragma once

#include "gobs/raster/datatype.h"
#include "plugins/support/writing/heldblocks.h"

namespace krv::plugins::support
{

// Samples of which a file keeps fewer bits than their type has.

// Whether that can be: integers of more than half of the type's bits, of bytes any, so that the type comes back by the
// bits; 32-bit reals of 16 or 24 bits.
bool CanNarrow(const krv::gobs::DataType& oType, unsigned int nBits);

// Makes values what is kept of them: integers the nearest that fits, reals the nearest of so many bits. Whether these
// can be is not asked again.
HeldBlocks::SettlePixels MakeNarrowing(const krv::gobs::DataType& oType, unsigned int nBits);

} // namespace krv::plugins::support
