#include "toolkit/exceptions/exceptions.h"
#include "toolkit/raster/copydata.h"
#include "toolkit/raster/merger.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <limits>
#include <memory>
#include <random>
#include <string>
#include <vector>

using namespace krv;
using namespace krv::raster;

namespace
{

// The model works value by value in long double, whose 64 bits of fraction hold every part type exactly, and knows
// nothing of the types but these facts.
struct Part
{
    int mnBytes;
    bool mbReal;
    long double mnLow;
    long double mnHigh;
    long double (*Load)(const unsigned char*);
    void (*Store)(unsigned char*, long double);
};

template <typename T>
Part PartOf()
{
    static_assert(std::numeric_limits<long double>::digits >= 64);
    using Limits = std::numeric_limits<T>;
    return {sizeof(T),
            !Limits::is_integer,
            static_cast<long double>(Limits::lowest()),
            static_cast<long double>(Limits::max()),
            [](const unsigned char* p)
            {
                T nValue;
                std::memcpy(&nValue, p, sizeof(T));
                return static_cast<long double>(nValue);
            },
            [](unsigned char* p, long double nValue)
            {
                const T nStored = static_cast<T>(nValue);
                std::memcpy(p, &nStored, sizeof(T));
            }};
}

const Part PARTS[] = {PartOf<std::uint8_t>(),  PartOf<std::int8_t>(),  PartOf<std::uint16_t>(), PartOf<std::int16_t>(),
                      PartOf<std::uint32_t>(), PartOf<std::int32_t>(), PartOf<float>(),         PartOf<std::uint64_t>(),
                      PartOf<std::int64_t>(),  PartOf<double>()};

struct Type
{
    const Part* mpoPart;
    int mnParts;

    explicit Type(int nType)
    {
        constexpr int COMPLEX[] = {2, 3, 5, 6, 9};
        mpoPart = &PARTS[nType < 10 ? nType : COMPLEX[nType - 10]];
        mnParts = nType < 10 ? 1 : 2;
    }
    std::size_t Bytes() const { return static_cast<std::size_t>(mpoPart->mnBytes * mnParts); }
};

long double ModelPart(long double nValue, const Part& oTarget)
{
    if (oTarget.mbReal)
        return nValue;
    if (std::isnan(nValue))
        return 0;
    const long double nLower = std::floor(nValue);
    const long double nRest = nValue - nLower;
    const bool bUp = nRest > 0.5L || (nRest == 0.5L && std::fmod(nLower, 2.0L) != 0);
    return std::min(std::max(bUp ? nLower + 1 : nLower, oTarget.mnLow), oTarget.mnHigh);
}

void ModelValue(const unsigned char* pSource, const Type& oSource, unsigned char* pTarget, const Type& oTarget)
{
    for (int nPart = 0; nPart < oTarget.mnParts; ++nPart)
    {
        const long double nValue =
            nPart < oSource.mnParts ? oSource.mpoPart->Load(pSource + nPart * oSource.mpoPart->mnBytes) : 0;
        oTarget.mpoPart->Store(pTarget + nPart * oTarget.mpoPart->mnBytes, ModelPart(nValue, *oTarget.mpoPart));
    }
}

// What only reals know (early, where vector code meets it), every limit of every type with its neighbours, and halves,
// as far as the type holds them.
std::vector<unsigned char> BoundaryValues(const Part& oPart)
{
    std::vector<long double> oValues = {0,
                                        0.25L,
                                        0.5L,
                                        1.5L,
                                        2.5L,
                                        -0.5L,
                                        -1.5L,
                                        -2.5L,
                                        0.49999997L,
                                        123456.5L,
                                        1e30L,
                                        0.5L + 1e-10L,
                                        1.5L - 1e-10L,
                                        3000000000.5L + 1e-6L,
                                        -0.5L - 1e-10L};
    for (const Part& oOther : PARTS)
        for (long double nLimit : {oOther.mnLow, oOther.mnHigh})
            for (long double nStep : {-1.0L, -0.5L, 0.0L, 0.5L, 1.0L, 1.5L})
                oValues.push_back(nLimit + nStep);
    for (int nBits : {23, 24, 31, 32, 52, 53, 62, 63})
        for (int nStep = -3; nStep <= 3; ++nStep)
            for (int nSign : {-1, 1})
                oValues.push_back(nSign * (std::ldexp(1.0L, nBits) + nStep));
    if (oPart.mbReal)
        for (long double nValue : {std::numeric_limits<long double>::infinity(),
                                   -std::numeric_limits<long double>::infinity(), std::nanl("")})
            oValues.insert(oValues.begin() + 3, nValue);
    std::vector<unsigned char> oBytes(oValues.size() * static_cast<std::size_t>(oPart.mnBytes));
    for (std::size_t i = 0; i < oValues.size(); ++i)
        oPart.Store(oBytes.data() + i * static_cast<std::size_t>(oPart.mnBytes), ModelPart(oValues[i], oPart));
    return oBytes;
}

bool Same(const unsigned char* pLeft, const unsigned char* pRight, const Part& oPart)
{
    if (oPart.mbReal && std::isnan(oPart.Load(pLeft)))
        return std::isnan(oPart.Load(pRight));
    return std::memcmp(pLeft, pRight, static_cast<std::size_t>(oPart.mnBytes)) == 0;
}

} // namespace

TEST(CopyDataTest, EveryPairOfTypesAtItsBoundaries)
{
    for (int nFrom = 0; nFrom < 15; ++nFrom)
        for (int nTo = 0; nTo < 15; ++nTo)
        {
            const Type oFrom(nFrom);
            const Type oTo(nTo);
            std::vector<unsigned char> oSource = BoundaryValues(*oFrom.mpoPart);
            oSource.insert(oSource.begin(), 0); // so that nothing is aligned
            const std::size_t nCount = (oSource.size() - 1) / oFrom.Bytes();
            std::vector<unsigned char> oTarget(nCount * oTo.Bytes() + 1, 0xAA);
            CopyData(oSource.data() + 1, static_cast<BufferType>(nFrom), 1, oTarget.data() + 1,
                     static_cast<BufferType>(nTo), 1, nCount);
            for (std::size_t i = 0; i < nCount; ++i)
            {
                unsigned char oExpected[16];
                const unsigned char* pSource = oSource.data() + 1 + i * oFrom.Bytes();
                ModelValue(pSource, oFrom, oExpected, oTo);
                for (int nPart = 0; nPart < oTo.mnParts; ++nPart)
                {
                    const int nOffset = nPart * oTo.mpoPart->mnBytes;
                    const unsigned char* pGot = oTarget.data() + 1 + i * oTo.Bytes() + nOffset;
                    ASSERT_TRUE(Same(pGot, oExpected + nOffset, *oTo.mpoPart))
                        << "type " << nFrom << " to " << nTo << ", part " << nPart << " of "
                        << oFrom.mpoPart->Load(pSource) << ": " << oTo.mpoPart->Load(pGot) << " instead of "
                        << oTo.mpoPart->Load(oExpected + nOffset);
                }
            }
        }
}

// Random shapes: only the named values change, whatever the strides, run lengths and counts.
TEST(CopyDataTest, StridesTouchTheirValuesOnly)
{
    constexpr unsigned int SEED = 99;
    std::mt19937 oRandom(SEED);
    const auto Number = [&](unsigned int nBelow)
    {
        return oRandom() % nBelow;
    };
    for (int nRound = 0; nRound < 3000; ++nRound)
    {
        const Type oFrom(static_cast<int>(nRound % 15));
        const Type oTo(static_cast<int>(nRound / 15 % 15));
        const unsigned int nChannels = nRound % 50 == 0 ? 1100 + Number(9) : 1 + Number(6);
        const std::size_t nPixels = nRound % 7 == 0 ? 2 + (1000 + Number(2000)) / nChannels : Number(40);
        const std::size_t nFromStride = Number(10) == 0 ? 0 : nChannels + Number(2) * Number(4);
        const std::size_t nToStride = nChannels + Number(2) * Number(4);
        std::vector<unsigned char> oSource((nPixels * nFromStride + nChannels) * oFrom.Bytes());
        std::vector<unsigned char> oTarget((nPixels * nToStride + nChannels) * oTo.Bytes(), 0xAA);
        std::vector<unsigned char> oExpected = oTarget;
        for (std::size_t i = 0; i < oSource.size(); i += static_cast<std::size_t>(oFrom.mpoPart->mnBytes))
            oFrom.mpoPart->Store(oSource.data() + i,
                                 ModelPart(static_cast<int>(Number(100000)) - 50000, *oFrom.mpoPart));
        for (std::size_t i = 0; i < nPixels; ++i)
            for (unsigned int nChannel = 0; nChannel < nChannels; ++nChannel)
                ModelValue(oSource.data() + (i * nFromStride + nChannel) * oFrom.Bytes(), oFrom,
                           oExpected.data() + (i * nToStride + nChannel) * oTo.Bytes(), oTo);
        CopyData(oSource.data(), static_cast<BufferType>(nRound % 15), nFromStride, oTarget.data(),
                 static_cast<BufferType>(nRound / 15 % 15), nToStride, nPixels, nChannels);
        ASSERT_EQ(oTarget, oExpected) << "seed " << SEED << ", round " << nRound << ": " << nPixels << " pixels of "
                                      << nChannels << " channels, strides " << nFromStride << " to " << nToStride;
    }
}

// Every target type with random sources, places, repeats, gaps and counts. Values are boundary values; buffers are of
// exactly the size that is used, so that a sanitizer sees every byte too many.
TEST(MergerTest, ChannelsOfAllTypesAreConvertedAndPlaced)
{
    constexpr unsigned int SEED = 7;
    std::mt19937 oRandom(SEED);
    const auto Number = [&](std::size_t nBelow)
    {
        return static_cast<unsigned int>(oRandom() % nBelow);
    };
    for (int nRound = 0; nRound < 3000; ++nRound)
    {
        const int nTo = nRound % 15;
        const Type oTo(nTo);
        const std::size_t nPixels = Number(10) == 0 ? 400 + Number(3000) : Number(80);
        std::vector<MergeSource> oSources(1 + Number(4));
        std::vector<std::unique_ptr<unsigned char[]>> oBuffers;
        std::vector<const unsigned char*> oPointers;
        for (MergeSource& oSource : oSources)
        {
            // Half of the rounds have small unsigned integers and reals alone: those meet in a smaller type.
            constexpr int SMALL[] = {0, 2, 0, 3, 6};
            oSource = {static_cast<BufferType>(nRound % 2 == 0 ? Number(15) : SMALL[Number(5)]), Number(6)};
            const Type oFrom(oSource.meType);
            const std::vector<unsigned char> oValues = BoundaryValues(*oFrom.mpoPart);
            const std::size_t nBytes = nPixels * oSource.mnChannels * oFrom.Bytes();
            oBuffers.push_back(std::make_unique<unsigned char[]>(nBytes));
            const auto nPartBytes = static_cast<std::size_t>(oFrom.mpoPart->mnBytes);
            for (std::size_t i = 0; i < nBytes; i += nPartBytes)
                std::memcpy(&oBuffers.back()[i], &oValues[Number(oValues.size() / nPartBytes) * nPartBytes],
                            nPartBytes);
            oPointers.push_back(oBuffers.back().get());
        }
        std::vector<MergeChannel> oChannels(1 + Number(9));
        for (unsigned int i = 0; i < oChannels.size(); ++i)
        {
            const unsigned int nSource = nRound % 3 == 0 ? 0 : Number(oSources.size());
            const unsigned int nCount = oSources[nSource].mnChannels;
            if (nCount != 0 && Number(8) != 0)
                oChannels[i] = {nSource, nRound % 3 == 0 ? i % nCount : Number(nCount)};
        }
        const std::size_t nPixelBytes = oChannels.size() * oTo.Bytes();
        std::vector<unsigned char> oTarget(nPixels * nPixelBytes, 0xAA);
        Merger oMerger(oSources, static_cast<BufferType>(nTo), oChannels);
        oMerger.Run(oPointers, oTarget.data(), nPixels);
        for (std::size_t i = 0; i < nPixels * oChannels.size(); ++i)
        {
            const MergeChannel& oChannel = oChannels[i % oChannels.size()];
            unsigned char oExpected[16] = {};
            if (oChannel.mnSource != MergeChannel::NOWHERE)
            {
                const MergeSource& oSource = oSources[oChannel.mnSource];
                const Type oFrom(oSource.meType);
                const std::size_t nValue = i / oChannels.size() * oSource.mnChannels + oChannel.mnChannel;
                ModelValue(oPointers[oChannel.mnSource] + nValue * oFrom.Bytes(), oFrom, oExpected, oTo);
            }
            for (int nPart = 0; nPart < oTo.mnParts; ++nPart)
                ASSERT_TRUE(Same(&oTarget[i * oTo.Bytes()] + nPart * oTo.mpoPart->mnBytes,
                                 oExpected + nPart * oTo.mpoPart->mnBytes, *oTo.mpoPart))
                    << "seed " << SEED << ", round " << nRound << ", value " << i << " of type " << nTo;
        }
    }
}

TEST(MergerTest, WhatDoesNotExistIsRefused)
{
    EXPECT_THROW(Merger({{eBT_8U, 3}}, eBT_8U, {{0, 3}}), DataException);
    EXPECT_THROW(Merger({{eBT_8U, 3}}, eBT_8U, {{1, 0}}), DataException);
    EXPECT_THROW(Merger({{static_cast<BufferType>(15), 3}}, eBT_8U, {{0, 0}}), ParameterException);
    EXPECT_THROW(Merger({{eBT_8U, 1}}, static_cast<BufferType>(15), {{0, 0}}), ParameterException);
    EXPECT_THROW(Merger({{eBT_8U, ~0u}}, eBT_8U, {{0, 0}}), DataException);
    unsigned char nTarget = 5;
    Merger({}, eBT_8U, {MergeChannel()}).Run({}, &nTarget, 1);
    EXPECT_EQ(nTarget, 0);
}

TEST(CopyDataTest, SizesAndUnknownTypes)
{
    EXPECT_EQ(BufferDataSize(eBT_C16U, 10), 40u);
    EXPECT_EQ(BufferDataSize(eBT_C64R, 0x7FFFFFFFFFFFFFFull), 0x7FFFFFFFFFFFFFF0ull);
    EXPECT_THROW(BufferDataSize(eBT_C64R, 0x800000000000000ull), DataException);
    EXPECT_THROW(BufferDataSize(eBT_16U, ~0ull), DataException);
    EXPECT_THROW(BufferDataSize(static_cast<BufferType>(15), 1), ParameterException);
    int nValue = 5;
    int nTarget = 6;
    EXPECT_THROW(CopyData(&nValue, eBT_32S, 1, &nTarget, static_cast<BufferType>(-1), 1, 1), ParameterException);
    EXPECT_THROW(CopyData(&nValue, static_cast<BufferType>(99), 1, &nTarget, eBT_32S, 1, 0), ParameterException);
    CopyData(nullptr, eBT_8U, 1, nullptr, eBT_8U, 1, 0);
    EXPECT_EQ(nTarget, 6);
}
