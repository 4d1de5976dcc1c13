#include "gobs/raster/rasterview.h"

#include "toolkit/exceptions/exceptions.h"

#include <gmock/gmock.h>

#include <array>
#include <numeric>
#include <typeinfo>

namespace krv::gobs::test
{

namespace
{

// The list of values, the codes and the fields of the types say the same.
TEST(PixelValue, EveryTypeIsVisitedByItsOwnValue)
{
    for (int nCode = eDT_8U; nCode <= eDT_C64R; ++nCode)
    {
        const DataType oType(static_cast<NativeDataTypeCode>(nCode));
        const auto Check = [&]<class Value>(std::type_identity<Value>)
        {
            EXPECT_EQ(PIXEL_TYPE_OF<Value>, nCode);
            EXPECT_EQ(8 * sizeof(Value), oType.GetValueBits());
            EXPECT_EQ(PARTS_OF<Value>, oType.GetParts());
            EXPECT_EQ(std::is_floating_point_v<PartOf<Value>>, oType.IsReal());
            EXPECT_EQ(std::is_signed_v<PartOf<Value>>, oType.IsSigned());
            return &typeid(PartOf<Value>);
        };
        const auto NameOf = []<class Part>(std::type_identity<Part>)
        {
            return &typeid(Part);
        };
        EXPECT_EQ(*VisitPixelType(oType, Check), *VisitPartType(oType, NameOf));
    }
    const auto None = [](auto) {
    };
    EXPECT_THROW(VisitPixelType(eDT_BIT, None), krv::DataException);
    EXPECT_THROW(VisitPartType(DataType(24, false, false, 0, 0, false), None), krv::DataException);
}

TEST(RasterView, RowsAndValuesLieWhereTheBufferHasThem)
{
    Raster oRaster({3, 2, 2, eDT_16U}, {10, 20, 1, 2});
    const RasterView<std::uint16_t> oView(oRaster);
    std::iota(oView.GetFullRow(-2).begin(), oView.GetFullRow(3).end(), std::uint16_t(0));
    const Raster& oSame = oRaster;
    const RasterView<const std::uint16_t> oRead(oSame);
    // 5 pixels of 2 channels in a row, 2 rows above the first.
    EXPECT_THAT(oRead.GetRow(0), ::testing::ElementsAre(22, 23, 24, 25, 26, 27));
    EXPECT_THAT(oRead.GetFullRow(1), ::testing::ElementsAre(30, 31, 32, 33, 34, 35, 36, 37, 38, 39));
    EXPECT_EQ(oRead.At(0, 0, 1), 23);
    EXPECT_EQ(oRead.At(-1, -2, 0), 0);
    EXPECT_EQ(oRead.At(3, 3, 1), 59);
    EXPECT_EQ(&oRead.At(2, 1, 0), &oView.GetRow(1)[4]);
}

TEST(RasterView, OnlyARasterOfThatTypeIsViewed)
{
    const auto Refuse = [](auto&& View, const char* pText)
    {
        EXPECT_THAT(View, ::testing::ThrowsMessage<krv::DataException>(::testing::HasSubstr(pText)));
    };
    Raster oReal({2, 2, 1, eDT_32R}, {0, 0});
    Refuse([&] { RasterView<std::int32_t>{oReal}; }, "type 32R, not 32S");
    Refuse([&] { RasterView<Complex<float>>{oReal}; }, "type 32R, not C32R");
    Raster oBits({8, 2, 1, eDT_BIT}, {0, 0});
    Refuse([&] { RasterView<std::uint8_t>{oBits}; }, "type BIT, not 8U");
    alignas(8) std::array<unsigned char, 9> oBuffer{};
    Raster oShifted({2, 1, 1, eDT_32R}, {0, 0}, oBuffer.data() + 1, false);
    Refuse([&] { RasterView<float>{oShifted}; }, "aligned");
}

} // namespace

} // namespace krv::gobs::test
