#include "tests/support/conversionmodel.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/raster/copydata.h"
#include "toolkit/raster/merger.h"

#include <gtest/gtest.h>

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
