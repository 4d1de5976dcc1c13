// Copies of files by the command: real ones, when the folder with them is there, and small ones made here.

#include "datasources/interfaces/accessmode.h"
#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/iencodedblocks.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/displaydefaults.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/multitypereader.h"
#include "datasources/reader/validitysource.h"
#include "datasources/writer/basicwriter.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/raster.h"
#include "operations/copy/conversion.h"
#include "tests/support/demofile.h"
#include "tests/support/facts.h"
#include "tests/support/pixels.h"
#include "tests/support/telldataset.h"
#include "tests/support/thrown.h"
#include "tests/tools/programrun.h"
#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>
#include <memory>
#include <set>
#include <sstream>

namespace krv::tool
{

namespace
{

using krv::conformance::TempFolder;
using krv::datasources::BasicReader;
using krv::datasources::DatasetManager;
using krv::datasources::IDataset;
using krv::test::DataFolder;
using krv::test::ExpectFailure;
using krv::test::Facts;
using krv::test::PixelsOf;
using krv::test::ProgramRun;
using krv::test::ReadPixels;
using krv::test::RunKrv;
using nlohmann::json;

using Texts = std::vector<std::string>;

// Of the files that lose nothing those that show something which no file before them did.
std::vector<Facts> ChooseFiles()
{
    std::vector<Facts> oChosen;
    std::set<std::string> oSeen;
    for (const Facts& oRow : krv::test::GetFacts())
    {
        bool bNew = false;
        for (const char* pName : {"container", "byte_order", "type", "interleave", "layout", "compression", "predictor",
                                  "photometric", "extra_samples", "raster_type"})
            bNew = oSeen.insert(std::string(pName) + oRow[pName]).second || bNew;
        for (const char* pName : {"palette", "no_data", "rpc", "masks", "overviews", "geotransform"})
            bNew = oSeen.insert(std::string(pName) + (oRow.Has(pName) ? "+" : "-")).second || bNew;
        bNew = oSeen.insert(oRow["tie_points"].size() > 1 ? "points" : "none").second || bNew;
        if (bNew && !oRow.IsLossy())
            oChosen.push_back(oRow);
    }
    return oChosen;
}

// What a copy keeps: all but the file's name, its blocks and its levels. The same reference system may be said in other
// words.
json Kept(const std::string& file)
{
    const auto oRun = RunKrv({"info", file, "--json"});
    EXPECT_EQ(oRun.code, 0) << oRun.errors;
    json oInfo = oRun.Json();
    for (const char* pName : {"file", "blockWidth", "blockHeight", "overviews", "furtherImages", "unusedBytes",
                              "sidecars", "preferredTile", "storage", "cloudLayout"})
        oInfo.erase(pName);
    if (!oInfo["crs"].is_null())
        oInfo["crs"].erase("wkt");
    json& oTags = oInfo["channels"];
    for (json& oChannel : oTags)
        for (auto oTag = oChannel["metadata"].begin(); oTag != oChannel["metadata"].end();)
            oTag = oTag.key().starts_with("_Overview_") ? oChannel["metadata"].erase(oTag) : std::next(oTag);
    return oInfo;
}

std::string Sums(const std::string& file)
{
    const auto oRun = RunKrv({"checksum", file});
    EXPECT_EQ(oRun.code, 0) << oRun.errors;
    return oRun.output;
}

ProgramRun RunConvert(Texts oArguments)
{
    oArguments.insert(oArguments.begin(), "convert");
    return RunKrv(oArguments);
}

std::unique_ptr<IDataset> OpenFile(const std::string& file, AccessMode eMode = eUpdate)
{
    return std::unique_ptr<IDataset>(DatasetManager::GetInstance()->Open(file, eMode));
}

TEST(Convert, RealFilesKeepPixelsAndInformationInEveryLayout)
{
    if (krv::test::GetFacts().empty())
        GTEST_SKIP() << "no folder of real files";
    const Texts FORMS = {"TILED=YES", "TILED=NO COMPRESS=DEFLATE", "COMPRESS=LZW",
                         "COMPRESS=ZSTD BLOCKXSIZE=128 BLOCKYSIZE=64", "INTERLEAVE=BAND TILED=NO BIGTIFF=YES"};
    const TempFolder oFolder;
    const std::string there = oFolder.File("there.tif"), back = oFolder.File("back.tif");
    std::size_t nForm = 0;
    for (const Facts& oRow : ChooseFiles())
    {
        SCOPED_TRACE(oRow["file"]);
        const std::string file = oRow.GetPath();
        const auto oThere = RunConvert({file, there, "--options", FORMS[nForm++ % FORMS.size()]});
        ASSERT_EQ(oThere.code, 0) << oThere.errors;
        const auto oBack = RunConvert({there, back, "--options", "TILED=NO"});
        ASSERT_EQ(oBack.code, 0) << oBack.errors;
        const std::string sums = Sums(file);
        EXPECT_EQ(Sums(there), sums);
        EXPECT_EQ(Sums(back), sums);
        const json oKept = Kept(file);
        EXPECT_EQ(json::diff(oKept, Kept(there)), json::array());
        EXPECT_EQ(json::diff(oKept, Kept(back)), json::array());
    }
    EXPECT_GT(nForm, 30U);
}

// There, from one native file to another, and back, in this process: pixels, tags, levels, masks, tables and models, of
// files with loss as they decode.
TEST(Convert, RealFilesComeBackFromNativeFiles)
{
    const TempFolder oFolder;
    const std::string there = oFolder.File("there.krv"), again = oFolder.File("again.krv"),
                      back = oFolder.File("back.tif");
    unsigned int nFiles = 0;
    for (const Facts& oRow : krv::test::GetFacts())
    {
        SCOPED_TRACE(oRow["file"]);
        std::string told;
        if (!krv::test::Error([&] { told = krv::test::TellDataset(*OpenFile(oRow.GetPath(), eReadOnly)); }).empty())
            continue;
        operations::Convert({{oRow.GetPath()}, {}, {}, {}}, {there, "", ""});
        EXPECT_EQ(krv::test::TellDataset(*OpenFile(there, eReadOnly)), told);
        operations::Convert({{there}, {}, {}, {}}, {again, "", ""});
        operations::Convert({{again}, {}, {}, {}}, {back, "", ""});
        EXPECT_EQ(krv::test::TellDataset(*OpenFile(back, eReadOnly)), told);
        ++nFiles;
    }
    if (nFiles == 0)
        GTEST_SKIP() << "no folder of real files";
    EXPECT_GT(nFiles, 200U);
}

// Where two images, or levels of them, are stored in another way; empty when every byte of their blocks is the same.
std::string DescribeDifference(krv::datasources::IEncodedBlocks& oOne, krv::datasources::IEncodedBlocks& oOther,
                               unsigned int nLevel)
{
    const auto oForm = oOne.GetEncodedForm(nLevel);
    if (oForm != oOther.GetEncodedForm(nLevel))
        return "the form of level " + std::to_string(nLevel);
    std::vector<unsigned char> oBytes, oOthers;
    for (unsigned int nPlane = 0; nPlane < (oForm.mbSeparate ? oForm.mnChannels : 1); ++nPlane)
        for (unsigned int nY = 0; nY * oForm.mnBlockHeight < oForm.mnHeight; ++nY)
            for (unsigned int nX = 0; nX * oForm.mnBlockWidth < oForm.mnWidth; ++nX)
                if (oOne.ReadEncoded(nLevel, {nPlane, nX, nY}, oBytes) !=
                        oOther.ReadEncoded(nLevel, {nPlane, nX, nY}, oOthers) ||
                    oBytes != oOthers)
                    return "block " + std::to_string(nX) + ", " + std::to_string(nY);
    return "";
}

// 1 for the image, and its levels.
std::vector<unsigned int> LevelsOf(IDataset& oDataset)
{
    const std::unique_ptr<krv::datasources::IOverviewManager> poManager(
        dynamic_cast<krv::datasources::IRasterDataset&>(oDataset).GetOverviewManager());
    std::vector<unsigned int> oLevels = poManager->GetLevels();
    oLevels.insert(oLevels.begin(), 1);
    return oLevels;
}

// Bytes move, so that copies are no larger, nothing is encoded a second time and levels stay what they are. Of codecs
// with an order of bytes those of big-endian files are encoded anew, by the same codec.
TEST(Convert, RealFilesAreStoredAsTheyWere)
{
    constexpr std::uintmax_t TAG_BYTES = 2048; // numbers and levels are recorded, one-valued tags spelt out
    const TempFolder oFolder;
    const std::string copy = oFolder.File("copy.tif");
    std::size_t nMoved = 0, nFiles = 0;
    for (const Facts& oRow : krv::test::GetFacts())
    {
        SCOPED_TRACE(oRow["file"]);
        // In this process: a command for each file would take minutes.
        if (const std::string error = krv::test::Error(
                [&] {
                    operations::Convert({{oRow.GetPath()}, {}, {}, {}}, {copy, "", ""});
                });
            !error.empty())
        {
            EXPECT_NE(RunKrv({"checksum", oRow.GetPath()}).code, 0) << error;
            continue;
        }
        ++nFiles;
        const auto poOld = OpenFile(oRow.GetPath(), eReadOnly), poNew = OpenFile(copy, eReadOnly);
        auto& oOld = dynamic_cast<krv::datasources::IEncodedBlocks&>(*poOld);
        auto& oNew = dynamic_cast<krv::datasources::IEncodedBlocks&>(*poNew);
        const std::vector<unsigned int> oLevels = LevelsOf(*poOld);
        EXPECT_EQ(LevelsOf(*poNew), oLevels);
        EXPECT_LE(std::filesystem::file_size(copy),
                  std::filesystem::file_size(oRow.GetPath()) * 11 / 10 + TAG_BYTES * oLevels.size());
        for (const unsigned int nLevel : oLevels)
        {
            const auto oForm = oOld.GetEncodedForm(nLevel);
            EXPECT_EQ(oForm.moCodec, oNew.GetEncodedForm(nLevel).moCodec);
            const std::string level = std::to_string(nLevel);
            const bool bMoved = oForm.mbReadable && !oForm.mbBigEndian;
            if (bMoved)
                EXPECT_EQ(DescribeDifference(oOld, oNew, nLevel), "");
            else
                EXPECT_EQ(RunKrv({"checksum", copy, "--level", level}).output,
                          RunKrv({"checksum", oRow.GetPath(), "--level", level}).output);
            nMoved += bMoved ? 1 : 0;
        }
    }
    if (nFiles == 0)
        GTEST_SKIP() << "no folder of real files";
    EXPECT_GT(nMoved, 200U);
}

// Explicit options win; what they leave open stays as the file has it, and a line says what the format lacks.
TEST(Convert, KeepsHowTheFileIsStoredWhereNoOptionSaysOtherwise)
{
    const TempFolder oFolder;
    const std::string demo = oFolder.File("a.dem"), file = oFolder.File("a.tif"), out = oFolder.File("out.tif");
    krv::test::WriteDemoFile(demo, 300, 200, {krv::gobs::eDT_16U, krv::gobs::eDT_16U});
    ASSERT_EQ(
        RunConvert({demo, file, "--options", "COMPRESS=LZW PREDICTOR=2 BLOCKXSIZE=64 BLOCKYSIZE=32 INTERLEAVE=BAND"})
            .code,
        0);
    ASSERT_EQ(RunKrv({"overviews", file, "--levels", "2,5", "--resampling", "min"}).code, 0);
    struct Case
    {
        Texts moArguments;
        std::string moForm; // codec, predictor, planes, block
        std::string moSaid;
    };
    const Case CASES[] = {
        {{}, "LZW 2 band 64 x 32", ""},
        {{"--window", "8,0,200,100"}, "LZW 2 band 64 x 32", ""},
        {{"--channels", "2"}, "LZW 2 pixel 64 x 32", ""},
        {{"--type", "32R"}, "LZW 3 band 64 x 32", ""},
        {{"--options", "COMPRESS=ZSTD"}, "ZSTD 2 band 64 x 32", ""},
        {{"--options", "compress=lzw predictor=no"}, "LZW 1 band 64 x 32", ""},
        {{"--options", "BLOCKXSIZE=128 INTERLEAVE=PIXEL"}, "LZW 2 pixel 128 x 32", ""},
        {{"--options", "TILED=NO"}, "LZW 2 band 300 x 200", ""},
        {{"--options", "LAYOUT=COG"}, "LZW 2 band 64 x 32", ""},
        {{"--type", "8U", "--options", "COMPRESS=JPEG"}, "JPEG 1 band 64 x 32", "16U to 8U"},
    };
    for (const Case& oCase : CASES)
    {
        Texts oArguments = {file, out};
        oArguments.insert(oArguments.end(), oCase.moArguments.begin(), oCase.moArguments.end());
        SCOPED_TRACE(oCase.moForm + (oCase.moArguments.empty() ? "" : " " + oCase.moArguments.back()));
        const auto oRun = RunConvert(oArguments);
        ASSERT_EQ(oRun.code, 0) << oRun.errors;
        EXPECT_EQ(oRun.errors.empty(), oCase.moSaid.empty()) << oRun.errors;
        EXPECT_NE(oRun.errors.find(oCase.moSaid), std::string::npos) << oRun.errors;
        const auto poOut = OpenFile(out, eReadOnly);
        auto& oRaster = dynamic_cast<krv::datasources::IRasterDataset&>(*poOut);
        const auto oForm = dynamic_cast<krv::datasources::IEncodedBlocks&>(*poOut).GetEncodedForm(1);
        EXPECT_EQ(oForm.moCodec + " " + std::to_string(oForm.mnPredictor) + (oForm.mbSeparate ? " band " : " pixel ") +
                      std::to_string(oForm.mnBlockWidth) + " x " + std::to_string(oForm.mnBlockHeight),
                  oCase.moForm);
        const std::unique_ptr<krv::datasources::IOverviewManager> poLevels(oRaster.GetOverviewManager());
        ASSERT_EQ(poLevels->GetLevels(), (std::vector<unsigned int>{2, 5}));
        EXPECT_EQ(poLevels->GetResamplingName(), "MIN");
        EXPECT_TRUE(poLevels->IsValid(1, 5));
    }
    EXPECT_EQ(RunKrv({"checksum", out, "--level", "5"}).code, 0);
    const auto oLeft = RunConvert({file, oFolder.File("b.demo")});
    EXPECT_EQ(oLeft.code, 0);
    for (const char* pWord : {"compression LZW", "interleaving by band", "tiles of 64 x 32"})
        EXPECT_NE(oLeft.errors.find(pWord), std::string::npos) << oLeft.errors;
    EXPECT_EQ(oLeft.errors.find("goes without"), std::string::npos) << oLeft.errors;
}

// A part of an image in JPEG is stored without further loss, and its no-data value holds; encoding with loss makes a
// mask of it, for the levels too, since values near it mean nothing.
TEST(Convert, LossyCodecsKeepValidityAndAreNotAppliedUnasked)
{
    const TempFolder oFolder;
    const std::string demo = oFolder.File("a.dem"), lossless = oFolder.File("a.tif"), lossy = oFolder.File("b.tif"),
                      out = oFolder.File("out.tif");
    krv::test::WriteDemoFile(demo, 400, 300, {krv::gobs::eDT_8U}, {{"NO_DATA_VALUE", "0"}});
    ASSERT_EQ(RunConvert({demo, lossless}).code, 0);
    {
        krv::datasources::BasicWriter oWriter(lossless);
        krv::gobs::Raster oRaster({150, 300, 1, krv::gobs::eDT_8U}, {100, 0});
        std::fill_n(oRaster.GetBuffer(), oRaster.GetBufferSize(), static_cast<unsigned char>(0));
        oWriter.WriteRaster(&oRaster);
        oWriter.Synchronize();
    }
    const auto Valid = [](const std::string& file, const std::vector<unsigned int>& oWindow)
    {
        const auto poFile = OpenFile(file, eReadOnly);
        const krv::datasources::ValiditySource oValidity(poFile.get());
        BasicReader oReader(file);
        const std::unique_ptr<krv::gobs::Raster> poPixels(
            oReader.ReadRaster(oWindow[0], oWindow[1], oWindow[2], oWindow[3]));
        const std::unique_ptr<krv::gobs::Mask> poMask(oValidity.BuildMask(*poPixels));
        return std::string(poMask->GetBits(), poMask->GetBits() + poMask->GetBitsSize());
    };
    const std::string jp2 = oFolder.File("b.jp2"), jpeg = oFolder.File("b.jpg");
    for (const std::vector<std::string>& oLossy :
         {std::vector<std::string>{jp2, "--options", "QUALITY=30"},
          {jp2, "--options", "RATIO=20", "--type", "8U", "--scale", "0,255,0,254"},
          {jpeg, "--options", "QUALITY=60"},
          {lossy, "--options", "COMPRESS=JPEG LEVEL=30", "--type", "8U", "--scale", "0,255,0,254"},
          {lossy, "--options", "COMPRESS=JPEG LEVEL=30"},
          {lossy, "--options", "LAYOUT=COG COMPRESS=JPEG LEVEL=30"}})
    {
        SCOPED_TRACE(oLossy[0] + oLossy[2]);
        std::vector<std::string> oArguments{lossless};
        oArguments.insert(oArguments.end(), oLossy.begin(), oLossy.end());
        const auto oRun = RunConvert(oArguments);
        ASSERT_EQ(oRun.code, 0) << oRun.errors;
        EXPECT_NE(oRun.errors.find("a mask says which are valid"), std::string::npos) << oRun.errors;
        EXPECT_EQ(Valid(oLossy[0], {0, 0, 400, 300}), Valid(lossless, {0, 0, 400, 300}));
    }
    const auto poLossy = OpenFile(lossy, eReadOnly);
    auto& oBitmaps = dynamic_cast<krv::datasources::IBitmapDataset&>(*poLossy);
    const std::unique_ptr<krv::datasources::IOverviewManager> poMaskLevels(oBitmaps.GetBitmapOverviewManager());
    ASSERT_EQ(poMaskLevels->GetLevels(), std::vector<unsigned int>{2});
    const std::unique_ptr<krv::datasources::IRasterIO> poLevel(poMaskLevels->GetOverviewIO(2, {1}));
    std::string bits(200 * 150, '\0');
    poLevel->ReadWindow(0U, 0U, 200U, 150U, reinterpret_cast<unsigned char*>(bits.data()));
    for (const unsigned int nX : {49U, 50U, 124U, 125U})
        EXPECT_EQ(bits[70 * 200 + nX] != 0, nX < 50 || nX > 124) << nX;

    // Blocks that move bring the values along; the levels that are built beside them want the mask all the same.
    ASSERT_EQ(RunConvert({demo, out, "--options", "COMPRESS=JPEG"}).code, 0);
    {
        const auto poFile = OpenFile(out);
        dynamic_cast<krv::datasources::IBitmapDataset&>(*poFile).DeleteBitmap(1);
        auto oRecord = poFile->ReadAuxiliaryData();
        oRecord.SetFileMetadataValue("NO_DATA_VALUE", "0");
        poFile->WriteAuxiliaryData(oRecord);
        poFile->Close();
    }
    const std::string moved = oFolder.File("moved.tif");
    ASSERT_EQ(RunConvert({out, moved, "--options", "LAYOUT=COG COMPRESS=JPEG"}).errors, "");
    EXPECT_EQ(Valid(moved, {0, 0, 400, 300}), Valid(out, {0, 0, 400, 300}));
    const auto poOut = OpenFile(out, eReadOnly), poMoved = OpenFile(moved, eReadOnly);
    EXPECT_EQ(DescribeDifference(dynamic_cast<krv::datasources::IEncodedBlocks&>(*poOut),
                                 dynamic_cast<krv::datasources::IEncodedBlocks&>(*poMoved), 1),
              "");
    auto& oMoved = dynamic_cast<krv::datasources::IBitmapDataset&>(*poMoved);
    EXPECT_EQ(std::unique_ptr<krv::datasources::IOverviewManager>(oMoved.GetBitmapOverviewManager())->GetLevels(),
              std::vector<unsigned int>{2});

    const auto oPart = RunConvert({lossy, out, "--window", "3,5,64,32"});
    ASSERT_EQ(oPart.code, 0) << oPart.errors;
    EXPECT_NE(oPart.errors.find("compression JPEG"), std::string::npos) << oPart.errors;
    const std::unique_ptr<krv::gobs::Raster> poPart(BasicReader(lossy).ReadRaster(3, 5, 64, 32));
    EXPECT_EQ(ReadPixels(BasicReader(out)), std::string(poPart->GetBuffer(), poPart->GetBuffer() + 64 * 32));
    EXPECT_EQ(Valid(out, {0, 0, 64, 32}), Valid(lossy, {3, 5, 64, 32}));
}

// Display defaults get the numbers of the copy, references to the file's own table follow the copied table, and a
// window moves everything that counts pixels.
TEST(Convert, RealFilesKeepTheirDisplayInASubset)
{
    const std::string colours = DataFolder() + "/optical/L7_ETMs.tif";
    if (!std::filesystem::exists(colours))
        GTEST_SKIP() << "no folder of real files";
    const TempFolder oFolder;
    const std::string file = oFolder.File("file.tif"), copy = oFolder.File("copy.tif");
    ASSERT_EQ(RunConvert({colours, file}).code, 0);
    {
        const auto poDataset = OpenFile(file);
        krv::datasources::SetDefaultRed(poDataset.get(), 4);
        krv::datasources::SetDefaultGreen(poDataset.get(), 3);
        krv::datasources::SetDefaultBlue(poDataset.get(), 2);
        krv::datasources::SetDefaultLUT(poDataset.get(), 3, "other.dat", "LUT", 7);
        poDataset->Close();
    }
    ASSERT_EQ(RunConvert({file, copy, "--channels", "3,1,4", "--window", "10,20,100,50"}).code, 0);
    const json oInfo = RunKrv({"info", copy, "--json"}).Json();
    EXPECT_EQ(oInfo["displayDefaults"], json::parse(R"({"red": 3, "green": 1, "blue": null, "gray": null})"));
    EXPECT_EQ(oInfo["channels"][0]["defaultLUT"], json::parse(R"({"file": "other.dat", "layer": "LUT", "number": 7})"));
    const json oOld = RunKrv({"info", file, "--json"}).Json();
    for (const int nAxis : {0, 3})
        EXPECT_EQ(oInfo["geocoding"][nAxis].get<double>(), oOld["geocoding"][nAxis].get<double>() +
                                                               10 * oOld["geocoding"][nAxis + 1].get<double>() +
                                                               20 * oOld["geocoding"][nAxis + 2].get<double>());
    EXPECT_EQ(oInfo["crs"], oOld["crs"]);
    std::unique_ptr<krv::gobs::Raster> poPart(BasicReader(file, {3, 1, 4}).ReadRaster(10, 20, 100, 50));
    EXPECT_EQ(PixelsOf(*poPart), ReadPixels(BasicReader(copy)));
    const std::string table = oFolder.File("table.tif");
    ASSERT_EQ(RunConvert({DataFolder() + "/palette/lc.tif", table}).code, 0);
    {
        const auto poDataset = OpenFile(table);
        krv::datasources::SetDefaultPCT(poDataset.get(), 1, table, "PCT", 1);
        poDataset->Close();
    }
    ASSERT_EQ(RunConvert({table, copy, "--window", "0,0,5,5"}).code, 0);
    EXPECT_EQ(RunKrv({"info", copy, "--json"}).Json()["channels"][0]["defaultPCT"]["file"], copy);
    EXPECT_EQ(RunKrv({"info", copy, "--json"}).Json()["colourTables"].size(), 1U);
    const std::string points = DataFolder() + "/geometry/austrian_capitals_model_tie_points_pixel_is_area.tif";
    ASSERT_EQ(RunConvert({points, copy, "--window", "3,2,5,5"}).code, 0);
    const auto Points = [](const std::string& name)
    {
        std::istringstream oText(
            RunKrv({"info", name, "--json"}).Json()["metadata"]["GroundControlPoints"].get<std::string>());
        double nColumn = 0, nRow = 0;
        oText >> nColumn >> nRow;
        return std::pair(nColumn, nRow);
    };
    EXPECT_EQ(Points(copy), std::pair(Points(points).first - 3, Points(points).second - 2));
}

// Files are stacked, types converted, no-data values kept by channel; the reference reads through the library.
TEST(Convert, StacksAndConvertsTypes)
{
    using namespace krv::gobs;
    const TempFolder oFolder;
    const std::string a = oFolder.File("a.dem"), b = oFolder.File("b.dem"), out = oFolder.File("out.tif");
    krv::test::WriteDemoFile(a, 70, 300, {eDT_8U, eDT_16S, eDT_8U}, {{"NO_DATA_VALUE", "-5"}});
    krv::test::WriteDemoFile(b, 70, 300, {eDT_32R, eDT_16S});
    ExpectFailure(RunConvert({a, b, out}), 2, {"8U and 16S"});
    EXPECT_FALSE(std::filesystem::exists(out));

    const auto oRun = RunConvert({a, b, out, "--type", "promoted", "--options", "BLOCKXSIZE=32 BLOCKYSIZE=32"});
    ASSERT_EQ(oRun.code, 0) << oRun.errors;
    EXPECT_EQ(oRun.errors, "");
    const auto poOut = OpenFile(out, eReadOnly);
    using krv::datasources::MultiTypeReader;
    EXPECT_EQ(ReadPixels(BasicReader(out, {1, 2, 3})),
              ReadPixels(MultiTypeReader(a, {1, 2, 3}, DataType(eDT_32R), krv::datasources::eOwnPlace)));
    EXPECT_EQ(ReadPixels(BasicReader(out, {4, 5})),
              ReadPixels(MultiTypeReader(b, {1, 2}, DataType(eDT_32R), krv::datasources::eOwnPlace)));
    const auto oRecord = poOut->ReadAuxiliaryData();
    EXPECT_EQ(oRecord.GetFileMetadataValue("NO_DATA_VALUE"), "");
    EXPECT_EQ(oRecord.GetChanMetadataValue("NO_DATA_VALUE", 3), "-5");
    EXPECT_EQ(oRecord.GetChanMetadataValue("NO_DATA_VALUE", 4), "");

    const auto oLossy = RunConvert({a, out, "--channels", "2", "--type", "8u"});
    EXPECT_EQ(oLossy.code, 0);
    EXPECT_NE(oLossy.errors.find("type 8U cannot hold the no-data value -5"), std::string::npos) << oLossy.errors;
    EXPECT_NE(oLossy.errors.find("16S to 8U"), std::string::npos) << oLossy.errors;
    EXPECT_EQ(ReadPixels(BasicReader(out)), ReadPixels(MultiTypeReader(a, {2}, DataType(eDT_8U))));
}

TEST(Convert, BitmapsAreCut)
{
    const TempFolder oFolder;
    const std::string file = oFolder.File("file.tif"), copy = oFolder.File("copy.tif");
    krv::test::WriteDemoFile(oFolder.File("a.dem"), 60, 40, {krv::gobs::eDT_16U});
    ASSERT_EQ(RunConvert({oFolder.File("a.dem"), file}).code, 0);
    const auto poFile = OpenFile(file);
    auto* const poBitmaps = dynamic_cast<krv::datasources::IBitmapDataset*>(poFile.get());
    for (const unsigned int nBitmap : {poBitmaps->CreateBitmap(), poBitmaps->CreateBitmap()})
    {
        krv::datasources::BasicWriter oWriter(poBitmaps, {nBitmap});
        const std::unique_ptr<krv::gobs::Raster> poRaster(oWriter.ReadRaster(0, 0, 60, 40));
        poRaster->GetBuffer()[21 * 60 + 11 + nBitmap] = 1;
        oWriter.WriteRaster(poRaster.get());
    }
    poBitmaps->SetBitmapDescription(1, "");
    poBitmaps->SetBitmapDescription(2, "clouds");
    poFile->Close();
    ASSERT_EQ(RunConvert({file, copy, "--window", "11,20,30,10"}).code, 0);
    const auto poCopy = OpenFile(copy, eReadOnly);
    auto* const poCut = dynamic_cast<krv::datasources::IBitmapDataset*>(poCopy.get());
    ASSERT_EQ(poCut->GetBitmapList(), (std::vector<unsigned int>{1, 2}));
    EXPECT_EQ(poCut->GetBitmapDescription(1) + poCut->GetBitmapDescription(2), "clouds");
    for (const unsigned int nBitmap : {1U, 2U})
    {
        BasicReader oReader(poCut, {nBitmap}, false);
        std::string expected(300, '\0');
        expected[30 + nBitmap] = 1;
        EXPECT_EQ(ReadPixels(oReader), expected);
    }
    // The bitmaps of a later file of a stack say nothing of the first one's channels.
    const auto oStack = RunConvert({oFolder.File("a.dem"), file, oFolder.File("stack.tif")});
    EXPECT_NE(oStack.errors.find("those of the first file"), std::string::npos) << oStack.errors;
    const auto poStack = OpenFile(oFolder.File("stack.tif"), eReadOnly);
    EXPECT_TRUE(dynamic_cast<krv::datasources::IBitmapDataset&>(*poStack).GetBitmapList().empty());
}

// Each channel keeps the pixels that its own mask leaves, under its new number, wherever the format keeps masks.
TEST(Convert, MasksOfChannelsFollowThem)
{
    const TempFolder oFolder;
    const std::string file = oFolder.File("file.img");
    krv::test::WriteDemoFile(oFolder.File("a.dem"), 60, 40, {krv::gobs::eDT_8U, krv::gobs::eDT_8U, krv::gobs::eDT_8U});
    ASSERT_EQ(RunConvert({oFolder.File("a.dem"), file}).code, 0);
    const auto poFile = OpenFile(file);
    auto& oBitmaps = dynamic_cast<krv::datasources::IBitmapDataset&>(*poFile);
    for (const unsigned int nChannel : {1U, 2U, 3U})
    {
        const unsigned int nMask = oBitmaps.CreateBitmap();
        oBitmaps.SetBitmapMetadata(nMask, {{krv::datasources::VALIDITY_OF_CHANNEL, std::to_string(nChannel)}});
        krv::datasources::BasicWriter oWriter(&oBitmaps, {nMask});
        const std::unique_ptr<krv::gobs::Raster> poRaster(oWriter.ReadRaster(0, 0, 60, 40));
        std::fill_n(poRaster->GetBuffer(), std::size_t{100} * nChannel, static_cast<unsigned char>(1));
        oWriter.WriteRaster(poRaster.get());
    }
    poFile->Close();
    const std::pair<Texts, std::vector<int>> COPIES[] = {{{"--channels", "3,1"}, {300, 100}},
                                                         {{"--channels", "2", "--window", "0,0,60,3"}, {180}},
                                                         {{"--type", "16U", "--scale", "0,9"}, {100, 200, 300}}};
    const auto CompareValid = [](const std::string& copy, const std::vector<int>& oValid)
    {
        const auto oChannels = krv::test::RunKrv({"stats", copy, "--json"}).Json()["channels"];
        ASSERT_EQ(oChannels.size(), oValid.size());
        for (std::size_t n = 0; n < oValid.size(); ++n)
            EXPECT_EQ(oChannels[n]["valid"], oValid[n]) << copy << ", channel " << n;
    };
    for (const char* const pName : {"copy.tif", "copy.krv", "copy.img", "copy.jp2", "copy.j2k", "copy.demo"})
        for (const auto& [oOptions, oValid] : COPIES)
        {
            SCOPED_TRACE(oOptions.back());
            Texts oArguments = {file, oFolder.File(pName)};
            oArguments.insert(oArguments.end(), oOptions.begin(), oOptions.end());
            const auto oRun = RunConvert(oArguments);
            EXPECT_TRUE(oRun.code == 0 && oRun.errors.empty()) << pName << ": " << oRun.errors;
            CompareValid(oFolder.File(pName), oValid);
        }
    // So do the pixels of another grid, where a value stands for those that are not valid.
    const std::string warped = oFolder.File("warped.tif");
    ASSERT_EQ(krv::test::RunKrv({"edit", file, "--origin", "0,40", "--pixel-size", "1"}).code, 0);
    EXPECT_NE(krv::test::RunKrv({"warp", file, warped, "--resolution", "1"}).errors.find("mask of a channel"),
              std::string::npos);
    ASSERT_EQ(krv::test::RunKrv({"warp", file, warped, "--resolution", "1", "--no-data", "0"}).code, 0);
    CompareValid(warped, {100, 200, 300});
}

TEST(Convert, FailuresLeaveNothingBehindAndTheOldFileAsItWas)
{
    const TempFolder oFolder;
    const std::string a = oFolder.File("a.dem"), b = oFolder.File("b.dem"), out = oFolder.Write("out.tif", "old");
    krv::test::WriteDemoFile(a, 50, 40, {krv::gobs::eDT_8U});
    krv::test::WriteDemoFile(b, 40, 50, {krv::gobs::eDT_8U});
    krv::test::ExpectRefusals("convert",
                              {{{a, oFolder.GetPath() + "/./a.dem"}, 2, "is the file itself"},
                               {{a, b, out}, 1, "of one size"},
                               {{a, out, "--window", "20,0,31,40"}, 2, "not inside the image of 50 x 40"},
                               {{a, out, "--window", "1,2"}, 2, "x,y,width,height"},
                               {{a, out, "--channels", "2"}, 2, "no channel 2"},
                               {{a, out, "--type", "9U"}, 2, "9U"},
                               {{a, out, "--format", "NONE"}, 2, "NONE"},
                               {{a, out, "--options", "COMPRESS=MAGIC"}, 2, "COMPRESS does not take \"MAGIC\""},
                               {{a, out, "--options", "PREDICTOR=3 COMPRESS=LZW"}, 2, "8U"},
                               {{a, out, "--window", "0,0,99999999999,5"}, 2, "above 4294967295"},
                               {{a, out, "--channels", ""}, 2, "--channels: the value is empty"},
                               {{a, oFolder.File("out.bmp")}, 2, "extension .bmp"},
                               {{a, oFolder.GetPath() + "/none/out.tif"}, 1, "there is no folder " + oFolder.GetPath()},
                               {{a, oFolder.GetPath()}, 2, "no plain file"}});
    // A file that ends in the middle of its pixels fails on the way.
    std::filesystem::resize_file(a, std::filesystem::file_size(a) - 900);
    ExpectFailure(RunConvert({a, out}), 1, {"a.dem"});
    EXPECT_EQ(krv::conformance::ReadFile(out), "old");

    const std::string large = oFolder.File("large.dem");
    krv::test::WriteDemoFile(large, 1, 1, {krv::gobs::eDT_64R});
    std::string bytes = krv::conformance::ReadFile(large);
    bytes.replace(bytes.find("1 1"), 3, "9000 9000");
    krv::conformance::WriteFile(large, bytes);
    std::filesystem::resize_file(large, bytes.size() + std::uint64_t{9000} * 9000 * 8);
    const auto oStopped =
        krv::test::RunProgram(KRV_PROGRAM, {"convert", large, out, "--options", "COMPRESS=DEFLATE LEVEL=9"}, {}, 300);
    ExpectFailure(oStopped, 130, {"interrupted"});
    EXPECT_EQ(krv::conformance::ReadFile(out), "old");
    EXPECT_EQ(std::distance(std::filesystem::directory_iterator(oFolder.GetPath()), {}), 4);
}

} // namespace

} // namespace krv::tool
