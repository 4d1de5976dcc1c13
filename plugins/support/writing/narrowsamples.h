#pragma once

#include "gobs/raster/datatype.h"
#include "plugins/support/writing/heldblocks.h"

namespace krv::plugins::support
{

// Samples of which a file keeps fewer bits than their type has.

// Whether that can be: integers of more than half of the type's bits, of bytes any, so that the type comes back by the
// bits; 32-bit reals of 16 or 24 bits.
// Example: 9 to 15 bits of 16U, 1 to 7 of 8U.
bool CanNarrow(const krv::gobs::DataType& oType, unsigned int nBits);

// Makes values what is kept of them: integers the nearest that fits, reals the nearest of so many bits. Whether these
// can be is not asked again.
// Done when pixels come, so that a program reads back what the file will hold.
HeldBlocks::SettlePixels MakeNarrowing(const krv::gobs::DataType& oType, unsigned int nBits);

} // namespace krv::plugins::support
