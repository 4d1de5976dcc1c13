// Words of the command: what it says of slips, what it says of itself, and homes of one's own.

#include "tests/tools/programrun.h"
#include "tools/conformance/tempfolder.h"
#include "tools/krv/nearestword.h"

#include <gtest/gtest.h>

#include <filesystem>

namespace krv::tool
{

namespace
{

using krv::conformance::ReadFile;
using krv::conformance::TempFolder;
using krv::test::ExpectFailure;
using krv::test::RunKrv;
using nlohmann::json;

TEST(Words, SlipsAreNamedWithWhatIsMeant)
{
    EXPECT_EQ(FindNearestWord("inof", {"view", "info", "link"}), "info");
    EXPECT_EQ(FindNearestWord("xyzzy", {"view", "info"}), "");
    ExpectFailure(RunKrv({"--threads", "2", "inof", "x"}), 2, {"\"inof\"", "is info meant?"});
    ExpectFailure(RunKrv({"explode"}), 2, {"convert", "warp"});
    ExpectFailure(RunKrv({"stats", "x", "--percentile=2"}), 2, {"is --percentiles meant?"});
    ExpectFailure(RunKrv({"view", "x", "y.png", "--stretch", "ful"}), 2,
                  {"--stretch", "\"ful\" is none of auto, none, percentile, minmax"});
    ExpectFailure(RunKrv({"view", "x", "y.gif"}), 2, {"y.gif", ".png or .jpg"});
    ExpectFailure(RunKrv({"convert", "x", "y", "--type", "float31"}), 2, {"float31", "float32"});
    ExpectFailure(RunKrv({"stats", "x", "--channels", "3-1"}), 2, {"3-1"});
    ExpectFailure(RunKrv({"formats", "TIFF"}), 2, {"TIFF", "TIF"});
}

TEST(Words, RangesTypesAndSeveralFilesAreUnderstood)
{
    const TempFolder oFolder;
    krv::test::RunProgram(KRV_SAMPLESCENE_PROGRAM, {oFolder.GetPath(), "--size", "200"});
    const std::string scene = oFolder.File("rgb.tif"), copy = oFolder.File("copy.tif");
    ASSERT_EQ(RunKrv({"convert", scene, copy, "--type", "Float32", "--channels", "1-2", "--no-data", "9"}).code, 0);
    const json oFiles = RunKrv({"info", scene, copy, "--json"}).Json()["files"];
    EXPECT_EQ(oFiles[1]["channels"].size(), 2U);
    EXPECT_EQ(oFiles[1]["channels"][0]["type"], "32R");
    EXPECT_EQ(oFiles[1]["channels"][0]["noData"], "9");
    // The median of a channel whose values are all known.
    const std::string scaled = oFolder.File("scaled.tif");
    ASSERT_EQ(RunKrv({"convert", scene, scaled, "--scale", "0,255,0,1", "--type", "64R", "--channels", "2"}).code, 0);
    const json oStored = RunKrv({"stats", scene, "--channels", "2", "--percentiles", "50", "--json"}).Json();
    const json oBack = RunKrv({"stats", scaled, "--unscale", "--percentiles", "0,50", "--json"}).Json();
    const json &oOld = oStored["channels"][0], &oNew = oBack["channels"][0];
    EXPECT_EQ(oNew["valid"], oOld["valid"]);
    EXPECT_NEAR(oNew["mean"].get<double>(), oOld["mean"].get<double>(), 1e-9);
    EXPECT_NEAR(oNew["percentiles"][1]["value"].get<double>(), oOld["percentiles"][0]["value"].get<double>(), 0.01);
    EXPECT_NEAR(oNew["percentiles"][0]["value"].get<double>(), oOld["min"].get<double>(), 0.01);
    std::uint64_t nCounted = 0;
    const json oBinned = RunKrv({"stats", scene, "--bins", "7", "--json"}).Json();
    for (const json& oCount : oBinned["channels"][1]["histogram"]["counts"])
        nCounted += oCount.get<std::uint64_t>();
    EXPECT_EQ(oOld["valid"], nCounted);
}

TEST(Words, TheCommandDescribesItself)
{
    const TempFolder oFolder;
    ASSERT_EQ(RunKrv({"describe", oFolder.File("share")}).code, 0);
    const std::string help = RunKrv({"--help"}).output;
    EXPECT_EQ(help.find("describe"), std::string::npos) << "is for the build";
    const std::string bash = ReadFile(oFolder.File("share/bash-completion/completions/krv"));
    const std::string zsh = ReadFile(oFolder.File("share/zsh/site-functions/_krv"));
    unsigned int nPages = 0;
    for (const auto& oPage : std::filesystem::directory_iterator(oFolder.File("share/man/man1")))
    {
        const std::string name = oPage.path().stem().string();
        nPages += 1;
        if (name == "krv")
            continue;
        EXPECT_NE(help.find(name.substr(4)), std::string::npos) << name;
        EXPECT_NE(bash.find(name.substr(4) + ")"), std::string::npos) << name;
        EXPECT_NE(zsh.find("'" + name.substr(4) + ":"), std::string::npos) << name;
    }
    EXPECT_GT(nPages, 12U);
    EXPECT_NE(ReadFile(oFolder.File("share/man/man1/krv-view.1")).find("\n\\fB\\-\\-stretch\\fR"), std::string::npos);
    // What the shells make of them.
    EXPECT_EQ(krv::test::RunProgram("/bin/bash", {"-n", oFolder.File("share/bash-completion/completions/krv")}).code,
              0);
    const auto Complete = [&](const std::string& words, const char* pAt)
    {
        return krv::test::RunProgram("/bin/bash",
                                     {"-c", "source " + oFolder.File("share/bash-completion/completions/krv") +
                                                "; COMP_WORDS=(" + words + "); COMP_CWORD=" + pAt +
                                                "; _krv; echo ${COMPREPLY[@]}"})
            .output;
    };
    EXPECT_EQ(Complete("krv view a b --stretch m", "5"), "minmax\n");
    EXPECT_EQ(Complete("krv convert a b --type C32", "5"), "C32S C32R\n");
    EXPECT_EQ(Complete("krv convert a b --window 1", "5"), "\n");
}

TEST(Words, OneFileOfSeveralThatFailsLeavesTheOthers)
{
    const TempFolder oFolder;
    const std::string first = oFolder.File("a b.tif"), last = oFolder.File("grün.tif");
    krv::test::RunProgram(KRV_SAMPLESCENE_PROGRAM, {oFolder.GetPath(), "--size", "200"});
    std::filesystem::rename(oFolder.File("rgb.tif"), first);
    std::filesystem::copy(first, last);
    for (const char* pVerb : {"info", "stats", "checksum", "edit"})
    {
        std::vector<std::string> oArguments = {pVerb, first, oFolder.File("missing.tif"), last, "--json"};
        if (oArguments.front() == "edit")
            oArguments.insert(oArguments.end(), {"--tag", "A=B"});
        const auto oResult = RunKrv(oArguments);
        EXPECT_EQ(oResult.code, 1) << pVerb;
        EXPECT_NE(oResult.errors.find("missing.tif"), std::string::npos) << oResult.errors;
        const json oFiles = oResult.Json()["files"];
        ASSERT_EQ(oFiles.size(), 2U) << pVerb;
        EXPECT_EQ(oFiles[1]["file"], last);
    }
    // What the library says of a request, the command names the option of.
    ExpectFailure(RunKrv({"convert", first, oFolder.File("c.tif"), "--format", "NIX"}), 2, {"NIX", "(--format)"});
}

TEST(Words, AHomeOfOnesOwnIsMadeWholeOrNotAtAll)
{
    const TempFolder oFolder;
    const std::string home = oFolder.File("home"), plugin = oFolder.File("demo.so");
    const json oInstalled = RunKrv({"formats", "--json"}).Json();
    const std::filesystem::path oRoot = oInstalled["home"].get<std::string>();
    ASSERT_EQ(RunKrv({"formats", "--home", home}).code, 0);
    const auto oOwn = RunKrv({"formats", "--json"}, {"KRVHOME=" + home});
    ASSERT_EQ(oOwn.code, 0) << oOwn.errors;
    EXPECT_EQ(oOwn.Json()["formats"].size(), oInstalled["formats"].size());
    const std::string registry = home + "/etc/qrfformats/availableformats.xml", bytes = ReadFile(registry);
    oFolder.Write("bad.so", "no library");
    oFolder.Write("bad.xml", "<Format><Object>bad</Object></Format>");
    ExpectFailure(RunKrv({"formats", "--home", home, "--add", oFolder.File("bad.so")}), 2, {"bad.so", "does not load"});
    std::filesystem::copy(oRoot / "lib/qrfformats/demo.so", plugin);
    ExpectFailure(RunKrv({"formats", "--home", home, "--add", plugin}), 2, {"demo.xml", "missing"});
    // The same format under another name.
    std::filesystem::copy(oRoot / "lib/qrfformats/demo.so", oFolder.File("other.so"));
    oFolder.Write("other.xml", "<Format><Object>other</Object></Format>");
    ExpectFailure(RunKrv({"formats", "--home", home, "--add", oFolder.File("other.so")}), 2, {"DEMO", "other.xml"});
    EXPECT_EQ(ReadFile(registry), bytes);
    std::filesystem::copy(oRoot / "etc/qrfformats/demo.xml", oFolder.File("demo.xml"));
    ASSERT_EQ(RunKrv({"formats", "--home", home, "--add", plugin}).code, 0);
    EXPECT_FALSE(std::filesystem::is_symlink(home + "/lib/qrfformats/demo.so"));
    EXPECT_EQ(RunKrv({"doctor"}, {"KRVHOME=" + home}).code, 0);
}

} // namespace

} // namespace krv::tool
