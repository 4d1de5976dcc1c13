#include "operations/statistics/statistics.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>

namespace krv::operations
{

namespace
{

template <typename T>
ChannelStatistics StatisticsOf(const std::vector<T>& oValues, krv::gobs::NativeDataTypeCode eType,
                               const std::string& noData = "", unsigned int nStride = 1)
{
    const auto poGatherer = StatisticsGatherer::Make(eType, krv::datasources::ParseNoData(noData));
    const unsigned int nParts = krv::gobs::DataType(eType).GetParts();
    poGatherer->Add(reinterpret_cast<const unsigned char*>(oValues.data()), oValues.size() / nStride / nParts, nStride);
    return poGatherer->Get();
}

TEST(Statistics, IntegersAreExactAtTheEndsOfTheirRange)
{
    constexpr auto HIGHEST = std::numeric_limits<std::uint64_t>::max();
    const auto oUnsigned = StatisticsOf<std::uint64_t>({HIGHEST, HIGHEST - 2, HIGHEST - 1}, krv::gobs::eDT_64U);
    EXPECT_EQ(oUnsigned.maximum, ExactNumber(HIGHEST));
    EXPECT_EQ(oUnsigned.minimum, ExactNumber(HIGHEST - 2));
    EXPECT_NEAR(oUnsigned.deviation.value(), std::sqrt(2.0 / 3.0), 1e-12);

    constexpr auto LOWEST = std::numeric_limits<std::int64_t>::min();
    const auto oSigned = StatisticsOf<std::int64_t>({LOWEST, 0}, krv::gobs::eDT_64S, "-9223372036854775808");
    EXPECT_EQ(oSigned.noData, 1U);
    EXPECT_EQ(oSigned.minimum, ExactNumber(std::int64_t{0}));

    const std::vector<std::int16_t> oShorts(100000, -32768);
    const auto oLow = StatisticsOf(oShorts, krv::gobs::eDT_16S);
    EXPECT_EQ(oLow.mean.value(), -32768.0);
    EXPECT_EQ(oLow.deviation.value(), 0.0);
    EXPECT_EQ(oLow.valid, 100000U);
}

TEST(Statistics, LargeOffsetCostsNoDigits)
{
    std::vector<double> oValues;
    for (int i = 0; i < 100001; ++i)
        oValues.push_back(1e9 + i % 3);
    const auto oReal = StatisticsOf(oValues, krv::gobs::eDT_64R);
    EXPECT_NEAR(oReal.mean.value() - 1e9, 1.0 - 1.0 / 100001, 1e-6);
    EXPECT_NEAR(oReal.deviation.value(), std::sqrt(2.0 / 3.0), 1e-5);
    std::vector<std::int32_t> oIntegers;
    for (int i = 0; i < 99999; ++i)
        oIntegers.push_back(2000000000 + i % 3);
    EXPECT_NEAR(StatisticsOf(oIntegers, krv::gobs::eDT_32S).deviation.value(), std::sqrt(2.0 / 3.0), 1e-9);
    const auto oHuge = StatisticsOf<double>({1.7e308, -1.7e308, 1.7e308, -1.7e308}, krv::gobs::eDT_64R);
    EXPECT_EQ(oHuge.mean.value(), 0.0);
    EXPECT_NEAR(oHuge.deviation.value() / 1.7e308, 1.0, 1e-12);
}

TEST(Statistics, EveryValueIsCountedOnce)
{
    const float nNan = std::numeric_limits<float>::quiet_NaN(), nInfinite = std::numeric_limits<float>::infinity();
    const std::vector<float> oValues{1, nNan, -9999, 3, nInfinite, -nInfinite};
    const auto oPlain = StatisticsOf(oValues, krv::gobs::eDT_32R, "-9999");
    EXPECT_EQ(oPlain.valid, 2U);
    EXPECT_EQ(oPlain.noData, 1U);
    EXPECT_EQ(oPlain.nan, 1U);
    EXPECT_EQ(oPlain.infinite, 2U);
    EXPECT_EQ(oPlain.mean.value(), 2.0);
    const auto oNan = StatisticsOf(oValues, krv::gobs::eDT_32R, "nan");
    EXPECT_EQ(oNan.noData, 1U);
    EXPECT_EQ(oNan.nan, 0U);
    const auto oNothing = StatisticsOf<float>({nNan}, krv::gobs::eDT_32R);
    EXPECT_FALSE(oNothing.minimum || oNothing.mean || oNothing.deviation);
}

TEST(Statistics, InterleavedAndComplexChannels)
{
    const std::vector<std::uint8_t> oPixels{1, 10, 2, 20, 3, 30};
    EXPECT_EQ(StatisticsOf(oPixels, krv::gobs::eDT_8U, "", 2).mean.value(), 2.0);
    EXPECT_EQ(StatisticsOf(oPixels, krv::gobs::eDT_8U, "3", 2).maximum, ExactNumber(std::uint64_t{2}));
    const auto oMagnitude = StatisticsOf<std::int16_t>({3, 4, 0, 0, -6, 8}, krv::gobs::eDT_C16S, "0");
    EXPECT_EQ(oMagnitude.noData, 1U);
    EXPECT_EQ(oMagnitude.minimum, ExactNumber(5.0));
    EXPECT_EQ(oMagnitude.maximum, ExactNumber(10.0));
}

} // namespace

} // namespace krv::operations
