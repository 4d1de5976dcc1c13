#include "gobs/mask/mask.h"
#include "gobs/raster/raster.h"
#include "tests/support/thrown.h"
#include "toolkit/core/hmalloc.h"

#include <gtest/gtest.h>

#include <random>
#include <vector>

using namespace krv;
using namespace krv::gobs;

namespace
{

struct Extent
{
    unsigned int mnWidth, mnHeight, mnXMargin, mnYMargin;
};

} // namespace

TEST(MaskTest, PacksCountsAndRetrievesEveryExtent)
{
    std::mt19937 oRandom(7);
    for (const Extent& o : {Extent{1, 1, 0, 0}, Extent{8, 1, 0, 0}, Extent{7, 5, 0, 0}, Extent{13, 3, 2, 1},
                            Extent{64, 64, 3, 2}, Extent{0, 4, 1, 0}, Extent{3, 0, 0, 0}, Extent{1, 9, 9, 0}})
    {
        const RasterInfo oInfo(o.mnWidth, o.mnHeight, 1, DataType(eDT_8U));
        const RasterContext oContext(5, -6, o.mnXMargin, o.mnYMargin);
        Raster oBytes(oInfo, oContext);
        const std::uint64_t nWidth = oBytes.GetFullWidth();
        std::uint64_t nSet = 0;
        std::uint64_t nCentre = 0;
        for (std::uint64_t i = 0; i < oBytes.GetBufferSize(); ++i)
        {
            oBytes.GetBuffer()[i] = static_cast<unsigned char>(oRandom() % 2 ? 0 : 1u << oRandom() % 8);
            const bool bSet = oBytes.GetBuffer()[i] != 0;
            nSet += bSet;
            nCentre += bSet && i % nWidth - o.mnXMargin < o.mnWidth && i / nWidth - o.mnYMargin < o.mnHeight;
        }
        const Mask oMask(oInfo, oContext, oBytes.GetBuffer(), false);
        EXPECT_EQ(oMask.GetBitsSize(), (oBytes.GetBufferSize() + 7) / 8);
        EXPECT_EQ(oMask.CountSet(), nSet);
        EXPECT_EQ(oMask.CountSetInCentre(), nCentre);
        EXPECT_EQ(oMask.GetY(), -6);

        Raster oRetrieved(oInfo, oContext);
        oMask.RetrieveRaster(oRetrieved);
        Raster oPacked(RasterInfo(o.mnWidth, o.mnHeight, 1, DataType(eDT_BIT)), oContext);
        oMask.RetrieveRaster(oPacked);
        for (std::uint64_t i = 0; i < oBytes.GetBufferSize(); ++i)
        {
            const int nExpected = oBytes.GetBuffer()[i] != 0;
            ASSERT_EQ(oRetrieved.GetBuffer()[i], nExpected) << i;
            ASSERT_EQ((oPacked.GetBuffer()[i / 8] & (128 >> i % 8)) != 0, nExpected) << i;
            ASSERT_EQ(oMask.GetBit(i % nWidth, i / nWidth), nExpected) << i;
        }
    }
}

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
