#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/ifileformat.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/interfaces/isidecardataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/overviews/overviewbuilder.h"
#include "datasources/reader/basicoverviewreaderaccessor.h"
#include "datasources/reader/basicreader.h"
#include "datasources/writer/basicwriter.h"
#include "plugins/support/sidecar/auxxml.h"
#include "plugins/support/sidecar/worldfile.h"
#include "tests/support/outputcapture.h"
#include "tests/support/pixels.h"
#include "tests/support/recipe.h"
#include "tests/support/thrown.h"
#include "toolkit/core/core.h"
#include "toolkit/ogc/cs/crsfactory.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/ogc/cs/icrs.h"
#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>

#include <cstdio>
#include <filesystem>
#include <memory>

using namespace krv::datasources;
using namespace krv::plugins::support;
using krv::conformance::ReadFile;
using krv::conformance::TempFolder;
using krv::test::RecipeImage;

namespace
{

std::unique_ptr<IDataset> Open(const std::string& file, AccessMode eMode = eReadOnly)
{
    return std::unique_ptr<IDataset>(DatasetManager::GetInstance()->Open(file, eMode));
}

IRasterDataset& Rasters(IDataset& oDataset)
{
    return dynamic_cast<IRasterDataset&>(oDataset);
}

// An image of one channel of the recipe.
std::string Make(const TempFolder& oFolder, const std::string& name, const std::string& format,
                 unsigned int nWidth = 60, unsigned int nHeight = 40)
{
    const std::string file = oFolder.File(name);
    const std::unique_ptr<IDataset> poDataset(DatasetManager::GetInstance()->NewDataset(file, format, ""));
    Rasters(*poDataset).Create(nWidth, nHeight, {krv::gobs::eDT_8U});
    const std::unique_ptr<IRasterIO> poIO(Rasters(*poDataset).GetRasterIO({1}));
    std::string pixels = RecipeImage(nWidth, nHeight, {1}, krv::gobs::eDT_8U);
    poIO->WriteWindow(0u, 0u, nWidth, nHeight, reinterpret_cast<unsigned char*>(pixels.data()));
    poDataset->Close();
    return file;
}

std::vector<Sidecar> List(const std::string& file)
{
    return dynamic_cast<ISidecarDataset&>(*Open(file)).ListSidecars();
}

std::string ReadMask(IDataset& oDataset, unsigned int nBitmap)
{
    const std::unique_ptr<IRasterIO> poIO(dynamic_cast<IBitmapDataset&>(oDataset).GetBitmapIO({nBitmap}));
    std::string bytes(std::size_t{poIO->GetFileWidth()} * poIO->GetFileHeight(), '?');
    poIO->ReadWindow(0u, 0u, poIO->GetFileWidth(), poIO->GetFileHeight(),
                     reinterpret_cast<unsigned char*>(bytes.data()));
    return bytes;
}

} // namespace

TEST(WorldFiles, AreSixNumbersOfACentre)
{
    const auto oInfo = ParseWorldFile("10\r\n2 \r\n2\n-10\n 5\n+295\n");
    ASSERT_TRUE(oInfo);
    EXPECT_TRUE(*oInfo == krv::ogc::cs::GeocodingInfo(-1, 10, 2, 299, 2, -10));
    for (const char* pText : {"", "1 0 0 1 0", "1 0 0 x 0 0", "1 0 0 0 0 0", "1 0 0 nan 0 0", "1,0,0,1,0,0"})
        EXPECT_FALSE(ParseWorldFile(pText)) << pText;
    EXPECT_EQ(ListWorldEndings("a.b/scene.tiff"), (std::vector<std::string>{".tfw", ".tiffw", ".wld"}));
    EXPECT_EQ(ListWorldEndings("a.b/scene"), (std::vector<std::string>{".wld"}));
}

// What is changed is as it was set, and what is not known stays.
TEST(AuxXmlFiles, AreMerged)
{
    const std::string text =
        "<PAMDataset own='1'><SRS dataAxisToSRSAxisMapping='2,1'>EPSG:4326</SRS>"
        "<GeoTransform> 1.0e+00, 2,0, 3, 0,-2 </GeoTransform><Unknown>kept</Unknown>"
        "<Metadata><MDI key='a'>1</MDI></Metadata><Metadata domain='D'><MDI key='b'>&lt;2&gt;</MDI></Metadata>"
        "<Metadata domain='ENVI'><MDI key='bands'>7</MDI></Metadata>"
        "<PAMRasterBand band='2'><NoDataValue> -9.99E+03 </NoDataValue><Histograms><HistItem/></Histograms>"
        "<Description>two</Description><Scale>0.5</Scale>"
        "<CategoryNames><Category>water</Category><Category/><Category> a, b "
        "</Category></CategoryNames></PAMRasterBand>"
        "<PAMRasterBand band='9'><NoDataValue>1</NoDataValue></PAMRasterBand></PAMDataset>";
    AuxXml oFirst(text, "x", 2);
    EXPECT_EQ(oFirst.GetTags().GetFileMetadata(), (MetadataMap{{"a", "1"}, {"D:b", "<2>"}}));
    EXPECT_EQ(
        oFirst.GetTags().GetChanMetadata(2),
        (MetadataMap{
            {"NO_DATA_VALUE", "-9.99E+03"}, {"Scale", "0.5"}, {"CLASS_NAME_0", "water"}, {"CLASS_NAME_2", "a, b"}}));
    EXPECT_TRUE(oFirst.GetGeocoding() == krv::ogc::cs::GeocodingInfo(1, 2, 0, 3, 0, -2));
    AuxiliaryData oTags = oFirst.GetTags();
    oTags.SetChanMetadataValue("own:key", "\"&'\n\t", 1);
    oTags.SetFileMetadata({});
    oFirst.SetTags(oTags);
    oFirst.SetGeocoding({});
    oFirst.SetStamp({80, -1});
    const AuxXml oSecond(oFirst.Write(), "x", 2);
    EXPECT_EQ(oSecond.Write(), oFirst.Write());
    EXPECT_EQ(oSecond.GetTags().GetChanMetadata(2), oFirst.GetTags().GetChanMetadata(2));
    EXPECT_EQ(oSecond.GetTags().GetChanMetadata(1), (MetadataMap{{"own:key", "\"&'\n\t"}}));
    EXPECT_EQ(oSecond.GetTags().GetChannelDescription(2), "two");
    EXPECT_TRUE(oSecond.GetTags().GetFileMetadata().empty());
    EXPECT_EQ(oSecond.GetCRS(), "EPSG:4326");
    EXPECT_FALSE(oSecond.GetGeocoding());
    EXPECT_TRUE(oSecond.GetStamp() == (AuxXml::Stamp{80, -1}));
    for (const char* pKept : {"<Unknown>kept</Unknown>", "<HistItem>", "band=\"9\"", "<Category>a, b"})
        EXPECT_NE(oSecond.Write().find(pKept), std::string::npos) << pKept;
    std::string wide("\xFF\xFE", 2);
    for (const char c : std::string("<PAMDataset><SRS>EPSG:4326</SRS></PAMDataset>"))
        wide += {c, '\0'};
    EXPECT_EQ(AuxXml(wide, "x", 1).GetCRS(), "EPSG:4326");
    for (const char* pBad : {"", "<Other/>", "<PAMDataset>", "Test file", "<!DOCTYPE a []><PAMDataset/>"})
        EXPECT_THROW(AuxXml(pBad, "x", 1), krv::DataException) << pBad;
}

TEST(Sidecars, AddWhatTheFileLacks)
{
    for (const char* pFormat : {"TIF", "RAW", "JP2", "DEMO"})
    {
        SCOPED_TRACE(pFormat);
        const TempFolder oFolder;
        const std::string file = Make(oFolder, "x.img", pFormat);
        EXPECT_TRUE(List(file).empty());
        oFolder.Write("x.igw", "2\n0\n0\n-2\n11\n19\n");
        EXPECT_TRUE(dynamic_cast<IGeocodedDataset&>(*Open(file)).GetGeocoding() ==
                    krv::ogc::cs::GeocodingInfo(10, 2, 0, 20, 0, -2));
        oFolder.Write("X.PRJ", "EPSG:32633");
        EXPECT_EQ(std::unique_ptr<krv::ogc::cs::ICRS>(Open(file)->ReadCRS())->GetEPSG(), 32633);
        oFolder.Write("x.img.aux.xml",
                      "<PAMDataset><SRS>EPSG:4326</SRS><GeoTransform>1,2,0,3,0,-2</GeoTransform>"
                      "<PAMRasterBand band='1'><NoDataValue>7</NoDataValue></PAMRasterBand></PAMDataset>");
        const auto poDataset = Open(file);
        EXPECT_EQ(dynamic_cast<IGeocodedDataset&>(*poDataset).GetGeocoding().GetXOffset(), 1);
        EXPECT_EQ(std::unique_ptr<krv::ogc::cs::ICRS>(poDataset->ReadCRS())->GetEPSG(), 4326);
        EXPECT_EQ(poDataset->ReadAuxiliaryData().GetChanMetadataValue("NO_DATA_VALUE", 1), "7");
        const auto oList = List(file);
        ASSERT_EQ(oList.size(), 3u);
        EXPECT_TRUE(oList[0].mbUsed && !oList[1].mbUsed && !oList[2].mbUsed);
        // Damaged ones are as if they were not there, and said to be so once.
        oFolder.Write("x.img.aux.xml", "<PAMDataset>");
        oFolder.Write("x.igw", "2\n0\n0\n");
        oFolder.Write("X.PRJ", "no system");
        const krv::test::OutputCapture oCapture;
        const auto poDamaged = Open(file);
        EXPECT_TRUE(dynamic_cast<IGeocodedDataset&>(*poDamaged).GetGeocoding().IsIdentity());
        EXPECT_EQ(poDamaged->ReadCRS(), nullptr);
        EXPECT_EQ(poDamaged->ReadCRS(), nullptr);
        EXPECT_EQ(poDamaged->ReadAuxiliaryData().GetChanMetadataValue("NO_DATA_VALUE", 1), "");
        EXPECT_EQ(oCapture.moWarnings.size(), 3u);
    }
}

TEST(Sidecars, MasksAreOfTheImagesSize)
{
    const TempFolder oFolder;
    const std::string file = Make(oFolder, "x.img", "RAW");
    const std::string pixels = RecipeImage(60, 40, {1}, krv::gobs::eDT_8U);
    {
        const auto poDataset = Open(file, eUpdate);
        auto& oBitmaps = dynamic_cast<IBitmapDataset&>(*poDataset);
        const unsigned int nMask = oBitmaps.CreateBitmap();
        EXPECT_THROW(poDataset->Synchronize(), krv::DataException) << "it is a zone still";
        oBitmaps.SetBitmapDescription(nMask, "");
        const std::unique_ptr<IRasterIO> poIO(oBitmaps.GetBitmapIO({nMask}));
        unsigned char aBits[] = {1, 0, 7};
        poIO->WriteWindow(3u, 2u, 3u, 1u, aBits);
        EXPECT_FALSE(std::filesystem::exists(file + ".msk"));
        poDataset->Close();
    }
    const auto poDataset = Open(file);
    const std::string mask = ReadMask(*poDataset, FindValidityMask(dynamic_cast<IBitmapDataset&>(*poDataset)));
    EXPECT_EQ(mask.substr(2 * 60 + 2, 5), std::string("\0\1\0\1\0", 5));
    EXPECT_TRUE(krv::test::ReadPixels(BasicReader(file)) == pixels);
    // The mask of another image, or what is none.
    const auto IsRefused = [&]
    {
        const krv::test::OutputCapture oCapture;
        const auto poOther = Open(file);
        const bool bNone = dynamic_cast<IBitmapDataset&>(*poOther).GetBitmapList().empty();
        return bNone && oCapture.moWarnings.size() == 1 &&
               oCapture.moWarnings[0].moMessage.starts_with(file + ".msk is not used: ");
    };
    EXPECT_FALSE(IsRefused());
    Make(oFolder, "x.img.msk", "TIF", 61, 40);
    EXPECT_TRUE(IsRefused());
    oFolder.Write("x.img.msk", "no image");
    EXPECT_TRUE(IsRefused());
    std::filesystem::remove(file + ".msk");
    std::filesystem::create_symlink(file, file + ".msk");
    EXPECT_TRUE(std::filesystem::exists(file + ".msk.hdr") || IsRefused()) << "itself, which names no header there";
}

// Of channels: the others are valid, whoever reads the file.
TEST(Sidecars, MasksOfChannelsAreWritten)
{
    const TempFolder oFolder;
    const std::string file = oFolder.File("x.img");
    const auto SetPixel = [](IBitmapDataset& oBitmaps, unsigned int nMask, unsigned int nX)
    {
        unsigned char nBit = 1;
        std::unique_ptr<IRasterIO>(oBitmaps.GetBitmapIO({nMask}))->WriteWindow(nX, 0u, 1u, 1u, &nBit);
    };
    {
        const std::unique_ptr<IDataset> poNew(DatasetManager::GetInstance()->NewDataset(file, "RAW", ""));
        Rasters(*poNew).Create(4, 1, {krv::gobs::eDT_16U, krv::gobs::eDT_16U, krv::gobs::eDT_16U});
        auto& oBitmaps = dynamic_cast<IBitmapDataset&>(*poNew);
        for (const unsigned int nChannel : {3u, 1u})
        {
            const unsigned int nMask = oBitmaps.CreateBitmap();
            oBitmaps.SetBitmapMetadata(nMask, {{VALIDITY_OF_CHANNEL, std::to_string(nChannel)}});
            SetPixel(oBitmaps, nMask, nChannel);
        }
        const unsigned int nZone = oBitmaps.CreateBitmap();
        EXPECT_THROW(SetPixel(oBitmaps, nZone, 0), krv::DataException) << "it is a zone still";
        EXPECT_THROW(oBitmaps.SetBitmapMetadata(nZone, {{"of", "clouds"}}), krv::DataException);
        poNew->Close();
    }
    const auto poDataset = Open(file);
    auto& oBitmaps = dynamic_cast<IBitmapDataset&>(*poDataset);
    EXPECT_EQ(oBitmaps.GetBitmapList(), (std::vector<unsigned int>{1, 3}));
    EXPECT_EQ(oBitmaps.GetBitmapMetadata(3), (MetadataMap{{VALIDITY_OF_CHANNEL, "3"}}));
    EXPECT_EQ(ReadMask(*poDataset, 1), std::string("\0\1\0\0", 4));
    EXPECT_EQ(ReadMask(*poDataset, 3), std::string("\0\0\0\1", 4));
    const auto poMask = Open(file + ".msk");
    EXPECT_EQ(krv::test::ReadPixels(BasicReader(poMask.get(), std::vector<unsigned int>{2}, false)),
              "\xff\xff\xff\xff");
    EXPECT_EQ(poMask->ReadAuxiliaryData().GetFileMetadataValue("INTERNAL_MASK_FLAGS_2"), "1");
}

// Pixels that are written make the levels of the file beside outdated, whichever way the image was opened; the file of
// another scene is left alone.
TEST(Sidecars, LevelsBesideAreOutdatedByNewPixels)
{
    for (const auto& [pFormat, bGeneric] : {std::pair{"TIF", false}, {"TIF", true}, {"RAW", false}, {"RAW", true}})
    {
        SCOPED_TRACE(testing::Message() << pFormat << bGeneric);
        const TempFolder oFolder;
        const std::string file = Make(oFolder, "x.img", pFormat, 100, 80), levels = file + ".ovr";
        const auto WritePixel = [&, bGeneric = bGeneric](bool bClose)
        {
            const std::unique_ptr<IDataset> poDataset(
                bGeneric ? DatasetManager::GetInstance()->OpenFormat("GDBALL", file, eUpdate)
                         : Open(file, eUpdate).release());
            unsigned char nPixel = 77;
            std::unique_ptr<IRasterIO>(Rasters(*poDataset).GetRasterIO({1}))->WriteWindow(0u, 0u, 1u, 1u, &nPixel);
            if (bClose)
                poDataset->Close();
        };
        Make(oFolder, "x.img.ovr", "TIF", 50, 40);
        {
            const auto poLevels = Open(levels, eUpdate);
            BasicWriter oWriter(&Rasters(*poLevels), {1});
            EXPECT_TRUE(BuildOverviews(oWriter, {2}, "average"));
            poLevels->Close();
        }
        const auto CountValid = [&]
        {
            const auto poImage = Open(file);
            const BasicOverviewReaderAccessor oAccessor(&Rasters(*poImage), {1});
            EXPECT_EQ(oAccessor.GetLevels(), (std::vector<unsigned int>{2, 4}));
            return int{oAccessor.IsLevelValid(2)} + int{oAccessor.IsLevelValid(4)};
        };
        EXPECT_EQ(CountValid(), 2);
        {
            const krv::test::OutputCapture oCapture; // of what is lost
            WritePixel(false);
        }
        EXPECT_EQ(CountValid(), 0) << "before the pixels are stored";
        WritePixel(true);
        EXPECT_EQ(CountValid(), 0);
        Make(oFolder, "x.img.ovr", "TIF", 70, 70);
        const std::string other = ReadFile(levels);
        const krv::test::OutputCapture oCapture;
        WritePixel(true);
        EXPECT_TRUE(ReadFile(levels) == other);
    }
}

TEST(Generic, LevelsLieBesideWhatCannotHoldThem)
{
    for (const char* pFormat : {"RAW", "DEMO"})
    {
        SCOPED_TRACE(pFormat);
        const TempFolder oFolder;
        const std::string file = Make(oFolder, "x.img", pFormat, 517, 301);
        DatasetManager& oManager = *DatasetManager::GetInstance();
        EXPECT_EQ(oManager.OpenFormat("GDBALL", file, eReadOnly), nullptr);
        {
            const std::string name = oFolder.File("x.hdr"), named = std::filesystem::exists(name) ? name : file;
            const std::unique_ptr<IDataset> poGeneric(oManager.OpenFormat("GDBALL", named, eUpdate));
            ASSERT_NE(poGeneric, nullptr);
            BasicWriter oWriter(&Rasters(*poGeneric), {1});
            EXPECT_TRUE(BuildOverviews(oWriter, {2, 4, 8}, "average"));
            EXPECT_FALSE(std::filesystem::exists(file + ".ovr"));
            poGeneric->Close();
        }
        const std::string inside = Make(oFolder, "y.tif", "TIF", 517, 301);
        {
            const auto poTiff = Open(inside, eUpdate);
            BasicWriter oWriter(&Rasters(*poTiff), {1});
            EXPECT_TRUE(BuildOverviews(oWriter, {2, 4, 8}, "average"));
            poTiff->Close();
        }
        const auto poImage = Open(file), poTiff = Open(inside);
        BasicOverviewReaderAccessor oBeside(&Rasters(*poImage), {1}), oInside(&Rasters(*poTiff), {1});
        ASSERT_EQ(oBeside.GetLevels(), (std::vector<unsigned int>{2, 4, 8}));
        for (const unsigned int nLevel : {2, 4, 8})
        {
            EXPECT_TRUE(oBeside.IsLevelValid(nLevel));
            const std::unique_ptr<IRasterReader> poOne(oBeside.CreateRasterReader(nLevel)),
                poOther(oInside.CreateRasterReader(nLevel));
            EXPECT_TRUE(krv::test::ReadPixels(*poOne) == krv::test::ReadPixels(*poOther)) << nLevel;
        }
    }
}

// A format that updates no files: what they lack is kept beside them, and what they say themselves is refused.
TEST(Generic, WhatAFileLacksIsKeptBesideIt)
{
    for (const auto& [pFormat, pName] : {std::pair{"JP2", "x.j2k"}, {"DEMO", "x.img"}})
    {
        SCOPED_TRACE(pFormat);
        const TempFolder oFolder;
        const std::string file = Make(oFolder, pName, pFormat), before = ReadFile(file);
        EXPECT_NE(krv::test::Error([&] { Open(file, eUpdate); }), "");
        const auto Update = [&]
        {
            return std::unique_ptr<IDataset>(DatasetManager::GetInstance()->OpenFormat("GDBALL", file, eUpdate));
        };
        const krv::ogc::cs::GeocodingInfo oPlace(10, 2, 0, 20, 0, -2);
        {
            const auto poDataset = Update();
            AuxiliaryData oTags = poDataset->ReadAuxiliaryData();
            oTags.SetFileMetadataValue("scene", "alps");
            oTags.SetChanMetadataValue("NO_DATA_VALUE", "7", 1);
            poDataset->WriteAuxiliaryData(oTags);
            poDataset->UpdateCRS(*std::unique_ptr<krv::ogc::cs::ICRS>(krv::ogc::cs::CreateCRSFromEPSG(32633)));
            dynamic_cast<IGeocodedDataset&>(*poDataset).SetGeocoding(oPlace);
            auto& oBitmaps = dynamic_cast<IBitmapDataset&>(*poDataset);
            const unsigned int nMask = oBitmaps.CreateBitmap();
            oBitmaps.SetBitmapDescription(nMask, "");
            unsigned char nBit = 9;
            std::unique_ptr<IRasterIO>(oBitmaps.GetBitmapIO({nMask}))->WriteWindow(3u, 2u, 1u, 1u, &nBit);
            EXPECT_EQ(poDataset->ReadAuxiliaryData().GetFileMetadataValue("scene"), "alps");
            EXPECT_FALSE(std::filesystem::exists(file + ".aux.xml"));
            poDataset->Close();
        }
        EXPECT_EQ(ReadFile(file), before);
        const auto poDataset = Open(file);
        EXPECT_EQ(poDataset->ReadAuxiliaryData().GetFileMetadataValue("scene"), "alps");
        EXPECT_EQ(poDataset->ReadAuxiliaryData().GetChanMetadataValue("NO_DATA_VALUE", 1), "7");
        EXPECT_EQ(std::unique_ptr<krv::ogc::cs::ICRS>(poDataset->ReadCRS())->GetEPSG(), 32633);
        EXPECT_TRUE(dynamic_cast<IGeocodedDataset&>(*poDataset).GetGeocoding() == oPlace);
        EXPECT_EQ(ReadMask(*poDataset, 1).substr(2 * 60 + 2, 3), std::string("\0\1\0", 3));
    }
    const TempFolder oFolder;
    const std::string file = oFolder.File("x.img");
    {
        const std::unique_ptr<IDataset> poNew(DatasetManager::GetInstance()->NewDataset(file, "DEMO", ""));
        Rasters(*poNew).Create(9, 9, {krv::gobs::eDT_8U});
        AuxiliaryData oTags(1);
        oTags.SetFileMetadataValue("scene", "sea");
        poNew->WriteAuxiliaryData(oTags);
        poNew->Close();
    }
    const std::unique_ptr<IDataset> poUpdate(DatasetManager::GetInstance()->OpenFormat("GDBALL", file, eUpdate));
    AuxiliaryData oTags = poUpdate->ReadAuxiliaryData();
    oTags.SetFileMetadataValue("scene", "alps");
    EXPECT_NE(krv::test::Error([&] { poUpdate->WriteAuxiliaryData(oTags); }).find("the file itself says it"),
              std::string::npos);
}

TEST(Generic, LevelsOfAnotherSceneAreNotUsed)
{
    const TempFolder oFolder;
    const std::string file = Make(oFolder, "x.img", "RAW", 100, 80);
    const krv::test::OutputCapture oCapture;
    const auto Levels = [&]
    {
        const auto poImage = Open(file);
        return BasicOverviewReaderAccessor(&Rasters(*poImage), {1}).GetLevels();
    };
    Make(oFolder, "x.img.ovr", "TIF", 50, 40);
    EXPECT_EQ(Levels(), std::vector<unsigned int>{2});
    EXPECT_TRUE(oCapture.moWarnings.empty());
    for (const auto& [nWidth, nHeight] : {std::pair{50u, 20u}, {100u, 80u}, {70u, 70u}})
    {
        Make(oFolder, "x.img.ovr", "TIF", nWidth, nHeight);
        EXPECT_TRUE(Levels().empty()) << nWidth;
    }
    oFolder.Write("x.img.ovr", "II*");
    EXPECT_TRUE(Levels().empty());
    EXPECT_EQ(oCapture.moWarnings.size(), 4u);
}

// Files that are open for update are found in the table; the last dataset closes them, and writing makes levels
// outdated.
TEST(Generic, OpenFilesAreShared)
{
    const TempFolder oFolder;
    const std::string file = Make(oFolder, "x.img", "RAW", 100, 80);
    Make(oFolder, "x.img.ovr", "TIF", 50, 40);
    DatasetManager& oManager = *DatasetManager::GetInstance();
    std::unique_ptr<IDataset> poFirst(oManager.OpenFormat("GDBALL", file, eUpdate));
    ASSERT_NE(poFirst, nullptr);
    const std::unique_ptr<IDataset> poSecond = Open(file, eUpdate);
    const std::unique_ptr<IOverviewManager> poLevels(Rasters(*poSecond).GetOverviewManager());
    EXPECT_TRUE(poLevels->IsValid(1, 2));
    unsigned char aPixel[] = {77};
    const auto Write = [&](IDataset& oDataset)
    {
        const std::unique_ptr<IRasterIO> poIO(Rasters(oDataset).GetRasterIO({1}));
        poIO->WriteWindow(0u, 0u, 1u, 1u, aPixel);
    };
    Write(*poFirst);
    EXPECT_FALSE(poLevels->IsValid(1, 2));
    poFirst->Close();
    poFirst.reset();
    aPixel[0] = 78;
    Write(*poSecond);
    poSecond->Close();
    EXPECT_EQ(krv::test::ReadPixels(BasicReader(file))[0], 78);
    EXPECT_EQ(krv::test::Error([&] { Open(file, eUpdate)->Close(); }), "") << "nobody has it open any more";
    // An entry that somebody else made leads nowhere, and back to nobody.
    std::FILE* const pFile = std::fopen(file.c_str(), "rb");
    fpAdd(file, "r+", pFile, eGenericFile);
    EXPECT_EQ(Open(file, eUpdate), nullptr);
    fpRemove(pFile);
    std::fclose(pFile);
}

TEST(Generic, TypesAreMadeByTheirFormats)
{
    const TempFolder oFolder;
    DatasetManager& oManager = *DatasetManager::GetInstance();
    const auto Make = [&](const std::string& type, const std::string& options)
    {
        const std::unique_ptr<IDataset> poDataset(oManager.NewDataset(oFolder.File("new"), type, options));
        Rasters(*poDataset).Create(3, 2, {krv::gobs::eDT_16U, krv::gobs::eDT_16U});
        poDataset->Close();
        return std::string(BasicReader(oFolder.File("new")).GetFileFormat()->GetShortName());
    };
    EXPECT_EQ(Make("bil", "INTERLEAVE=BIL"), "RAW");
    EXPECT_NE(ReadFile(oFolder.File("new.hdr")).find("interleave = bil"), std::string::npos);
    EXPECT_EQ(Make("tif", ""), "TIF");
    for (const char* pType : {"NONE", "", "gdball"})
        EXPECT_NE(krv::test::Error([&] { Make(pType, ""); }), "") << pType;
    EXPECT_NE(krv::test::Error([&] { Make("NONE", ""); }).find("RAW"), std::string::npos);
}
