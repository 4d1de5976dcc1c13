#include "datasources/reader/basicreader.h"
#include "operations/picture/reduction.h"
#include "operations/picture/stretch.h"
#include "tests/operations/image.h"
#include "tests/support/recipe.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstring>

namespace krv::operations
{

namespace
{

using krv::datasources::BasicReader;
using krv::gobs::SourceStart;

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
    const auto poImage = krv::test::MakeImage(2, krv::gobs::eDT_16U);
    const std::string bytes = krv::test::RecipeImage(21, 17, {2}, krv::gobs::eDT_16U);
    for (const auto& [nWidth, nHeight] : {std::pair{5U, 4U}, {21U, 17U}, {1U, 1U}, {20U, 3U}})
    {
        BasicReader oReader(poImage.get(), {}, false);
        ProgressCounter oProgress({}, "test", 1);
        const auto oPlanes =
            Reduce(oReader, {std::nullopt, std::nullopt}, nWidth, nHeight, Resampling::eAverage, oProgress);
        const auto oNearest =
            Reduce(oReader, {std::nullopt, std::nullopt}, nWidth, nHeight, Resampling::eNearest, oProgress);
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
    const auto poImage = krv::test::MakeImage(1, krv::gobs::eDT_16U);
    const std::string bytes = krv::test::RecipeImage(21, 17, {1}, krv::gobs::eDT_16U);
    std::uint16_t nFirst = 0;
    std::memcpy(&nFirst, bytes.data(), 2);
    BasicReader oReader(poImage.get(), {}, false);
    ProgressCounter oProgress({}, "test", 1);
    const auto oFull =
        Reduce(oReader, {krv::gobs::SampleValue::FromUnsigned(nFirst)}, 21, 17, Resampling::eAverage, oProgress);
    EXPECT_EQ(oFull[0].coverage[0], 0.0F);
    EXPECT_EQ(oFull[0].coverage[1], 1.0F);
    const auto oAll =
        Reduce(oReader, {krv::gobs::SampleValue::FromUnsigned(nFirst)}, 1, 1, Resampling::eAverage, oProgress);
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

} // namespace

} // namespace krv::operations
