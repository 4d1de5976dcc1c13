#include "gobs/raster/raster.h"
#include "tests/support/thrown.h"
#include "toolkit/core/hmalloc.h"

#include <gtest/gtest.h>

#include <cstdint>

using namespace krv;
using namespace krv::gobs;

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
