#include "datasources/writer/basicwriter.h"

#include "datasources/interfaces/datatypechannelfilter.h"
#include "datasources/writer/basicoverviewwriteraccessor.h"
#include "tests/datasources/reader/readertest.h"
#include "toolkit/ogc/cs/crsfactory.h"

#include <algorithm>

namespace krv::test
{

namespace
{

using krv::datasources::AuxiliaryData;
using krv::datasources::BasicOverviewWriterAccessor;
using krv::datasources::BasicReader;
using krv::datasources::BasicWriter;
using krv::datasources::IBitmapDataset;
using krv::datasources::IRasterDataset;
using krv::datasources::IRasterIO;
using krv::gobs::Raster;
using krv::gobs::RasterInfo;

constexpr unsigned int WIDTH = 150;
constexpr unsigned int HEIGHT = 90;

// The real format writes, synthetic datasets fail on demand.
class BasicWriterTest : public ReaderTest
{
protected:
    BasicWriterTest()
    {
        moHome.Add(std::string(KRV_TEST_HOME) + "/lib/qrfformats/tif.so", "<Dataset><SupportsCreate/></Dataset>");
        krv::datasources::DatasetManager::DestroyInstance();
        RegisterSynthetic();
    }

    // The pixels of the centre; whatever stands in the margins must not reach the file.
    void Fill(Raster& oRaster, const Channels& oChannels = {1, 2, 3}) const
    {
        const ReferenceImage oImage{WIDTH, HEIGHT, 2 * oChannels.size(),
                                    RecipeImage(WIDTH, HEIGHT, oChannels, krv::gobs::eDT_16U)};
        const std::string bytes =
            oImage.WithMargins(oRaster.GetX(), oRaster.GetY(), oRaster.GetWidth(), oRaster.GetHeight(),
                               oRaster.GetXMargin(), oRaster.GetYMargin(), eConstant);
        std::copy(bytes.begin(), bytes.end(), oRaster.GetBuffer());
    }

    // Writes a three-channel file tile by tile with margins.
    std::string MakeFile(const char* pName)
    {
        const std::string file = moHome.GetFolder().GetPath() + "/" + pName;
        BasicWriter oWriter(file, {1, 2, 3}, "TIF", "TILED=YES BLOCKXSIZE=64 BLOCKYSIZE=32 COMPRESS=DEFLATE");
        oWriter.CreateNewFile({WIDTH, HEIGHT, 3, krv::gobs::eDT_16U});
        oWriter.SetMargins(2, 2, eMirror);
        for (auto oTile = oWriter.Begin(); oTile != oWriter.End(); ++oTile)
        {
            const RasterPtr oRaster(*oTile);
            Fill(*oRaster);
            oWriter.WriteRaster(oRaster.get());
        }
        AuxiliaryData oData(3);
        oData.SetFileMetadataValue("scene", "alps");
        oData.SetChanMetadataValue("band", "nir", 3);
        oData.SetChannelDescription("near infrared", 3);
        oWriter.SetAuxiliaryData(oData);
        oWriter.SetGeocodingInfo({300000, 30, 0, 5100000, 0, -30});
        oWriter.SetCRS(krv::ogc::cs::CreateCRSFromEPSG(32632).get());
        oWriter.Synchronize();
        return file;
    }

    static void ExpectPixels(const std::string& file)
    {
        EXPECT_TRUE(ReadPixels(BasicReader(file, Channels{3, 1})) ==
                    RecipeImage(WIDTH, HEIGHT, {3, 1}, krv::gobs::eDT_16U));
    }
};

} // namespace

TEST_F(BasicWriterTest, NewFileIsWrittenAndReadBack)
{
    const std::string file = MakeFile("new.tif");
    ExpectPixels(file);
    BasicReader oReader(file);
    const AuxiliaryData oData = oReader.GetAuxiliaryData();
    EXPECT_EQ(oData.GetFileMetadataValue("scene"), "alps");
    EXPECT_EQ(oData.GetChanMetadataValue("band", 3), "nir");
    EXPECT_EQ(oData.GetChannelDescription(3), "near infrared");
    const std::unique_ptr<krv::ogc::cs::GeocodingInfo> oGeocoding(oReader.GetGeocodingInfo());
    EXPECT_EQ(*oGeocoding, krv::ogc::cs::GeocodingInfo(300000, 30, 0, 5100000, 0, -30));
    const std::unique_ptr<krv::ogc::cs::ICRS> oCRS(oReader.GetCRS());
    EXPECT_EQ(oCRS->GetEPSG(), 32632);
}

TEST_F(BasicWriterTest, UnopenedWriterWaitsForItsImage)
{
    const std::string file = moHome.GetFolder().GetPath() + "/later.tif";
    BasicWriter oWriter(file, {1, 2}, "TIF", "");
    EXPECT_EQ(oWriter.GetWidth(), 0u);
    EXPECT_EQ(oWriter.GetTileCount(), 0u);
    EXPECT_TRUE(oWriter.Begin() == oWriter.End());
    oWriter.SetTileSize(64, 64);
    Raster oRaster({4, 4, 2, krv::gobs::eDT_8U}, {0, 0});
    EXPECT_EQ(Error([&] { oWriter.WriteRaster(&oRaster); }),
              "data: You have to create the dataset before trying to write to it");
    EXPECT_EQ(Error([&] { oWriter.SetMargins(1, 0, eMirror); }), "data: Margins can't be wider than half of the file");
    EXPECT_EQ(Error(
                  [&] {
                      oWriter.CreateNewFile({8, 8, 3, krv::gobs::eDT_8U});
                  }),
              "data: The RasterInfo does not match the write channels of this writer");
    oWriter.CreateNewFile({8, 8, 2, krv::gobs::eDT_8U});
    EXPECT_EQ(oWriter.GetWidth(), 8u);
    EXPECT_EQ(Error([&] { oWriter.CreateNewFile({8, 8, 2, krv::gobs::eDT_8U}); }), "data: The dataset already exists");
    EXPECT_EQ(Error([&] { oWriter.SetCRS(nullptr); }), "data: The reference system is NULL");
    EXPECT_NE(Error([&] { oWriter.WriteRaster(nullptr); }), "");
    Raster oOther({4, 4, 2, krv::gobs::eDT_16U}, {0, 0});
    EXPECT_NE(Error([&] { oWriter.WriteRaster(&oOther); }), "");
    EXPECT_EQ(Error([&] { oWriter.WriteRaster(&oRaster); }), "");
}

TEST_F(BasicWriterTest, ExistingFileIsUpdatedInPlaceWithItsLevels)
{
    const std::string file = MakeFile("update.tif");
    {
        BasicWriter oWriter(file, Channels{2});
        const std::unique_ptr<krv::datasources::IOverviewWriterAccessor> oLevels(oWriter.GetOverviewWriterAccessor());
        EXPECT_TRUE(oLevels->GetLevels().empty());
        EXPECT_NE(Error([&] { oLevels->SetResamplingName("best"); }), "");
        oLevels->SetResamplingName("average");
        oLevels->CreateLevel(4);
        {
            const std::unique_ptr<krv::datasources::IRasterWriter> oLevel(oLevels->CreateRasterWriter(4));
            EXPECT_EQ(oLevel->GetWidth(), (WIDTH + 3) / 4);
            EXPECT_EQ(oLevel->GetHeight(), (HEIGHT + 3) / 4);
            EXPECT_EQ(oLevel->GetOverviewWriterAccessor(), nullptr);
            Raster oRaster({8, 8, 1, krv::gobs::eDT_16U}, {0, 0});
            Fill(oRaster, {2});
            oLevel->WriteRaster(&oRaster);
        }
        oLevels->SetLevelValid(4, true);
        EXPECT_TRUE(oLevels->IsValid(1, 4));
        EXPECT_EQ(Error([&] { oLevels->IsValid(2, 4); }), "bounds: Out of bounds.");
        EXPECT_EQ(Error([&] { oLevels->SetValid(0, 4, true); }), "bounds: Out of bounds.");
        oWriter.Synchronize();
    }
    ExpectPixels(file);
    BasicReader oReader(file, Channels{2});
    const std::unique_ptr<krv::datasources::IOverviewReaderAccessor> oLevels(oReader.GetOverviewReaderAccessor());
    ASSERT_EQ(oLevels->GetLevels(), std::vector<unsigned int>{4});
    const std::unique_ptr<krv::datasources::IRasterReader> oLevel(oLevels->CreateRasterReader(4));
    const RasterPtr oPart(oLevel->ReadRaster(0, 0, 8, 8));
    Raster oExpected({8, 8, 1, krv::gobs::eDT_16U}, {0, 0});
    Fill(oExpected, {2});
    EXPECT_EQ(PixelsOf(*oPart), PixelsOf(oExpected));
}

TEST_F(BasicWriterTest, RefusalsSayWhatIsWrong)
{
    const auto dataset = MakeDataset();
    auto* const poRaster = dynamic_cast<IRasterDataset*>(dataset.get());
    auto* const poBitmaps = dynamic_cast<IBitmapDataset*>(dataset.get());
    IRasterDataset* const poNoRaster = nullptr;
    IBitmapDataset* const poNoBitmaps = nullptr;
    const Channels oNone;
    const Channels oFirst{1};
    const struct
    {
        std::function<void()> moOperation;
        const char* mpError;
    } CASES[] = {
        {[&] { BasicWriter(poBitmaps, oNone); }, "data: You should request at least one channel."},
        {[&] { BasicWriter(poNoBitmaps, oFirst); }, "data: Invalid bitmap Dataset"},
        {[&] { BasicWriter(poNoRaster, oFirst); }, "data: Invalid Raster Dataset"},
        {[&] { BasicWriter(poRaster, poRaster->GetRasterIO(oFirst), oNone); }, "data: Channel list can not be empty"},
        {[&] { BasicWriter(poNoRaster, poRaster->GetRasterIO(oFirst), oFirst); },
         "data: Invalid Raster Dataset, poRDS can not be NULL"},
        {[&] { BasicWriter(poRaster, nullptr, oFirst); }, "data: Invalid Raster IO, poRasterIO can not be NULL"},
        {[&] { BasicWriter("none.tif", oNone, "TIF", ""); }, "data: No channels in dataset: file=none.tif"},
        {[&] { BasicOverviewWriterAccessor(poNoRaster, oFirst); }, "data: The raster dataset is NULL"},
        {[&] { BasicOverviewWriterAccessor(poRaster, oNone); },
         "data: No channels were specified for pyramiding. Are you sure this file contains raster data?"},
    };
    for (const auto& oCase : CASES)
        EXPECT_EQ(Error(oCase.moOperation), oCase.mpError);
    EXPECT_EQ(moProbe.GetLive(), 1); // the dataset alone
}

// A failure at any call leaves nothing behind, whatever the constructor.
TEST_F(BasicWriterTest, FailuresLeaveNothing)
{
    const std::string file = moFile;
    const krv::datasources::DataTypeChannelFilter oFilter(krv::gobs::eDT_16U);
    const std::function<void()> OPERATIONS[] = {
        [&] { BasicWriter oWriter(file); },
        [&] {
            BasicWriter(file, Channels{2, 1}).GetAuxiliaryData();
        },
        [&] { BasicWriter oWriter(file, Channels{1}, "SYNTHETIC", ""); },
        [&] { BasicWriter oWriter(file, oFilter); },
        [&]
        {
            BasicWriter oWriter(file);
            const RasterPtr oRaster(oWriter.GetRaster(0));
            oWriter.SetAuxiliaryData(AuxiliaryData(3));
            const std::unique_ptr<krv::datasources::IOverviewWriterAccessor> oLevels(
                oWriter.GetOverviewWriterAccessor());
            oLevels->CreateLevel(2);
            const std::unique_ptr<krv::datasources::IRasterWriter> oLevel(oLevels->CreateRasterWriter(2));
            oLevels->SetLevelValid(2, true);
            oWriter.Synchronize();
        },
    };
    for (const auto& oOperation : OPERATIONS)
        FailAtEveryCall(oOperation, [&] { moModel->moLevels.clear(); });
}

} // namespace krv::test
