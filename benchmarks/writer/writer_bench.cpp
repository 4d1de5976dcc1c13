// Measures writing of new files through the library against the same work by hand, libtiff and, where it is installed,
// libvips, in one process and interleaved rounds of changing order.
//     krv_bench_writer FOLDER [--size N] [--only none|deflate|zstd]
// FOLDER keeps the scene for the next run; the files that are written in it are removed.

#include "benchmarks/support/arguments.h"
#include "benchmarks/support/measure.h"
#include "benchmarks/support/scene.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/reader/basicreader.h"
#include "datasources/writer/basicwriter.h"
#include "gobs/raster/raster.h"
#include "plugins/support/codec/deflate.h"
#include "plugins/support/codec/predictor.h"
#include "plugins/support/codec/zstd.h"

#include <fcntl.h>
#include <tiffio.h>
#include <unistd.h>
#ifdef KRV_HAVE_VIPS
#include <vips/vips.h>
#endif

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <functional>
#include <memory>
#include <numeric>
#include <random>
#include <stdexcept>

namespace
{

using namespace krv::benchmarks;
namespace codec = krv::plugins::codec;

constexpr unsigned int TILE = 256;
constexpr unsigned int CHANNELS = 3;
constexpr std::size_t TILE_BYTES = std::size_t{TILE} * TILE * CHANNELS;
constexpr int DEFLATE_LEVEL = 6;
constexpr int ZSTD_LEVEL = 3;
// Tiles that begin at multiples of a quarter MiB would be slow in the page cache, for whoever writes them.
constexpr off_t FIRST_TILE = 16384;

// The pixels in memory, tile by tile and row by row.
struct Pixels
{
    unsigned int mnSize = 0;
    unsigned int mnAcross = 0;
    std::vector<unsigned char> moTiles;
    std::vector<unsigned char> moRows;

    unsigned int CountTiles() const { return mnAcross * mnAcross; }
    unsigned char* GetTile(unsigned int nTile) { return moTiles.data() + nTile * TILE_BYTES; }
};

// Seconds of writing all tiles, and of making them safe on the disk after it.
struct Times
{
    double mnWritten = 0;
    double mnSafe = 0;
};

class Clock
{
public:
    double Get() const { return std::chrono::duration<double>(std::chrono::steady_clock::now() - moStart).count(); }

private:
    std::chrono::steady_clock::time_point moStart = std::chrono::steady_clock::now();
};

Pixels LoadPixels(const SceneFile& oScene)
{
    krv::datasources::BasicReader oReader(oScene.moPath);
    Pixels oPixels;
    oPixels.mnSize = oScene.mnSize;
    oPixels.mnAcross = oScene.mnSize / TILE;
    oPixels.moTiles.resize(oPixels.CountTiles() * TILE_BYTES);
    oPixels.moRows.resize(oPixels.moTiles.size());
    for (unsigned int nTile = 0; nTile < oPixels.CountTiles(); ++nTile)
    {
        const std::unique_ptr<krv::gobs::Raster> poRaster(oReader.GetRaster(nTile));
        std::memcpy(oPixels.GetTile(nTile), poRaster->GetBuffer(), TILE_BYTES);
        for (unsigned int nRow = 0; nRow < TILE; ++nRow)
            std::memcpy(oPixels.moRows.data() +
                            ((std::size_t{nTile} / oPixels.mnAcross * TILE + nRow) * oPixels.mnSize +
                             std::size_t{nTile} % oPixels.mnAcross * TILE) *
                                CHANNELS,
                        poRaster->GetBuffer() + nRow * TILE * CHANNELS, TILE * CHANNELS);
    }
    return oPixels;
}

Times WriteByLibrary(Pixels& oPixels, const std::string& codecName, const std::string& file, const char* pMore = "")
{
    const Clock oClock;
    Times oTimes;
    const std::string options = "BLOCKXSIZE=256 BLOCKYSIZE=256 COMPRESS=" + codecName + pMore;
    std::unique_ptr<krv::datasources::IDataset> poDataset(
        krv::datasources::DatasetManager::GetInstance()->NewDataset(file, "TIF", options));
    auto* const poRaster = dynamic_cast<krv::datasources::IRasterDataset*>(poDataset.get());
    poRaster->Create(krv::gobs::RasterInfo(oPixels.mnSize, oPixels.mnSize, CHANNELS, krv::gobs::eDT_8U));
    krv::datasources::BasicWriter oWriter(poRaster, {});
    const krv::gobs::RasterInfo oInfo(TILE, TILE, CHANNELS, krv::gobs::eDT_8U);
    for (unsigned int nTile = 0; nTile < oPixels.CountTiles(); ++nTile)
    {
        const krv::gobs::RasterContext oContext(static_cast<int>(nTile % oPixels.mnAcross * TILE),
                                                static_cast<int>(nTile / oPixels.mnAcross * TILE));
        const krv::gobs::Raster oRaster(oInfo, oContext, oPixels.GetTile(nTile), false);
        oWriter.WriteRaster(&oRaster);
    }
    oTimes.mnWritten = oClock.Get();
    poDataset->Close();
    oTimes.mnSafe = oClock.Get();
    return oTimes;
}

// Straight code over the codec libraries and pwrite.
class ByHand
{
public:
    explicit ByHand(const std::string& codecName) : moCodec(codecName), moDeflate(DEFLATE_LEVEL), moZstd(ZSTD_LEVEL)
    {
        moDifferences.resize(TILE_BYTES);
        moCoded.resize(std::max(moDeflate.GetBound(TILE_BYTES), moZstd.GetBound(TILE_BYTES)));
    }

    Times Write(Pixels& oPixels, const std::string& file)
    {
        const Clock oClock;
        Times oTimes;
        const int nFile = open(file.c_str(), O_RDWR | O_CREAT | O_TRUNC, 0666);
        off_t nAt = FIRST_TILE;
        for (unsigned int nTile = 0; nTile < oPixels.CountTiles(); ++nTile)
        {
            const unsigned char* pBytes = oPixels.GetTile(nTile);
            std::size_t nBytes = TILE_BYTES;
            if (moCodec != "none")
            {
                const codec::BlockShape oShape{TILE, TILE, CHANNELS, 1};
                codec::ApplyHorizontal(pBytes, oShape.GetRowBytes(), moDifferences.data(), oShape.GetRowBytes(),
                                       oShape);
                nBytes = moCodec == "deflate"
                             ? moDeflate.Encode(moDifferences.data(), TILE_BYTES, moCoded.data(), moCoded.size())
                             : moZstd.Encode(moDifferences.data(), TILE_BYTES, moCoded.data(), moCoded.size());
                pBytes = moCoded.data();
            }
            if (pwrite(nFile, pBytes, nBytes, nAt) != static_cast<ssize_t>(nBytes))
                throw std::runtime_error("short write");
            nAt += static_cast<off_t>(nBytes + nBytes % 2);
        }
        mnBytes = static_cast<std::uint64_t>(nAt - FIRST_TILE);
        oTimes.mnWritten = oClock.Get();
        fdatasync(nFile);
        close(nFile);
        oTimes.mnSafe = oClock.Get();
        return oTimes;
    }

    std::uint64_t GetBytes() const { return mnBytes; }

private:
    std::string moCodec;
    codec::DeflateEncoder moDeflate;
    codec::ZstdEncoder moZstd;
    std::vector<unsigned char> moDifferences;
    std::vector<unsigned char> moCoded;
    std::uint64_t mnBytes = 0;
};

Times WriteByLibtiff(Pixels& oPixels, const std::string& codecName, const std::string& file)
{
    const Clock oClock;
    Times oTimes;
    TIFF* const poTiff = TIFFOpen(file.c_str(), "w");
    TIFFSetField(poTiff, TIFFTAG_IMAGEWIDTH, oPixels.mnSize);
    TIFFSetField(poTiff, TIFFTAG_IMAGELENGTH, oPixels.mnSize);
    TIFFSetField(poTiff, TIFFTAG_TILEWIDTH, TILE);
    TIFFSetField(poTiff, TIFFTAG_TILELENGTH, TILE);
    TIFFSetField(poTiff, TIFFTAG_BITSPERSAMPLE, 8);
    TIFFSetField(poTiff, TIFFTAG_SAMPLESPERPIXEL, CHANNELS);
    TIFFSetField(poTiff, TIFFTAG_PLANARCONFIG, PLANARCONFIG_CONTIG);
    TIFFSetField(poTiff, TIFFTAG_PHOTOMETRIC, PHOTOMETRIC_RGB);
    if (codecName != "none")
    {
        TIFFSetField(poTiff, TIFFTAG_COMPRESSION, codecName == "zstd" ? COMPRESSION_ZSTD : COMPRESSION_ADOBE_DEFLATE);
        TIFFSetField(poTiff, TIFFTAG_PREDICTOR, PREDICTOR_HORIZONTAL);
        // Its deflate level is 6 by itself.
        if (codecName == "zstd")
            TIFFSetField(poTiff, TIFFTAG_ZSTD_LEVEL, ZSTD_LEVEL);
    }
    for (unsigned int nTile = 0; nTile < oPixels.CountTiles(); ++nTile)
        if (TIFFWriteEncodedTile(poTiff, nTile, oPixels.GetTile(nTile), TILE_BYTES) < 0)
            throw std::runtime_error("libtiff cannot write");
    TIFFFlush(poTiff);
    oTimes.mnWritten = oClock.Get();
    fdatasync(TIFFFileno(poTiff));
    TIFFClose(poTiff);
    oTimes.mnSafe = oClock.Get();
    return oTimes;
}

#ifdef KRV_HAVE_VIPS
Times WriteByVips(Pixels& oPixels, const std::string& codecName, const std::string& file)
{
    const Clock oClock;
    Times oTimes;
    VipsImage* const poImage =
        vips_image_new_from_memory(oPixels.moRows.data(), oPixels.moRows.size(), static_cast<int>(oPixels.mnSize),
                                   static_cast<int>(oPixels.mnSize), CHANNELS, VIPS_FORMAT_UCHAR);
    poImage->Type = VIPS_INTERPRETATION_sRGB;
    const auto eCodec = codecName == "none"   ? VIPS_FOREIGN_TIFF_COMPRESSION_NONE
                        : codecName == "zstd" ? VIPS_FOREIGN_TIFF_COMPRESSION_ZSTD
                                              : VIPS_FOREIGN_TIFF_COMPRESSION_DEFLATE;
    const int nLevel = codecName == "zstd" ? ZSTD_LEVEL : DEFLATE_LEVEL;
    if (vips_tiffsave(poImage, file.c_str(), "tile", TRUE, "tile_width", static_cast<int>(TILE), "tile_height",
                      static_cast<int>(TILE), "compression", eCodec, "predictor",
                      VIPS_FOREIGN_TIFF_PREDICTOR_HORIZONTAL, "level", nLevel, nullptr) != 0)
        throw std::runtime_error("libvips cannot write");
    g_object_unref(poImage);
    oTimes.mnWritten = oClock.Get();
    const int nFile = open(file.c_str(), O_RDWR);
    fdatasync(nFile);
    close(nFile);
    oTimes.mnSafe = oClock.Get();
    return oTimes;
}
#endif

using Writer = std::function<Times(const std::string&)>;

// Every file is new; the one before is gone and the disk has settled before the next is timed.
std::vector<Times> MedianTimes(const std::vector<Writer>& oWriters, const std::string& folder, int nRounds)
{
    std::vector<std::vector<double>> oWritten(oWriters.size()), oSafe(oWriters.size());
    std::vector<std::size_t> oOrder(oWriters.size());
    std::iota(oOrder.begin(), oOrder.end(), std::size_t{0});
    std::mt19937 oRandom(11);
    for (int nRound = -1; nRound < nRounds; ++nRound)
    {
        std::shuffle(oOrder.begin(), oOrder.end(), oRandom);
        for (const std::size_t nWriter : oOrder)
        {
            const std::string file = folder + "/written." + std::to_string(nWriter) + ".tif";
            const Times oTimes = oWriters[nWriter](file);
            std::filesystem::remove(file);
            sync();
            if (nRound < 0)
                continue;
            oWritten[nWriter].push_back(oTimes.mnWritten);
            oSafe[nWriter].push_back(oTimes.mnSafe);
        }
    }
    std::vector<Times> oMedians;
    for (std::size_t nWriter = 0; nWriter < oWriters.size(); ++nWriter)
    {
        for (auto* pTimes : {&oWritten[nWriter], &oSafe[nWriter]})
            std::sort(pTimes->begin(), pTimes->end());
        oMedians.push_back({oWritten[nWriter][nRounds / 2u], oSafe[nWriter][nRounds / 2u]});
    }
    return oMedians;
}

// The library's file must hold the pixels in as many bytes as the straight code makes of them.
void CheckEqual(Pixels& oPixels, ByHand& oHand, const std::string& codecName, const std::string& folder)
{
    const std::string file = folder + "/written.tif";
    oHand.Write(oPixels, file);
    WriteByLibrary(oPixels, codecName, file);
    TIFF* const poTiff = TIFFOpen(file.c_str(), "r");
    std::uint64_t nBytes = 0;
    for (unsigned int nTile = 0; nTile < oPixels.CountTiles(); ++nTile)
        nBytes += (TIFFGetStrileByteCount(poTiff, nTile) + 1) / 2 * 2;
    std::vector<unsigned char> oTile(TILE_BYTES);
    const unsigned int nLast = oPixels.CountTiles() - 1;
    TIFFReadEncodedTile(poTiff, nLast, oTile.data(), TILE_BYTES);
    TIFFClose(poTiff);
    std::filesystem::remove(file);
    if (nBytes != oHand.GetBytes() || std::memcmp(oTile.data(), oPixels.GetTile(nLast), TILE_BYTES) != 0)
        throw std::runtime_error("the library's file is not the one that is made by hand");
}

void Measure(Pixels& oPixels, const std::string& codecName, const std::string& folder, double nGoal, int nRounds)
{
    ByHand oHand(codecName);
    CheckEqual(oPixels, oHand, codecName, folder);
    std::vector<Writer> oWriters = {[&](const std::string& file) { return WriteByLibrary(oPixels, codecName, file); },
                                    [&](const std::string& file) { return oHand.Write(oPixels, file); },
                                    [&](const std::string& file)
                                    {
                                        return WriteByLibtiff(oPixels, codecName, file);
                                    }};
    constexpr std::size_t VIPS = 3;
#ifdef KRV_HAVE_VIPS
    oWriters.emplace_back([&](const std::string& file) { return WriteByVips(oPixels, codecName, file); });
#endif
    const std::size_t nBands = oWriters.size();
    if (codecName == "none")
        oWriters.emplace_back([&](const std::string& file)
                              { return WriteByLibrary(oPixels, codecName, file, " INTERLEAVE=BAND"); });
    const auto oTimes = MedianTimes(oWriters, folder, nRounds);
    const auto Ratio = [&oTimes](std::size_t nWriter)
    {
        return oTimes[1].mnWritten / oTimes[nWriter].mnWritten;
    };
    std::string remarks = Number(static_cast<double>(oPixels.moTiles.size()) / oTimes[0].mnWritten / 1e6, 0) +
                          " MB/s; libtiff " + Number(Ratio(2));
    if (nBands > VIPS)
        remarks += ", libvips " + Number(Ratio(VIPS));
    PrintRow(codecName + ", new file", Ratio(0), nGoal, remarks);
    PrintRow(codecName + ", new file, until it is on the disk", oTimes[1].mnSafe / oTimes[0].mnSafe, 0,
             "libtiff " + Number(oTimes[1].mnSafe / oTimes[2].mnSafe));
    if (oTimes.size() > nBands)
        PrintRow(codecName + ", band interleaved, against pixel interleaved", Ratio(nBands), 0);
}

} // namespace

int main(int nArguments, char** pArguments)
{
    const Arguments oArguments(nArguments, pArguments, "FOLDER [--size N] [--only none|deflate|zstd]");
    const std::string& folder = oArguments.GetWords().front();
    const unsigned int nSize = oArguments.GetNumber("size", 8192) / TILE * TILE;
    std::filesystem::create_directories(folder);
#ifdef KRV_HAVE_VIPS
    if (VIPS_INIT(pArguments[0]) != 0)
        return 1;
    vips_concurrency_set(1);
#endif
    Pixels oPixels = LoadPixels(MakeScene(folder, {"3x8U", CHANNELS, 8, false}, "none", TILE, nSize));
    PrintHeading("Writing " + std::to_string(nSize) + " x " + std::to_string(nSize) +
                 " x 3 in tiles of 256, against straight code over pwrite and the codecs");
    if (oArguments.Wants("none"))
        Measure(oPixels, "none", folder, 0.95, 11);
    if (oArguments.Wants("deflate"))
        Measure(oPixels, "deflate", folder, 0.97, 3);
    if (oArguments.Wants("zstd"))
        Measure(oPixels, "zstd", folder, 0.97, 5);
    return 0;
}
