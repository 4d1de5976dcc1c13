// Building levels 2 to 32 by average, against straight code over the tiles of libtiff and against the pyramid of
// libvips; averaging alone against reading the source once; memory. Usage: krv_bench_overviews FOLDER [--size N]
// N is a multiple of 8192.

#include "benchmarks/overviews/byhand.h"
#include "benchmarks/support/arguments.h"
#include "benchmarks/support/measure.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/overviews/overviewbuilder.h"
#include "datasources/reader/ioverviewaccessor.h"
#include "datasources/writer/basicwriter.h"
#include "gobs/raster/raster.h"
#include "gobs/resampling/levelreducer.h"
#include "gobs/resampling/leveltarget.h"

#include <fcntl.h>
#include <immintrin.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <functional>
#include <memory>
#include <random>
#include <stdexcept>
#include <string>
#include <vector>

#if defined(KRV_HAVE_VIPS)
#include <vips/vips.h>
#endif

namespace
{

using namespace krv::benchmarks;
using krv::datasources::BasicWriter;
using krv::datasources::DatasetManager;

const std::vector<unsigned int> LEVELS = {2, 4, 8, 16, 32};

// The writer, since one that goes without having been synchronised takes back what it wrote.
std::unique_ptr<BasicWriter> Build(const std::string& file, bool bSync)
{
    auto oWriter = std::make_unique<BasicWriter>(file);
    krv::datasources::BuildOverviews(*oWriter, LEVELS, "average");
    if (bSync)
        oWriter->Synchronize();
    return oWriter;
}

// The file without levels, in the page cache and not on its way to the disk.
std::string Copy(const SceneFile& oScene, const std::string& folder)
{
    const std::string file = folder + "/overviews.tif";
    std::filesystem::copy_file(oScene.moPath, file, std::filesystem::copy_options::overwrite_existing);
    const int nFile = open(file.c_str(), O_RDONLY);
    fsync(nFile);
    close(nFile);
    return file;
}

// Both ways must give the same pixels before they are worth a figure.
void CheckEqual(const SceneFile& oScene, const std::string& folder)
{
    const std::string file = Copy(oScene, folder);
    const std::string target = folder + "/byhand.bin";
    Build(file, true);
    BuildByHand(oScene, file, target, false);
    BasicWriter oWriter(file);
    const std::unique_ptr<krv::datasources::IOverviewReaderAccessor> oLevels(oWriter.GetOverviewReaderAccessor());
    const int nFile = open(target.c_str(), O_RDONLY);
    std::vector<unsigned char> oTile(256 * 256 * 3);
    for (const unsigned int nLevel : LEVELS)
    {
        const std::unique_ptr<krv::datasources::IRasterReader> oReader(oLevels->CreateRasterReader(nLevel));
        const unsigned int nTiles = oScene.mnSize / nLevel / 256;
        for (unsigned int n = 0; n < nTiles * nTiles; ++n)
        {
            const std::unique_ptr<krv::gobs::Raster> oRaster(oReader->GetRaster(n));
            const auto nOffset = static_cast<off_t>(GetTileOffset(oScene, nLevel, n % nTiles, n / nTiles));
            if (pread(nFile, oTile.data(), oTile.size(), nOffset) != static_cast<ssize_t>(oTile.size()) ||
                std::memcmp(oTile.data(), oRaster->GetBuffer(), oTile.size()) != 0)
                throw std::runtime_error("the candidates differ at level " + std::to_string(nLevel));
        }
    }
    close(nFile);
}

#if defined(KRV_HAVE_VIPS)
void SaveByVips(const std::string& file, const std::string& target, bool bPyramid)
{
    VipsImage* const poImage = vips_image_new_from_file(file.c_str(), "access", VIPS_ACCESS_SEQUENTIAL, nullptr);
    if (poImage == nullptr ||
        vips_tiffsave(poImage, target.c_str(), "tile", TRUE, "tile_width", 256, "tile_height", 256, "pyramid",
                      bPyramid ? TRUE : FALSE, "compression", VIPS_FOREIGN_TIFF_COMPRESSION_NONE, nullptr) != 0)
        throw std::runtime_error("libvips failed");
    g_object_unref(poImage);
}
#endif

void MeasureFiles(const SceneFile& oScene, const std::string& folder, int nRounds)
{
    CheckEqual(oScene, folder);
    const std::string target = folder + "/byhand.bin";
    std::string file;
    struct Run
    {
        std::function<void()> moRun;
        std::vector<double> moTimes;
    };
    std::unique_ptr<BasicWriter> oWriter;
    std::vector<Run> oRuns = {
        {[&] { oWriter = Build(file, false); }, {}},
        {[&] { BuildByHand(oScene, file, target, false); }, {}},
        {[&] { oWriter = Build(file, true); }, {}},
        {[&] { BuildByHand(oScene, file, target, true); }, {}},
    };
#if defined(KRV_HAVE_VIPS)
    vips_concurrency_set(1);
    oRuns.push_back({[&] { SaveByVips(file, folder + "/vips.tif", true); }, {}});
    oRuns.push_back({[&] { SaveByVips(file, folder + "/vips.tif", false); }, {}});
#endif
    std::vector<std::size_t> oOrder(oRuns.size());
    for (std::size_t n = 0; n < oOrder.size(); ++n)
        oOrder[n] = n;
    std::mt19937 oRandom(5);
    for (int nRound = 0; nRound < nRounds; ++nRound)
    {
        std::shuffle(oOrder.begin(), oOrder.end(), oRandom);
        for (const std::size_t n : oOrder)
        {
            oWriter.reset();
            std::filesystem::remove(target);
            std::filesystem::remove(folder + "/vips.tif");
            file = Copy(oScene, folder);
            sync();
            oRuns[n].moTimes.push_back(Seconds(oRuns[n].moRun));
        }
    }
    const auto Time = [&](std::size_t n)
    {
        return Median(oRuns[n].moTimes);
    };
    const double nMegabytes = 3.0 * oScene.mnSize * oScene.mnSize / 1e6;
    const auto Rate = [&](double nSeconds)
    {
        return Number(nMegabytes / nSeconds, 0) + " MB/s";
    };
    PrintRow("levels written, against a loop by hand", Time(1) / Time(0), 0.9, Rate(Time(0)) + " of " + Rate(Time(1)));
    PrintRow("the same, both brought to the disk", Time(3) / Time(2), 0.9, Rate(Time(2)) + " of " + Rate(Time(3)));
#if defined(KRV_HAVE_VIPS)
    PrintRow("against a pyramid of libvips", Time(4) / Time(0), 3, Rate(Time(4)));
    PrintRow("against what its levels take longer than a flat copy", (Time(4) - Time(5)) / Time(0), 3,
             Rate(Time(4) - Time(5)));
#endif
}

// Reads everything once and does next to nothing with it.
void ReadOnce(const std::vector<unsigned char>& oBytes)
{
    __m128i oAll = _mm_setzero_si128();
    __m128i oMore = _mm_setzero_si128();
    for (std::size_t n = 0; n + 64 <= oBytes.size(); n += 64)
    {
        const auto* const p = reinterpret_cast<const __m128i*>(oBytes.data() + n);
        oAll = _mm_xor_si128(oAll, _mm_xor_si128(_mm_loadu_si128(p), _mm_loadu_si128(p + 1)));
        oMore = _mm_xor_si128(oMore, _mm_xor_si128(_mm_loadu_si128(p + 2), _mm_loadu_si128(p + 3)));
    }
    oAll = _mm_xor_si128(oAll, oMore);
    Keep(&oAll);
}

// Levels of an image in memory that lies there tile by tile; what is made is thrown away tile by tile.
void AverageTiles(const std::vector<unsigned char>& oBytes, const krv::gobs::DataType& oType, unsigned int nChannels,
                  unsigned int nWidth, unsigned int nHeight, const std::vector<unsigned int>& oLevels)
{
    const krv::gobs::SourceForm oForm{nWidth, nHeight, nChannels, oType, false};
    std::vector<std::unique_ptr<krv::gobs::LevelTarget>> oTargets;
    std::vector<krv::gobs::LevelTask> oTasks;
    for (const unsigned int nLevel : oLevels)
    {
        const krv::gobs::PixelBounds oBounds{0, 0, nWidth / nLevel, nHeight / nLevel};
        oTargets.push_back(std::make_unique<krv::gobs::LevelTarget>(
            krv::gobs::TileGatherer(oBounds, 256, 256, nChannels, oType,
                                    [](const std::unique_ptr<krv::gobs::Raster>& poTile)
                                    { Keep(poTile->GetBuffer()); }),
            oForm, nullptr));
        oTasks.push_back({nLevel, oBounds, oTargets.back().get()});
    }
    const auto oReducer = krv::gobs::MakeAverageCascade(oForm, oTasks, {0, 0, nWidth, nHeight}, false);
    const std::size_t nTileBytes = 256 * 256 * oForm.GetPixelBytes();
    const unsigned char* pTile = oBytes.data();
    for (unsigned int nY = 0; nY < nHeight; nY += 256)
        for (unsigned int nX = 0; nX < nWidth; nX += 256, pTile += nTileBytes)
            oReducer->Add({{nX, nY, nX + 256, nY + 256}, pTile, nullptr});
}

void MeasureMemory(const char* pName, const krv::gobs::DataType& oType, unsigned int nChannels)
{
    const unsigned int nWidth = 8192;
    const std::size_t nPixelBytes = oType.GetValueBits() / 8 * nChannels;
    const auto nHeight = static_cast<unsigned int>((std::size_t{192} << 20) / nWidth / nPixelBytes / 256 * 256);
    std::vector<unsigned char> oBytes(std::size_t{nWidth} * nHeight * nPixelBytes);
    for (std::size_t n = 0; n < oBytes.size(); ++n)
        oBytes[n] = static_cast<unsigned char>(n * 7 >> 3 & 0x3F);
    const auto oTimes = MedianSeconds({{"once",
                                        [&]
                                        {
                                            ReadOnce(oBytes);
                                        }},
                                       {"one",
                                        [&]
                                        {
                                            AverageTiles(oBytes, oType, nChannels, nWidth, nHeight, {2});
                                        }},
                                       {"all",
                                        [&]
                                        {
                                            AverageTiles(oBytes, oType, nChannels, nWidth, nHeight, LEVELS);
                                        }}},
                                      9);
    const auto Rate = [&](double nSeconds)
    {
        return Number(static_cast<double>(oBytes.size()) / nSeconds / 1e6, 0) + " MB/s";
    };
    PrintRow(std::string(pName) + ", level 2", oTimes[0] / oTimes[1], 0.9, Rate(oTimes[1]) + " of " + Rate(oTimes[0]));
    PrintRow(std::string(pName) + ", levels 2 to 32", oTimes[0] / oTimes[2], 0, Rate(oTimes[2]));
}

// Runs this program again; the child's peak memory in MiB. It tells it itself: what the system counts for a child
// begins with this process's own.
double RunChild(const std::string& file)
{
    const std::string self = std::filesystem::read_symlink("/proc/self/exe").string();
    FILE* const poChild = popen((self + " --child '" + file + "'").c_str(), "r");
    double nPeak = 0;
    if (poChild == nullptr || std::fscanf(poChild, "%lf", &nPeak) != 1 || pclose(poChild) != 0)
        throw std::runtime_error("the child failed");
    return nPeak;
}

int BeChild(const std::string& file)
{
    DatasetManager::GetInstance();
    if (!file.empty())
        Build(file, true);
    std::ifstream oStatus("/proc/self/status");
    for (std::string line; std::getline(oStatus, line);)
        if (line.starts_with("VmHWM:"))
            std::printf("%f\n", std::stod(line.substr(6)) / 1024);
    return 0;
}

} // namespace

int main(int nArguments, char** pArguments)
{
    if (nArguments == 3 && std::strcmp(pArguments[1], "--child") == 0)
        return BeChild(pArguments[2]);
    const Arguments oArguments(nArguments, pArguments, "FOLDER [--size N]");
#if defined(KRV_HAVE_VIPS)
    if (VIPS_INIT(pArguments[0]) != 0)
        return 1;
#endif
    const std::string& folder = oArguments.GetWords().front();
    std::filesystem::create_directories(folder);
    const unsigned int nSize = oArguments.GetNumber("size", 8192);
    if (nSize == 0 || nSize % (256U << 5) != 0)
        throw std::invalid_argument("--size: the loop by hand has whole tiles in all levels: a multiple of 8192");
    const SceneFile oScene = MakeScene(folder, {"8U x 3", 3, 8, false}, "none", 256, nSize);

    PrintHeading("Averaging in memory, against reading the source once");
    MeasureMemory("8U x 1", krv::gobs::eDT_8U, 1);
    MeasureMemory("8U x 3", krv::gobs::eDT_8U, 3);
    MeasureMemory("8U x 4", krv::gobs::eDT_8U, 4);
    MeasureMemory("16U x 1", krv::gobs::eDT_16U, 1);
    MeasureMemory("16U x 3", krv::gobs::eDT_16U, 3);
    MeasureMemory("32R x 1", krv::gobs::eDT_32R, 1);
    PrintHeading("Levels 2 to 32 by average of an uncompressed file of tiles of 256");
    MeasureFiles(oScene, folder, 7);
    const double nManager = RunChild("");
    PrintRow("peak memory above a process with the manager, MiB", RunChild(Copy(oScene, folder)) - nManager, 0,
             "at most 64");
    return 0;
}
