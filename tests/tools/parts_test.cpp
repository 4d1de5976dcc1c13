#include "datasources/reader/basicreader.h"
#include "tests/support/recipe.h"
#include "tests/support/syntheticdataset.h"
#include "toolkit/exceptions/exceptions.h"
#include "tools/krv/checksums.h"
#include "tools/krv/errors.h"
#include "tools/krv/progress.h"
#include "tools/krv/reduction.h"
#include "tools/krv/statistics.h"
#include "tools/krv/stretch.h"
#include "tools/krv/verbs/verbs.h"

#include <gtest/gtest.h>
#include <zlib.h>

#include <cmath>
#include <cstring>
#include <limits>

namespace krv::tool
{

namespace
{

using krv::datasources::BasicReader;
using krv::test::ImageModel;
using krv::test::SyntheticDataset;

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
    EXPECT_EQ(oUnsigned.maximum.get<std::uint64_t>(), HIGHEST);
    EXPECT_EQ(oUnsigned.minimum.get<std::uint64_t>(), HIGHEST - 2);
    EXPECT_NEAR(oUnsigned.deviation.get<double>(), std::sqrt(2.0 / 3.0), 1e-12);

    constexpr auto LOWEST = std::numeric_limits<std::int64_t>::min();
    const auto oSigned = StatisticsOf<std::int64_t>({LOWEST, 0}, krv::gobs::eDT_64S, "-9223372036854775808");
    EXPECT_EQ(oSigned.noData, 1U);
    EXPECT_EQ(oSigned.minimum.get<std::int64_t>(), 0);

    const std::vector<std::int16_t> oShorts(100000, -32768);
    const auto oLow = StatisticsOf(oShorts, krv::gobs::eDT_16S);
    EXPECT_EQ(oLow.mean.get<double>(), -32768.0);
    EXPECT_EQ(oLow.deviation.get<double>(), 0.0);
    EXPECT_EQ(oLow.valid, 100000U);
}

TEST(Statistics, LargeOffsetCostsNoDigits)
{
    std::vector<double> oValues;
    for (int i = 0; i < 100001; ++i)
        oValues.push_back(1e9 + i % 3);
    const auto oReal = StatisticsOf(oValues, krv::gobs::eDT_64R);
    EXPECT_NEAR(oReal.mean.get<double>() - 1e9, 1.0 - 1.0 / 100001, 1e-6);
    EXPECT_NEAR(oReal.deviation.get<double>(), std::sqrt(2.0 / 3.0), 1e-5);
    std::vector<std::int32_t> oIntegers;
    for (int i = 0; i < 99999; ++i)
        oIntegers.push_back(2000000000 + i % 3);
    EXPECT_NEAR(StatisticsOf(oIntegers, krv::gobs::eDT_32S).deviation.get<double>(), std::sqrt(2.0 / 3.0), 1e-9);
    const auto oHuge = StatisticsOf<double>({1.7e308, -1.7e308, 1.7e308, -1.7e308}, krv::gobs::eDT_64R);
    EXPECT_EQ(oHuge.mean.get<double>(), 0.0);
    EXPECT_NEAR(oHuge.deviation.get<double>() / 1.7e308, 1.0, 1e-12);
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
    EXPECT_EQ(oPlain.mean.get<double>(), 2.0);
    const auto oNan = StatisticsOf(oValues, krv::gobs::eDT_32R, "nan");
    EXPECT_EQ(oNan.noData, 1U);
    EXPECT_EQ(oNan.nan, 0U);
    const auto oNothing = StatisticsOf<float>({nNan}, krv::gobs::eDT_32R);
    EXPECT_TRUE(oNothing.minimum.is_null() && oNothing.mean.is_null() && oNothing.deviation.is_null());
}

TEST(Statistics, InterleavedAndComplexChannels)
{
    const std::vector<std::uint8_t> oPixels{1, 10, 2, 20, 3, 30};
    EXPECT_EQ(StatisticsOf(oPixels, krv::gobs::eDT_8U, "", 2).mean.get<double>(), 2.0);
    EXPECT_EQ(StatisticsOf(oPixels, krv::gobs::eDT_8U, "3", 2).maximum.get<int>(), 2);
    const auto oMagnitude = StatisticsOf<std::int16_t>({3, 4, 0, 0, -6, 8}, krv::gobs::eDT_C16S, "0");
    EXPECT_EQ(oMagnitude.noData, 1U);
    EXPECT_EQ(oMagnitude.minimum.get<double>(), 5.0);
    EXPECT_EQ(oMagnitude.maximum.get<double>(), 10.0);
}

// A synthetic image of channels of one type, cut into awkward tiles.
struct Image
{
    Image(unsigned int nChannels, krv::gobs::NativeDataTypeCode eType) : poModel(std::make_shared<ImageModel>())
    {
        poModel->moTypes.assign(nChannels, eType);
        poModel->moAuxiliary = krv::datasources::AuxiliaryData(nChannels);
        poDataset = std::make_unique<SyntheticDataset>(poModel);
    }
    krv::datasources::IDataset* Get() const { return poDataset.get(); }

    std::shared_ptr<ImageModel> poModel;
    std::unique_ptr<SyntheticDataset> poDataset;
};

TEST(Checksums, AreThoseOfTheRowMajorPixelsWhateverTheTiles)
{
    for (const auto eType : {krv::gobs::eDT_8U, krv::gobs::eDT_16S, krv::gobs::eDT_32R, krv::gobs::eDT_64R,
                             krv::gobs::eDT_C16S, krv::gobs::eDT_C64R})
    {
        for (const unsigned int nChannels : {1U, 2U, 3U, 4U, 5U})
        {
            const Image oImage(nChannels, eType);
            for (const auto& [nTileWidth, nTileHeight] : {std::pair{8U, 6U}, {21U, 4U}, {1U, 1U}, {64U, 64U}})
            {
                BasicReader oReader(oImage.Get(), {}, false);
                oReader.SetTileSize(nTileWidth, nTileHeight);
                Progress oProgress("test", 1);
                const auto oSums = ComputeChecksums(oReader, oProgress);
                for (unsigned int c = 1; c <= nChannels; ++c)
                {
                    const std::string bytes = krv::test::RecipeImage(21, 17, {c}, eType);
                    EXPECT_EQ(oSums.at(c - 1),
                              crc32(0, reinterpret_cast<const Bytef*>(bytes.data()), static_cast<uInt>(bytes.size())))
                        << "type " << eType << ", channel " << c << " of " << nChannels << ", tile " << nTileWidth;
                }
            }
        }
    }
}

// The mean over each target pixel's source pixels, one by one.
double NaiveMean(const std::string& bytes, unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight)
{
    double nSum = 0;
    unsigned int nCount = 0;
    for (unsigned int y = SourceStart(nY, 17, nHeight); y < SourceStart(nY + 1, 17, nHeight); ++y)
    {
        for (unsigned int x = SourceStart(nX, 21, nWidth); x < SourceStart(nX + 1, 21, nWidth); ++x, ++nCount)
        {
            std::uint16_t nValue = 0;
            std::memcpy(&nValue, bytes.data() + 2 * (y * 21 + x), 2);
            nSum += nValue;
        }
    }
    return nSum / nCount;
}

TEST(Reduction, IsTheMeanOfTheSourcePixelsOfEachPixel)
{
    const Image oImage(2, krv::gobs::eDT_16U);
    const std::string bytes = krv::test::RecipeImage(21, 17, {2}, krv::gobs::eDT_16U);
    for (const auto& [nWidth, nHeight] : {std::pair{5U, 4U}, {21U, 17U}, {1U, 1U}, {20U, 3U}})
    {
        BasicReader oReader(oImage.Get(), {}, false);
        Progress oProgress("test", 1);
        const auto oPlanes =
            Reduce(oReader, {std::nullopt, std::nullopt}, nWidth, nHeight, Reduction::eAverage, oProgress);
        const auto oNearest =
            Reduce(oReader, {std::nullopt, std::nullopt}, nWidth, nHeight, Reduction::eNearest, oProgress);
        for (unsigned int y = 0; y < nHeight; ++y)
        {
            for (unsigned int x = 0; x < nWidth; ++x)
            {
                const double nMean = NaiveMean(bytes, x, y, nWidth, nHeight);
                EXPECT_NEAR(oPlanes[1].values[y * nWidth + x], nMean, 1e-6 * nMean + 1e-6)
                    << nWidth << " " << x << " " << y;
                EXPECT_EQ(oPlanes[1].coverage[y * nWidth + x], 1.0F);
                EXPECT_EQ(oNearest[1].coverage[y * nWidth + x], 1.0F);
            }
        }
    }
}

TEST(Reduction, NoDataTakesNoPartAndLowersTheCoverage)
{
    const Image oImage(1, krv::gobs::eDT_16U);
    const std::string bytes = krv::test::RecipeImage(21, 17, {1}, krv::gobs::eDT_16U);
    std::uint16_t nFirst = 0;
    std::memcpy(&nFirst, bytes.data(), 2);
    BasicReader oReader(oImage.Get(), {}, false);
    Progress oProgress("test", 1);
    const auto oFull =
        Reduce(oReader, {krv::gobs::SampleValue::FromUnsigned(nFirst)}, 21, 17, Reduction::eAverage, oProgress);
    EXPECT_EQ(oFull[0].coverage[0], 0.0F);
    EXPECT_EQ(oFull[0].coverage[1], 1.0F);
    const auto oAll =
        Reduce(oReader, {krv::gobs::SampleValue::FromUnsigned(nFirst)}, 1, 1, Reduction::eAverage, oProgress);
    EXPECT_LT(oAll[0].coverage[0], 1.0F);
    EXPECT_GT(oAll[0].coverage[0], 0.5F);
}

Plane PlaneOf(const std::vector<float>& oValues)
{
    return {static_cast<unsigned int>(oValues.size()), 1, oValues, std::vector<float>(oValues.size(), 1.0F)};
}

TEST(Stretch, LeavesGoodEightBitDataAloneAndStretchesTheRest)
{
    std::vector<float> oValues;
    for (int i = 0; i <= 100; ++i)
        oValues.push_back(static_cast<float>(i) + 1000.0F);
    const Stretch oPercentile = FindStretch(PlaneOf(oValues), StretchMode::eAuto, false);
    EXPECT_EQ(oPercentile.low, 1002.0F);
    EXPECT_EQ(oPercentile.high, 1098.0F);
    EXPECT_EQ(oPercentile(0), 0);
    EXPECT_EQ(oPercentile(5000), 255);
    EXPECT_EQ(oPercentile(1050), 128);
    EXPECT_EQ(FindStretch(PlaneOf(oValues), StretchMode::eMinMax, false).high, 1100.0F);
    EXPECT_EQ(FindStretch(PlaneOf({0, 255, 0, 255}), StretchMode::eAuto, true).high, 255.0F);
    EXPECT_EQ(FindStretch(PlaneOf({10, 20, 30, 40}), StretchMode::eAuto, true).low, 10.0F);
    EXPECT_EQ(FindStretch(PlaneOf({10, 20, 30, 40}), StretchMode::eNone, true).low, 0.0F);
    EXPECT_EQ(FindStretch(PlaneOf({7, 7, 7}), StretchMode::eAuto, false)(7), 128);
    Plane oHidden = PlaneOf({1, 2, 1e9F});
    oHidden.coverage[2] = 0;
    EXPECT_EQ(FindStretch(oHidden, StretchMode::eMinMax, false).high, 2.0F);
}

TEST(Texts, NumbersProgressAndErrorsAreOneLine)
{
    EXPECT_EQ(ParseNumbers("3,1,12", "--x"), (std::vector<unsigned int>{3, 1, 12}));
    EXPECT_TRUE(ParseNumbers("", "--x").empty());
    for (const char* pText : {"1,", ",1", "1,,2", "a", "-1", "1 2", "4294967296"})
        EXPECT_THROW(ParseNumbers(pText, "--x"), UsageError) << pText;
    const std::string line = ProgressLine("checksum", 3ULL << 30U, 4ULL << 30U, 10.0);
    EXPECT_NE(line.find("75 %"), std::string::npos);
    EXPECT_NE(line.find("0:03 left"), std::string::npos);
    EXPECT_LT(ProgressLine(std::string(200, 'x'), 0, 0, 0).size(), 80U);
    EXPECT_EQ(OneLine("a\nb\x1b[31m\tc \xC3\xA4\xE9 \xC2\x9B\xE2\x80\xAE"),
              "a b\\x1b[31m c \xC3\xA4\\xe9 \\xc2\\x9b\\xe2\\x80\\xae");
    EXPECT_LT(OneLine("begin" + std::string(100000, '\xC3') + "end").size(), 2000U);
    EXPECT_TRUE(OneLine("begin" + std::string(100000, 'x') + "end").ends_with("xend"));
}

} // namespace

} // namespace krv::tool
