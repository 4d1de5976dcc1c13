#include "plugins/support/codec/bits.h"

#include "tests/plugins/codec/blocks.h"

#include <gtest/gtest.h>

#include <bit>
#include <cmath>
#include <cstring>
#include <limits>

namespace
{

using namespace krv::plugins::codec;
using krv::test::Bytes;
using krv::test::Exact;

// Sample number nSample of a row, bit by bit.
std::int64_t TakeSample(const Bytes& oBytes, std::size_t nFirstByte, std::size_t nSample, unsigned int nBits,
                        bool bSigned)
{
    std::uint64_t nValue = 0;
    for (std::size_t i = nSample * nBits; i < (nSample + 1) * nBits; ++i)
    {
        const std::size_t nByte = nFirstByte + i / 8;
        const unsigned int nBit = nByte < oBytes.size() ? (oBytes[nByte] >> (7 - i % 8)) & 1U : 0U;
        nValue = nValue << 1 | nBit;
    }
    if (bSigned && nBits < 64 && (nValue >> (nBits - 1)) != 0)
        nValue |= ~std::uint64_t{0} << nBits;
    return static_cast<std::int64_t>(nValue);
}

TEST(Bits, UnpacksEveryWidth)
{
    for (unsigned int nBits = 1; nBits <= 64; ++nBits)
        for (unsigned int nSeed = 0; nSeed < 12; ++nSeed)
        {
            std::mt19937 oRandom(nBits * 100 + nSeed);
            const bool bSigned = nSeed % 2 == 1;
            const std::size_t nSamples = 1 + oRandom() % 90, nRows = 1 + oRandom() % 4;
            const std::size_t nPitch = (nSamples * nBits + 7) / 8 + oRandom() % 3;
            const std::size_t nContainer = GetContainerBytes(nBits), nToPitch = nSamples * nContainer + oRandom() % 3;
            // Now and then the data end too early.
            Exact oSource(
                krv::test::RandomBytes(oRandom, nPitch * nRows - (nSeed > 8 ? oRandom() % (nPitch * nRows) : 0)));
            const Bytes oBytes = oSource.ToBytes();
            Exact oResult(nToPitch * (nRows - 1) + nSamples * nContainer);
            UnpackBits(oSource.data(), oSource.size(), nPitch, oResult.data(), nToPitch, nSamples, nRows, nBits,
                       bSigned);
            for (std::size_t i = 0; i < nSamples * nRows; ++i)
            {
                const std::int64_t nExpected = TakeSample(oBytes, i / nSamples * nPitch, i % nSamples, nBits, bSigned);
                const unsigned char* at = oResult.data() + i / nSamples * nToPitch + i % nSamples * nContainer;
                ASSERT_EQ(0, std::memcmp(&nExpected, at, nContainer))
                    << nBits << " bits, seed " << nSeed << ", sample " << i;
            }
        }
}

TEST(Bits, UnpacksThreeBytes)
{
    for (std::size_t nCount = 0; nCount < 40; ++nCount)
        for (const bool bBigEndian : {false, true})
            for (const bool bSigned : {false, true})
            {
                std::mt19937 oRandom(static_cast<unsigned int>(nCount));
                Exact oSource(krv::test::RandomBytes(oRandom, nCount * 3)), oResult(nCount * 4);
                Unpack24(oSource.data(), oResult.data(), nCount, bBigEndian, bSigned);
                Bytes oOrdered = oSource.ToBytes();
                if (!bBigEndian)
                    SwapBytes(oOrdered.data(), oOrdered.data(), nCount, 3);
                for (std::size_t i = 0; i < nCount; ++i)
                {
                    const auto nExpected = static_cast<std::int32_t>(TakeSample(oOrdered, 0, i, 24, bSigned));
                    ASSERT_EQ(0, std::memcmp(&nExpected, oResult.data() + i * 4, 4)) << nCount << " numbers, " << i;
                }
            }
}

// The value of a narrow number by its definition, for all but not-a-number.
float Evaluate(std::uint32_t nNumber, int nExponentBits, int nFractionBits)
{
    const int nExponent = static_cast<int>(nNumber >> nFractionBits) & ((1 << nExponentBits) - 1);
    const int nFraction = static_cast<int>(nNumber) & ((1 << nFractionBits) - 1);
    const int nBias = (1 << (nExponentBits - 1)) - 1;
    const bool bNegative = (nNumber >> (nExponentBits + nFractionBits)) != 0;
    double nValue = std::numeric_limits<double>::infinity();
    if (nExponent == 0)
        nValue = std::ldexp(nFraction, 1 - nBias - nFractionBits);
    else if (nExponent < (1 << nExponentBits) - 1)
        nValue = std::ldexp(nFraction + (1 << nFractionBits), nExponent - nBias - nFractionBits);
    return static_cast<float>(bNegative ? -nValue : nValue);
}

void ExpectWidened(std::uint32_t nNumber, const unsigned char* at, int nExponentBits, int nFractionBits)
{
    std::uint32_t nResult = 0;
    std::memcpy(&nResult, at, 4);
    const std::uint32_t nFraction = nNumber & ((1U << nFractionBits) - 1);
    const bool bTop = ((nNumber >> nFractionBits) & ((1U << nExponentBits) - 1)) == (1U << nExponentBits) - 1;
    std::uint32_t nExpected = std::bit_cast<std::uint32_t>(Evaluate(nNumber, nExponentBits, nFractionBits));
    if (bTop)
        nExpected |= nFraction << (23 - nFractionBits); // not a number keeps its payload
    ASSERT_EQ(nExpected, nResult) << "of " << nNumber;
}

TEST(Bits, EveryHalfFloatIsWidenedExactly)
{
    for (const std::size_t nCount : {65536U, 65531U, 3U}) // with whole vectors and without
    {
        Exact oSource(nCount * 2), oResult(nCount * 4);
        for (std::size_t i = 0; i < nCount; ++i)
        {
            const auto nHalf = static_cast<std::uint16_t>(i * 40503);
            std::memcpy(oSource.data() + i * 2, &nHalf, 2);
        }
        HalfToFloat(oSource.data(), oResult.data(), nCount);
        for (std::size_t i = 0; i < nCount; ++i)
            ExpectWidened(static_cast<std::uint16_t>(i * 40503), oResult.data() + i * 4, 5, 10);
        if (HasFatalFailure())
            return;
    }
}

TEST(Bits, Every24BitFloatIsWidenedExactly)
{
    constexpr std::size_t COUNT = 1 << 16;
    Exact oSource(COUNT * 3), oResult(COUNT * 4);
    for (std::uint32_t nHigh = 0; nHigh < 256; ++nHigh)
    {
        for (std::uint32_t i = 0; i < COUNT; ++i)
        {
            const std::uint32_t nNumber = nHigh << 16 | i;
            std::memcpy(oSource.data() + std::size_t{i} * 3, &nNumber, 3);
        }
        Float24ToFloat(oSource.data(), oResult.data(), COUNT);
        for (std::uint32_t i = 0; i < COUNT; i += 1 + (nHigh % 8 != 0) * (i % 97))
            ExpectWidened(nHigh << 16 | i, oResult.data() + std::size_t{i} * 4, 7, 16);
        if (HasFatalFailure())
            return;
    }
}

TEST(Bits, BitsAndBytesAreTurnedRoundInPlaceToo)
{
    for (std::size_t nCount = 0; nCount < 70; ++nCount)
    {
        std::mt19937 oRandom(static_cast<unsigned int>(nCount));
        for (const std::size_t nSampleBytes : {1, 2, 3, 4, 5, 6, 7, 8})
        {
            Exact oSource(krv::test::RandomBytes(oRandom, nCount * nSampleBytes)), oResult(oSource.size());
            Bytes oExpected(oSource.size());
            for (std::size_t i = 0; i < oExpected.size(); ++i)
                oExpected[i] = oSource.data()[i / nSampleBytes * nSampleBytes + nSampleBytes - 1 - i % nSampleBytes];
            SwapBytes(oSource.data(), oResult.data(), nCount, nSampleBytes);
            ASSERT_TRUE(oExpected == oResult.ToBytes()) << nCount << " of " << nSampleBytes;
            SwapBytes(oSource.data(), oSource.data(), nCount, nSampleBytes);
            ASSERT_TRUE(oExpected == oSource.ToBytes()) << nCount << " of " << nSampleBytes;
        }
        Exact oSource(krv::test::RandomBytes(oRandom, nCount)), oResult(nCount);
        ReverseBits(oSource.data(), oResult.data(), nCount);
        for (std::size_t i = 0; i < nCount * 8; ++i)
            ASSERT_EQ((oSource.data()[i / 8] >> i % 8) & 1, (oResult.data()[i / 8] >> (7 - i % 8)) & 1);
        ReverseBits(oResult.data(), oResult.data(), nCount);
        ASSERT_TRUE(oSource.ToBytes() == oResult.ToBytes());
    }
}

} // namespace
