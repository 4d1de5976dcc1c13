// Copies of files by the command: real ones, when the folder with them is there, and small ones made here.

#include "datasources/interfaces/accessmode.h"
#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/displaydefaults.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/multitypereader.h"
#include "datasources/writer/basicwriter.h"
#include "tests/support/demofile.h"
#include "tests/support/facts.h"
#include "tests/support/pixels.h"
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
    for (const char* pName : {"file", "blockWidth", "blockHeight", "overviews", "furtherImages", "unusedBytes"})
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
    ExpectFailure(RunConvert({a, b, out}), 1, {"8U and 16S"});
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

TEST(Convert, ACloudOptimisedCopyHasItsLevels)
{
    const TempFolder oFolder;
    const std::string a = oFolder.File("a.dem"), out = oFolder.File("out.tif"), plain = oFolder.File("plain.tif");
    krv::test::WriteDemoFile(a, 900, 600, {krv::gobs::eDT_16U, krv::gobs::eDT_16U});
    ASSERT_EQ(RunConvert({a, out, "--options", "layout=cog COMPRESS=ZSTD"}).code, 0);
    ASSERT_EQ(RunConvert({a, plain}).code, 0);
    ASSERT_EQ(RunKrv({"overviews", plain}).code, 0);
    EXPECT_EQ(Sums(out), Sums(a));
    EXPECT_EQ(RunKrv({"info", out, "--json"}).Json()["overviews"],
              RunKrv({"info", plain, "--json"}).Json()["overviews"]);
    const auto oLevel = RunKrv({"checksum", out, "--level", "4"});
    EXPECT_EQ(oLevel.code, 0) << oLevel.errors;
    EXPECT_EQ(oLevel.output, RunKrv({"checksum", plain, "--level", "4"}).output);
    EXPECT_EQ(std::distance(std::filesystem::directory_iterator(oFolder.GetPath()), {}), 3);
}

// Types that TIFF cannot mix stay apart in a format that can.
TEST(Convert, MixedTypesGoIntoAFormatThatHoldsThem)
{
    const TempFolder oFolder;
    const std::string a = oFolder.File("a.dem"), out = oFolder.File("out.dem");
    krv::test::WriteDemoFile(a, 70, 50, {krv::gobs::eDT_8U, krv::gobs::eDT_32R, krv::gobs::eDT_C16S});
    const auto oRun = RunConvert({a, a, out, "--channels", "3,1,2,5", "--format", "DEMO"});
    if (oRun.errors.find("cannot create") != std::string::npos)
        GTEST_SKIP() << oRun.errors;
    ASSERT_EQ(oRun.code, 0) << oRun.errors;
    const json oOld = RunKrv({"checksum", a, "--json"}).Json()["channels"];
    const json oNew = RunKrv({"checksum", out, "--json"}).Json()["channels"];
    ASSERT_EQ(oNew.size(), 4U);
    std::size_t nAt = 0;
    for (const std::size_t nFrom : {2U, 0U, 1U, 1U})
        EXPECT_EQ(oNew[nAt++]["crc32"], oOld[nFrom]["crc32"]);
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
                               {{a, out, "--options", "COMPRESS=MAGIC"}, 2, "COMPRESS=MAGIC"},
                               {{a, out, "--options", "PREDICTOR=3 COMPRESS=LZW"}, 2, "8U"},
                               {{a, out, "--window", "0,0,99999999999,5"}, 2, "above 4294967295"},
                               {{a, out, "--channels", ""}, 2, "--channels: the value is empty"},
                               {{a, oFolder.File("out.png")}, 2, "extension .png"},
                               {{a, oFolder.GetPath() + "/none/out.tif"}, 1, "there is no folder " + oFolder.GetPath()},
                               {{a, oFolder.GetPath()}, 1, "no plain file"}});
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
    ExpectFailure(oStopped, 1, {"stopped"});
    EXPECT_EQ(krv::conformance::ReadFile(out), "old");
    EXPECT_EQ(std::distance(std::filesystem::directory_iterator(oFolder.GetPath()), {}), 4);
}

} // namespace

} // namespace krv::tool
