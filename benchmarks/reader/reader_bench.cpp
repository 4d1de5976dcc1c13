// Measures reading through the library against the raw libraries underneath, in one process and interleaved rounds.
//     krv_bench_reader FOLDER [--size N] [--only tiles|margins|windows|wide|layouts|cold|memory|threads|process]
//     [--match TEXT]
// TEXT is looked for in what the scenes are called, such as "3x8U deflate". FOLDER takes the scenes (some gigabytes at
// the full size of 8192) and keeps them for the next run.

#include "benchmarks/reader/byhand.h"
#include "benchmarks/reader/layouts.h"
#include "benchmarks/reader/passes.h"
#include "benchmarks/support/arguments.h"
#include "benchmarks/support/measure.h"
#include "benchmarks/support/scene.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/reader/basicreader.h"
#include "gobs/raster/raster.h"
#include "toolkit/cache/tilestore.h"

#include <fcntl.h>
#include <spawn.h>
#include <sys/mman.h>
#include <sys/wait.h>
#include <tiffio.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <functional>
#include <memory>
#include <random>
#include <thread>

namespace
{

using namespace krv::benchmarks;
using krv::datasources::BasicReader;
using krv::datasources::DatasetManager;
using krv::gobs::Raster;

constexpr unsigned int WIDE = 40960;
constexpr unsigned long long BYTES_A_PASS = 192ull << 20;

struct Settings
{
    std::string moFolder;
    unsigned int mnSize;
    std::string moSelf;
};

const SceneKind KINDS[] = {{"3x8U", 3, 8, false}, {"1x16U", 1, 16, false}, {"4x32R", 4, 32, true}};

// Whole rows of tiles, as many as make up a pass.
unsigned int TilesOfPass(const SceneFile& oScene)
{
    const unsigned long long nRowBytes = oScene.TileBytes() * oScene.TilesAcross();
    const auto nRows = std::clamp<unsigned long long>(BYTES_A_PASS / nRowBytes, 1, oScene.TilesDown());
    return static_cast<unsigned int>(nRows) * oScene.TilesAcross();
}

std::string Rate(const SceneFile& oScene, unsigned int nTiles, double nSeconds)
{
    return krv::benchmarks::Rate(static_cast<double>(oScene.TileBytes()) * nTiles, nSeconds);
}

// Every candidate must deliver the same pixels before it is worth a figure.
void CheckEqual(const SceneFile& oScene)
{
    ByHand oHand(oScene);
    ByLibtiff oTiff(oScene);
    const auto oReader = OpenScene(oScene);
    for (const unsigned int nTile : {0u, oScene.TilesAcross() + 1})
    {
        const std::unique_ptr<Raster> oRaster(oReader->GetRaster(nTile));
        const unsigned char* const pExpected = oTiff.ReadTile(nTile);
        if (oRaster->GetBufferSize() != oScene.TileBytes() ||
            std::memcmp(oRaster->GetBuffer(), pExpected, oScene.TileBytes()) != 0 ||
            std::memcmp(oHand.ReadTile(nTile), pExpected, oScene.TileBytes()) != 0)
            throw std::runtime_error("the candidates differ over " + oScene.moPath);
    }
}

void MeasureTiles(const SceneFile& oScene, double nGoal)
{
    CheckEqual(oScene);
    const unsigned int nTiles = TilesOfPass(oScene);
    ByHand oHand(oScene);
    ByLibtiff oTiff(oScene);
    const auto oReader = OpenScene(oScene);
    const auto oTimes = MedianSeconds({{"reader",
                                        [&]
                                        {
                                            ReadTiles(*oReader, 0, nTiles);
                                        }},
                                       {"hand",
                                        [&]
                                        {
                                            ReadTilesOf(oHand, nTiles);
                                        }},
                                       {"libtiff",
                                        [&]
                                        {
                                            ReadTilesOf(oTiff, nTiles);
                                        }}},
                                      7);
    PrintRow(oScene.moKind.moName + " " + oScene.moCodec + ", tiles of " + std::to_string(oScene.mnTile),
             oTimes[1] / oTimes[0], nGoal,
             Rate(oScene, nTiles, oTimes[0]) + "; libtiff " + Number(oTimes[1] / oTimes[2]) + "; against libtiff " +
                 Number(oTimes[2] / oTimes[0]));
}

// Bytes a second with the margin against the same pass without one. Over all of the image: a part of it needs a row of
// tiles more than it has.
void MeasureMargins(const SceneFile& oScene, unsigned int nMargin, double nGoal)
{
    const unsigned int nTiles = oScene.TilesAcross() * oScene.TilesDown();
    const auto oPlain = OpenScene(oScene);
    const auto oMargins = OpenScene(oScene);
    oMargins->SetMargins(nMargin, nMargin, eMirror);
    const auto oTimes = MedianSeconds({{"plain",
                                        [&]
                                        {
                                            ForgetTiles();
                                            ReadTiles(*oPlain, 0, nTiles);
                                        }},
                                       {"margins",
                                        [&]
                                        {
                                            ForgetTiles();
                                            ReadTiles(*oMargins, 0, nTiles);
                                        }}},
                                      5);
    const double nSide = oScene.mnTile + 2.0 * nMargin;
    const double nMore = nSide * nSide / oScene.mnTile / oScene.mnTile;
    PrintRow(oScene.moKind.moName + " " + oScene.moCodec + ", " + std::to_string(oScene.mnSize) + " wide, tiles of " +
                 std::to_string(oScene.mnTile) + ", margin " + std::to_string(nMargin),
             oTimes[0] / oTimes[1] * nMore, nGoal, Rate(oScene, nTiles, oTimes[1] / nMore));
}

using Windows = std::vector<std::pair<unsigned int, unsigned int>>;
constexpr unsigned int WINDOW = 300;

Windows MakeWindows(unsigned int nSize)
{
    std::mt19937 oRandom(3);
    std::uniform_int_distribution<unsigned int> oPosition(0, nSize - WINDOW);
    Windows oWindows(1000);
    for (auto& [nX, nY] : oWindows)
    {
        nX = oPosition(oRandom);
        nY = oPosition(oRandom);
    }
    return oWindows;
}

void ReadWindows(BasicReader& oReader, const Windows& oWindows)
{
    for (const auto& [nX, nY] : oWindows)
    {
        const std::unique_ptr<Raster> oRaster(oReader.ReadRaster(nX, nY, WINDOW, WINDOW));
        Keep(oRaster->GetBuffer());
    }
}

// Assembles a window from its tiles: oPart(tile, begin, end) gives the bytes of a tile from its byte begin to end.
template <typename PartSource>
void CopyWindow(const SceneFile& oScene, unsigned int nX, unsigned int nY, std::vector<unsigned char>& oTarget,
                PartSource oPart)
{
    const std::size_t nPixel = oScene.mnChannelsBytes();
    const unsigned int nSide = oScene.mnTile;
    const std::size_t nPitch = nSide * nPixel;
    for (unsigned int nRow = nY / nSide; nRow <= (nY + WINDOW - 1) / nSide; ++nRow)
        for (unsigned int nColumn = nX / nSide; nColumn <= (nX + WINDOW - 1) / nSide; ++nColumn)
        {
            const unsigned int nLeft = std::max(nX, nColumn * nSide);
            const unsigned int nRight = std::min(nX + WINDOW, (nColumn + 1) * nSide);
            const unsigned int nTop = std::max(nY, nRow * nSide);
            const unsigned int nBottom = std::min(nY + WINDOW, (nRow + 1) * nSide);
            const std::size_t nBegin = (nTop - nRow * nSide) * nPitch + (nLeft - nColumn * nSide) * nPixel;
            const std::size_t nRowBytes = (nRight - nLeft) * nPixel;
            const unsigned char* const pPart = oPart(nRow * oScene.TilesAcross() + nColumn, nBegin,
                                                     nBegin + (nBottom - nTop - 1) * nPitch + nRowBytes);
            for (unsigned int y = nTop; y < nBottom; ++y)
                std::memcpy(oTarget.data() + ((y - nY) * std::size_t{WINDOW} + nLeft - nX) * nPixel,
                            pPart + (y - nTop) * nPitch, nRowBytes);
        }
}

void MeasurePlainWindows(const SceneFile& oScene)
{
    const Windows oWindows = MakeWindows(oScene.mnSize);
    const auto oReader = OpenScene(oScene);
    std::vector<std::uint64_t> oOffsets;
    TIFF* const poTiff = TIFFOpen(oScene.moPath.c_str(), "r");
    for (unsigned int nTile = 0; nTile < TIFFNumberOfTiles(poTiff); ++nTile)
        oOffsets.push_back(TIFFGetStrileOffset(poTiff, nTile));
    TIFFClose(poTiff);
    const std::size_t nBytes = std::filesystem::file_size(oScene.moPath);
    const int nFile = open(oScene.moPath.c_str(), O_RDONLY);
    auto* const pMapping =
        static_cast<unsigned char*>(mmap(nullptr, nBytes, PROT_READ, MAP_SHARED | MAP_POPULATE, nFile, 0));
    std::vector<unsigned char> oTarget(1ull * WINDOW * WINDOW * oScene.mnChannelsBytes());
    std::vector<unsigned char> oPart(oScene.TileBytes());
    const auto oTimes = MedianSeconds({{"reader",
                                        [&]
                                        {
                                            ReadWindows(*oReader, oWindows);
                                        }},
                                       {"mapping",
                                        [&]
                                        {
                                            for (const auto& [nX, nY] : oWindows)
                                                CopyWindow(oScene, nX, nY, oTarget,
                                                           [&](unsigned int nTile, std::size_t nBegin, std::size_t)
                                                           { return pMapping + oOffsets[nTile] + nBegin; });
                                        }},
                                       {"hand",
                                        [&]
                                        {
                                            for (const auto& [nX, nY] : oWindows)
                                                CopyWindow(oScene, nX, nY, oTarget,
                                                           [&](unsigned int nTile, std::size_t nBegin, std::size_t nEnd)
                                                           {
                                                               const auto nAt =
                                                                   static_cast<off_t>(oOffsets[nTile] + nBegin);
                                                               if (pread(nFile, oPart.data(), nEnd - nBegin, nAt) !=
                                                                   static_cast<ssize_t>(nEnd - nBegin))
                                                                   throw std::runtime_error("short read");
                                                               return oPart.data();
                                                           });
                                        }}},
                                      9);
    munmap(pMapping, nBytes);
    close(nFile);
    PrintRow(oScene.moKind.moName + " none, against one pread a tile by hand", oTimes[2] / oTimes[0], 0.95,
             "against copies from a mapping, which the library has not, " + Number(oTimes[1] / oTimes[0]));
}

void MeasureDecodedWindows(const SceneFile& oScene)
{
    const Windows oWindows = MakeWindows(oScene.mnSize);
    const auto oReader = OpenScene(oScene);
    CachedTiles oTiff(oScene);
    std::vector<unsigned char> oTarget(1ull * WINDOW * WINDOW * oScene.mnChannelsBytes());
    const auto oTimes = MedianSeconds({{"reader",
                                        [&]
                                        {
                                            ReadWindows(*oReader, oWindows);
                                        }},
                                       {"libtiff",
                                        [&]
                                        {
                                            for (const auto& [nX, nY] : oWindows)
                                                CopyWindow(oScene, nX, nY, oTarget,
                                                           [&](unsigned int nTile, std::size_t nBegin, std::size_t)
                                                           { return oTiff.ReadTile(nTile) + nBegin; });
                                        }}},
                                      5);
    PrintRow(oScene.moKind.moName + " " + oScene.moCodec + ", against libtiff and the same cache",
             oTimes[1] / oTimes[0], 0.95);
}

void MeasureEightRasters()
{
    for (const unsigned int nSide : {256u, 512u, 1024u, 2048u, 4096u, 7094u})
    {
        const krv::gobs::RasterInfo oInfo(nSide, nSide, 1, krv::gobs::eDT_8U);
        const std::size_t nBytes = 1ull * nSide * nSide;
        const int nRepeats = static_cast<int>(std::max<std::size_t>(1, (64u << 20) / nBytes));
        std::vector<std::vector<unsigned char>> oReused(8, std::vector<unsigned char>(nBytes));
        const auto oTimes = MedianSeconds({{"rasters",
                                            [&]
                                            {
                                                for (int n = 0; n < nRepeats; ++n)
                                                {
                                                    std::unique_ptr<Raster> oRasters[8];
                                                    for (auto& oRaster : oRasters)
                                                    {
                                                        oRaster =
                                                            std::make_unique<Raster>(oInfo, krv::gobs::RasterContext());
                                                        std::memset(oRaster->GetBuffer(), n, nBytes);
                                                        Keep(oRaster->GetBuffer());
                                                    }
                                                }
                                            }},
                                           {"reused",
                                            [&]
                                            {
                                                for (int n = 0; n < nRepeats; ++n)
                                                    for (auto& oBuffer : oReused)
                                                    {
                                                        std::memset(oBuffer.data(), n, nBytes);
                                                        Keep(oBuffer.data());
                                                    }
                                            }}},
                                          9);
        PrintRow("eight rasters of " + std::to_string(nBytes >> 10) + " KiB", oTimes[1] / oTimes[0], 0.85);
    }
}

void RunThreads(unsigned int nThreads, const std::function<void(unsigned int)>& oRun)
{
    std::vector<std::thread> oThreads;
    for (unsigned int n = 1; n < nThreads; ++n)
        oThreads.emplace_back(oRun, n);
    oRun(0);
    for (std::thread& oThread : oThreads)
        oThread.join();
}

// The same by hand says what the machine has for so many threads at all.
void MeasureThreads(const SceneFile& oScene, unsigned int nThreads)
{
    const unsigned int nTiles = TilesOfPass(oScene);
    std::vector<std::unique_ptr<BasicReader>> oReaders;
    std::vector<std::unique_ptr<ByHand>> oHands;
    for (unsigned int n = 0; n < nThreads; ++n)
    {
        oReaders.push_back(OpenScene(oScene));
        oHands.push_back(std::make_unique<ByHand>(oScene));
    }
    const auto oTimes =
        MedianSeconds({{"one",
                        [&]
                        {
                            ReadTiles(*oReaders[0], 0, nTiles);
                        }},
                       {"threads",
                        [&]
                        {
                            RunThreads(nThreads, [&](unsigned int n) { ReadTiles(*oReaders[n], 0, nTiles); });
                        }},
                       {"one by hand",
                        [&]
                        {
                            ReadTilesOf(*oHands[0], nTiles);
                        }},
                       {"threads by hand",
                        [&]
                        {
                            RunThreads(nThreads, [&](unsigned int n) { ReadTilesOf(*oHands[n], nTiles); });
                        }}},
                      5);
    PrintRow(oScene.moKind.moName + " " + oScene.moCodec + ", " + std::to_string(nThreads) +
                 " threads with a reader each",
             nThreads * oTimes[0] / oTimes[1], nThreads == 2 ? 1.8 : 0,
             "by hand " + Number(nThreads * oTimes[2] / oTimes[3]) + "; against as many by hand " +
                 Number(oTimes[3] / oTimes[1]));
}

using Readers = std::vector<std::unique_ptr<BasicReader>>;

Readers OpenWithMargins(const SceneFile& oScene, std::size_t nReaders)
{
    Readers oReaders;
    for (std::size_t n = 0; n < nReaders; ++n)
    {
        oReaders.push_back(OpenScene(oScene));
        oReaders.back()->SetMargins(8, 8, eMirror);
    }
    return oReaders;
}

// Readers of one file that share its tiles between them, each with margins.
void MeasureSharing(const SceneFile& oScene)
{
    const unsigned int nTiles = TilesOfPass(oScene);
    krv::cache::TileStore& oStore = krv::cache::TileStore::Process();
    const std::string name = oScene.moKind.moName + " " + oScene.moCodec + ", ";
    for (const std::size_t nReaders : {2u, 4u})
    {
        const Readers oReaders = OpenWithMargins(oScene, nReaders);
        oStore.ResetStatistics();
        for (unsigned int nTile = 0; nTile < nTiles; ++nTile)
            ReadTiles(*oReaders[nTile % nReaders], nTile, nTile + 1);
        // The pass shows the row of tiles below it too.
        const unsigned int nShown = std::min(nTiles + oScene.TilesAcross(), oScene.TilesAcross() * oScene.TilesDown());
        PrintRow(name + std::to_string(nReaders) + " readers take tiles in turn, decodes per tile",
                 static_cast<double>(oStore.GetStatistics().mnMisses) / nShown, 0, "goal 1.00");
    }
    const auto InTurn = [&](unsigned int nThreads)
    {
        const Readers oReaders = OpenWithMargins(oScene, nThreads);
        std::atomic<unsigned int> nNext{0};
        RunThreads(nThreads,
                   [&](unsigned int nThread)
                   {
                       for (unsigned int nTile = nNext++; nTile < nTiles; nTile = nNext++)
                           ReadTiles(*oReaders[nThread], nTile, nTile + 1);
                   });
    };
    const auto oTimes = MedianSeconds({{"one",
                                        [&]
                                        {
                                            InTurn(1);
                                        }},
                                       {"two",
                                        [&]
                                        {
                                            InTurn(2);
                                        }}},
                                      5);
    PrintRow(name + "two threads take tiles as they come", oTimes[0] / oTimes[1], 1.8);
}

double ProcessorSeconds()
{
    timespec oTime = {};
    clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &oTime);
    return static_cast<double>(oTime.tv_sec) + static_cast<double>(oTime.tv_nsec) * 1e-9;
}

// Small windows of blocks that are all there: processor time for each by one thread and by eight.
void MeasureHits(const SceneFile& oScene)
{
    constexpr unsigned int HITS = 40000;
    constexpr unsigned int SIDE = 32;
    const auto PerHit = [&](unsigned int nThreads)
    {
        const Readers oReaders = OpenWithMargins(oScene, nThreads);
        ReadWindows(*oReaders[0], {{10, 10}, {300, 10}, {10, 300}, {300, 300}});
        const double nBegin = ProcessorSeconds();
        RunThreads(nThreads,
                   [&](unsigned int nThread)
                   {
                       for (unsigned int n = 0; n < HITS / nThreads; ++n)
                       {
                           const std::unique_ptr<Raster> oRaster(
                               oReaders[nThread]->ReadRaster(20 + n % 200, 20 + n / 200 % 200, SIDE, SIDE));
                           Keep(oRaster->GetBuffer());
                       }
                   });
        return (ProcessorSeconds() - nBegin) / HITS;
    };
    std::vector<double> oOne, oEight;
    for (int nRound = 0; nRound < 5; ++nRound)
    {
        oOne.push_back(PerHit(1));
        oEight.push_back(PerHit(8));
    }
    PrintRow(oScene.moKind.moName + " " + oScene.moCodec + ", hits by eight threads, processor time of one thread's",
             Median(oEight) / Median(oOne), 0, "at most 1.3; " + Number(Median(oOne) * 1e9, 0) + " ns");
}

// Eight images open at once, a tile of each in turn, against the same tiles one image after the other.
void MeasureEightReaders(const SceneFile& oScene)
{
    const unsigned int nTiles = std::max(1u, TilesOfPass(oScene) / 8);
    std::vector<std::unique_ptr<BasicReader>> oReaders(8);
    for (auto& oReader : oReaders)
        oReader = OpenScene(oScene);
    const auto oTimes = MedianSeconds({{"in turn",
                                        [&]
                                        {
                                            for (unsigned int nTile = 0; nTile < nTiles; ++nTile)
                                                for (const auto& oReader : oReaders)
                                                    ReadTiles(*oReader, nTile, nTile + 1);
                                        }},
                                       {"one by one",
                                        [&]
                                        {
                                            for (const auto& oReader : oReaders)
                                                ReadTiles(*oReader, 0, nTiles);
                                        }}},
                                      5);
    PrintRow(oScene.moKind.moName + " " + oScene.moCodec + ", eight readers in turn", oTimes[1] / oTimes[0], 0.9,
             Rate(oScene, 8 * nTiles, oTimes[0]));
}

// The file is thrown out of the system's cache before every pass.
void MeasureColdFile(const SceneFile& oScene)
{
    const unsigned int nTiles = TilesOfPass(oScene);
    const int nFile = open(oScene.moPath.c_str(), O_RDONLY);
    fsync(nFile);
    std::vector<double> oTimes[2];
    for (int nPass = 0; nPass < 10; ++nPass)
    {
        posix_fadvise(nFile, 0, 0, POSIX_FADV_DONTNEED);
        const auto oReader = OpenScene(oScene);
        ByHand oHand(oScene);
        posix_fadvise(nFile, 0, 0, POSIX_FADV_DONTNEED);
        oTimes[nPass % 2].push_back(Seconds(
            [&]
            {
                if (nPass % 2 == 0)
                    ReadTiles(*oReader, 0, nTiles);
                else
                    ReadTilesOf(oHand, nTiles);
            }));
    }
    close(nFile);
    PrintRow(oScene.moKind.moName + " " + oScene.moCodec + ", cold file, against the same by hand",
             Median(oTimes[1]) / Median(oTimes[0]), 0.95, Rate(oScene, nTiles, Median(oTimes[0])));
}

// Runs this program again with one word and the folder; the peak memory, in MiB, is what the child itself says at its
// end: what the system counts for it may begin at the peak of its parent.
double RunChild(const Settings& oSettings, const char* pWhat)
{
    int oPipe[2];
    posix_spawn_file_actions_t oActions;
    if (pipe(oPipe) != 0 || posix_spawn_file_actions_init(&oActions) != 0)
        throw std::runtime_error("no pipe to a child");
    posix_spawn_file_actions_adddup2(&oActions, oPipe[1], STDOUT_FILENO);
    const char* oArguments[] = {oSettings.moSelf.c_str(), "--child", pWhat, oSettings.moFolder.c_str(), nullptr};
    pid_t nChild = 0;
    if (posix_spawn(&nChild, oSettings.moSelf.c_str(), &oActions, nullptr, const_cast<char**>(oArguments), environ) !=
        0)
        throw std::runtime_error("cannot start a child");
    posix_spawn_file_actions_destroy(&oActions);
    close(oPipe[1]);
    long nPeak = 0;
    const bool bTold = read(oPipe[0], &nPeak, sizeof nPeak) == sizeof nPeak;
    close(oPipe[0]);
    int nStatus = 0;
    waitpid(nChild, &nStatus, 0);
    if (nStatus != 0 || !bTold)
        throw std::runtime_error(std::string("the child failed: ") + pWhat);
    return static_cast<double>(nPeak) / 1024;
}

constexpr std::uint64_t WIDE_BUDGET = std::uint64_t{256} << 20;

std::vector<SceneFile> MakeWideImages(const std::string& folder)
{
    std::vector<SceneFile> oScenes(8, MakeScene(folder, KINDS[0], "zstd", 256, WIDE, 1024));
    for (std::size_t n = 1; n < oScenes.size(); ++n)
    {
        oScenes[n].moPath += "." + std::to_string(n) + ".tif";
        std::filesystem::copy_file(oScenes[0].moPath, oScenes[n].moPath, std::filesystem::copy_options::skip_existing);
    }
    return oScenes;
}

// A tile of each of eight wide images in turn, with margins.
void ReadWideImages(const std::string& folder)
{
    const std::vector<SceneFile> oScenes = MakeWideImages(folder);
    krv::cache::TileStore& oStore = krv::cache::TileStore::Process();
    oStore.SetBudget(WIDE_BUDGET);
    Readers oReaders;
    for (const SceneFile& oScene : oScenes)
        oReaders.push_back(std::move(OpenWithMargins(oScene, 1).front()));
    const unsigned int nTiles = oScenes[0].TilesAcross() * oScenes[0].TilesDown();
    for (unsigned int nTile = 0; nTile < nTiles; ++nTile)
        for (const auto& poReader : oReaders)
            ReadTiles(*poReader, nTile, nTile + 1);
    std::fprintf(stderr, "eight readers of wide images: %.2f decodes per tile\n",
                 static_cast<double>(oStore.GetStatistics().mnMisses) / nTiles / 8);
}

int BeChild(const std::string& what, const std::string& folder)
{
    if (what != "nothing")
        DatasetManager::GetInstance();
    if (what == "sparse")
    {
        BasicReader oReader(MakeSparse(folder, 100000, 256));
        oReader.SetMargins(8, 8, eMirror);
        ReadTiles(oReader, 0, oReader.GetTileCount());
    }
    if (what == "wide")
        ReadWideImages(folder);
    long nPeak = 0;
    std::ifstream oStatus("/proc/self/status");
    for (std::string line; std::getline(oStatus, line);)
        std::sscanf(line.c_str(), "VmHWM: %ld", &nPeak);
    return write(STDOUT_FILENO, &nPeak, sizeof nPeak) == sizeof nPeak ? 0 : 1;
}

void MeasureProcess(const Settings& oSettings)
{
    const auto oTimes = MedianSeconds({{"nothing",
                                        [&]
                                        {
                                            RunChild(oSettings, "nothing");
                                        }},
                                       {"instance",
                                        [&]
                                        {
                                            RunChild(oSettings, "instance");
                                        }}},
                                      21);
    PrintRow("first GetInstance, milliseconds above a process", (oTimes[1] - oTimes[0]) * 1000, 0, "at most 15");

    MakeSparse(oSettings.moFolder, 100000, 256);
    const double nInstance = RunChild(oSettings, "instance");
    PrintRow("sparse 100000 x 100000 with margins, MiB above", RunChild(oSettings, "sparse") - nInstance, 0,
             "at most the cache's bound + 32; the process alone " + Number(nInstance, 1));
    MakeWideImages(oSettings.moFolder);
    PrintRow("eight readers of wide images in turn, budget 256 MiB, MiB above", RunChild(oSettings, "wide") - nInstance,
             0, "at most 320");
}

void MeasureOpening(const SceneFile& oScene)
{
    constexpr int OPENINGS = 10000;
    DatasetManager* const poManager = DatasetManager::GetInstance();
    const auto oTimes = MedianSeconds({{"library",
                                        [&]
                                        {
                                            for (int n = 0; n < OPENINGS; ++n)
                                                delete poManager->Open(oScene.moPath, eReadOnly);
                                        }},
                                       {"libtiff",
                                        [&]
                                        {
                                            for (int n = 0; n < OPENINGS; ++n)
                                                TIFFClose(TIFFOpen(oScene.moPath.c_str(), "r"));
                                        }}},
                                      3);
    PrintRow("10,000 opens, time against TIFFOpen and TIFFClose", oTimes[0] / oTimes[1], 0, "at most 1.2");
}

double GoalOf(const std::string& codec)
{
    return codec == "lzw" ? 0.9 : 0.95;
}

void MeasureAll(const Settings& oSettings, const Arguments& oArguments)
{
    const auto oMake = [&](const SceneKind& oKind, const std::string& codec, unsigned int nTile)
    {
        return MakeScene(oSettings.moFolder, oKind, codec, nTile, oSettings.mnSize);
    };
    std::vector<std::pair<SceneKind, std::string>> oScenes;
    for (const char* pCodec : {"none", "deflate", "lzw", "zstd"})
        for (const SceneKind& oKind : KINDS)
            if ((oKind.moName + " " + pCodec).find(oArguments.GetOption("match")) != std::string::npos)
                oScenes.emplace_back(oKind, pCodec);

    if (oArguments.Wants("tiles"))
    {
        PrintHeading("Tiles, against straight code over the codec libraries");
        for (const auto& [oKind, codec] : oScenes)
            for (const unsigned int nTile : {256u, 512u})
                MeasureTiles(oMake(oKind, codec, nTile), GoalOf(codec));
    }
    if (oArguments.Wants("margins"))
    {
        PrintHeading("Margins, per byte delivered against the same run without margins");
        for (const auto& [oKind, codec] : oScenes)
            for (const unsigned int nMargin : {8u, 32u})
                MeasureMargins(oMake(oKind, codec, 256), nMargin, codec == "none" ? 0.6 : 0.95);
    }
    if (oArguments.Wants("windows"))
    {
        PrintHeading("1,000 random windows of 300 x 300");
        for (const auto& [oKind, codec] : oScenes)
            if (!oKind.mbReal && codec == "none")
                MeasurePlainWindows(oMake(oKind, codec, 256));
            else if (!oKind.mbReal && codec == "deflate")
                MeasureDecodedWindows(oMake(oKind, codec, 256));
    }
    if (oArguments.Wants("wide"))
    {
        PrintHeading("Wide images, per byte delivered against the same run without margins");
        for (const auto& [oKind, codec] : oScenes)
            if (oKind.mnChannels == 3)
                MeasureMargins(MakeScene(oSettings.moFolder, oKind, codec, 256, WIDE, oSettings.mnSize / 4), 8,
                               codec == "none" ? 0.6 : 0.95);
    }
    if (oArguments.Wants("layouts"))
    {
        PrintHeading("Other layouts, against libtiff and a plain loop");
        MeasureLayouts(oSettings.moFolder, oSettings.mnSize, oArguments.GetOption("match"));
    }
    if (oArguments.Wants("cold"))
    {
        PrintHeading("Files that the system has not in its cache");
        for (const auto& [oKind, codec] : oScenes)
            if (oKind.mnChannels == 3)
                MeasureColdFile(oMake(oKind, codec, 256));
    }
    if (oArguments.Wants("memory"))
    {
        PrintHeading("Raster memory, filling against reused buffers");
        MeasureEightRasters();
    }
    if (oArguments.Wants("threads"))
    {
        PrintHeading("Threads, and many readers");
        for (const auto& [oKind, codec] : oScenes)
            if (oKind.mnChannels == 3)
            {
                for (const unsigned int nThreads : {2u, 8u})
                    MeasureThreads(oMake(oKind, codec, 256), nThreads);
                MeasureEightReaders(oMake(oKind, codec, 256));
                if (codec != "none")
                    MeasureSharing(oMake(oKind, codec, 256));
                if (codec == "deflate")
                    MeasureHits(oMake(oKind, codec, 256));
            }
    }
    if (oArguments.Wants("process"))
    {
        PrintHeading("Start, opening, memory");
        MeasureProcess(oSettings);
        MeasureOpening(oMake(KINDS[0], "deflate", 256));
    }
}

} // namespace

int main(int nArguments, char** pArguments)
{
    if (nArguments == 4 && std::strcmp(pArguments[1], "--child") == 0)
        return BeChild(pArguments[2], pArguments[3]);
    const Arguments oArguments(nArguments, pArguments,
                               "FOLDER [--size N] [--only "
                               "tiles|margins|windows|wide|layouts|cold|memory|threads|process] "
                               "[--match TEXT]");
    const Settings oSettings{oArguments.GetWords().front(), oArguments.GetNumber("size", 8192),
                             std::filesystem::read_symlink("/proc/self/exe").string()};
    std::filesystem::create_directories(oSettings.moFolder);
    MeasureAll(oSettings, oArguments);
    return 0;
}
