// The command gives the same for any number of threads, byte for byte.

#include "tests/tools/programrun.h"
#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>

#include <filesystem>

namespace krv::tool
{

namespace
{

using krv::conformance::ReadFile;
using krv::conformance::TempFolder;
using krv::test::ProgramRun;
using krv::test::RunKrv;

using Texts = std::vector<std::string>;

Texts WithThreads(Texts oArguments, unsigned int nThreads)
{
    oArguments.insert(oArguments.end(), {"--threads", std::to_string(nThreads)});
    return oArguments;
}

// What a command says, and the file that it makes from a copy of another, or of nothing.
std::string ResultOf(const Texts& oArguments, unsigned int nThreads, const std::string& made, const std::string& from)
{
    std::filesystem::remove(made);
    if (!from.empty())
        std::filesystem::copy_file(from, made);
    const ProgramRun oRun = RunKrv(WithThreads(oArguments, nThreads));
    return std::to_string(oRun.code) + oRun.output + oRun.errors +
           (std::filesystem::exists(made) ? ReadFile(made) : std::string());
}

void ExpectSame(const Texts& oArguments, const std::string& made = "", const std::string& from = "")
{
    const std::string one = ResultOf(oArguments, 1, made, from);
    for (const unsigned int nThreads : {2U, 3U, 8U})
        EXPECT_TRUE(ResultOf(oArguments, nThreads, made, from) == one)
            << oArguments[0] << " " << oArguments[1] << " with " << nThreads << " threads";
}

// 900 x 900 pixels in tiles of 256.
class Scene
{
public:
    Scene() { krv::test::RunProgram(KRV_SAMPLESCENE_PROGRAM, {moFolder.GetPath(), "--size", "900"}); }
    std::string File(const std::string& name) const { return moFolder.File(name); }

private:
    TempFolder moFolder;
};

} // namespace

TEST(Threads, EveryVerbGivesTheSameOfAScene)
{
    const Scene oScene;
    for (const std::string& name : {std::string("rgb.tif"), std::string("pan.tif")})
    {
        const std::string file = oScene.File(name), made = oScene.File("made.tif"), look = oScene.File("look.png");
        ExpectSame({"checksum", file});
        ExpectSame({"stats", file, "--json"});
        ExpectSame({"view", file, look, "--size", "333"}, look);
        ExpectSame({"mask", file, "--no-data", "--json"});
        ExpectSame({"mask", made, "--no-data", "--write", "new"}, made, file);
        ExpectSame({"overviews", made}, made, file);
        ExpectSame({"overviews", made, "--levels", "3,4", "--resampling", "cubic"}, made, file);
        ExpectSame({"convert", file, made}, made);
        for (const char* pOptions : {"COMPRESS=DEFLATE BLOCKXSIZE=128 BLOCKYSIZE=64", "COMPRESS=JPEG INTERLEAVE=BAND",
                                     "COMPRESS=LERC TILED=NO", "LAYOUT=COG COMPRESS=ZSTD PREDICTOR=2"})
            ExpectSame({"convert", file, made, "--options", pOptions}, made);
        ExpectSame({"convert", file, made, "--window", "100,50,700,800", "--type", "32R"}, made);
    }
}

// Another block is damaged than the first: all others are done before it, whoever meets it first.
TEST(Threads, ADamagedBlockIsToldAloneAndLeavesNothing)
{
    const Scene oScene;
    const std::string file = oScene.File("pan.tif"), made = oScene.File("made.tif");
    std::string bytes = ReadFile(file);
    for (std::size_t nAt = bytes.size() / 2; nAt < bytes.size() / 2 + 2000; ++nAt)
        bytes[nAt] = static_cast<char>(nAt % 251);
    krv::conformance::WriteFile(file, bytes);
    ASSERT_NE(RunKrv({"stats", file}).code, 0);
    ExpectSame({"stats", file});
    ExpectSame({"checksum", file});
    ExpectSame({"convert", file, made, "--options", "COMPRESS=LZW"}, made);
    ExpectSame({"convert", file, made, "--check"}, made);
    EXPECT_FALSE(std::filesystem::exists(made));
    const std::string before = ReadFile(file);
    ExpectSame({"overviews", made}, made, file);
    EXPECT_EQ(ReadFile(file), before);
    // Bytes move as they are, damaged or not, when nobody asks.
    EXPECT_EQ(RunKrv({"convert", file, made}).code, 0);
    for (const auto& oEntry : std::filesystem::directory_iterator(std::filesystem::path(file).parent_path()))
        EXPECT_NE(oEntry.path().extension(), ".tmp") << oEntry.path();
}

TEST(Threads, AnInterruptLeavesNothing)
{
    const TempFolder oFolder;
    krv::test::RunProgram(KRV_SAMPLESCENE_PROGRAM, {oFolder.GetPath(), "--size", "3000"});
    const std::string file = oFolder.File("rgb.tif"), made = oFolder.File("made.tif");
    const auto CountFiles = [&oFolder]
    {
        return std::distance(std::filesystem::directory_iterator(oFolder.GetPath()), {});
    };
    const auto nFiles = CountFiles();
    for (const char* pOptions : {"COMPRESS=ZSTD LEVEL=19", "LAYOUT=COG COMPRESS=DEFLATE LEVEL=9"})
    {
        const ProgramRun oRun = krv::test::RunProgram(
            KRV_PROGRAM, {"convert", file, made, "--options", pOptions, "--threads", "3"}, {}, 300);
        EXPECT_EQ(oRun.code, 130);
        EXPECT_EQ(CountFiles(), nFiles) << pOptions;
    }
}

TEST(Threads, NumbersThatMakeNoSenseAreRefused)
{
    krv::test::ExpectRefusals(
        "checksum", {{{"x.tif", "--threads", "0"}, 2, "threads"}, {{"x.tif", "--threads", "many"}, 2, "threads"}});
}

} // namespace krv::tool
