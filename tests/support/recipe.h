#pragma once

#include "gobs/raster/datatype.h"

#include <string>
#include <vector>

namespace krv::test
{

// The recipe image: a value for every type, channel (from 1) and pixel, unlike its neighbours'; reals are finite.
// Appends the bytes of one value in the machine's order.
void AppendRecipeValue(std::string& oBytes, const krv::gobs::DataType& oType, unsigned int nChannel, unsigned int nX,
                       unsigned int nY);

// All pixels of some channels of the recipe, pixel interleaved.
std::string RecipeImage(unsigned int nWidth, unsigned int nHeight, const std::vector<unsigned int>& oChannels,
                        const krv::gobs::DataType& oType);

} // namespace krv::test
