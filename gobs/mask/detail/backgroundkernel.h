#pragma once

#include "gobs/mask/detail/sampletest.h"
#include "gobs/mask/maskdecision.h"

#include <cstddef>
#include <vector>

namespace krv::gobs::detail
{

// Marks background by at most one test per channel. Samples are those that the processor compares: unsigned integers
// (signed ones and complex integers by their bits), reals, complex reals.
template <class Sample>
class BackgroundKernel
{
public:
    // The tests name channels below nChannels, each at most once. Without tests nothing is background.
    BackgroundKernel(const std::vector<SampleTest<Sample>>& oTests, std::size_t nChannels, BkgdRule eRule);

    // As IMaskDecisionImpl::Mark.
    void Mark(const unsigned char* pPixels, std::size_t nPixels, unsigned char* pBits) const;

private:
    void BuildPattern();
    bool IsBackground(const unsigned char* pPixel) const;
    // By vector instructions, as many pixels as they take; gives their number, a multiple of 8.
    std::size_t MarkVectors(const unsigned char* pPixels, std::size_t nPixels, unsigned char* pBits) const;
    // One after the other, for what is left and for processors without the instructions.
    void MarkPixels(const unsigned char* pPixels, std::size_t nPixels, unsigned char* pBits) const;

    std::vector<SampleTest<Sample>> moTests;
    std::size_t mnChannels;
    BkgdRule meRule;
    // The pattern of MarkPattern; empty when vectors do not pay.
    std::vector<unsigned char> moValues;
    std::vector<unsigned char> moNaNs;
    std::vector<unsigned char> moUsed;
    std::vector<unsigned char> moExpected;
    bool mbNaN = false;
};

extern template class BackgroundKernel<std::uint8_t>;
extern template class BackgroundKernel<std::uint16_t>;
extern template class BackgroundKernel<std::uint32_t>;
extern template class BackgroundKernel<std::uint64_t>;
extern template class BackgroundKernel<float>;
extern template class BackgroundKernel<double>;
extern template class BackgroundKernel<Complex<float>>;
extern template class BackgroundKernel<Complex<double>>;

} // namespace krv::gobs::detail
