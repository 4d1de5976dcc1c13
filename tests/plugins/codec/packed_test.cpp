// PackBits and pixels of one bit, beside the plainest code there is for both.
#include "plugins/support/codec/bits.h"
#include "plugins/support/codec/packbits.h"
#include "tests/plugins/codec/blocks.h"

#include <gtest/gtest.h>

#include <cstring>

namespace
{

using namespace krv::plugins::codec;
using krv::test::Bytes;
using krv::test::Exact;

Bytes EncodePlainly(const Bytes& oData)
{
    Bytes oStream;
    for (std::size_t i = 0, nEnd = 0; i < oData.size(); i = nEnd)
    {
        nEnd = i + 1;
        const bool bRun = nEnd < oData.size() && oData[nEnd] == oData[i];
        while (nEnd < oData.size() && nEnd - i < 128 && (oData[nEnd] == oData[nEnd - 1]) == bRun)
            ++nEnd;
        oStream.push_back(static_cast<unsigned char>(bRun ? 257 - (nEnd - i) : nEnd - i - 1));
        oStream.insert(oStream.end(), oData.begin() + static_cast<std::ptrdiff_t>(i),
                       oData.begin() + static_cast<std::ptrdiff_t>(bRun ? i + 1 : nEnd));
        if (nEnd % 3 == 0)
            oStream.push_back(128);
    }
    return oStream;
}

// Everything that the stream gives.
Bytes DecodePlainly(const Bytes& oStream)
{
    Bytes oData;
    for (std::size_t i = 0; i < oStream.size();)
    {
        const unsigned int nLength = oStream[i++];
        const std::size_t nBytes = nLength > 128 ? 257 - nLength : nLength + 1;
        if (nLength == 128)
            continue;
        if (oStream.size() - i < (nLength > 128 ? 1 : nBytes))
            break;
        for (std::size_t k = 0; k < nBytes; ++k)
            oData.push_back(oStream[nLength > 128 ? i : i + k]);
        i += nLength > 128 ? 1 : nBytes;
    }
    return oData;
}

TEST(PackBits, DecodesSoundAndHostileInputAsThePlainLoopDoes)
{
    unsigned int nMore = 0;
    for (unsigned int nSeed = 0; nSeed < 400; ++nSeed)
    {
        std::mt19937 oRandom(nSeed);
        const Bytes oData = krv::test::MakeData(oRandom, nSeed, 1 + oRandom() % 3000);
        const Bytes oSound = EncodePlainly(oData);
        ASSERT_TRUE(DecodePlainly(oSound) == oData) << nSeed;
        Bytes oStream = oSound;
        if (nSeed % 2 == 1)
            oStream[oRandom() % oStream.size()] = static_cast<unsigned char>(oRandom());
        if (nSeed % 8 == 7)
            oStream.resize(oRandom() % oStream.size());
        const Bytes oTruth = DecodePlainly(oStream);
        Exact oInput(oStream), oOutput(oData.size());
        const Result oResult = DecodePackBits(oInput.data(), oInput.size(), oOutput.data(), oOutput.size());
        ASSERT_EQ(oTruth.size() >= oData.size(), oResult.IsDone()) << nSeed;
        ASSERT_EQ(std::min(oTruth.size(), oData.size()), oResult.mnBytes) << nSeed;
        ASSERT_TRUE(
            std::equal(oTruth.begin(), oTruth.begin() + static_cast<std::ptrdiff_t>(oResult.mnBytes), oOutput.data()))
            << nSeed;
        ASSERT_FALSE(oResult.mbMore && nSeed % 2 == 0) << nSeed;
        nMore += oResult.mbMore;
    }
    EXPECT_GT(nMore, 5U);
}

TEST(Bits, SamplesOfEveryWidthAreThoseOfThePlainLoop)
{
    for (unsigned int nSeed = 0; nSeed < 1500; ++nSeed)
    {
        std::mt19937 oRandom(nSeed);
        const unsigned int nBits = nSeed % 3 == 0 ? 1 : 1 + oRandom() % 31;
        const bool bSigned = oRandom() % 4 == 0;
        const std::size_t nSamples = 1 + oRandom() % 300, nRows = 1 + oRandom() % 3;
        const std::size_t nPitch = (nSamples * nBits + 7) / 8 + oRandom() % 2, nBytes = GetContainerBytes(nBits);
        Exact oSource(krv::test::RandomBytes(oRandom, nPitch * nRows - oRandom() % nPitch));
        Exact oTarget(nSamples * nBytes * nRows);
        UnpackBits(oSource.data(), oSource.size(), nPitch, oTarget.data(), nSamples * nBytes, nSamples, nRows, nBits,
                   bSigned);
        for (std::size_t i = 0; i < nSamples * nRows; ++i)
        {
            std::int64_t nExpected = 0;
            for (std::size_t nBit = 0; nBit < nBits; ++nBit)
            {
                const std::size_t nAt = i / nSamples * nPitch * 8 + i % nSamples * nBits + nBit;
                const int nSet = nAt / 8 < oSource.size() ? oSource.data()[nAt / 8] >> (7 - nAt % 8) & 1 : 0;
                nExpected = nExpected * 2 + (bSigned && nBit == 0 ? -nSet : nSet);
            }
            const std::int64_t nMask = (std::int64_t{1} << 8 * nBytes) - 1;
            std::uint32_t nGot = 0;
            std::memcpy(&nGot, oTarget.data() + i * nBytes, nBytes);
            ASSERT_EQ(nExpected & nMask, nGot) << nSeed << ": " << nBits << " bits, sample " << i;
        }
    }
}

} // namespace
