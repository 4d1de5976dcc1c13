#pragma once

#include "benchmarks/support/scene.h"

#include <string>

namespace krv::benchmarks
{

// Averages of 2 to 32 of a copy of a three-channel 8-bit scene in tiles of 256, whose side is a multiple of 8192:
// straight code over the tiles of libtiff, each of which is visited once. The levels go, one after the other, into a
// plain file that is made anew, tile by tile in the order of the rows; then what was written is brought to the disk if
// bSync.
void BuildByHand(const SceneFile& oScene, const std::string& file, const std::string& target, bool bSync);

// Where the tile of a level begins in that file.
unsigned long long GetTileOffset(const SceneFile& oScene, unsigned int nLevel, unsigned int nColumn, unsigned int nRow);

} // namespace krv::benchmarks
