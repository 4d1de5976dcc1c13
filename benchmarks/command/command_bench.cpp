// Measures the command line beside `vips` and `tiffcp`, whole processes on warm files, one thread each, the new files
// safe on the disk by krv and left to the system to write by the others; a program that is not installed is left out.
// Then two threads beside one, and beside `vips` and `cp` with `sync`; and how long `krv info` takes of small files.
//     krv_bench_command FOLDER [--size N] [--only one|threads|info]
// FOLDER keeps the scenes for the next run.

#include "benchmarks/support/arguments.h"
#include "benchmarks/support/measure.h"
#include "benchmarks/support/scene.h"

#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <tiffio.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <stdexcept>

namespace
{

using namespace krv::benchmarks;
using Words = std::vector<std::string>;

// False when there is no such program; an exception when it fails. What it prints is dropped.
bool Run(const Words& oWords)
{
    std::vector<char*> oArguments;
    for (const std::string& word : oWords)
        oArguments.push_back(const_cast<char*>(word.c_str()));
    oArguments.push_back(nullptr);
    posix_spawn_file_actions_t oActions;
    posix_spawn_file_actions_init(&oActions);
    for (const int nStream : {STDOUT_FILENO, STDERR_FILENO})
        posix_spawn_file_actions_addopen(&oActions, nStream, "/dev/null", O_WRONLY, 0);
    pid_t nChild = 0;
    const int nFault = posix_spawnp(&nChild, oArguments[0], &oActions, nullptr, oArguments.data(), environ);
    posix_spawn_file_actions_destroy(&oActions);
    int nStatus = 0;
    if (nFault == 0)
        waitpid(nChild, &nStatus, 0);
    const bool bMissing = nFault == ENOENT || (WIFEXITED(nStatus) && WEXITSTATUS(nStatus) == 127);
    if (!bMissing && (nFault != 0 || nStatus != 0))
        throw std::runtime_error(oWords[0] + " failed with " + oWords.back());
    return !bMissing;
}

struct Program
{
    std::string moName;
    Words moWords;
    std::string moTarget;
};

// The pixels of the programs' files are the same: one tile of each tells.
void CheckSame(const std::vector<Program>& oPrograms)
{
    std::vector<unsigned char> oFirst;
    for (const Program& oProgram : oPrograms)
    {
        const std::unique_ptr<TIFF, decltype(&TIFFClose)> oTiff(TIFFOpen(oProgram.moTarget.c_str(), "r"), &TIFFClose);
        std::vector<unsigned char> oTile(static_cast<std::size_t>(TIFFTileSize(oTiff.get())));
        if (TIFFReadEncodedTile(oTiff.get(), 1, oTile.data(), static_cast<tmsize_t>(oTile.size())) < 0 ||
            (!oFirst.empty() && oTile != oFirst))
            throw std::runtime_error(oProgram.moName + " made other pixels");
        oFirst = oTile;
    }
}

// The first program is krv.
void Measure(const std::string& workload, std::vector<Program> oPrograms)
{
    std::erase_if(oPrograms, [](const Program& oProgram) { return !Run(oProgram.moWords); });
    CheckSame(oPrograms);
    std::vector<Candidate> oCandidates;
    for (const Program& oProgram : oPrograms)
        oCandidates.push_back({oProgram.moName, [oProgram]
                               {
                                   std::filesystem::remove(oProgram.moTarget);
                                   Run(oProgram.moWords);
                               }});
    const auto oTimes = MedianSeconds(oCandidates, 5);
    for (std::size_t n = 1; n < oPrograms.size(); ++n)
        PrintRow(workload + ", against " + oPrograms[n].moName, oTimes[n] / oTimes[0], 1.0,
                 Number(oTimes[0] * 1000, 0) + " and " + Number(oTimes[n] * 1000, 0) + " ms");
    for (const Program& oProgram : oPrograms)
        std::filesystem::remove(oProgram.moTarget);
}

// How often the first command fits into the time of each other one, the goals with them.
struct Rival
{
    std::string moName;
    Words moWords;
    double mnGoal;
};

void Compare(const std::string& workload, const Words& oFirst, std::vector<Rival> oRivals, const std::string& target)
{
    const auto Repeat = [target](const Words& oWords)
    {
        if (!target.empty())
            std::filesystem::remove(target);
        return Run(oWords);
    };
    std::erase_if(oRivals, [&](const Rival& oRival) { return !Repeat(oRival.moWords); });
    std::vector<Candidate> oCandidates{{"krv", [&]
                                        {
                                            Repeat(oFirst);
                                        }}};
    for (const Rival& oRival : oRivals)
        oCandidates.push_back({oRival.moName, [&]
                               {
                                   Repeat(oRival.moWords);
                               }});
    const auto oTimes = MedianSeconds(oCandidates, 5);
    for (std::size_t n = 0; n < oRivals.size(); ++n)
        PrintRow(workload + ", against " + oRivals[n].moName, oTimes[n + 1] / oTimes[0], oRivals[n].mnGoal,
                 Number(oTimes[0] * 1000, 0) + " and " + Number(oTimes[n + 1] * 1000, 0) + " ms");
    if (!target.empty())
        std::filesystem::remove(target);
}

// krv with two threads. The copy of equal form is of the image without a codec.
void MeasureThreads(const std::string& krv, const std::string& plain, const std::string& zipped,
                    const std::string& target)
{
    const auto With = [](Words oWords, const Words& oMore)
    {
        oWords.insert(oWords.end(), oMore.begin(), oMore.end());
        return oWords;
    };
    const auto Threads = [&](const Words& oWords, const char* pCount)
    {
        return With(With({krv}, oWords), {"--threads", pCount});
    };
    const Words VIPS = {"env",    "VIPS_CONCURRENCY=2", "vips",    "tiffsave",      zipped,
                        target,   "--compression",      "deflate", "--predictor",   "horizontal",
                        "--tile", "--tile-width",       "512",     "--tile-height", "512"};
    const Words oAnew = {"convert", zipped, target, "--options", "BLOCKXSIZE=512 BLOCKYSIZE=512"};
    const Words oCloud = {"convert", zipped, target, "--options", "LAYOUT=COG BLOCKXSIZE=512 BLOCKYSIZE=512"};
    const Words oStatistics = {"stats", zipped};
    PrintHeading("Two threads");
    Compare("deflate to deflate of other blocks", Threads(oAnew, "2"),
            {{"one thread", Threads(oAnew, "1"), 1.8}, {"vips", VIPS, 2.5}}, target);
    Compare("deflate to COG with levels", Threads(oCloud, "2"),
            {{"one thread", Threads(oCloud, "1"), 1.8}, {"vips", With(VIPS, {"--pyramid", "--subifd"}), 1.8}}, target);
    Compare("stats of deflate", Threads(oStatistics, "2"),
            {{"one thread", Threads(oStatistics, "1"), 1.8},
             {"vips", {"env", "VIPS_CONCURRENCY=2", "vips", "stats", zipped, target + ".v"}, 1.7}},
            "");
    std::filesystem::remove(target + ".v");
    Compare("same codec and blocks", Threads({"convert", plain, target}, "2"),
            {{"cp and sync", {"sh", "-c", "cp --reflink=never \"$0\" \"$1\" && sync \"$1\"", plain, target}, 0.8}},
            target);
    const std::string levels = target + ".levels.tif";
    std::filesystem::copy_file(zipped, levels, std::filesystem::copy_options::overwrite_existing);
    for (const char* const pMethod : {"average", "cubic"})
    {
        const Words oLevels = {"overviews", levels, "--levels", "2,4,8,16", "--resampling", pMethod};
        Compare(std::string("overviews of deflate, ") + pMethod, Threads(oLevels, "2"),
                {{"one thread", Threads(oLevels, "1"), 1.8}}, "");
    }
    std::filesystem::remove(levels);
}

// Beside an empty program that links what reads XML and reference systems: a process that has to load these.
void MeasureInfo(const std::string& krv, const std::string& small, const std::string& place)
{
    PrintHeading("krv info of a small file");
    std::filesystem::copy_file(small, place, std::filesystem::copy_options::overwrite_existing);
    Run({krv, "edit", place, "--crs", "EPSG:32633", "--origin", "500000,5000000", "--pixel-size", "30"});
    const auto oTimes = MedianSeconds({{"empty",
                                        [&]
                                        {
                                            Run({krv + "_emptyprogram"});
                                        }},
                                       {"info",
                                        [&]
                                        {
                                            Run({krv, "info", small});
                                        }},
                                       {"info of a place",
                                        [&]
                                        {
                                            Run({krv, "info", place});
                                        }}},
                                      41);
    const auto Row = [&](const char* pWhat, double nSeconds)
    {
        PrintRow(pWhat, oTimes[0] / nSeconds, 0.89,
                 Number(nSeconds * 1000, 1) + " and " + Number(oTimes[0] * 1000, 1) + " ms");
    };
    Row("no reference system, against an empty program", oTimes[1]);
    Row("in UTM, against an empty program", oTimes[2]);
    std::filesystem::remove(place);
}

} // namespace

int main(int nArguments, char** pArguments)
{
    const Arguments oArguments(nArguments, pArguments, "FOLDER [--size N] [--only one|threads|info]");
    const std::string& folder = oArguments.GetWords().front();
    const unsigned int nSize = oArguments.GetNumber("size", 8192) / 512 * 512;
    std::filesystem::create_directories(folder);
    setenv("VIPS_CONCURRENCY", "1", 1);
    TIFFSetWarningHandler(nullptr);
    const std::string krv = (std::filesystem::read_symlink("/proc/self/exe").parent_path() / "krv").string();
    const auto Target = [&](const std::string& name)
    {
        return folder + "/command." + name + ".tif";
    };
    const std::string k = Target("krv"), v = Target("vips"), t = Target("tiffcp");
    PrintHeading("The command line on " + std::to_string(nSize) + " x " + std::to_string(nSize) + " x 3 of 8 bits");
    const SceneKind oKind{"3x8U", 3, 8, false};
    const std::string plain = MakeScene(folder, oKind, "none", 256, nSize).moPath;
    const std::string zipped = MakeScene(folder, oKind, "deflate", 256, nSize).moPath;
    if (oArguments.Wants("info"))
        MeasureInfo(krv, MakeScene(folder, oKind, "deflate", 256, 512).moPath, Target("place"));
    if (oArguments.Wants("threads"))
        MeasureThreads(krv, plain, zipped, k);
    if (!oArguments.Wants("one"))
        return 0;
    const Words TILES = {"--tile", "--tile-width", "256", "--tile-height", "256"};
    const auto Vips = [&](const std::string& source, const Words& oMore)
    {
        Words oWords = {"vips", "tiffsave", source, v};
        oWords.insert(oWords.end(), TILES.begin(), TILES.end());
        oWords.insert(oWords.end(), oMore.begin(), oMore.end());
        return Program{"vips", oWords, v};
    };
    const auto Krv = [&](const std::string& source, const std::string& options)
    {
        return Program{"krv", {krv, "convert", source, k, "--options", "BLOCKXSIZE=256 BLOCKYSIZE=256 " + options}, k};
    };
    const auto Tiffcp = [&](const std::string& source, const std::string& codec)
    {
        return Program{"tiffcp", {"tiffcp", "-t", "-w", "256", "-l", "256", "-c", codec, source, t}, t};
    };
    Measure("none to none", {Krv(plain, "COMPRESS=NONE"), Vips(plain, {}), Tiffcp(plain, "none")});
    Measure("deflate to none", {Krv(zipped, "COMPRESS=NONE"), Vips(zipped, {}), Tiffcp(zipped, "none")});
    Measure("none to deflate",
            {Krv(plain, "COMPRESS=DEFLATE PREDICTOR=2"),
             Vips(plain, {"--compression", "deflate", "--predictor", "horizontal"}), Tiffcp(plain, "zip:2")});
    Measure("none to a pyramid", {Krv(plain, "COMPRESS=NONE LAYOUT=COG"), Vips(plain, {"--pyramid", "--subifd"})});
    return 0;
}
