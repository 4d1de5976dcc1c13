#pragma once

#include "gobs/raster/datatype.h"

#include <string>
#include <vector>

namespace krv::test
{

// The recipe image: a value for every type, channel (from 1) and pixel, unlike its neighbours'; reals are finite.
// All pixels of some channels of the recipe, pixel interleaved.
std::string RecipeImage(unsigned int nWidth, unsigned int nHeight, const std::vector<unsigned int>& oChannels,
                        const krv::gobs::DataType& oType);

} // namespace krv::test
