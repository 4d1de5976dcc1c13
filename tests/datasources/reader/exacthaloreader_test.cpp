#include "datasources/reader/exacthaloreader.h"

#include "tests/datasources/reader/readertest.h"

#include <cstring>
#include <random>

namespace krv::test
{

namespace
{

using krv::datasources::BasicReader;
using krv::datasources::ExactHaloReader;

class ExactHaloReaderTest : public ReaderTest
{
protected:
    // A crop of the whole image extended beyond its borders, one pixel at a time.
    static std::string Crop(const ReferenceImage& oImage, long long nLeft, long long nTop, unsigned int nWidth,
                            unsigned int nHeight, eMarginBehaviour eBehaviour, const std::string& outside)
    {
        std::string crop;
        for (unsigned int nY = 0; nY < nHeight; ++nY)
            for (unsigned int nX = 0; nX < nWidth; ++nX)
            {
                const long long nColumn = FoldNaively(nLeft + nX, oImage.mnWidth, eBehaviour);
                const long long nRow = FoldNaively(nTop + nY, oImage.mnHeight, eBehaviour);
                crop += nColumn < 0 || nRow < 0 ? outside : oImage.Pixel(nColumn, nRow);
            }
        return crop;
    }
};

} // namespace

TEST_F(ExactHaloReaderTest, EveryWindowIsACropOfTheExtendedImage)
{
    const eMarginBehaviour BEHAVIOURS[] = {eReplicate, eMirror, eMirror101, eConstant, eNoData, eWrap};
    moModel->moTypes.assign(3, krv::gobs::eDT_16S);
    moModel->moAuxiliary.SetFileMetadataValue("NO_DATA_VALUE", "-7");
    moModel->moAuxiliary.SetChanMetadataValue("NO_DATA_VALUE", "300", 2);
    const std::int16_t CONSTANTS[] = {12, -3};
    const std::int16_t NO_DATA[] = {300, -7};
    for (unsigned int nSeed = 1; nSeed <= 300; ++nSeed)
    {
        std::mt19937 oRandom(nSeed);
        const auto Up = [&](unsigned int nLimit)
        {
            return static_cast<unsigned int>(oRandom() % (nLimit + 1));
        };
        moModel->mnWidth = 1 + Up(12);
        moModel->mnHeight = 1 + Up(12);
        ExactHaloReader oReader(new BasicReader(moFile, Channels{2, 1}), true);
        oReader.SetConstant({12, -3});
        const ReferenceImage oImage = Image({2, 1});
        for (int nWindow = 0; nWindow < 20; ++nWindow)
        {
            // The window itself may leave the image too.
            const int nX = static_cast<int>(Up(3 * moModel->mnWidth)) - static_cast<int>(moModel->mnWidth);
            const int nY = static_cast<int>(Up(3 * moModel->mnHeight)) - static_cast<int>(moModel->mnHeight);
            const unsigned int nWidth = 1 + Up(moModel->mnWidth);
            const unsigned int nHeight = 1 + Up(moModel->mnHeight);
            const unsigned int nXMargin = Up(1) * Up(2 * moModel->mnWidth);
            const unsigned int nYMargin = Up(1) * Up(2 * moModel->mnHeight);
            const eMarginBehaviour eBehaviour = BEHAVIOURS[Up(5)];
            oReader.SetMargins(0, 0, eBehaviour); // the raster's own margins count
            krv::gobs::Raster oRaster({nWidth, nHeight, 2, oReader.GetDataType()}, {nX, nY, nXMargin, nYMargin});
            oReader.ReadRaster(&oRaster);
            const auto* const pOutside = eBehaviour == eNoData ? NO_DATA : CONSTANTS;
            ASSERT_EQ(PixelsOf(oRaster),
                      Crop(oImage, static_cast<long long>(nX) - nXMargin, static_cast<long long>(nY) - nYMargin,
                           nWidth + 2 * nXMargin, nHeight + 2 * nYMargin, eBehaviour,
                           std::string(reinterpret_cast<const char*>(pOutside), 4)))
                << "seed " << nSeed << ", window " << nWindow;
        }
    }
}

TEST_F(ExactHaloReaderTest, TilesOfAnySizeMakeUpTheImageAndRefusalsSayWhy)
{
    ExactHaloReader oReader(new BasicReader(moFile, Channels{1, 2, 3}), true);
    const ReferenceImage oImage = Image({1, 2, 3});
    oReader.SetTileSize(5, 4);
    oReader.SetMargins(30, 2, eMirror); // wider than the image, which no other reader takes
    ASSERT_EQ(oReader.GetTileCount(), 5u * 5u);
    for (auto oTile = oReader.Begin(); oTile != oReader.End(); ++oTile)
    {
        const RasterPtr oRaster(*oTile);
        ASSERT_EQ(PixelsOf(*oRaster), Crop(oImage, oRaster->GetX() - 30, oRaster->GetY() - 2, oRaster->GetWidth() + 60,
                                           oRaster->GetHeight() + 4, eMirror, ""));
    }
    const auto Read = [&](eMarginBehaviour eBehaviour)
    {
        oReader.SetMargins(1, 1, eBehaviour);
        const RasterPtr oRaster(oReader.GetRaster(0));
    };
    EXPECT_EQ(Error([&] { Read(eException); }), "data: Margin behaviour is eException");
    EXPECT_EQ(Error([&] { Read(eNoData); }), "data: Channel 1 has no no-data value for the pixels outside the image");
    EXPECT_NE(Error([&] { Read(static_cast<eMarginBehaviour>(9)); }), "");
    EXPECT_EQ(oReader.GetMarginBehaviour(), eNoData);
    EXPECT_EQ(Error([&] { oReader.SetConstant({1}); }), "data: 1 values for 3 channels");
    EXPECT_EQ(Error([] { ExactHaloReader(nullptr, false); }), "data: The source reader is NULL");
}

} // namespace krv::test
