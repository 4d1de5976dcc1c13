#include "tests/support/conversionmodel.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/raster/copydata.h"
#include "toolkit/raster/merger.h"

#include <gtest/gtest.h>

#include <cstring>
#include <memory>
#include <random>
#include <string>
#include <vector>

using namespace krv;
using namespace krv::raster;
using namespace krv::test;

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
        // Few are long enough to be copied as a whole by a merger.
        const unsigned int nMost = nRound % 49 == 0 ? 40000 : 2000;
        const std::size_t nPixels = nRound % 7 == 0 ? 2 + (1000 + Number(nMost)) / nChannels : Number(40);
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
        ASSERT_EQ(oTarget, oExpected) << "seed " << SEED << ", round " << nRound;
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
