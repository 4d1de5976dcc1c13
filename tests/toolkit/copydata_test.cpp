#include "tests/support/conversionmodel.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/raster/copydata.h"
#include "toolkit/raster/merger.h"

#include <gtest/gtest.h>

#include <vector>

using namespace krv;
using namespace krv::raster;
using namespace krv::test;

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
