#pragma once

#include "toolkit/api.h"

#include <cstddef>

namespace krv::raster
{

// Writes nCount packed values of 2, 4 or 8 bytes in the other byte order. Nothing need be aligned. The destination is
// the source itself or does not overlap it. Throws ParameterException for values of other sizes.
// Complex values are two values of their part's size. Runs at the speed of a copy for large counts; any thread.
KRV_TOOLKIT_API void SwapBytes(const unsigned char* source, unsigned char* destination, std::size_t nCount,
                               std::size_t nValueBytes);

} // namespace krv::raster
