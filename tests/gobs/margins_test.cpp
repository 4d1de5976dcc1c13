#include "gobs/raster/margins.h"
#include "gobs/raster/raster.h"
#include "toolkit/exceptions/exceptions.h"
#include "tools/conformance/referenceimage.h"

#include <gtest/gtest.h>

#include <random>
#include <string>
#include <vector>

using namespace krv;
using namespace krv::gobs;

namespace
{

// The pixels of a raster as whole numbers that do not depend on how it packs them.
std::vector<std::string> Pixels(const Raster& oRaster)
{
    const std::uint64_t nPixelBits = oRaster.GetDataType().GetValueBits() * oRaster.GetChansCount();
    std::vector<std::string> oPixels(oRaster.GetFullWidth() * oRaster.GetFullHeight());
    for (std::size_t i = 0; i < oPixels.size(); ++i)
        for (std::uint64_t nBit = i * nPixelBits; nBit < (i + 1) * nPixelBits; ++nBit)
            oPixels[i] += oRaster.GetBuffer()[nBit / 8] & (128 >> nBit % 8) ? '1' : '0';
    return oPixels;
}

struct Line
{
    long long mnFirst;
    long long mnValid;

    Line(long long nFull, long long nMargin, bool bLow, bool bHigh)
        : mnFirst(bLow ? nMargin : 0), mnValid(nFull - mnFirst - (bHigh ? nMargin : 0))
    {
    }
    // The place on the line that stands for one in its margins; negative for a constant.
    long long Fold(long long k, eMarginBehaviour eBehaviour) const
    {
        const long long nFolded = conformance::FoldNaively(k - mnFirst, mnValid, eBehaviour);
        return nFolded < 0 ? nFolded : mnFirst + nFolded;
    }
};

void ExpectFilled(const std::vector<std::string>& oBefore, const Raster& oAfter, eMarginBehaviour eBehaviour,
                  unsigned int nSides, const std::string& sCase)
{
    const auto nWidth = static_cast<long long>(oAfter.GetFullWidth());
    const auto nHeight = static_cast<long long>(oAfter.GetFullHeight());
    const Line oX(nWidth, oAfter.GetXMargin(), nSides & 2, nSides & 1);
    const Line oY(nHeight, oAfter.GetYMargin(), nSides & 4, nSides & 8);
    const std::vector<std::string> oPixels = Pixels(oAfter);
    for (long long nRow = 0; nRow < nHeight; ++nRow)
        for (long long nColumn = 0; nColumn < nWidth; ++nColumn)
        {
            const long long nFromX = oX.Fold(nColumn, eBehaviour);
            const long long nFromY = oY.Fold(nRow, eBehaviour);
            const std::string sExpected = nFromX < 0 || nFromY < 0
                                              ? std::string(oPixels[0].size(), '0')
                                              : oBefore[static_cast<std::size_t>(nFromY * nWidth + nFromX)];
            ASSERT_EQ(oPixels[static_cast<std::size_t>(nRow * nWidth + nColumn)], sExpected)
                << sCase << ", column " << nColumn << ", row " << nRow;
        }
}

} // namespace

TEST(FillRasterMarginsTest, EveryBehaviourSideAndPixelSizeLikeTheNaiveModel)
{
    const unsigned int nSeed = 20240501;
    std::mt19937 oRandom(nSeed);
    constexpr eMarginBehaviour BEHAVIOURS[] = {eReplicate, eMirror, eMirror101, eConstant, eWrap};
    constexpr NativeDataTypeCode TYPES[] = {eDT_8U, eDT_16S, eDT_32R, eDT_64R, eDT_C64R, eDT_BIT};
    for (NativeDataTypeCode eType : TYPES)
        for (unsigned int nChannels : {1u, 2u, 3u, 5u, 8u})
            for (eMarginBehaviour eBehaviour : BEHAVIOURS)
                for (unsigned int nSides = 0; nSides < 16; ++nSides)
                {
                    const RasterInfo oInfo(1 + oRandom() % 6, 1 + oRandom() % 6, nChannels, DataType(eType));
                    const RasterContext oContext(0, 0, oRandom() % 8, oRandom() % 8);
                    Raster oRaster(oInfo, oContext);
                    for (std::uint64_t i = 0; i < oRaster.GetBufferSize(); ++i)
                        oRaster.GetBuffer()[i] = static_cast<unsigned char>(oRandom());
                    const std::vector<std::string> oBefore = Pixels(oRaster);
                    FillRasterMargins(&oRaster, eBehaviour, nSides);
                    ExpectFilled(oBefore, oRaster, eBehaviour, nSides,
                                 "seed " + std::to_string(nSeed) + ", " + DataType(eType).Describe() + ", sides " +
                                     std::to_string(nSides));
                }
}

TEST(FillRasterMarginsTest, RefusesWhatItCannotMake)
{
    Raster oRaster(RasterInfo(2, 2, 1, DataType(eDT_8U)), RasterContext(0, 0, 1, 1));
    for (int nBehaviour : {0, 5, 7, -1})
        EXPECT_THROW(FillRasterMargins(&oRaster, static_cast<eMarginBehaviour>(nBehaviour), 15), ParameterException);
    Raster oEmpty(RasterInfo(0, 2, 1, DataType(eDT_8U)), RasterContext(0, 0, 1, 1));
    EXPECT_THROW(FillRasterMargins(&oEmpty, eReplicate, 3), ParameterException);
    EXPECT_NO_THROW(FillRasterMargins(&oEmpty, eReplicate, 0));
    EXPECT_THROW(FillRasterMargins(nullptr, eReplicate, 0), DataException);
    EXPECT_THROW(FoldIndex(0, 0, eMirror), ParameterException);
    EXPECT_THROW(FoldIndex(0, 1, eConstant), ParameterException);
}

TEST(FoldIndexTest, FoldsFarIndices)
{
    for (eMarginBehaviour eBehaviour : {eReplicate, eMirror, eMirror101, eWrap})
        for (long long n = 1; n < 6; ++n)
            for (long long k = -30; k < 30; ++k)
                EXPECT_EQ(FoldIndex(k, n, eBehaviour), conformance::FoldNaively(k, n, eBehaviour)) << k << " of " << n;
    EXPECT_EQ(FoldIndex(-1, 1ll << 34, eMirror), 0);
    EXPECT_EQ(FoldIndex(-(1ll << 40), (1ll << 34) - 1, eWrap), (1ll << 34) - 1 - 64);
}
