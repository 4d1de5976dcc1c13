#include "datasources/reader/derived/derivedreader.h"

#include "datasources/interfaces/windowedio.h"
#include "datasources/reader/exacthaloreader.h"
#include "datasources/reader/multitypereader.h"
#include "datasources/reader/validitysource.h"
#include "datasources/writer/basicwriter.h"
#include "gobs/mask/mask.h"
#include "tests/datasources/reader/readertest.h"

#include <cstring>

// Classes that stand outside the library: they know its public headers alone.
namespace krv::test
{

namespace
{

using namespace krv::datasources;

class DerivedReaderTest : public ReaderTest
{
protected:
    DerivedReaderTest() { moModel->moTypes.assign(3, krv::gobs::eDT_8U); }
};

// 8-bit pixels whose channel c is the sum of column, row and c.
class SumIO : public WindowedIO<IRasterIO>
{
public:
    unsigned int GetFileWidth() const override { return 30; }
    unsigned int GetFileHeight() const override { return 20; }
    unsigned int GetTileWidth() const override { return 8; }
    unsigned int GetTileHeight() const override { return 5; }

private:
    std::size_t GetPixelBytes() const override { return 2; }
    void ReadPixels(const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch) override
    {
        for (unsigned int n = 0; n < oRect.mnWidth * oRect.mnHeight * 2; ++n)
        {
            const unsigned int nColumn = n / 2 % oRect.mnWidth;
            const unsigned int nRow = n / 2 / oRect.mnWidth;
            pTarget[nRow * nPitch + 2 * nColumn + n % 2] =
                static_cast<unsigned char>(oRect.mnX + nColumn + oRect.mnY + nRow + n % 2);
        }
    }
    void WritePixels(const PixelRect&, const unsigned char*, std::size_t) override {}
};

class SumReader : public BasicReader
{
public:
    explicit SumReader(IDataset* poDataset)
    {
        SetDataset(poDataset, {3, 1}, true);
        SetRasterIO(std::make_unique<SumIO>(), krv::gobs::eDT_8U);
    }
};

class OwnPlaceReader : public MultiTypeReader
{
public:
    explicit OwnPlaceReader(IDataset* poDataset)
    {
        UseDataset({poDataset, {}}, {2, 1, 3}, eOwnPlace);
        RequestType(krv::gobs::eDT_64R);
    }
};

class AllChannelsWriter : public BasicWriter
{
public:
    explicit AllChannelsWriter(IDataset* poDataset)
    {
        SetDataset(poDataset, {}, false);
        OpenDatasetOrCleanup(false);
    }
};

// 8-bit values, inverted.
class NegativeReader : public DerivedReader
{
public:
    explicit NegativeReader(std::unique_ptr<IRasterReader> poSource) { SetSource({poSource.release(), {true}}); }

    using DerivedReader::ReadRaster;
    void ReadRaster(krv::gobs::Raster* poRaster) override
    {
        GetSource().ReadRaster(poRaster);
        for (std::uint64_t n = 0; n < poRaster->GetBufferSize(); ++n)
            poRaster->GetBuffer()[n] ^= 0xFF;
    }

private:
    LevelWrapper GetLevelWrapper() const override
    {
        return [](std::unique_ptr<IRasterReader> poLevel)
        {
            return std::make_unique<NegativeReader>(std::move(poLevel));
        };
    }
};

std::string Bytes(IRasterReader& oReader)
{
    const RasterPtr oRaster(oReader.ReadRaster(0, 0, oReader.GetWidth(), oReader.GetHeight()));
    return {reinterpret_cast<const char*>(oRaster->GetBuffer()), static_cast<std::size_t>(oRaster->GetBufferSize())};
}

} // namespace

TEST_F(DerivedReaderTest, ClassesOutsideTheLibrarySetUpTheirState)
{
    {
        SumReader oReader(MakeDataset().release());
        EXPECT_EQ(oReader.GetTileCount(), 16u);
        EXPECT_EQ(oReader.GetChannelsInfo().size(), 2u);
        EXPECT_EQ(oReader.GetAuxiliaryData().GetChanMetadataValue("band", 1), "b3");
        oReader.SetMargins(2, 1, eReplicate);
        const RasterPtr oRaster(oReader.GetRaster(15));
        EXPECT_EQ(+oRaster->GetBuffer()[1], 24 - 2 + 15 - 1 + 1);
        EXPECT_EQ(+oRaster->GetBuffer()[oRaster->GetBufferSize() - 2], 29 + 19);
    }
    EXPECT_EQ(moProbe.GetLive(), 0);
    EXPECT_FALSE(moProbe.HasOrphans());

    moModel->moTypes[1] = krv::gobs::eDT_16S;
    const auto dataset = MakeDataset();
    OwnPlaceReader oOwnPlace(dataset.get());
    MultiTypeReader oSame(dataset.get(), {2, 1, 3}, krv::gobs::eDT_64R, eOwnPlace);
    EXPECT_EQ(Bytes(oOwnPlace), Bytes(oSame));
    moModel->moTypes.assign(3, krv::gobs::eDT_8U);
    AllChannelsWriter oWriter(dataset.get());
    BasicReader oReader(dataset.get(), {}, false);
    EXPECT_EQ(Bytes(oWriter), Bytes(oReader));
}

TEST_F(DerivedReaderTest, LevelsAreWrappedAndMarginsAreTheSources)
{
    moModel->moLevels = {2};
    NegativeReader oReader(std::make_unique<BasicReader>(moFile));
    EXPECT_NE(Error([&] { oReader.SetMargins(90, 0, eWrap); }), "");
    EXPECT_EQ(oReader.GetMarginBehaviour(), eWrap);
    EXPECT_EQ(oReader.GetXMargin(), 0u);
    EXPECT_EQ(oReader.GetTileWidth(), moModel->mnTileWidth);
    const std::unique_ptr<IOverviewReaderAccessor> oLevels(oReader.GetOverviewReaderAccessor());
    EXPECT_EQ(oLevels->GetLevels(), moModel->moLevels);
    EXPECT_TRUE(oLevels->IsLevelValid(2));
    EXPECT_EQ(oLevels->GetAuxiliaryData(2).GetFileMetadataValue("level"), "2");
    const std::unique_ptr<IRasterReader> oLevel(oLevels->CreateRasterReader(2));
    std::string expected = LevelImage(*moModel, 2, {1, 2, 3});
    for (char& nByte : expected)
        nByte = static_cast<char>(~nByte);
    EXPECT_EQ(Bytes(*oLevel), expected);
    EXPECT_EQ(oLevel->GetOverviewReaderAccessor(), nullptr);

    ExactHaloReader oHalo(&oReader, false);
    const std::unique_ptr<IOverviewReaderAccessor> oExact(oHalo.GetOverviewReaderAccessor());
    const std::unique_ptr<IRasterReader> oExactLevel(oExact->CreateRasterReader(2));
    EXPECT_NE(dynamic_cast<ExactHaloReader*>(oExactLevel.get()), nullptr);
    EXPECT_EQ(Bytes(*oExactLevel), expected);
}

// Through any reader the same pixels are valid: by no-data, mask bitmap and alpha of the dataset behind it.
TEST_F(DerivedReaderTest, ValidityIsThatOfTheSource)
{
    moModel->moBitmaps = {{1, ""}};
    moModel->moAuxiliary.SetFileMetadataValue("NO_DATA_VALUE", "7");
    moModel->moAuxiliary.SetChanMetadataValue("ColorInterp", "Alpha", 3);
    const auto dataset = MakeDataset();
    BasicReader oBasic(dataset.get(), {2, 1}, false);
    ExactHaloReader oHalo(&oBasic, false);
    MultiTypeReader oMulti(dataset.get(), {2, 1});
    const RasterPtr oRaster(oBasic.GetRaster(0));
    std::vector<std::string> oMasks;
    for (const IRasterReader* const poReader :
         {static_cast<IRasterReader*>(&oBasic), static_cast<IRasterReader*>(&oHalo),
          static_cast<IRasterReader*>(&oMulti)})
    {
        const auto& oAccess = dynamic_cast<const IDatasetAccess&>(*poReader);
        const ValiditySource oSource(oAccess.GetDataset(), oAccess.GetChannels());
        EXPECT_TRUE(oSource.HasNoData() && oSource.HasBitmap() && oSource.HasAlpha());
        const std::unique_ptr<krv::gobs::Mask> oMask(oSource.BuildMask(*oRaster));
        oMasks.emplace_back(reinterpret_cast<const char*>(oMask->GetBits()), oMask->GetBitsSize());
    }
    EXPECT_EQ(oMasks[1], oMasks[0]);
    EXPECT_EQ(oMasks[2], oMasks[0]);
}

} // namespace krv::test
