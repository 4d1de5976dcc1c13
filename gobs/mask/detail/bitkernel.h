#pragma once

#include "gobs/mask/detail/sampletest.h"
#include "gobs/mask/maskdecision.h"

#include <cstddef>
#include <vector>

namespace krv::gobs::detail
{

// As BackgroundKernel, for one-bit rasters: samples are single bits, the highest of a byte first, without padding.
class BitKernel
{
public:
    BitKernel(const std::vector<SampleTest<unsigned char>>& oTests, std::size_t nChannels, BkgdRule eRule)
        : moTests(oTests), mnChannels(nChannels), meRule(eRule)
    {
    }

    void Mark(const unsigned char* pPixels, std::size_t nPixels, unsigned char* pBits) const
    {
        const bool bSingle = mnChannels == 1 && moTests.size() == 1;
        for (std::size_t nByte = 0; nByte < (nPixels + 7) / 8; ++nByte)
        {
            const std::size_t nLeft = nPixels - nByte * 8;
            const unsigned int nValid = nLeft >= 8 ? 0xFFu : 0xFF00u >> nLeft & 0xFFu;
            const unsigned int nBits = bSingle ? SingleByte(pPixels[nByte]) : MarkByte(pPixels, nByte * 8, nLeft);
            pBits[nByte] = static_cast<unsigned char>(nBits & nValid);
        }
    }

private:
    unsigned int SingleByte(unsigned int nByte) const { return moTests[0].mnValue != 0 ? nByte : ~nByte; }

    unsigned int MarkByte(const unsigned char* pPixels, std::size_t nFirst, std::size_t nLeft) const
    {
        unsigned int nByte = 0;
        for (std::size_t n = 0; n < 8 && n < nLeft; ++n)
        {
            if (IsBackground(pPixels, nFirst + n))
                nByte |= 128u >> n;
        }
        return nByte;
    }

    bool IsBackground(const unsigned char* pPixels, std::size_t nPixel) const
    {
        const bool bAll = meRule == eAllChannels;
        for (const SampleTest<unsigned char>& oTest : moTests)
        {
            const std::size_t nAt = nPixel * mnChannels + oTest.mnChannel;
            const unsigned int nBit = pPixels[nAt / 8] >> (7 - nAt % 8) & 1u;
            if ((nBit == oTest.mnValue) != bAll)
                return !bAll;
        }
        return bAll && !moTests.empty();
    }

    std::vector<SampleTest<unsigned char>> moTests;
    std::size_t mnChannels;
    BkgdRule meRule;
};

} // namespace krv::gobs::detail
