#include "datasources/datasets/detail/pixelfill.h"

#include <algorithm>
#include <cstring>

namespace krv::datasources::detail
{

void FillPixels(unsigned char* pTarget, std::size_t nPitch, std::size_t nWidth, std::size_t nRows,
                const unsigned char* pPixel, std::size_t nPixelBytes)
{
    const std::size_t nRowBytes = nWidth * nPixelBytes;
    const bool bOneByte = std::all_of(pPixel, pPixel + nPixelBytes, [=](unsigned char n) { return n == *pPixel; });
    if (nRows == 0 || nRowBytes == 0)
        return;
    if (bOneByte && nPitch == nRowBytes)
    {
        std::memset(pTarget, *pPixel, nRowBytes * nRows);
        return;
    }
    for (std::size_t nRow = 0; nRow < nRows; ++nRow)
    {
        unsigned char* const pRow = pTarget + nRow * nPitch;
        if (bOneByte)
            std::memset(pRow, *pPixel, nRowBytes);
        else if (nRow > 0)
            std::memcpy(pRow, pTarget, nRowBytes);
        else
        {
            std::memcpy(pRow, pPixel, nPixelBytes);
            for (std::size_t nDone = nPixelBytes; nDone < nRowBytes; nDone *= 2)
                std::memcpy(pRow + nDone, pRow, std::min(nDone, nRowBytes - nDone));
        }
    }
}

} // namespace krv::datasources::detail
