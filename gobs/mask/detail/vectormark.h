#pragma once

#include <cstddef>

#if defined(__SSE4_2__)
#define KRV_VECTOR_MASKS 1
#endif

namespace krv::gobs::detail
{

// What the samples of 16 pixels are compared with, and how the results of a pixel's channels combine.
struct MarkPattern
{
    const unsigned char* mpValues;
    const unsigned char* mpNaNs;     // all ones for samples that match as NaN; null when there are none
    const unsigned char* mpUsed;     // a byte for each sample: all ones where the channel takes part
    const unsigned char* mpExpected; // a byte for each: makes the result zero where the rule may go on
    std::size_t mnChannels;
    bool mbInvert; // a pixel is background when not all its bytes became zero
};

// Mark pixels as BackgroundKernel does; give the number that they took, all but fewer than 16, 32 or 64.
template <class Sample>
std::size_t MarkBySse(const unsigned char* pPixels, std::size_t nPixels, const MarkPattern& oPattern,
                      unsigned char* pBits);
// Takes nothing where wider vectors bring nothing. Only for processors that have AVX2.
template <class Sample>
std::size_t MarkByAvx2(const unsigned char* pPixels, std::size_t nPixels, const MarkPattern& oPattern,
                       unsigned char* pBits);
// Takes nothing of samples of two parts. Only for processors that have AVX-512 with VBMI, GFNI and BMI2.
template <class Sample>
std::size_t MarkByAvx512(const unsigned char* pPixels, std::size_t nPixels, const MarkPattern& oPattern,
                         unsigned char* pBits);

} // namespace krv::gobs::detail
