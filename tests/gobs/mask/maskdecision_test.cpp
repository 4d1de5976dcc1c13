#include "gobs/mask/maskdecision.h"

#include "gobs/mask/exactmaskdecision.h"
#include "gobs/mask/mask.h"
#include "gobs/mask/samplematch.h"
#include "gobs/raster/raster.h"
#include "toolkit/exceptions/exceptions.h"

#include <gtest/gtest.h>

#include <cmath>
#include <complex>
#include <cstring>
#include <limits>
#include <memory>
#include <vector>

namespace krv::gobs
{

namespace
{

constexpr double NOT_A_NUMBER = std::numeric_limits<double>::quiet_NaN();

std::vector<unsigned char> Mark(const IMaskDecisionImpl& oImpl, const std::vector<unsigned char>& oPixels,
                                std::size_t nPixels, unsigned int nChannels)
{
    std::vector<unsigned char> oBits((nPixels + 7) / 8 + 1, 0xA5);
    oImpl.Mark(oPixels.data(), nPixels, nChannels, oBits.data());
    EXPECT_EQ(oBits.back(), 0xA5) << "written beyond the last byte";
    oBits.pop_back();
    return oBits;
}

template <class Sample>
bool Marks(NativeDataTypeCode eType, const SampleValue& oValue, Sample nSample, bool bNaNIsBackground = false)
{
    const ExactMaskDecision oDecision(eAnyChannel, {oValue}, {1}, bNaNIsBackground);
    const std::unique_ptr<IMaskDecisionImpl> oImpl(oDecision.GetImpl(eType, 1));
    std::vector<unsigned char> oPixels(33 * sizeof nSample);
    for (int n = 0; n < 33; ++n)
        std::memcpy(oPixels.data() + n * sizeof nSample, &nSample, sizeof nSample);
    const auto oBits = Mark(*oImpl, oPixels, 33, 1);
    // Vector and single pixels say the same.
    EXPECT_EQ(oBits[0], oBits[4] == 0x80 ? 0xFF : 0);
    if constexpr (std::is_arithmetic_v<Sample>)
    {
        const bool bNaN = bNaNIsBackground && std::isnan(static_cast<double>(nSample));
        EXPECT_EQ(oBits[4] != 0, bNaN || SampleMatch<Sample>(oValue).Matches(nSample));
    }
    return oBits[4] != 0;
}

} // namespace

TEST(MaskDecision, ComparesInThePixelsOwnType)
{
    constexpr float FLOAT_MAX = std::numeric_limits<float>::max();
    constexpr float FLOAT_INF = std::numeric_limits<float>::infinity();
    const auto Real = &SampleValue::FromReal;
    EXPECT_TRUE(Marks<std::uint8_t>(eDT_8U, Real(255.0), 255));
    EXPECT_FALSE(Marks<std::uint8_t>(eDT_8U, Real(256.0), 0));
    EXPECT_FALSE(Marks<std::uint8_t>(eDT_8U, Real(-1.0), 255));
    EXPECT_FALSE(Marks<std::uint8_t>(eDT_8U, Real(0.5), 0));
    EXPECT_TRUE(Marks<std::int8_t>(eDT_8S, Real(-128.0), -128));
    EXPECT_FALSE(Marks<std::int8_t>(eDT_8S, Real(128.0), -128));
    EXPECT_TRUE(Marks<std::int16_t>(eDT_16S, Real(-32768.0), -32768));
    EXPECT_FALSE(Marks<std::uint16_t>(eDT_16U, Real(-9999.0), static_cast<std::uint16_t>(-9999)));
    EXPECT_TRUE(Marks<std::uint32_t>(eDT_32U, Real(4294967295.0), 4294967295u));
    EXPECT_FALSE(Marks<std::uint32_t>(eDT_32U, Real(4294967296.0), 0));
    EXPECT_FALSE(Marks<std::int32_t>(eDT_32S, Real(INFINITY), 2147483647));
    EXPECT_FALSE(Marks<std::int32_t>(eDT_32S, Real(NOT_A_NUMBER), 0));

    EXPECT_TRUE(Marks<float>(eDT_32R, Real(0.1), 0.1f));
    EXPECT_TRUE(Marks<float>(eDT_32R, Real(-0.0), 0.0f));
    EXPECT_TRUE(Marks<float>(eDT_32R, Real(-3.4028234663852886e+38), -FLOAT_MAX));
    EXPECT_TRUE(Marks<float>(eDT_32R, Real(3.40282347e+38), FLOAT_MAX));
    EXPECT_TRUE(Marks<float>(eDT_32R, Real(3.4028235677973366e+38), FLOAT_MAX));
    EXPECT_FALSE(Marks<float>(eDT_32R, Real(-1.7976931348623157e+308), -FLOAT_INF));
    EXPECT_TRUE(Marks<float>(eDT_32R, Real(-INFINITY), -FLOAT_INF));
    EXPECT_FALSE(Marks<float>(eDT_32R, Real(0.0), NAN));
    EXPECT_TRUE(Marks<float>(eDT_32R, Real(NOT_A_NUMBER), -NAN));
    EXPECT_TRUE(Marks<double>(eDT_64R, Real(NOT_A_NUMBER), NOT_A_NUMBER));
    EXPECT_FALSE(Marks<double>(eDT_64R, Real(0.1), 0.1f));

    using ComplexFloat = std::complex<float>;
    EXPECT_TRUE(Marks(eDT_C32R, Real(2.0), ComplexFloat(2, -0.0f)));
    EXPECT_FALSE(Marks(eDT_C32R, Real(2.0), ComplexFloat(2, 1)));
    EXPECT_FALSE(Marks(eDT_C32R, Real(NOT_A_NUMBER), ComplexFloat(NAN, 0)));
    EXPECT_TRUE(Marks(eDT_C32R, Real(NOT_A_NUMBER), ComplexFloat(NAN, NAN)));
}

TEST(MaskDecision, IntegersOf64BitsAreExact)
{
    constexpr auto INT_MAX64 = std::numeric_limits<std::int64_t>::max();
    constexpr auto INT_MIN64 = std::numeric_limits<std::int64_t>::min();
    constexpr auto UINT_MAX64 = std::numeric_limits<std::uint64_t>::max();
    constexpr std::int64_t ODD = (std::int64_t{1} << 53) + 1;
    // A double that stands for the maximum matches it and nothing beside it.
    EXPECT_TRUE(Marks(eDT_64S, SampleValue::FromReal(9223372036854775808.0), INT_MAX64));
    EXPECT_FALSE(Marks(eDT_64S, SampleValue::FromReal(9223372036854775808.0), INT_MAX64 - 1));
    EXPECT_TRUE(Marks(eDT_64S, SampleValue::FromReal(-9223372036854775808.0), INT_MIN64));
    EXPECT_TRUE(Marks(eDT_64U, SampleValue::FromReal(18446744073709551616.0), UINT_MAX64));
    EXPECT_FALSE(Marks(eDT_64U, SampleValue::FromReal(18446744073709551616.0), UINT_MAX64 - 1));
    EXPECT_FALSE(Marks(eDT_64S, SampleValue::FromReal(18446744073709551616.0), INT_MAX64));

    EXPECT_TRUE(Marks(eDT_64S, SampleValue::FromSigned(ODD), ODD));
    EXPECT_FALSE(Marks(eDT_64S, SampleValue::FromSigned(ODD), ODD - 1));
    EXPECT_FALSE(Marks(eDT_64S, SampleValue::FromUnsigned(UINT_MAX64), std::int64_t{-1}));
    EXPECT_TRUE(Marks(eDT_64S, SampleValue::FromSigned(INT_MIN64), INT_MIN64));
    EXPECT_TRUE(Marks(eDT_64U, SampleValue::FromUnsigned(UINT_MAX64), UINT_MAX64));
    EXPECT_FALSE(Marks(eDT_64U, SampleValue::FromSigned(-1), UINT_MAX64));
    EXPECT_FALSE(Marks<std::uint8_t>(eDT_8U, SampleValue::FromUnsigned(256), 0));
    EXPECT_TRUE(Marks(eDT_64R, SampleValue::FromSigned(ODD), 9007199254740992.0));
    EXPECT_TRUE(Marks(eDT_32R, SampleValue::FromSigned(-16777217), -16777216.0f));
}

TEST(MaskDecision, NaNCountsAsBackgroundOnRequestForRealTypes)
{
    const auto oZero = SampleValue::FromReal(0.0);
    EXPECT_FALSE(Marks<float>(eDT_32R, oZero, NAN));
    EXPECT_TRUE(Marks<float>(eDT_32R, oZero, NAN, true));
    EXPECT_TRUE(Marks<float>(eDT_32R, oZero, 0.0f, true));
    EXPECT_FALSE(Marks<float>(eDT_32R, oZero, 1.0f, true));
    EXPECT_TRUE(Marks<float>(eDT_32R, SampleValue::FromReal(1e300), NAN, true));
    EXPECT_TRUE(Marks(eDT_C64R, oZero, std::complex<double>(NAN, NAN), true));
    EXPECT_FALSE(Marks<std::int32_t>(eDT_32S, SampleValue::FromReal(0.5), 0, true));
}

TEST(MaskDecision, RejectsWhatItCannotMeasure)
{
    EXPECT_THROW(MaskDecision(eAnyChannel, {1.0}, {}), krv::DataException);
    EXPECT_THROW(ExactMaskDecision(eAnyChannel, {}, {1}), krv::DataException);
    EXPECT_THROW(GetMaskDecisionImpl(eDT_8U, 1, eAnyChannel, {1.0}, {1, 2}), krv::DataException);
    EXPECT_THROW(MaskDecision(static_cast<BkgdRule>(2), {}, {}), krv::ParameterException);
    EXPECT_THROW(MaskDecision(eAnyChannel, {}, {}).GetImpl(DataType(), 1), krv::DataException);
    EXPECT_THROW(MaskDecisionBuilder(nullptr), krv::DataException);
    const std::unique_ptr<IMaskDecisionImpl> oImpl(MaskDecision(eAnyChannel, {}, {}).GetImpl(eDT_8U, 3));
    unsigned char nByte = 0;
    EXPECT_THROW(oImpl->Mark(&nByte, 1, 1, &nByte), krv::DataException);
}

TEST(MaskDecisionBuilder, CoversTheFullExtentAndOutlivesItsDecision)
{
    Raster oRaster(RasterInfo(5, 3, 2, eDT_16S), RasterContext(-2, 7, 2, 1));
    auto* pValues = reinterpret_cast<std::int16_t*>(oRaster.GetBuffer());
    for (int n = 0; n < 9 * 5 * 2; ++n)
        pValues[n] = static_cast<std::int16_t>(n % 7);
    auto oDecision = std::make_unique<MaskDecision>(eAllChannels, std::vector<double>{3}, std::vector<unsigned int>{2});
    auto oBuilder = std::make_unique<MaskDecisionBuilder>(oDecision.get());
    oDecision.reset();
    const MaskDecisionBuilder oCopy(*oBuilder);
    oBuilder.reset();
    const std::unique_ptr<Mask> oMask(oCopy.BuildMask(oRaster));
    EXPECT_EQ(oMask->GetX(), -2);
    EXPECT_EQ(oMask->GetFullWidth(), 9u);
    EXPECT_EQ(oMask->GetFullHeight(), 5u);
    for (unsigned int nRow = 0; nRow < 5; ++nRow)
    {
        for (unsigned int nColumn = 0; nColumn < 9; ++nColumn)
            EXPECT_EQ(oMask->GetBit(nColumn, nRow), pValues[(nRow * 9 + nColumn) * 2 + 1] == 3);
    }
}

} // namespace krv::gobs
