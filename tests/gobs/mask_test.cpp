#include "gobs/mask/mask.h"
#include "gobs/raster/raster.h"
#include "tests/support/thrown.h"
#include "toolkit/core/hmalloc.h"

#include <gtest/gtest.h>

using namespace krv;
using namespace krv::gobs;

TEST(MaskTest, BitsStandMostSignificantFirstOverTheFullExtent)
{
    Mask oMask(RasterInfo(3, 2, 4, DataType(eDT_64R)), RasterContext(0, 0, 1, 1));
    EXPECT_EQ(oMask.CountSet(), 0u);
    oMask.SetBit(0, 0);
    oMask.SetBit(4, 2); // index 14
    oMask.SetBit(4, 3); // index 19, the last
    ASSERT_EQ(oMask.GetBitsSize(), 3u);
    EXPECT_EQ(oMask.GetBits()[0], 0x80);
    EXPECT_EQ(oMask.GetBits()[1], 0x02);
    EXPECT_EQ(oMask.GetBits()[2], 0x10);
    EXPECT_EQ(oMask.CountSetInCentre(), 0u);
}

TEST(MaskTest, TakesOverBuffersAlsoWhenItThrows)
{
    const RasterInfo oInfo(100, 10, 1, DataType(eDT_8U));
    auto* pBytes = static_cast<unsigned char*>(HMalloc(1000));
    std::fill_n(pBytes, 1000, static_cast<unsigned char>(255));
    EXPECT_EQ(Mask(oInfo, RasterContext(), pBytes, true).CountSet(), 1000u);
    EXPECT_THROW(Mask(oInfo, RasterContext(), nullptr, true), DataException);
    const RasterInfo oHuge(0xFFFFFFFFu, 0xFFFFFFFFu, 1, DataType(eDT_8U));
    const RasterContext oMargins(0, 0, 0xFFFFFFFFu, 0xFFFFFFFFu);
    EXPECT_THROW(Mask(oHuge, oMargins, static_cast<unsigned char*>(HMalloc(1)), true), DataException);
}

TEST(MaskTest, RetrieveRasterRefusesOtherRasters)
{
    const Mask oMask(RasterInfo(4, 4, 1, DataType(eDT_8U)), RasterContext());
    Raster oReal(RasterInfo(4, 4, 2, DataType(eDT_32R)), RasterContext());
    const auto oError = test::Thrown<DataException>([&] { oMask.RetrieveRaster(oReal); });
    EXPECT_STREQ(oError.what(), "We can only rasterize into a eDT_BIT or eDT_8U Raster");
    test::ExpectPlace(oError, "", "gobs/mask/mask", 233);
    Raster oTwo(RasterInfo(4, 4, 2, DataType(eDT_8U)), RasterContext());
    EXPECT_THROW(oMask.RetrieveRaster(oTwo), DataException);
    Raster oWider(RasterInfo(4, 4, 1, DataType(eDT_8U)), RasterContext(0, 0, 1, 0));
    EXPECT_THROW(oMask.RetrieveRaster(oWider), DataException);
}
