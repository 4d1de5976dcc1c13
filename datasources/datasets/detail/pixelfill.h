#pragma once

#include <cstddef>

namespace krv::datasources::detail
{

// Fills nRows rows of nWidth pixels with one pixel of nPixelBytes bytes; rows begin nPitch bytes apart.
void FillPixels(unsigned char* pTarget, std::size_t nPitch, std::size_t nWidth, std::size_t nRows,
                const unsigned char* pPixel, std::size_t nPixelBytes);

} // namespace krv::datasources::detail
