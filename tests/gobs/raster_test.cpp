#include "gobs/raster/raster.h"
#include "tests/support/thrown.h"
#include "toolkit/core/hmalloc.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>

using namespace krv;
using namespace krv::gobs;

TEST(RasterTest, BufferCoversMarginsChannelsAndParts)
{
    Raster oRaster(RasterInfo(5, 3, 2, DataType(eDT_C16U)), RasterContext(-4, 7, 2, 1));
    EXPECT_EQ(oRaster.GetX(), -4);
    EXPECT_EQ(oRaster.GetY(), 7);
    EXPECT_EQ(oRaster.GetFullWidth(), 9u);
    EXPECT_EQ(oRaster.GetFullHeight(), 5u);
    EXPECT_EQ(oRaster.GetBufferSize(), 9u * 5 * 2 * 4);
    EXPECT_EQ(reinterpret_cast<std::uintptr_t>(oRaster.GetBuffer()) % 64, 0u);
    std::memset(oRaster.GetBuffer(), 1, oRaster.GetBufferSize());
}

TEST(RasterTest, HugeExtentsAreCountedNotWrapped)
{
    unsigned char nByte = 0;
    const RasterContext oWide(0, 0, 0xFFFFFFFFu, 0);
    Raster oRaster(RasterInfo(0xFFFFFFFFu, 1, 1, DataType(eDT_8U)), oWide, &nByte, false);
    EXPECT_EQ(oRaster.GetFullWidth(), 3ull * 0xFFFFFFFFu);
    EXPECT_EQ(oRaster.GetBufferSize(), 3ull * 0xFFFFFFFFu);
    const RasterInfo oHuge(0xFFFFFFFFu, 0xFFFFFFFFu, 0xFFFFFFFFu, DataType(eDT_C64R));
    EXPECT_THROW(Raster(oHuge, RasterContext()), DataException);
    // A buffer that is handed over does not leak when the description is refused.
    EXPECT_THROW(Raster(oHuge, RasterContext(), static_cast<unsigned char*>(HMalloc(100000)), true), DataException);
}

TEST(RasterTest, NullBufferIsRefusedAtItsPlace)
{
    const auto oError = test::Thrown<DataException>(
        [] { Raster oRaster(RasterInfo(1, 1, 1, DataType(eDT_8U)), RasterContext(), nullptr, true); });
    EXPECT_STREQ(oError.what(), "pBuffer is NULL, cannot create a Raster on NULL");
    test::ExpectPlace(oError, "Raster::Raster(", "gobs/raster/raster", 52);
}
