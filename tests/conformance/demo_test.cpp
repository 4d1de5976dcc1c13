#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/overviews/overviewbuilder.h"
#include "datasources/reader/basicreader.h"
#include "datasources/writer/basicwriter.h"
#include "tests/support/pixels.h"
#include "tests/support/recipe.h"
#include "tests/support/thrown.h"
#include "toolkit/ogc/cs/crsfactory.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "tools/conformance/conformance.h"
#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <memory>

using namespace krv::datasources;

namespace
{

// What opening a DEMO file of these bytes throws, with FILE for its name; empty when it opens.
std::string OpenError(const std::string& bytes)
{
    const krv::conformance::TempFolder oFolder;
    const std::string file = oFolder.Write("image.demo", bytes);
    const krv::conformance::Plugin oPlugin(std::string(KRV_TEST_HOME) + "/lib/qrfformats/demo.so");
    std::string error =
        krv::test::Error([&] { std::unique_ptr<IDataset>(oPlugin.GetBuilder().Open(file, eReadOnly)); });
    const std::size_t nFile = error.find(file);
    return nFile == std::string::npos ? error : error.replace(nFile, file.size(), "FILE");
}

} // namespace

TEST(DemoFormat, HeadersAreHostile)
{
    const std::string pixels(20, 'x');
    const std::string SHORT = "file: FILE is shorter than its header says";
    const std::string SIZE = "file: FILE has no valid image size or no channels";
    const std::pair<std::string, std::string> HEADERS[] = {
        {"DEMO1\n5 4\n8U\n\n" + pixels, ""},
        {"DEMO1\n5 4\n8U\n\n" + pixels + "more", ""},
        {"DEMO1\n5 2\n8U 8S\nkey=value\n\n" + pixels, ""},
        {"DEMO1\n5 2\n16U\nno tag\n\n" + pixels, ""},
        {"", "file: FILE has no complete header"},
        {"DEMO1\n5 4\n8U\n" + pixels, "file: FILE has no complete header"},
        {"DEMO-\n5 4\n8U\n\n" + pixels, "file: FILE was not written to its end"},
        {"DEMO2\n5 4\n8U\n\n" + pixels, "file: FILE has no complete header"},
        {"DEMO1\n5 4\n8U\n" + std::string(70000, 'k') + "=v\n\n" + pixels, "file: FILE has no complete header"},
        {"DEMO1\n\n5 4\n8U\n" + pixels, SIZE},
        {"DEMO1\n5\n\n", SIZE},
        {"DEMO1\n0 4\n8U\n\n", SIZE},
        {"DEMO1\n5 -4\n8U\n\n", SIZE},
        {"DEMO1\n4294967301 4\n8U\n\n" + pixels, SIZE},
        {"DEMO1\n5 99999999999999999999\n8U\n\n", SIZE},
        {"DEMO1\n5 4\n\n", SIZE},
        {"DEMO1\n5 4\n8U 12U\n\n" + pixels, "file: FILE has channels of the unknown type 12U"},
        {"DEMO1\n5 4\nBIT\n\n" + pixels, "file: FILE has channels of the unknown type BIT"},
        {"DEMO1\n5 4\n8U\n\n" + pixels.substr(1), SHORT},
        {"DEMO1\n5 4\n8U 8U\n\n" + pixels, SHORT},
        {"DEMO1\n5 4\n8U\n[level 2]=99999999999999999999\n[level 0]=1\n[crs]=no\n[geocoding]=1 2\n\n" + pixels, ""},
        {"DEMO1\n2147483647 2147483647\nC64R C64R C64R\n\n" + pixels, SHORT},
    };
    for (const auto& [bytes, error] : HEADERS)
        EXPECT_EQ(OpenError(bytes), error) << bytes.substr(0, 60);
}

namespace
{

std::unique_ptr<IDataset> NewDemo(const std::string& file, const std::string& options = "")
{
    return std::unique_ptr<IDataset>(DatasetManager::GetInstance()->NewDataset(file, "DEMO", options));
}

IRasterDataset& Rasters(IDataset& oDataset)
{
    return dynamic_cast<IRasterDataset&>(oDataset);
}

void WriteChannel(IDataset& oDataset, unsigned int nChannel, const std::string& pixels)
{
    const std::unique_ptr<IRasterIO> oIO(Rasters(oDataset).GetRasterIO({nChannel}));
    std::string copy = pixels;
    oIO->WriteWindow(0u, 0u, oIO->GetFileWidth(), oIO->GetFileHeight(), reinterpret_cast<unsigned char*>(copy.data()));
}

std::string ReadChannel(const std::string& file, unsigned int nChannel)
{
    return krv::test::ReadPixels(BasicReader(file, {nChannel}));
}

long CountFiles(const krv::conformance::TempFolder& oFolder)
{
    const std::filesystem::directory_iterator oFiles(std::filesystem::path(oFolder.File("x")).parent_path());
    return std::distance(begin(oFiles), end(oFiles));
}

} // namespace

TEST(DemoFormat, NewFilesOfMixedTypesAreThereWhenTheyAreWhole)
{
    const krv::conformance::TempFolder oFolder;
    const std::string file = oFolder.Write("new.demo", "something of old");
    const std::vector<krv::gobs::DataType> TYPES = {krv::gobs::eDT_8U, krv::gobs::eDT_C16U, krv::gobs::eDT_64R};
    AuxiliaryData oTags(3);
    oTags.SetFileMetadata({{"scene", "line\nline\n\n100 %"}, {"[2]k=%41", "a=b"}, {"empty", ""}});
    oTags.SetChanMetadata({{"NO_DATA_VALUE", "-1"}}, 3);
    oTags.SetChannelDescription("[1]=red\r\n", 2);
    const auto Lay = [&](IDataset& oDataset)
    {
        Rasters(oDataset).Create(300, 7, TYPES);
        for (unsigned int nChannel = 1; nChannel <= 3; ++nChannel)
            WriteChannel(oDataset, nChannel, krv::test::RecipeImage(300, 7, {nChannel}, TYPES[nChannel - 1]));
        oDataset.WriteAuxiliaryData(oTags);
    };
    {
        const auto oDataset = NewDemo(file);
        Lay(*oDataset);
        oDataset->Synchronize();
        for (unsigned int nChannel = 1; nChannel <= 3; ++nChannel)
            EXPECT_TRUE(ReadChannel(file, nChannel) == krv::test::RecipeImage(300, 7, {nChannel}, TYPES[nChannel - 1]));
        // From here the file is marked until the next Synchronize.
        WriteChannel(*oDataset, 1, std::string(2100, 'z'));
        EXPECT_THROW(ReadChannel(file, 1), krv::FileFormatException);
        oDataset->Close();
    }
    EXPECT_EQ(CountFiles(oFolder), 1);
    EXPECT_EQ(ReadChannel(file, 1), std::string(2100, 'z'));
    const AuxiliaryData oRead =
        std::unique_ptr<IDataset>(DatasetManager::GetInstance()->Open(file, eReadOnly))->ReadAuxiliaryData();
    EXPECT_EQ(oRead.GetFileMetadata(), oTags.GetFileMetadata());
    EXPECT_EQ(oRead.GetChannelDescription(2), "[1]=red\r\n");
    EXPECT_EQ(oRead.GetChanMetadataValue("NO_DATA_VALUE", 3), "-1");
}

// Levels are built where they belong, and say so until the image changes.
TEST(DemoFormat, PlaceAndLevelsComeBack)
{
    const krv::conformance::TempFolder oFolder;
    const std::string file = oFolder.File("new.demo");
    const krv::ogc::cs::GeocodingInfo oGeocoding(1e6 / 3, 0.1, 0, -5e6 / 7, 0, -1e-7);
    {
        const auto oNew = NewDemo(file);
        Rasters(*oNew).Create(700, 500, {krv::gobs::eDT_16S, krv::gobs::eDT_16S});
        WriteChannel(*oNew, 2, krv::test::RecipeImage(700, 500, {2}, krv::gobs::eDT_16S));
        oNew->UpdateCRS(*krv::ogc::cs::CreateCRSFromEPSG(32633));
        auto& oPlaced = dynamic_cast<IGeocodedDataset&>(*oNew);
        EXPECT_THROW(oPlaced.SetGeocoding({0, 0, 0, 0, 0, 0}), krv::DataException);
        oPlaced.SetGeocoding(oGeocoding);
        BasicWriter oWriter(&Rasters(*oNew), {1, 2});
        EXPECT_TRUE(BuildOverviews(oWriter, {4, 2, 16}, "average"));
        std::unique_ptr<IOverviewManager>(Rasters(*oNew).GetOverviewManager())->DeleteLevel(4);
        oNew->Close();
    }
    const std::unique_ptr<IDataset> oDataset(DatasetManager::GetInstance()->Open(file, eReadOnly));
    EXPECT_TRUE(dynamic_cast<IGeocodedDataset&>(*oDataset).GetGeocoding() == oGeocoding);
    EXPECT_EQ(std::unique_ptr<krv::ogc::cs::ICRS>(oDataset->ReadCRS())->GetEPSG(), 32633);
    const std::unique_ptr<IOverviewManager> oLevels(Rasters(*oDataset).GetOverviewManager());
    EXPECT_EQ(oLevels->GetLevels(), (std::vector<unsigned int>{2, 16}));
    EXPECT_EQ(oLevels->GetResamplingName(), "AVERAGE");
    EXPECT_TRUE(oLevels->IsValid(2, 16));
    EXPECT_THROW(oLevels->CreateLevel(8), krv::DataException);
    EXPECT_EQ(oLevels->GetLevelWidth(16), 44u);

    const auto oNew = NewDemo(oFolder.File("other.demo"));
    Rasters(*oNew).Create(40, 30, {krv::gobs::eDT_8U});
    const std::unique_ptr<IOverviewManager> oOwn(Rasters(*oNew).GetOverviewManager());
    oOwn->CreateLevel(2);
    oOwn->SetValid(1, 2, true);
    WriteChannel(*oNew, 1, std::string(1200, 'z'));
    EXPECT_FALSE(oOwn->IsValid(1, 2));
}

TEST(DemoFormat, WhatCannotBeCreatedIsRefusedAndLeavesNothing)
{
    const krv::conformance::TempFolder oFolder;
    const std::string file = oFolder.File("new.demo");
    EXPECT_THROW(NewDemo(file, "COMPRESS=ZSTD"), krv::DataException);
    const auto oDataset = NewDemo(file, " ");
    IRasterDataset& oRasters = Rasters(*oDataset);
    EXPECT_THROW(oRasters.GetWidth(), krv::DataException);
    EXPECT_THROW(oRasters.Create(0, 5, {krv::gobs::eDT_8U}), krv::DataException);
    EXPECT_THROW(oRasters.Create(5, 1u << 31, {krv::gobs::eDT_8U}), krv::DataException);
    EXPECT_THROW(oRasters.Create(5, 5, {}), krv::DataException);
    EXPECT_THROW(oRasters.Create(5, 5, {krv::gobs::eDT_BIT}), krv::DataException);
    EXPECT_THROW(oRasters.Create(5, 5, {krv::gobs::DataType()}), krv::DataException);
    EXPECT_THROW(oRasters.Create(5, 5, std::vector<krv::gobs::DataType>(30000, krv::gobs::eDT_8U)), krv::DataException);
    EXPECT_THROW(oRasters.Create(INT32_MAX, INT32_MAX, {krv::gobs::eDT_C64R, krv::gobs::eDT_C64R}), krv::DataException);
    EXPECT_EQ(CountFiles(oFolder), 0);
    oRasters.Create(5, 5, {krv::gobs::eDT_8U});
    EXPECT_THROW(oRasters.Create(5, 5, {krv::gobs::eDT_8U}), krv::DataException);
    AuxiliaryData oTags(1);
    oTags.SetFileMetadataValue("long", std::string(70000, 'k'));
    EXPECT_THROW(oDataset->WriteAuxiliaryData(oTags), krv::DataException);
    EXPECT_THROW(oDataset->WriteAuxiliaryData(AuxiliaryData(2)), krv::DataException);
    const std::unique_ptr<IRasterIO> oIO(oRasters.GetRasterIO({1}));
    oDataset->Close();
    unsigned char oPixels[25] = {};
    EXPECT_THROW(oIO->WriteWindow(0u, 0u, 5u, 5u, oPixels), krv::DataException);
    EXPECT_EQ(ReadChannel(file, 1), std::string(25, '\0'));
    EXPECT_THROW(DatasetManager::GetInstance()->Open(file, eUpdate), krv::DataException);
}
