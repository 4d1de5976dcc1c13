// The command as users run it, on files made here.

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "gobs/raster/datatype.h"
#include "tests/support/demofile.h"
#include "tests/support/tiffwriter.h"
#include "tests/tools/programrun.h"
#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>
#include <png.h>
#include <sys/stat.h>

#include <algorithm>
#include <filesystem>

namespace krv::tool
{

namespace
{

using krv::conformance::TempFolder;
using krv::test::ExpectFailure;
using krv::test::ProgramRun;
using krv::test::RunKrv;
using krv::test::RunProgram;
using nlohmann::json;

// A sample scene of 300 pixels, made once.
const std::string& SceneFolder()
{
    static const TempFolder oFolder;
    static const ProgramRun oRun = RunProgram(KRV_SAMPLESCENE_PROGRAM, {oFolder.GetPath(), "--size", "300"});
    EXPECT_EQ(oRun.code, 0) << oRun.errors;
    return oFolder.GetPath();
}

TEST(Command, FormatsListsWhatIsInstalled)
{
    const auto oRun = RunKrv({"formats", "--json"});
    ASSERT_EQ(oRun.code, 0) << oRun.errors;
    const json oFormats = oRun.Json()["formats"];
    const auto oTif = std::find_if(oFormats.begin(), oFormats.end(), [](const json& o) { return o["name"] == "TIF"; });
    ASSERT_NE(oTif, oFormats.end());
    EXPECT_TRUE((*oTif)["capabilities"]["create"].is_boolean());
    EXPECT_NE(RunKrv({"formats"}).output.find("TIF"), std::string::npos);
}

TEST(Command, InfoKeepsItsFieldNames)
{
    const auto oRun = RunKrv({"info", SceneFolder() + "/rgb.tif", "--json"});
    ASSERT_EQ(oRun.code, 0) << oRun.errors;
    const json oInfo = oRun.Json();
    for (const char* pName : {"file", "format", "width", "height", "blockWidth", "blockHeight", "channels", "metadata",
                              "geocoding", "crs", "overviews", "bitmaps", "mathModels", "unusedBytes"})
        EXPECT_TRUE(oInfo.contains(pName)) << pName;
    EXPECT_EQ(oInfo["width"], 300);
    EXPECT_EQ(oInfo["blockWidth"], 256);
    EXPECT_EQ(oInfo["geocoding"], json::parse("[288140.0, 10.0, 0.0, 5442360.0, 0.0, -10.0]"));
    EXPECT_EQ(oInfo["crs"]["epsg"], 32719);
    EXPECT_EQ(oInfo["crs"]["name"], "WGS 84 / UTM zone 19S");
    EXPECT_EQ(oInfo["channels"][2]["number"], 3);
    EXPECT_EQ(oInfo["channels"][2]["type"], "8U");
    EXPECT_EQ(oInfo["channels"][2]["noData"], "0");
    EXPECT_EQ(oInfo["channels"][2]["description"], "Blue");
    EXPECT_EQ(oInfo["overviews"], json::array());
    EXPECT_EQ(oInfo["unusedBytes"], nullptr) << "made elsewhere";
    const TempFolder oFolder;
    const std::string copy = oFolder.File("copy.tif");
    ASSERT_EQ(RunKrv({"convert", SceneFolder() + "/rgb.tif", copy}).code, 0);
    EXPECT_LT(RunKrv({"info", copy, "--json"}).Json()["unusedBytes"], 16384) << "the gap before the first block";
    ASSERT_EQ(RunKrv({"overviews", copy, "--levels", "2"}).code, 0);
    EXPECT_GT(RunKrv({"info", copy, "--json"}).Json()["unusedBytes"], 0);
    EXPECT_NE(RunKrv({"info", copy}).output.find("\n  unused "), std::string::npos);
    const std::string text = RunKrv({"info", SceneFolder() + "/pan.tif"}).output;
    EXPECT_NE(text.find("EPSG:32719"), std::string::npos) << text;
    EXPECT_NE(text.find("16U"), std::string::npos) << text;
}

TEST(Command, MixedTypesKeepTheOrderOfTheChannels)
{
    const TempFolder oFolder;
    const std::string file = oFolder.File("mixed.demo");
    krv::test::WriteDemoFile(file, 40, 30, {krv::gobs::eDT_8U, krv::gobs::eDT_64R, krv::gobs::eDT_C16S});
    const json oChannels = RunKrv({"checksum", file, "--json"}).Json()["channels"];
    EXPECT_EQ(oChannels[2]["number"], 3);
    EXPECT_EQ(oChannels[2]["type"], "C16S");
    EXPECT_EQ(RunKrv({"checksum", file, "--channels", "3,1", "--json"}).Json()["channels"],
              json::array({oChannels[2], oChannels[0]}));
    EXPECT_EQ(RunKrv({"stats", file, "--json"}).Json()["channels"][2]["of"], "magnitude");
    EXPECT_EQ(RunKrv({"walk", file, "--margins", "3", "--json"}).code, 0);
    EXPECT_EQ(RunKrv({"view", file, oFolder.File("mixed.png")}).code, 0);
}

TEST(Command, WalkDeliversEveryTileWithItsMargins)
{
    const auto oRun = RunKrv({"walk", SceneFolder() + "/rgb.tif", "--tile", "100,150", "--margins", "8,4",
                              "--behaviour", "replicate", "--json"});
    ASSERT_EQ(oRun.code, 0) << oRun.errors;
    EXPECT_EQ(oRun.Json()["tiles"], 6);
    EXPECT_EQ(oRun.Json()["xMargin"], 8);
    EXPECT_EQ(oRun.Json()["pixels"], 6 * 116 * 158);
    EXPECT_EQ(oRun.Json()["bytes"], 6 * 116 * 158 * 3);
    ExpectFailure(RunKrv({"walk", SceneFolder() + "/rgb.tif", "--margins", "8", "--behaviour", "exception"}), 1,
                  {"rgb.tif", "--behaviour"});
}

png_image ReadPng(const std::string& file, std::vector<unsigned char>& oPixels)
{
    png_image oImage{};
    oImage.version = PNG_IMAGE_VERSION;
    EXPECT_NE(png_image_begin_read_from_file(&oImage, file.c_str()), 0) << oImage.message;
    oImage.format = PNG_FORMAT_RGBA;
    oPixels.resize(PNG_IMAGE_SIZE(oImage));
    EXPECT_NE(png_image_finish_read(&oImage, nullptr, oPixels.data(), 0, nullptr), 0) << oImage.message;
    return oImage;
}

TEST(Command, ViewMakesMissingPixelsTransparent)
{
    const TempFolder oFolder;
    const std::string target = oFolder.File("look.png");
    const auto oRun = RunKrv({"view", SceneFolder() + "/rgb.tif", target, "--size", "100"});
    ASSERT_EQ(oRun.code, 0) << oRun.errors;
    std::vector<unsigned char> oPixels;
    const png_image oImage = ReadPng(target, oPixels);
    ASSERT_EQ(oImage.width, 100U);
    ASSERT_EQ(oImage.height, 100U);
    EXPECT_EQ(oPixels[3], 0);
    EXPECT_EQ(oPixels[(50 * 100 + 50) * 4 + 3], 255);
    ASSERT_EQ(RunKrv({"view", SceneFolder() + "/pan.tif", target, "--size", "5000"}).code, 0);
    EXPECT_EQ(ReadPng(target, oPixels).width, 300U);
    EXPECT_EQ(RunKrv({"view", SceneFolder() + "/pan.tif", target, "--stretch", "MinMax"}).code, 0);
    std::filesystem::remove(target);
    ExpectFailure(RunKrv({"view", "a", "b", "--stretch", "much"}), 2, {"much"});
    ExpectFailure(RunKrv({"view", SceneFolder() + "/pan.tif", oFolder.GetPath() + "/no/look.png"}), 1,
                  {"no/look.png", "there is no folder"});
    ASSERT_EQ(mkfifo(target.c_str(), 0600), 0);
    ExpectFailure(RunKrv({"view", SceneFolder() + "/pan.tif", target}), 1, {target, "not a regular file"});
    EXPECT_TRUE(std::filesystem::is_fifo(target));
    ExpectFailure(RunKrv({"view", SceneFolder() + "/rgb.tif", target, "--channels", "1,2"}), 2, {"three"});
    EXPECT_EQ(std::distance(std::filesystem::directory_iterator(oFolder.GetPath()), {}), 1);
}

TEST(Command, WrongUsageIsTwo)
{
    EXPECT_EQ(RunKrv({}).code, 2);
    EXPECT_EQ(RunKrv({"explode"}).code, 2);
    EXPECT_EQ(RunKrv({"info"}).code, 2);
    ExpectFailure(RunKrv({"info", "a", "--non\x1bsense"}), 2, {"--non\\x1bsense"});
    EXPECT_EQ(RunKrv({"view", "a", "b", "--size", "0"}).code, 2);
    ExpectFailure(RunKrv({"view", "a", "b", "--size", "9", "--size", "8"}), 2, {"--size is given more than once"});
    EXPECT_EQ(RunKrv({"--help"}).code, 0);
    EXPECT_EQ(RunKrv({"--version"}).code, 0);
    const std::string scene = SceneFolder() + "/rgb.tif";
    ExpectFailure(RunKrv({"checksum", scene, "--channels", "4"}), 2, {"rgb.tif", "no channel 4", "1 to 3"});
    ExpectFailure(RunKrv({"checksum", scene, "--channels", "1;2"}), 2, {"--channels"});
    ExpectFailure(RunKrv({"checksum", scene, "--level", "2"}), 2, {"rgb.tif", "no level 2"});
    ExpectFailure(RunKrv({"walk", scene, "--margins", "151,0"}), 2, {"--margins", "half"});
    ExpectFailure(RunKrv({"walk", scene, "--tile", "0,8"}), 2, {"--tile"});
}

TEST(Command, ErrorsNameFileCauseAndRemedy)
{
    const TempFolder oFolder;
    const std::string text = oFolder.Write("notes.txt", "hello");
    const std::string scene = krv::conformance::ReadFile(SceneFolder() + "/rgb.tif");
    const std::string cut = oFolder.Write("cut.tif", scene.substr(0, scene.size() / 2));
    ExpectFailure(RunKrv({"info", oFolder.File("none.tif")}), 1, {"none.tif", "no such file", "check"});
    ExpectFailure(RunKrv({"stats", oFolder.GetPath()}), 1, {oFolder.GetPath(), "folder"});
    ExpectFailure(RunKrv({"info", text}), 1, {"notes.txt", "no format recognises", "krv doctor"});
    ExpectFailure(RunKrv({"checksum", cut}), 1, {"cut.tif"});
    ExpectFailure(RunKrv({"info", oFolder.File("none.tif"), "--verbose"}), 1, {"["});
    const auto oDoctor = RunKrv({"doctor", text});
    EXPECT_EQ(oDoctor.code, 1);
    EXPECT_NE(oDoctor.output.find("no format recognises it"), std::string::npos) << oDoctor.output;
    EXPECT_EQ(RunKrv({"doctor", SceneFolder() + "/rgb.tif"}).code, 0);
}

TEST(Command, BrokenInstallationsAreDiagnosed)
{
    const TempFolder oHome;
    const std::vector<std::string> oEnvironment{"KRVHOME=" + oHome.GetPath()};
    const auto Expect = [&](const std::vector<std::string>& oErrorWords, const std::string& doctorWord)
    {
        ExpectFailure(RunKrv({"formats"}, oEnvironment), 1, oErrorWords);
        const auto oDoctor = RunKrv({"doctor"}, oEnvironment);
        EXPECT_EQ(oDoctor.code, 1);
        EXPECT_TRUE(oDoctor.errors.empty()) << oDoctor.errors;
        EXPECT_NE(oDoctor.output.find(doctorWord), std::string::npos) << oDoctor.output;
    };
    Expect({"availableformats.xml", "KRVHOME"}, "no such file");
    oHome.Write("etc/qrfformats/availableformats.xml", "<Formats><Format>x.xml");
    Expect({"availableformats.xml", "reinstall"}, "mend the XML");
    oHome.Write("etc/qrfformats/availableformats.xml", "<Formats/>");
    Expect({"availableformats.xml", "lists no format"}, "lists no format");
    oHome.Write("etc/qrfformats/availableformats.xml", "<Formats><Format><!-- none --> </Format></Formats>");
    Expect({"availableformats.xml", "an entry is empty"}, "an entry is empty");
    oHome.Write("etc/qrfformats/availableformats.xml", "<Formats><Format> x.xml </Format></Formats>");
    Expect({"x.xml"}, "description x.xml");
    oHome.Write("etc/qrfformats/x.xml", "<Format><Object/></Format>");
    Expect({"availableformats.xml", "names no library"}, "names no library");
    oHome.Write("etc/qrfformats/x.xml", "<Format><Object>nowhere</Object></Format>");
    Expect({"nowhere.so", "registry"}, "plug-in nowhere.so: does not load");
    oHome.Write("lib/qrfformats/nowhere.so", "no library at all");
    Expect({"nowhere.so"}, "plug-in nowhere.so: does not load");
}

// A tiled file of zeros; its blocks but the first are not stored.
void WriteSparse(const std::string& file, unsigned int nSize, const char* pDescription)
{
    const krv::test::TiffFile poTiff = krv::test::NewTiff(file, "w8");
    krv::test::SetForm(poTiff.get(), {.mnWidth = nSize, .mnHeight = nSize, .mnRows = 512, .mnTileWidth = 512});
    TIFFSetField(poTiff.get(), TIFFTAG_IMAGEDESCRIPTION, pDescription);
    krv::test::WriteBlock(poTiff.get(), 0, std::vector<unsigned char>(512 * 512));
}

TEST(Command, ForeignBytesInMetadataKeepTheJsonValid)
{
    const TempFolder oFolder;
    const std::string file = oFolder.File("bytes.tif");
    WriteSparse(file, 16, "caf\xE9 \xFF\xFE\x01 end");
    const auto oRun = RunKrv({"info", file, "--json"});
    ASSERT_EQ(oRun.code, 0) << oRun.errors;
    EXPECT_NE(oRun.Json()["metadata"].dump().find(" end"), std::string::npos);
    EXPECT_EQ(RunKrv({"info", file}).output.find('\x01'), std::string::npos);
}

TEST(Command, ANativeFileWithoutChannelsIsSound)
{
    using namespace krv::datasources;
    const TempFolder oFolder;
    const std::string file = oFolder.File("empty.krv");
    {
        const std::unique_ptr<IDataset> poNew(DatasetManager::GetInstance()->NewDataset(file, "KRVDSK", ""));
        auto& oRaster = dynamic_cast<IRasterDataset&>(*poNew);
        oRaster.Create(40, 30, {krv::gobs::eDT_8U});
        std::unique_ptr<IOverviewManager>(oRaster.GetOverviewManager())->CreateLevel(2);
        oRaster.DeleteChannel(1);
        poNew->Close();
    }
    const auto oDoctor = RunKrv({"doctor", file});
    EXPECT_EQ(oDoctor.code, 0) << oDoctor.output;
    EXPECT_NE(oDoctor.output.find("40 x 30 pixels, no channels"), std::string::npos) << oDoctor.output;
    EXPECT_NE(oDoctor.output.find("begins like a native file"), std::string::npos) << oDoctor.output;
}

// What spoils a part leaves the rest to be shown, and `doctor` names it.
TEST(Command, SpoiltPartsAreNamedAndTheRestIsShown)
{
    const TempFolder oFolder;
    const std::string file = oFolder.File("spoilt.tif"), other = oFolder.File("chain.tif");
    WriteSparse(file, 16, "<no xml & no end");
    std::string bytes = krv::conformance::ReadFile(file);
    const std::size_t nTag = bytes.find(std::string("\x0E\x01\x02\0", 4));
    ASSERT_NE(nTag, std::string::npos);
    bytes.replace(nTag, 2, "\x80\xA4"); // the description becomes tag 42112
    oFolder.Write("spoilt.tif", bytes);
    WriteSparse(other, 16, "fine");
    bytes = krv::conformance::ReadFile(other);
    std::uint64_t nDirectory = 0;
    std::memcpy(&nDirectory, &bytes[8], 8);
    bytes.replace(nDirectory + 8 + 20 * static_cast<unsigned char>(bytes[nDirectory]), 8, "\x7F\x7F\x7F\0\0\0\0\0", 8);
    oFolder.Write("chain.tif", bytes);
    for (const auto& [name, words] :
         {std::pair(file, "spoilt.tif: tag 42112"), std::pair(other, "chain of directories")})
    {
        const auto oInfo = RunKrv({"info", name});
        EXPECT_EQ(oInfo.code, 0) << oInfo.errors;
        EXPECT_NE(oInfo.errors.find(words), std::string::npos) << oInfo.errors;
        EXPECT_EQ(oInfo.errors.find(words), oInfo.errors.rfind(words)) << "said once";
        EXPECT_EQ(RunKrv({"view", name, oFolder.File("a.png")}).code, 0);
        EXPECT_EQ(RunKrv({"convert", name, oFolder.File("copy.tif")}).code, 0);
        const auto oDoctor = RunKrv({"doctor", name});
        EXPECT_EQ(oDoctor.code, 1);
        EXPECT_NE(oDoctor.output.find(words), std::string::npos) << oDoctor.output;
    }
}

} // namespace

} // namespace krv::tool
