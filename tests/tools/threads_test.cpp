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
    }
}

TEST(Threads, NumbersThatMakeNoSenseAreRefused)
{
    krv::test::ExpectRefusals(
        "checksum", {{{"x.tif", "--threads", "0"}, 2, "threads"}, {{"x.tif", "--threads", "many"}, 2, "threads"}});
}

} // namespace krv::tool
