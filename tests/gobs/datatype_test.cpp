#include "gobs/raster/buffertype.h"
#include "gobs/raster/datatype.h"
#include "gobs/raster/datatypeadapter.h"
#include "gobs/raster/datatypeconstraints.h"
#include "tests/support/thrown.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <sstream>

using namespace krv;
using namespace krv::gobs;

namespace
{

constexpr int CODES = 15;
constexpr double INF = std::numeric_limits<double>::infinity();

DataType TypeOf(int nCode)
{
    return DataType(static_cast<NativeDataTypeCode>(nCode));
}

// Promotion of the row's type with the column's, columns in the order of the codes; "!" marks loss.
constexpr const char* PROMOTIONS = R"(
8U   8U 16S 16U 16S 32U 32S 32R 64U 64S 64R C16U C16S C32S C32R C64R
8S   16S 8S 32S 16S 64S 32S 32R 64R! 64S 64R C32S C16S C32S C32R C64R
16U  16U 32S 16U 32S 32U 32S 32R 64U 64S 64R C16U C32S C32S C32R C64R
16S  16S 16S 32S 16S 64S 32S 32R 64R! 64S 64R C32S C16S C32S C32R C64R
32U  32U 64S 32U 64S 32U 64S 64R 64U 64S 64R C64R C64R C64R C64R C64R
32S  32S 32S 32S 32S 64S 32S 64R 64R! 64S 64R C32S C32S C32S C64R C64R
32R  32R 32R 32R 32R 64R 64R 32R 64R! 64R! 64R C32R C32R C64R C32R C64R
64U  64U 64R! 64U 64R! 64U 64R! 64R! 64U 64R! 64R! C64R! C64R! C64R! C64R! C64R!
64S  64S 64S 64S 64S 64S 64S 64R! 64R! 64S 64R! C64R! C64R! C64R! C64R! C64R!
64R  64R 64R 64R 64R 64R 64R 64R 64R! 64R! 64R C64R C64R C64R C64R C64R
C16U C16U C32S C16U C32S C64R C32S C32R C64R! C64R! C64R C16U C32S C32S C32R C64R
C16S C16S C16S C32S C16S C64R C32S C32R C64R! C64R! C64R C32S C16S C32S C32R C64R
C32S C32S C32S C32S C32S C64R C32S C64R C64R! C64R! C64R C32S C32S C32S C64R C64R
C32R C32R C32R C32R C32R C64R C64R C32R C64R! C64R! C64R C32R C32R C64R C32R C64R
C64R C64R C64R C64R C64R C64R C64R C64R C64R! C64R! C64R C64R C64R C64R C64R C64R
)";

} // namespace

TEST(DataTypeTest, CodesRoundTripAndFieldsOrderTheTypes)
{
    std::vector<DataType> oTypes;
    for (int nCode = 0; nCode < CODES; ++nCode)
    {
        EXPECT_EQ(TypeOf(nCode).GetNativeCode(), nCode);
        oTypes.push_back(TypeOf(nCode));
    }
    std::sort(oTypes.begin(), oTypes.end());
    std::string sOrder;
    for (const DataType& oType : oTypes)
        sOrder += oType.Describe() + " ";
    EXPECT_EQ(sOrder, "8U 8S 16U C16U 16S C16S 32U 32S C32S 32R C32R 64U 64S 64R C64R ");
    EXPECT_EQ(DataType(eDT_BIT).Describe(), "BIT");
    EXPECT_EQ(DataType(eDT_BIT).GetNativeCode(), eDT_BIT);
    EXPECT_EQ(DataType(eDT_C16S), DataType(16, true, false, 0, 0, true));
    EXPECT_NE(DataType(eDT_C16S), DataType(16, true, false, 0, 1, true));
    EXPECT_THROW(TypeOf(16), ParameterException);
    EXPECT_THROW(DataType(12, false, false, 0, 0, false).GetNativeCode(), DataException);
    EXPECT_EQ(DataType(12, false, false, 0, 0, true).Describe(), "12-bit unsigned complex");
}

TEST(DataTypeTest, AdapterKeepsItsGapsAndPlaces)
{
    constexpr int SIZES[CODES] = {1, 1, 2, 2, 4, 4, 4, 8, 8, 8, 0, 4, 8, 8, 16};
    for (int nCode = 0; nCode < CODES; ++nCode)
    {
        if (nCode == eDT_C16U)
            continue;
        EXPECT_EQ(DataTypeAdapter::ByteSize(static_cast<NativeDataTypeCode>(nCode)), SIZES[nCode]);
    }
    EXPECT_EQ(DataTypeAdapter::TypeToString(eDT_C16U), "C16U");
    EXPECT_THROW(DataTypeAdapter::TypeToString(eDT_BIT), ParameterException);
    const auto oError = test::Thrown<ParameterException>([] { DataTypeAdapter::ByteSize(eDT_C16U); });
    EXPECT_STREQ(oError.what(), "Could not determine byte size for provided datatype");
    EXPECT_EQ(oError.GetType(), 1);
    EXPECT_EQ(oError.GetParameter(), "eDataType");
    test::ExpectPlace(oError, "", "gobs/raster/datatypeadapter", 86);
}

TEST(DataTypeTest, BufferBytesCountEveryPartAndRefuseOverflow)
{
    EXPECT_EQ(BufferBytes(3, 5, 2, DataType(eDT_C16U)), 120u);
    EXPECT_EQ(BufferBytes(3, 3, 1, DataType(eDT_BIT)), 2u);
    EXPECT_EQ(BufferBytes(0, 1ull << 33, 7, DataType(eDT_64R)), 0u);
    EXPECT_EQ(BufferBytes(1ull << 33, 1ull << 29, 1, DataType(eDT_8U)), 1ull << 62);
    EXPECT_EQ(BufferBytes(1ull << 33, 1ull << 32, 1, DataType(eDT_BIT)), 1ull << 62);
    EXPECT_THROW(BufferBytes(1ull << 33, 1ull << 30, 1, DataType(eDT_8U)), DataException);
    EXPECT_THROW(BufferBytes(1ull << 33, 1ull << 32, 1u << 31, DataType(eDT_C64R)), DataException);
    EXPECT_THROW(BufferBytes(~0ull, ~0ull, ~0ull, DataType(eDT_C64R)), DataException);
}

TEST(PromoteTypeTest, PairsFollowTheTable)
{
    std::istringstream oTable(PROMOTIONS);
    for (int nRow = 0; nRow < CODES; ++nRow)
    {
        std::string sName;
        oTable >> sName;
        ASSERT_EQ(sName, TypeOf(nRow).Describe());
        for (int nColumn = 0; nColumn < CODES; ++nColumn)
        {
            std::string sExpected;
            oTable >> sExpected;
            const std::vector<DataType> oPair = {TypeOf(nRow), TypeOf(nColumn)};
            EXPECT_EQ(PromoteType(oPair).Describe() + (PromotionIsExact(oPair) ? "" : "!"), sExpected)
                << sName << " with " << TypeOf(nColumn).Describe();
        }
    }
}

TEST(PromoteTypeTest, TriplesAreTakenAtOnceInAnyOrder)
{
    EXPECT_EQ(PromoteType({eDT_8S, eDT_16U, eDT_C16S}), DataType(eDT_C32S));
    EXPECT_EQ(PromoteType({eDT_32U, eDT_8S, eDT_32R}), DataType(eDT_64R));
    for (int nA = 0; nA < CODES; ++nA)
        for (int nB = 0; nB < CODES; ++nB)
            for (int nC = 0; nC < CODES; ++nC)
            {
                std::vector<DataType> oTypes = {TypeOf(nA), TypeOf(nB), TypeOf(nC)};
                const DataType oResult = PromoteType(oTypes);
                const bool bAllHeld = std::all_of(oTypes.begin(), oTypes.end(),
                                                  [&](const DataType& oType) { return IsLossless(oType, oResult); });
                EXPECT_EQ(PromotionIsExact(oTypes), bAllHeld);
                std::reverse(oTypes.begin(), oTypes.end());
                EXPECT_EQ(PromoteType(oTypes), oResult);
                std::swap(oTypes[0], oTypes[1]);
                EXPECT_EQ(PromoteType(oTypes), oResult);
            }
}

TEST(PromoteTypeTest, EqualTypesComeBackAndOthersMustBeKnown)
{
    const DataType oOdd(12, false, false, 3, 4, false);
    EXPECT_EQ(PromoteType({oOdd}), oOdd);
    EXPECT_EQ(PromoteType({oOdd, oOdd}), oOdd);
    EXPECT_THROW(PromoteType({oOdd, eDT_8U}), ParameterException);
    EXPECT_THROW(PromoteType({eDT_8U, eDT_BIT}), ParameterException);
    EXPECT_THROW(PromoteType({}), ParameterException);
    EXPECT_THROW(PromotionIsExact({}), ParameterException);
}

// The limits say the same as IsLossless when every value of a type is held, seen from its extremes.
TEST(DataTypeConstraintsTest, LimitsAgreeWithLossOfExtremes)
{
    for (int nFrom = 0; nFrom < CODES; ++nFrom)
        for (int nTo = 0; nTo < CODES; ++nTo)
        {
            const DataType oFrom = TypeOf(nFrom);
            const DataType oTo = TypeOf(nTo);
            if (oFrom.GetBits() == 64 || oFrom.IsReal() || (oFrom.IsComplex() && !oTo.IsComplex()))
                continue;
            const DataTypeConstraints oLimits(oFrom);
            const DataTypeConstraints oTarget(oTo);
            EXPECT_EQ(IsLossless(oFrom, oTo),
                      oTarget.Holds(oLimits.GetMinimum()) && oTarget.Holds(oLimits.GetMaximum()))
                << oFrom.Describe() << " to " << oTo.Describe();
        }
}

TEST(DataTypeConstraintsTest, LimitsAndHeldValues)
{
    const DataTypeConstraints oLong{DataType(eDT_64S)};
    EXPECT_EQ(oLong.GetIntegerMinimum(), std::numeric_limits<std::int64_t>::min());
    EXPECT_EQ(oLong.GetIntegerMaximum(), static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max()));
    EXPECT_TRUE(oLong.Holds(-0x1p63));
    EXPECT_FALSE(oLong.Holds(0x1p63));
    EXPECT_EQ(DataTypeConstraints(DataType(eDT_64U)).GetIntegerMaximum(), ~std::uint64_t(0));
    EXPECT_FALSE(DataTypeConstraints(DataType(eDT_64U)).Holds(0x1p64));

    const DataTypeConstraints oByte{DataType(eDT_8S)};
    EXPECT_EQ(oByte.GetMinimum(), -128);
    EXPECT_EQ(oByte.GetMaximum(), 127);
    EXPECT_TRUE(oByte.Holds(-128));
    for (double nValue : {-129.0, 128.0, 0.5, INF, std::nan("")})
        EXPECT_FALSE(oByte.Holds(nValue)) << nValue;

    const DataTypeConstraints oSingle{DataType(eDT_C32R)};
    EXPECT_EQ(oSingle.GetMinimum(), -3.4028234663852886e+38);
    EXPECT_FALSE(oSingle.IsInteger());
    EXPECT_TRUE(oSingle.Holds(-INF) && oSingle.Holds(std::nan("")) && oSingle.Holds(0.25));
    EXPECT_FALSE(oSingle.Holds(0.1) || oSingle.Holds(1e39) || oSingle.Holds(16777217));

    EXPECT_FALSE(DataTypeConstraints().Holds(0));
    EXPECT_THROW(DataTypeConstraints(DataType(eDT_BIT)), ParameterException);
}

TEST(BufferTypeTest, EveryTypeHasABufferTypeOfItsSize)
{
    for (int nCode = 0; nCode < CODES; ++nCode)
        EXPECT_EQ(raster::BufferDataSize(QRFDataType2RasterBufferType(TypeOf(nCode)), 10),
                  BufferBytes(10, 1, 1, TypeOf(nCode)));
    EXPECT_THROW(QRFDataType2RasterBufferType(DataType(eDT_BIT)), ParameterException);
    EXPECT_THROW(QRFDataType2RasterBufferType(DataType()), ParameterException);
}
