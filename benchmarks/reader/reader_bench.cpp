// Measures reading through the library against the raw libraries underneath, in one process and interleaved rounds.
//     krv_bench_reader FOLDER [--size N] [--only tiles|margins|windows|memory|threads|process] [--match TEXT]
// TEXT is looked for in what the scenes are called, such as "3x8U deflate". FOLDER takes the scenes (some gigabytes at
// the full size of 8192) and keeps them for the next run.

#include "benchmarks/reader/byhand.h"
#include "benchmarks/support/arguments.h"
#include "benchmarks/support/measure.h"
#include "benchmarks/support/scene.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/reader/basicreader.h"
#include "gobs/raster/raster.h"

#include <fcntl.h>
#include <spawn.h>
#include <sys/mman.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <tiffio.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <memory>
#include <random>
#include <thread>

namespace
{

using namespace krv::benchmarks;
using krv::datasources::BasicReader;
using krv::datasources::DatasetManager;
using krv::gobs::Raster;

constexpr unsigned long long BYTES_A_PASS = 192ull << 20;

struct Settings
{
    std::string moFolder;
    unsigned int mnSize;
    std::string moSelf;
};

const SceneKind KINDS[] = {{"3x8U", 3, 8, false}, {"1x16U", 1, 16, false}, {"4x32R", 4, 32, true}};

std::unique_ptr<BasicReader> OpenScene(const SceneFile& oScene)
{
    return std::make_unique<BasicReader>(oScene.moPath, std::vector<unsigned int>());
}

// Whole rows of tiles, as many as make up a pass.
unsigned int TilesOfPass(const SceneFile& oScene)
{
    const unsigned long long nRowBytes = oScene.TileBytes() * oScene.TilesAcross();
    const auto nRows = std::clamp<unsigned long long>(BYTES_A_PASS / nRowBytes, 1, oScene.TilesAcross());
    return static_cast<unsigned int>(nRows) * oScene.TilesAcross();
}

void ReadTiles(BasicReader& oReader, unsigned int nBegin, unsigned int nEnd)
{
    for (unsigned int nTile = nBegin; nTile < nEnd; ++nTile)
    {
        const std::unique_ptr<Raster> oRaster(oReader.GetRaster(nTile));
        Keep(oRaster->GetBuffer());
    }
}

template <typename Source>
void ReadTilesOf(Source& oSource, unsigned int nEnd)
{
    for (unsigned int nTile = 0; nTile < nEnd; ++nTile)
        Keep(oSource.ReadTile(nTile));
}

std::string Rate(const SceneFile& oScene, unsigned int nTiles, double nSeconds)
{
    return Number(static_cast<double>(oScene.TileBytes()) * nTiles / nSeconds / 1e6, 0) + " MB/s";
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
    const unsigned int nTiles = oScene.TilesAcross() * oScene.TilesAcross();
    const auto oPlain = OpenScene(oScene);
    const auto oMargins = OpenScene(oScene);
    oMargins->SetMargins(nMargin, nMargin, eMirror);
    const auto oTimes = MedianSeconds({{"plain",
                                        [&]
                                        {
                                            ReadTiles(*oPlain, 0, nTiles);
                                        }},
                                       {"margins",
                                        [&]
                                        {
                                            ReadTiles(*oMargins, 0, nTiles);
                                        }}},
                                      5);
    const double nSide = oScene.mnTile + 2.0 * nMargin;
    const double nMore = nSide * nSide / oScene.mnTile / oScene.mnTile;
    PrintRow(oScene.moKind.moName + " " + oScene.moCodec + ", tiles of " + std::to_string(oScene.mnTile) + ", margin " +
                 std::to_string(nMargin),
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

void MeasureWindowsOfMapping(const SceneFile& oScene)
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
    PrintRow(oScene.moKind.moName + " none, windows of 300, against a mapping", oTimes[1] / oTimes[0], 0.45,
             "stretch 0.55; a pread per tile by hand " + Number(oTimes[1] / oTimes[2]));
}

void MeasureWindowsOfLibtiff(const SceneFile& oScene)
{
    const Windows oWindows = MakeWindows(oScene.mnSize);
    const auto oReader = OpenScene(oScene);
    ByLibtiff oTiff(oScene);
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
    PrintRow(oScene.moKind.moName + " " + oScene.moCodec + ", windows of 300, against libtiff", oTimes[1] / oTimes[0],
             1.3);
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

// The same by hand says what the machine has for two threads at all.
void MeasureTwoThreads(const SceneFile& oScene)
{
    const unsigned int nTiles = TilesOfPass(oScene);
    const auto oFirst = OpenScene(oScene);
    const auto oSecond = OpenScene(oScene);
    ByHand oFirstHand(oScene);
    ByHand oSecondHand(oScene);
    const auto oTimes = MedianSeconds({{"one",
                                        [&]
                                        {
                                            ReadTiles(*oFirst, 0, nTiles);
                                        }},
                                       {"two",
                                        [&]
                                        {
                                            std::thread oThread([&] { ReadTiles(*oFirst, 0, nTiles); });
                                            ReadTiles(*oSecond, 0, nTiles);
                                            oThread.join();
                                        }},
                                       {"one by hand",
                                        [&]
                                        {
                                            ReadTilesOf(oFirstHand, nTiles);
                                        }},
                                       {"two by hand",
                                        [&]
                                        {
                                            std::thread oThread([&] { ReadTilesOf(oFirstHand, nTiles); });
                                            ReadTilesOf(oSecondHand, nTiles);
                                            oThread.join();
                                        }}},
                                      7);
    PrintRow(oScene.moKind.moName + " " + oScene.moCodec + ", two threads with a reader each",
             2 * oTimes[0] / oTimes[1], 1.8,
             "by hand " + Number(2 * oTimes[2] / oTimes[3]) + "; two against two by hand " +
                 Number(oTimes[3] / oTimes[1]));
}

// Runs this program again with one word and the folder; seconds and the child's peak memory in MiB.
void RunChild(const Settings& oSettings, const char* pWhat, double& nPeak)
{
    const char* oArguments[] = {oSettings.moSelf.c_str(), "--child", pWhat, oSettings.moFolder.c_str(), nullptr};
    pid_t nChild = 0;
    if (posix_spawn(&nChild, oSettings.moSelf.c_str(), nullptr, nullptr, const_cast<char**>(oArguments), environ) != 0)
        throw std::runtime_error("cannot start a child");
    int nStatus = 0;
    rusage oUsage{};
    wait4(nChild, &nStatus, 0, &oUsage);
    if (nStatus != 0)
        throw std::runtime_error(std::string("the child failed: ") + pWhat);
    nPeak = static_cast<double>(oUsage.ru_maxrss) / 1024;
}

int BeChild(const std::string& what, const std::string& folder)
{
    if (what == "nothing")
        return 0;
    DatasetManager::GetInstance();
    if (what == "sparse")
    {
        BasicReader oReader(MakeSparse(folder, 100000, 256));
        oReader.SetMargins(8, 8, eMirror);
        ReadTiles(oReader, 0, oReader.GetTileCount());
    }
    return 0;
}

void MeasureProcess(const Settings& oSettings)
{
    double nPeak = 0;
    const auto oTimes = MedianSeconds({{"nothing",
                                        [&]
                                        {
                                            RunChild(oSettings, "nothing", nPeak);
                                        }},
                                       {"instance",
                                        [&]
                                        {
                                            RunChild(oSettings, "instance", nPeak);
                                        }}},
                                      21);
    PrintRow("first GetInstance, milliseconds above a process", (oTimes[1] - oTimes[0]) * 1000, 0, "at most 15");

    MakeSparse(oSettings.moFolder, 100000, 256);
    double nInstancePeak = 0;
    RunChild(oSettings, "instance", nInstancePeak);
    RunChild(oSettings, "sparse", nPeak);
    PrintRow("sparse 100000 x 100000 with margins, MiB above", nPeak - nInstancePeak, 0,
             "at most the cache's bound + 32");
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
    PrintRow("10,000 opens, time against TIFFOpen and TIFFClose", oTimes[0] / oTimes[1], 0, "at most 1.5");
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
                MeasureWindowsOfMapping(oMake(oKind, codec, 256));
            else if (!oKind.mbReal && codec == "deflate")
                MeasureWindowsOfLibtiff(oMake(oKind, codec, 256));
    }
    if (oArguments.Wants("memory"))
    {
        PrintHeading("Raster memory, filling against reused buffers");
        MeasureEightRasters();
    }
    if (oArguments.Wants("threads"))
    {
        PrintHeading("Threads");
        for (const auto& [oKind, codec] : oScenes)
            if (oKind.mnChannels == 3)
                MeasureTwoThreads(oMake(oKind, codec, 256));
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
                               "FOLDER [--size N] [--only tiles|margins|windows|memory|threads|process] "
                               "[--match TEXT]");
    const Settings oSettings{oArguments.GetWords().front(), oArguments.GetNumber("size", 8192),
                             std::filesystem::read_symlink("/proc/self/exe").string()};
    std::filesystem::create_directories(oSettings.moFolder);
    MeasureAll(oSettings, oArguments);
    return 0;
}
