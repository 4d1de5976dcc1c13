#include "krv/krv.h"

#include "datasources/interfaces/ipctdataset.h"
#include "tests/support/thrown.h"
#include "tools/conformance/formathome.h"

#include <gmock/gmock.h>

#include <cmath>
#include <limits>

namespace krv::test
{

namespace
{

using krv::conformance::FormatHome;

class OpenTest : public ::testing::Test
{
protected:
    OpenTest()
    {
        for (const char* const pName : {"tif", "krvdsk", "gdball"})
            moHome.Add(std::string(KRV_TEST_HOME) + "/lib/qrfformats/" + pName + ".so",
                       "<Dataset><SupportsCreate/></Dataset>");
    }

    std::string Name(const char* pName) const { return moHome.GetFolder().GetPath() + "/" + pName; }

    // 64 x 48 pixels of 10 m, the upper left corner at (1000, 5000); the value is its column.
    std::string MakeScene(const char* pName, const DataType& oType = eDT_8U, unsigned int nChannels = 1) const
    {
        const auto poWriter =
            CreateWriter(Name(pName), RasterInfo(64, 48, nChannels, oType), "TIF", "COMPRESS=DEFLATE");
        poWriter->SetGeocodingInfo(GeocodingInfo(1000, 10, 0, 5000, 0, -10));
        poWriter->SetCRS(CreateCRSFromEPSG(32719).get());
        if (oType == eDT_8U && nChannels == 1)
        {
            Raster oRaster({64, 48, 1, eDT_8U}, {0, 0});
            for (std::size_t n = 0; n < oRaster.GetBufferSize(); ++n)
                oRaster.GetBuffer()[n] = static_cast<unsigned char>(n % 64);
            poWriter->WriteRaster(&oRaster);
        }
        BuildOverviews(*poWriter, {2, 4}, "NEAREST");
        poWriter->Synchronize();
        return Name(pName);
    }

    FormatHome moHome;
};

TEST_F(OpenTest, WhatIsHandedOutLivesAndWhatIsMissingIsNamed)
{
    const std::string file = MakeScene("scene.tif");
    const auto poReader = OpenReader(file);
    EXPECT_EQ(GetLevels(*poReader), (std::vector<unsigned int>{2, 4}));
    EXPECT_EQ(Read(*OpenLevel(*poReader, 4), PixelWindow{3, 0, 1, 1})->GetBuffer()[0], 14);
    EXPECT_NE(Error([&] { OpenLevel(*poReader, 3); }), "");

    // What the rectangle touches, and nothing that it only borders on.
    const auto oWindow = FindWindow(*poReader, {1020, 4971, 1040, 4990});
    ASSERT_TRUE(oWindow);
    EXPECT_EQ(oWindow->x, 2u);
    EXPECT_EQ(oWindow->y, 1u);
    EXPECT_EQ(oWindow->width, 2u);
    EXPECT_EQ(oWindow->height, 2u);
    EXPECT_EQ(Read(*poReader, MapBounds{1020, 4971, 1040, 4990})->GetBuffer()[1], 3);
    EXPECT_EQ(Error([&] { Read(*poReader, MapBounds{0, 0, 10, 10}); }), "data: The bounds hold no pixel of the image");

    const auto poHalo = OpenHaloReader(file, {}, 3, eReplicate);
    poHalo->SetTileSize(16, 16);
    const auto poTile = ReadTile(*poHalo, 3);
    EXPECT_EQ(RasterView<const std::uint8_t>(*poTile).At(-3, 0, 0), 45); // from the tile before
    EXPECT_EQ(RasterView<const std::uint8_t>(*poTile).At(18, 0, 0), 63);

    EXPECT_EQ(Error([&] { OpenReader(Name("none.tif")); }).substr(0, 4), "file");
    EXPECT_NE(Error([&] { OpenReader(file, {2}); }), "");
    EXPECT_EQ(Error([&] { ReadBitmap(*Open(file), 1, {0, 0, 1, 1}); }).substr(0, 4), "data");
    const auto oTaken = Thrown<DataException>([&] { CreateWriter(file, RasterInfo(8, 8, 1, eDT_8U)); });
    EXPECT_EQ(oTaken.GetMessage(), "The dataset already exists");
    try
    {
        CreateWriter(file, RasterInfo(8, 8, 1, eDT_8U));
    }
    catch (const std::exception& oError)
    {
        EXPECT_EQ(oError.what(), file + ": The dataset already exists");
    }
}

TEST_F(OpenTest, ChannelsOfSeveralTypesAreOneImage)
{
    {
        const auto poDataset = Create(Name("mixed.krv"), "KRVDSK");
        dynamic_cast<IRasterDataset&>(*poDataset).Create(8, 8, {eDT_8U, eDT_16S, eDT_8U});
        poDataset->Synchronize();
    }
    EXPECT_EQ(OpenReader(Name("mixed.krv"))->GetDataType(), eDT_16S);
    EXPECT_EQ(OpenReader(*Open(Name("mixed.krv")), {1, 3})->GetDataType(), eDT_8U);
}

TEST_F(OpenTest, EverythingButPixelsIsCopied)
{
    const auto poFrom = OpenWriter(MakeScene("from.tif", eDT_16U, 3));
    AuxiliaryData oRecord = poFrom->GetAuxiliaryData();
    oRecord.SetFileMetadataValue("DefaultRed", "3");
    oRecord.SetFileMetadataValue("DefaultBlue", "2"); // is not copied
    oRecord.SetChanMetadataValue("STATISTICS_MAXIMUM", "9", 3);
    oRecord.SetChannelDescription("third", 3);
    SetNoData(oRecord, 65535, 3);
    poFrom->SetAuxiliaryData(oRecord);
    poFrom->Synchronize();

    const auto poSource = OpenReader(Name("from.tif"), {3, 1});
    const auto poTarget = CreateWriter(Name("to.tif"), RasterInfo(64, 48, 2, eDT_32R));
    EXPECT_THAT(CopyAllButPixels(*poSource, *poTarget), ::testing::IsEmpty());
    poTarget->Synchronize();
    const auto poCopy = OpenReader(Name("to.tif"));
    const AuxiliaryData oCopied = poCopy->GetAuxiliaryData();
    EXPECT_EQ(oCopied.GetFileMetadataValue("DefaultRed"), "1");
    EXPECT_EQ(oCopied.GetFileMetadataValue("DefaultBlue"), "");
    EXPECT_EQ(oCopied.GetChannelDescription(1), "third");
    EXPECT_EQ(oCopied.GetChanMetadataValue("STATISTICS_MAXIMUM", 1), "");
    EXPECT_EQ(GetNoData<float>(oCopied, 1), 65535.0f);
    EXPECT_EQ(GetCRS(*poCopy)->GetEPSG(), 32719);
    EXPECT_EQ(*GetGeocoding(*poCopy), GeocodingInfo(1000, 10, 0, 5000, 0, -10));
    EXPECT_THAT(GetLevels(*poCopy), ::testing::IsEmpty()); // pixels, too

    const auto poSmall = CreateWriter(Name("small.tif"), RasterInfo(8, 8, 2, eDT_32R));
    EXPECT_NE(Error([&] { CopyAllButPixels(*poSource, *poSmall); }), "");
    poSmall->Synchronize();
}

TEST_F(OpenTest, AColourTableIsCopiedOrNamedAsLost)
{
    {
        const auto poDataset = Open(MakeScene("index.tif"), eUpdate);
        dynamic_cast<datasources::IPCTDataset&>(*poDataset).CreatePCT(PCT::FromColours({{1, 2, 3}, {4, 5, 6}}), 1);
        AuxiliaryData oRecord(1);
        oRecord.SetChanMetadataValue("DEFAULT_PCT_REF", "gdb:index.tif/{PCT:1}", 1);
        poDataset->WriteAuxiliaryData(oRecord);
        poDataset->Synchronize();
    }
    const auto poSource = OpenReader(Name("index.tif"));
    const auto poSame = CreateWriter(Name("same.tif"), RasterInfo(64, 48, 1, eDT_8U));
    EXPECT_THAT(CopyAllButPixels(*poSource, *poSame), ::testing::IsEmpty());
    poSame->Synchronize();
    const auto poCopy = Open(Name("same.tif"));
    EXPECT_EQ(dynamic_cast<datasources::IPCTDataset&>(*poCopy).GetPCTList().size(), 1u);
    EXPECT_EQ(poCopy->ReadAuxiliaryData().GetChanMetadataValue("DEFAULT_PCT_REF", 1), "") << "leads to the source";
    const auto poReal = CreateWriter(Name("real.tif"), RasterInfo(64, 48, 1, eDT_32R));
    EXPECT_THAT(CopyAllButPixels(*poSource, *poReal),
                ::testing::ElementsAre(::testing::StartsWith("colour table 1 is not kept: ")));
    poReal->Synchronize();
}

TEST(NoDataNumbers, AreExactInTheirOwnType)
{
    AuxiliaryData oRecord(1);
    EXPECT_FALSE(GetNoData<float>(oRecord, 1));
    SetFileNoData(oRecord, NoDataValue::From(300));
    EXPECT_FALSE(GetNoData<std::uint8_t>(oRecord, 1)); // no such sample
    EXPECT_EQ(GetNoData<std::int16_t>(oRecord, 1), 300);
    SetNoData(oRecord, std::numeric_limits<std::uint64_t>::max() - 1, 1);
    EXPECT_EQ(GetNoData<std::uint64_t>(oRecord, 1), std::numeric_limits<std::uint64_t>::max() - 1);
    SetNoData(oRecord, std::numeric_limits<float>::quiet_NaN(), 1);
    EXPECT_TRUE(std::isnan(GetNoData<double>(oRecord, 1).value()));
    SetNoData(oRecord, 0.1f, 1);
    EXPECT_EQ(GetNoData<float>(oRecord, 1), 0.1f);
    EXPECT_THROW(SetNoData(oRecord, 1, 2), OutOfBoundsException);
}

} // namespace

} // namespace krv::test
