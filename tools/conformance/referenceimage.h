#pragma once

#include "gobs/raster/margins.h"

#include <string>

namespace krv::conformance
{

// The index on a line that stands for one outside it, found by walking back one reflection or step at a time; negative
// for a constant.
long long FoldNaively(long long nIndex, long long nLength, eMarginBehaviour eBehaviour);

// A whole image in memory, the reference of every comparison; naive on purpose: one pixel at a time.
struct ReferenceImage
{
    unsigned int mnWidth;
    unsigned int mnHeight;
    std::size_t mnPixelBytes;
    std::string moBytes;

    std::string Pixel(long long nX, long long nY) const;
    // The pixels of a window that lies inside.
    std::string Window(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight) const;
    // The buffer after a part of a window was read into it: what lies in the part and in the image is replaced.
    std::string Part(std::string buffer, long long nX, long long nY, unsigned int nWidth, unsigned int nHeight,
                     unsigned int nPartX, unsigned int nPartY, unsigned int nPartWidth, unsigned int nPartHeight) const;
    // What a reader delivers for a window inside the image with margins around it: a side whose margin is not wholly
    // inside the image (right and bottom: or ends on its last pixel) is made from the pixels that were read.
    std::string WithMargins(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight,
                            unsigned int nXMargin, unsigned int nYMargin, eMarginBehaviour eBehaviour) const;
};

} // namespace krv::conformance
