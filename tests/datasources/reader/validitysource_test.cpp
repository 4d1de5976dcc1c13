#include "datasources/reader/validitysource.h"

#include "datasources/iomanager/datasetmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/rasterrange.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/raster.h"
#include "tests/support/facts.h"
#include "tests/support/syntheticdataset.h"
#include "toolkit/exceptions/exceptions.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <filesystem>
#include <memory>
#include <string>

namespace krv::datasources
{

namespace
{

using krv::gobs::Mask;
using krv::gobs::Raster;

// An image of 8-bit channels, whose values in some channel and bitmap decide about validity.
class ValiditySourceTest : public testing::Test
{
protected:
    ValiditySourceTest()
    {
        mpoModel->moTypes.assign(4, krv::gobs::eDT_8U);
        mpoModel->moAuxiliary = AuxiliaryData(4);
    }

    std::unique_ptr<Raster> Read(const std::vector<unsigned int>& oChannels, unsigned int nMargin,
                                 eMarginBehaviour eBehaviour)
    {
        BasicReader oReader(static_cast<IDataset*>(&moDataset), oChannels, false);
        return ReadFrom(oReader, nMargin, eBehaviour);
    }

    std::unique_ptr<Raster> ReadBitmap(unsigned int nBitmap, unsigned int nMargin, eMarginBehaviour eBehaviour)
    {
        BasicReader oReader(static_cast<IBitmapDataset*>(&moDataset), {nBitmap}, false);
        return ReadFrom(oReader, nMargin, eBehaviour);
    }

    std::string ValueAt(unsigned int nChannel, unsigned int nX, unsigned int nY)
    {
        return std::to_string(+Read({nChannel}, 0, eMirror)->GetBuffer()[nY * mpoModel->mnWidth + nX]);
    }

    krv::test::ImageModelPtr mpoModel = std::make_shared<krv::test::ImageModel>();
    krv::test::SyntheticDataset moDataset{mpoModel};

private:
    std::unique_ptr<Raster> ReadFrom(BasicReader& oReader, unsigned int nMargin, eMarginBehaviour eBehaviour)
    {
        oReader.SetMargins(nMargin, nMargin, eBehaviour);
        return std::unique_ptr<Raster>(oReader.ReadRaster(0, 0, mpoModel->mnWidth, mpoModel->mnHeight));
    }
};

std::unique_ptr<Mask> Build(const ValiditySource& oSource, const Raster& oRaster)
{
    return std::unique_ptr<Mask>(oSource.BuildMask(oRaster));
}

template <class Expected>
void ExpectValid(const Mask& oMask, const Expected& oExpected)
{
    std::uint64_t nValid = 0;
    for (std::uint64_t nRow = 0; nRow < oMask.GetFullHeight(); ++nRow)
    {
        for (std::uint64_t nColumn = 0; nColumn < oMask.GetFullWidth(); ++nColumn)
        {
            const bool bValid = oExpected(nRow * oMask.GetFullWidth() + nColumn);
            nValid += bValid ? 1 : 0;
            ASSERT_EQ(oMask.GetBit(nColumn, nRow), bValid) << "column " << nColumn << " row " << nRow;
        }
    }
    EXPECT_EQ(oMask.CountSet(), nValid);
}

} // namespace

TEST_F(ValiditySourceTest, AllDeclaredSourcesCountTogether)
{
    mpoModel->moBitmaps = {{3, "clouds"}, {5, ""}, {6, ""}};
    mpoModel->moAuxiliary.SetChanMetadataValue("NO_DATA_VALUE", ValueAt(2, 3, 4), 2);
    mpoModel->moAuxiliary.SetFileMetadataValue("NO_DATA_VALUE", ValueAt(3, 8, 1));
    mpoModel->moAuxiliary.SetChanMetadataValue("ColorInterp", "ALPHA", 4);
    const auto oBitmap = ReadBitmap(5, 3, eMirror101);
    const auto oAlpha = Read({4}, 3, eMirror101);
    const int nFirst = std::stoi(ValueAt(3, 8, 1));
    const int nSecond = std::stoi(ValueAt(2, 3, 4));
    for (const auto eRule : {krv::gobs::eAnyChannel, krv::gobs::eAllChannels})
    {
        // Alpha beside the raster, and as its first channel: it takes no part in the no-data rule.
        for (const std::vector<unsigned int>& oChannels : {std::vector<unsigned int>{3, 2}, {4, 3, 2}})
        {
            ValiditySource oSource(&moDataset, oChannels, eRule);
            oSource.SetMarginBehaviour(eMirror101);
            EXPECT_TRUE(oSource.HasNoData() && oSource.HasBitmap() && oSource.HasAlpha());
            const auto oRaster = Read(oChannels, 3, eMirror101);
            const std::size_t nChannels = oChannels.size();
            ExpectValid(*Build(oSource, *oRaster),
                        [&](std::uint64_t n)
                        {
                            const unsigned char* pPixel = oRaster->GetBuffer() + n * nChannels + nChannels - 2;
                            const bool bFirst = pPixel[0] == nFirst;
                            const bool bSecond = pPixel[1] == nSecond;
                            const bool bNoData =
                                eRule == krv::gobs::eAnyChannel ? bFirst || bSecond : bFirst && bSecond;
                            return !bNoData && oBitmap->GetBuffer()[n] != 0 && oAlpha->GetBuffer()[n] != 0;
                        });
        }
    }
}

TEST_F(ValiditySourceTest, AReadersMetadataAndAlphaChannelServe)
{
    mpoModel->moBitmaps = {{1, ""}};
    mpoModel->moAuxiliary.SetChanMetadataValue("NO_DATA_VALUE", ValueAt(3, 5, 5), 3);
    mpoModel->moAuxiliary.SetChanMetadataValue("ColorInterp", "Alpha", 1);
    BasicReader oReader(static_cast<IDataset*>(&moDataset), {3, 1}, false);
    const ValiditySource oSource(oReader, krv::gobs::eAnyChannel);
    EXPECT_TRUE(oSource.HasNoData() && oSource.HasAlpha());
    EXPECT_FALSE(oSource.HasBitmap());
    const std::unique_ptr<Raster> oRaster(oReader.ReadRaster(2, 3, 11, 9));
    const int nValue = std::stoi(ValueAt(3, 5, 5));
    const auto oMask = Build(oSource, *oRaster);
    ExpectValid(*oMask, [&](std::uint64_t n)
                { return oRaster->GetBuffer()[2 * n] != nValue && oRaster->GetBuffer()[2 * n + 1] != 0; });
    EXPECT_FALSE(oMask->GetBit(3, 2)); // the pixel that gave the value

    const BasicReader oColours(static_cast<IDataset*>(&moDataset), {2, 3}, false);
    EXPECT_FALSE(ValiditySource(oColours).HasAlpha());
}

TEST_F(ValiditySourceTest, PixelsOutsideTheImageAreValidOnlyAsCopies)
{
    for (const auto eBehaviour : {eReplicate, eMirror, eConstant, eNoData, eException})
    {
        for (const bool bBitmap : {false, true})
        {
            mpoModel->moBitmaps =
                bBitmap ? std::map<unsigned int, std::string>{{1, ""}} : std::map<unsigned int, std::string>();
            ValiditySource oSource(&moDataset);
            EXPECT_FALSE(oSource.HasNoData() || oSource.HasAlpha() || oSource.HasBitmap() != bBitmap);
            oSource.SetMarginBehaviour(eBehaviour);
            const bool bCopies = eBehaviour == eReplicate || eBehaviour == eMirror;
            const auto oRaster = Read({}, 2, eMirror);
            const auto oBits = ReadBitmap(1, 2, bCopies ? eBehaviour : eConstant);
            ExpectValid(*Build(oSource, *oRaster),
                        [&](std::uint64_t n)
                        {
                            const std::uint64_t nColumn = n % 25;
                            const std::uint64_t nRow = n / 25;
                            const bool bInside = nColumn >= 2 && nColumn < 23 && nRow >= 2 && nRow < 19;
                            return (bInside || bCopies) && (!bBitmap || oBits->GetBuffer()[n] != 0);
                        });
        }
    }
}

// A pixel of a level is valid by the bitmap where any pixel of its box is.
TEST_F(ValiditySourceTest, LevelsAreValidWhereTheirBoxesAre)
{
    mpoModel->moBitmaps = {{1, ""}};
    mpoModel->moLevels = {2};
    const auto oBits = ReadBitmap(1, 0, eMirror);
    const unsigned int nWidth = mpoModel->LevelWidth(2), nHeight = mpoModel->LevelHeight(2);
    ValiditySource oSource(&moDataset, {}, nWidth, nHeight);
    const Raster oRaster({nWidth, nHeight, 4, krv::gobs::eDT_8U}, {0, 0});
    const auto oMask = Build(oSource, oRaster);
    EXPECT_LT(oMask->CountSet(), std::uint64_t{nWidth} * nHeight);
    ExpectValid(*oMask,
                [&](std::uint64_t n)
                {
                    bool bAny = false;
                    for (std::uint64_t y = n / nWidth * 2; y < std::min(n / nWidth * 2 + 2, std::uint64_t{17}); ++y)
                        for (std::uint64_t x = n % nWidth * 2; x < std::min(n % nWidth * 2 + 2, std::uint64_t{21}); ++x)
                            bAny = bAny || oBits->GetBuffer()[y * 21 + x] != 0;
                    return bAny;
                });
}

TEST_F(ValiditySourceTest, RefusesWhatItCannotAsk)
{
    EXPECT_THROW(ValiditySource(static_cast<IDataset*>(nullptr)), krv::DataException);
    EXPECT_THROW(ValiditySource(&moDataset, {1, 9}), krv::OutOfBoundsException);
    krv::test::DatasetWithoutRaster oPlain(mpoModel);
    EXPECT_THROW(ValiditySource oSource(&oPlain), krv::DataException);
    mpoModel->moAuxiliary.SetFileMetadataValue("NO_DATA_VALUE", "none");
    EXPECT_THROW(ValiditySource oSource(&moDataset), krv::DataException);
}

} // namespace krv::datasources
