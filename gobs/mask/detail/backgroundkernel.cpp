#include "gobs/mask/detail/backgroundkernel.h"

#include "gobs/mask/detail/vectormark.h"
#include "toolkit/simd/processor.h"

#include <cstring>

namespace krv::gobs::detail
{

namespace
{

constexpr std::size_t GROUP = 16; // pixels

// Whether comparing whole pixels beats picking the tested channels. A tested sample costs about as much as three
// vectors; beyond some thousand channels the pattern would leave the cache.
[[maybe_unused]] bool VectorsPay(std::size_t nTests, std::size_t nChannels, std::size_t nSampleSize)
{
    constexpr std::size_t BYTES_PER_TEST = 48;
    return nChannels <= 4096 && nTests * BYTES_PER_TEST >= nChannels * nSampleSize;
}

} // namespace

template <class Sample>
BackgroundKernel<Sample>::BackgroundKernel(const std::vector<SampleTest<Sample>>& oTests, std::size_t nChannels,
                                           BkgdRule eRule)
    : moTests(oTests), mnChannels(nChannels), meRule(eRule)
{
#if defined(KRV_VECTOR_MASKS)
    if (!moTests.empty() && VectorsPay(moTests.size(), nChannels, sizeof(Sample)))
        BuildPattern();
#endif
}

template <class Sample>
void BackgroundKernel<Sample>::BuildPattern()
{
    moValues.resize(GROUP * mnChannels * sizeof(Sample));
    moNaNs.resize(moValues.size());
    moUsed.resize(GROUP * mnChannels);
    moExpected.resize(moUsed.size());
    for (const SampleTest<Sample>& oTest : moTests)
    {
        mbNaN = mbNaN || oTest.mbNaN;
        for (std::size_t nPixel = 0; nPixel < GROUP; ++nPixel)
        {
            const std::size_t nAt = nPixel * mnChannels + oTest.mnChannel;
            std::memcpy(moValues.data() + nAt * sizeof(Sample), &oTest.mnValue, sizeof(Sample));
            std::memset(moNaNs.data() + nAt * sizeof(Sample), oTest.mbNaN ? 0xFF : 0, sizeof(Sample));
            moUsed[nAt] = 0xFF;
            moExpected[nAt] = meRule == eAllChannels ? 0xFF : 0;
        }
    }
}

template <class Sample>
void BackgroundKernel<Sample>::Mark(const unsigned char* pPixels, std::size_t nPixels, unsigned char* pBits) const
{
    if (moTests.empty())
    {
        std::memset(pBits, 0, (nPixels + 7) / 8);
        return;
    }
    const std::size_t nDone = moValues.empty() ? 0 : MarkVectors(pPixels, nPixels, pBits);
    MarkPixels(pPixels + nDone * mnChannels * sizeof(Sample), nPixels - nDone, pBits + nDone / 8);
}

template <class Sample>
std::size_t BackgroundKernel<Sample>::MarkVectors([[maybe_unused]] const unsigned char* pPixels,
                                                  [[maybe_unused]] std::size_t nPixels,
                                                  [[maybe_unused]] unsigned char* pBits) const
{
#if defined(KRV_VECTOR_MASKS)
    const MarkPattern oPattern = {moValues.data(), mbNaN ? moNaNs.data() : nullptr,
                                  moUsed.data(),   moExpected.data(),
                                  mnChannels,      meRule == eAnyChannel};
    const std::size_t nPixelBytes = mnChannels * sizeof(Sample);
    std::size_t nDone = 0;
    const auto oMark = [&](auto Mark)
    {
        nDone += Mark(pPixels + nDone * nPixelBytes, nPixels - nDone, oPattern, pBits + nDone / 8);
    };
    if (krv::simd::RunsAvx512())
        oMark(MarkByAvx512<Sample>);
    if (krv::simd::RunsAvx2())
        oMark(MarkByAvx2<Sample>);
    oMark(MarkBySse<Sample>);
    return nDone;
#else
    return 0;
#endif
}

template <class Sample>
void BackgroundKernel<Sample>::MarkPixels(const unsigned char* pPixels, std::size_t nPixels, unsigned char* pBits) const
{
    for (std::size_t nFirst = 0; nFirst < nPixels; nFirst += 8)
    {
        unsigned int nByte = 0;
        for (std::size_t nPixel = nFirst; nPixel < nFirst + 8 && nPixel < nPixels; ++nPixel)
        {
            if (IsBackground(pPixels + nPixel * mnChannels * sizeof(Sample)))
                nByte |= 128u >> (nPixel - nFirst);
        }
        pBits[nFirst / 8] = static_cast<unsigned char>(nByte);
    }
}

template <class Sample>
bool BackgroundKernel<Sample>::IsBackground(const unsigned char* pPixel) const
{
    const bool bAll = meRule == eAllChannels;
    for (const SampleTest<Sample>& oTest : moTests)
    {
        Sample nSample;
        std::memcpy(&nSample, pPixel + oTest.mnChannel * sizeof(Sample), sizeof(Sample));
        if (oTest.Matches(nSample) != bAll)
            return !bAll;
    }
    return bAll;
}

template class BackgroundKernel<std::uint8_t>;
template class BackgroundKernel<std::uint16_t>;
template class BackgroundKernel<std::uint32_t>;
template class BackgroundKernel<std::uint64_t>;
template class BackgroundKernel<float>;
template class BackgroundKernel<double>;
template class BackgroundKernel<Complex<float>>;
template class BackgroundKernel<Complex<double>>;

} // namespace krv::gobs::detail
