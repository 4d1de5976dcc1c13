// Measures the block codecs on tiles of 256 x 256 in memory, one thread. Each decoding is compared with the image
// first.

#include "benchmarks/codec/memorytiff.h"
#include "benchmarks/support/arguments.h"
#include "benchmarks/support/measure.h"
#include "plugins/support/codec/bits.h"
#include "plugins/support/codec/deflate.h"
#include "plugins/support/codec/lzw.h"
#include "plugins/support/codec/predictor.h"
#include "plugins/support/codec/zstd.h"
#include "toolkit/raster/interleave.h"

#include <array>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <functional>
#include <random>
#include <string>

namespace
{

using krv::benchmarks::MedianSeconds;
using krv::benchmarks::MemoryTiff;
using krv::benchmarks::Number;
using krv::benchmarks::PrintHeading;
using krv::benchmarks::PrintRow;
namespace codec = krv::plugins::codec;
using Bytes = std::vector<unsigned char>;

constexpr std::size_t TILE = 256;
constexpr std::size_t TILES = 48;
constexpr int ROUNDS = 11;

// Fractal terrain by midpoint displacement on a torus of nSize x nSize, about 0 to 1.
std::vector<float> MakeTerrain(std::size_t nSize, unsigned int nSeed)
{
    std::mt19937 oRandom(nSeed);
    std::vector<float> oHeights(nSize * nSize, 0.5F);
    auto oAt = [&](std::size_t x, std::size_t y) -> float&
    {
        return oHeights[(y % nSize) * nSize + x % nSize];
    };
    float nRange = 0.5F;
    for (std::size_t nStep = nSize; nStep > 1; nStep /= 2, nRange *= 0.55F)
    {
        std::uniform_real_distribution<float> oShift(-nRange, nRange);
        const std::size_t h = nStep / 2;
        for (std::size_t y = 0; y < nSize; y += nStep)
            for (std::size_t x = 0; x < nSize; x += nStep)
                oAt(x + h, y + h) = oShift(oRandom) +
                                    (oAt(x, y) + oAt(x + nStep, y) + oAt(x, y + nStep) + oAt(x + nStep, y + nStep)) / 4;
        for (std::size_t y = 0; y < nSize; y += h)
            for (std::size_t x = (y / h) % 2 == 0 ? h : 0; x < nSize; x += nStep)
                oAt(x, y) = oShift(oRandom) +
                            (oAt(x + h, y) + oAt(x + nSize - h, y) + oAt(x, y + h) + oAt(x, y + nSize - h)) / 4;
    }
    return oHeights;
}

struct Kind
{
    const char* moName;
    std::size_t mnChannels;
    std::size_t mnBytes;
    bool mbReal;
};

// The tiles of an image, one after the other, pixel interleaved.
Bytes MakeTiles(const Kind& oKind)
{
    constexpr std::size_t SIZE = 2048;
    Bytes oTiles(TILES * TILE * TILE * oKind.mnChannels * oKind.mnBytes);
    std::mt19937 oRandom(7);
    std::normal_distribution<float> oNoise(0, 1.0F);
    for (std::size_t c = 0; c < oKind.mnChannels; ++c)
    {
        const std::vector<float> oHeights = MakeTerrain(SIZE, 11 + static_cast<unsigned int>(c / 3));
        for (std::size_t i = 0; i < TILES * TILE * TILE; ++i)
        {
            const std::size_t nTile = i / (TILE * TILE), nRow = i / TILE % TILE, nColumn = i % TILE;
            const std::size_t x = nTile % (SIZE / TILE) * TILE + nColumn, y = nTile / (SIZE / TILE) * TILE + nRow;
            const float nHeight = oHeights[y * SIZE + x];
            unsigned char* sample = oTiles.data() + (i * oKind.mnChannels + c) * oKind.mnBytes;
            if (oKind.mbReal)
            {
                const float nValue = 300 + 900 * nHeight;
                std::memcpy(sample, &nValue, 4);
            }
            else if (oKind.mnBytes == 2)
            {
                const auto nValue = static_cast<std::uint16_t>(std::clamp(2000 + 6000 * nHeight, 0.0F, 65535.0F));
                std::memcpy(sample, &nValue, 2);
            }
            else
                *sample = static_cast<unsigned char>(
                    std::clamp(30 + 150 * nHeight + 10 * static_cast<float>(c) + oNoise(oRandom), 0.0F, 255.0F));
        }
    }
    return oTiles;
}

struct Coding
{
    const char* moName;
    int mnCompression;
    int mnPredictor;
};

struct Encoded
{
    MemoryTiff moFile;
    std::vector<Bytes> moBlocks;
};

Encoded Encode(const Bytes& oTiles, const Kind& oKind, const Coding& oCoding)
{
    Encoded oResult;
    const std::size_t nBytes = oTiles.size() / TILES;
    {
        const auto oFile = oResult.moFile.Open("w");
        TIFF* tif = oFile.get();
        TIFFSetField(tif, TIFFTAG_IMAGEWIDTH, static_cast<std::uint32_t>(TILE * TILES));
        TIFFSetField(tif, TIFFTAG_IMAGELENGTH, static_cast<std::uint32_t>(TILE));
        TIFFSetField(tif, TIFFTAG_TILEWIDTH, static_cast<std::uint32_t>(TILE));
        TIFFSetField(tif, TIFFTAG_TILELENGTH, static_cast<std::uint32_t>(TILE));
        TIFFSetField(tif, TIFFTAG_SAMPLESPERPIXEL, static_cast<int>(oKind.mnChannels));
        TIFFSetField(tif, TIFFTAG_BITSPERSAMPLE, static_cast<int>(oKind.mnBytes * 8));
        TIFFSetField(tif, TIFFTAG_SAMPLEFORMAT, oKind.mbReal ? SAMPLEFORMAT_IEEEFP : SAMPLEFORMAT_UINT);
        TIFFSetField(tif, TIFFTAG_PLANARCONFIG, PLANARCONFIG_CONTIG);
        TIFFSetField(tif, TIFFTAG_PHOTOMETRIC, PHOTOMETRIC_MINISBLACK);
        TIFFSetField(tif, TIFFTAG_COMPRESSION, oCoding.mnCompression);
        TIFFSetField(tif, TIFFTAG_PREDICTOR, oCoding.mnPredictor);
        for (std::size_t i = 0; i < TILES; ++i)
        {
            Bytes oTile(oTiles.begin() + static_cast<std::ptrdiff_t>(i * nBytes),
                        oTiles.begin() + static_cast<std::ptrdiff_t>((i + 1) * nBytes));
            TIFFWriteEncodedTile(tif, static_cast<std::uint32_t>(i), oTile.data(), static_cast<tmsize_t>(nBytes));
        }
    }
    const auto oFile = oResult.moFile.Open("r");
    for (std::uint32_t i = 0; i < TILES; ++i)
    {
        Bytes oBlock(TIFFGetStrileByteCount(oFile.get(), i));
        TIFFReadRawTile(oFile.get(), i, oBlock.data(), static_cast<tmsize_t>(oBlock.size()));
        oResult.moBlocks.push_back(std::move(oBlock));
    }
    return oResult;
}

[[noreturn]] void Stop(const std::string& text)
{
    std::fprintf(stderr, "codec_bench: %s\n", text.c_str());
    std::exit(1);
}

class Ours
{
public:
    void Decode(const Bytes& oBlock, unsigned char* output, std::size_t nOutput, const Kind& oKind,
                const Coding& oCoding)
    {
        const codec::BlockShape oShape{TILE, TILE, oKind.mnChannels, oKind.mnBytes};
        const std::size_t nPitch = oShape.GetRowBytes();
        unsigned char* decoded = output;
        if (oCoding.mnPredictor == PREDICTOR_FLOATINGPOINT)
        {
            moBlock.resize(nOutput);
            decoded = moBlock.data();
        }
        codec::Result oResult;
        if (oCoding.mnCompression == COMPRESSION_LZW)
            oResult = moLzw.Decode(oBlock.data(), oBlock.size(), decoded, nOutput);
        else if (oCoding.mnCompression == COMPRESSION_ZSTD)
            oResult = moZstd.Decode(oBlock.data(), oBlock.size(), decoded, nOutput);
        else
            oResult = moDeflate.Decode(oBlock.data(), oBlock.size(), decoded, nOutput);
        if (!oResult.IsDone())
            Stop(codec::StatusText(oResult.moStatus));
        if (oCoding.mnPredictor == PREDICTOR_HORIZONTAL)
            codec::UndoHorizontal(decoded, nPitch, output, nPitch, oShape);
        else if (oCoding.mnPredictor == PREDICTOR_FLOATINGPOINT)
            codec::UndoFloatingPoint(decoded, nPitch, output, nPitch, oShape, moScratch);
    }

private:
    codec::LzwDecoder moLzw;
    codec::DeflateDecoder moDeflate;
    codec::ZstdDecoder moZstd;
    Bytes moBlock;
    std::vector<unsigned char> moScratch;
};

void MeasureCoding(const Bytes& oTiles, const Kind& oKind, const Coding& oCoding)
{
    Encoded oEncoded = Encode(oTiles, oKind, oCoding);
    const std::size_t nBytes = oTiles.size() / TILES;
    Bytes oOutput(nBytes);
    Ours oOurs;
    const auto oFile = oEncoded.moFile.Open("r");
    std::size_t nStored = 0;
    for (std::uint32_t i = 0; i < TILES; ++i)
    {
        nStored += oEncoded.moBlocks[i].size();
        oOurs.Decode(oEncoded.moBlocks[i], oOutput.data(), nBytes, oKind, oCoding);
        if (std::memcmp(oOutput.data(), oTiles.data() + i * nBytes, nBytes) != 0)
            Stop("a tile was decoded wrongly");
    }
    const auto oOwn = [&]
    {
        for (const Bytes& oBlock : oEncoded.moBlocks)
            oOurs.Decode(oBlock, oOutput.data(), nBytes, oKind, oCoding);
    };
    const auto oTheirs = [&]
    {
        for (std::uint32_t i = 0; i < TILES; ++i)
            TIFFReadEncodedTile(oFile.get(), i, oOutput.data(), static_cast<tmsize_t>(nBytes));
    };
    const auto oTimes = MedianSeconds({{"ours", oOwn}, {"libtiff", oTheirs}}, ROUNDS);
    const double nMega = static_cast<double>(oTiles.size()) / 1e6;
    const bool bIntegerLzw = oCoding.mnCompression == COMPRESSION_LZW && !oKind.mbReal;
    PrintRow(std::string(oKind.moName) + " " + oCoding.moName + ", predictor " + std::to_string(oCoding.mnPredictor),
             oTimes[1] / oTimes[0], bIntegerLzw ? 1.75 : 0,
             Number(nMega / oTimes[0], 0) + " MB/s, stored " +
                 Number(static_cast<double>(nStored) / static_cast<double>(oTiles.size())));
}

// A kernel that writes nBytes, beside copying as many.
void MeasureKernel(const std::string& name, std::size_t nBytes, const std::function<void()>& oRun)
{
    constexpr int REPEATS = 200;
    const Bytes oFrom(nBytes, 1);
    Bytes oTo(nBytes);
    const auto oKernel = [&]
    {
        for (int i = 0; i < REPEATS; ++i)
            oRun();
    };
    const auto oCopy = [&]
    {
        for (int i = 0; i < REPEATS; ++i)
        {
            krv::raster::CopyRows(oFrom.data(), nBytes, oTo.data(), nBytes, nBytes, 1);
            krv::benchmarks::Keep(oTo.data());
        }
    };
    const auto oTimes = MedianSeconds({{"kernel", oKernel}, {"copy", oCopy}}, ROUNDS);
    PrintRow(name, oTimes[1] / oTimes[0], 0,
             Number(static_cast<double>(nBytes) * REPEATS / oTimes[0] / 1e9, 1) + " GB/s written");
}

void MeasurePredictors(Bytes& oFrom, Bytes& oTo)
{
    PrintHeading("Predictors of a tile, against copying it");
    std::vector<unsigned char> oScratch;
    for (const std::size_t nSampleBytes : {1, 2, 4, 8})
        for (const std::size_t nChannels : {1, 3, 4, 9})
        {
            const codec::BlockShape oShape{TILE, TILE, nChannels, nSampleBytes};
            const std::size_t nPitch = oShape.GetRowBytes();
            const std::string kind = std::to_string(nChannels) + " x " + std::to_string(nSampleBytes * 8) + " bits";
            MeasureKernel("horizontal, in place, " + kind, nPitch * TILE,
                          [&] { codec::UndoHorizontal(oTo.data(), nPitch, oTo.data(), nPitch, oShape); });
            if (nSampleBytes > 1)
                MeasureKernel(
                    "floating point, " + kind, nPitch * TILE,
                    [&] { codec::UndoFloatingPoint(oFrom.data(), nPitch, oTo.data(), nPitch, oShape, oScratch); });
        }
}

void MeasureChannels(Bytes& oFrom, Bytes& oTo)
{
    PrintHeading("Channels of a tile, against copying the result");
    constexpr std::array<std::size_t, 4> CHANNELS{2, 1, 0, 3};
    for (const std::size_t nSampleBytes : {1, 2, 4, 8})
        for (const std::size_t nChannels : {2, 3, 4, 7})
        {
            const krv::raster::PixelArea oArea{TILE, TILE, nSampleBytes};
            const std::size_t nPlane = TILE * nSampleBytes, nPitch = nPlane * nChannels;
            const std::string kind = std::to_string(nChannels) + " x " + std::to_string(nSampleBytes * 8) + " bits";
            std::vector<const unsigned char*> oPlanes;
            for (std::size_t k = 0; k < nChannels; ++k)
                oPlanes.push_back(oFrom.data() + k * nPlane * TILE);
            MeasureKernel(
                "planes together, " + kind, nPitch * TILE,
                [&] { krv::raster::InterleavePlanes(oPlanes.data(), nPlane, oTo.data(), nPitch, nChannels, oArea); });
            MeasureKernel(
                "one channel out of " + kind, nPlane * TILE,
                [&] { krv::raster::ExtractChannel(oFrom.data(), nPitch, 1, nChannels, oTo.data(), nPlane, oArea); });
            MeasureKernel(
                "one channel into " + kind, nPlane * TILE,
                [&] { krv::raster::PlaceChannel(oFrom.data(), nPlane, oTo.data(), nPitch, 1, nChannels, oArea); });
            if (nChannels >= 3)
                MeasureKernel("three turned round of " + kind, nPlane * 3 * TILE,
                              [&] {
                                  krv::raster::GatherChannels(oFrom.data(), nPitch, nChannels, oTo.data(), nPlane * 3,
                                                              CHANNELS.data(), 3, oArea);
                              });
        }
}

void MeasureBits(Bytes& oFrom, Bytes& oTo)
{
    PrintHeading("Samples of a tile, against copying the result");
    for (const unsigned int nBits : {1U, 2U, 4U, 7U, 10U, 12U, 14U, 20U, 24U})
    {
        const std::size_t nStored = TILE * nBits / 8, nPitch = TILE * codec::GetContainerBytes(nBits);
        for (const bool bSigned : {false, true})
            MeasureKernel(std::to_string(nBits) + (bSigned ? " bits, signed" : " bits"), nPitch * TILE,
                          [&] {
                              codec::UnpackBits(oFrom.data(), nStored * TILE, nStored, oTo.data(), nPitch, TILE, TILE,
                                                nBits, bSigned);
                          });
    }
    constexpr std::size_t COUNT = TILE * TILE;
    MeasureKernel("24 bits, low byte first", COUNT * 4,
                  [&] { codec::Unpack24(oFrom.data(), oTo.data(), COUNT, false, true); });
    MeasureKernel("half floats", COUNT * 4, [&] { codec::HalfToFloat(oFrom.data(), oTo.data(), COUNT); });
    MeasureKernel("24-bit floats", COUNT * 4, [&] { codec::Float24ToFloat(oFrom.data(), oTo.data(), COUNT); });
    MeasureKernel("bits turned round", COUNT * 4, [&] { codec::ReverseBits(oFrom.data(), oTo.data(), COUNT * 4); });
    for (const std::size_t nBytes : {2, 4, 8})
        MeasureKernel("bytes turned round, " + std::to_string(nBytes), COUNT * nBytes,
                      [&] { codec::SwapBytes(oFrom.data(), oTo.data(), COUNT, nBytes); });
}

void MeasureCodings(const std::string& filter)
{
    PrintHeading("Decoding tiles of 256, against libtiff");
    for (const Kind& oKind : {Kind{"3 x 8U", 3, 1, false}, Kind{"1 x 16U", 1, 2, false}, Kind{"4 x 32R", 4, 4, true}})
    {
        const Bytes oTiles = MakeTiles(oKind);
        for (const auto& [name, nCompression] :
             {std::pair{"lzw", COMPRESSION_LZW}, {"deflate", COMPRESSION_ADOBE_DEFLATE}, {"zstd", COMPRESSION_ZSTD}})
            for (const int nPredictor : {1, oKind.mbReal ? 3 : 2})
                if (filter.empty() || filter == name)
                    MeasureCoding(oTiles, oKind, {name, nCompression, nPredictor});
    }
}

} // namespace

// Without arguments everything; otherwise one of lzw, deflate, zstd, predictors, channels, bits.
int main(int nArguments, char** pArguments)
{
    const krv::benchmarks::Arguments oArguments(nArguments, pArguments,
                                                "[--only lzw|deflate|zstd|predictors|channels|bits]");
    TIFFSetWarningHandler(nullptr);
    Bytes oFrom(TILE * TILE * 9 * 8, 3), oTo(TILE * TILE * 9 * 8, 5);
    if (oArguments.Wants("lzw") || oArguments.Wants("deflate") || oArguments.Wants("zstd"))
        MeasureCodings(oArguments.GetOption("only"));
    if (oArguments.Wants("predictors"))
        MeasurePredictors(oFrom, oTo);
    if (oArguments.Wants("channels"))
        MeasureChannels(oFrom, oTo);
    if (oArguments.Wants("bits"))
        MeasureBits(oFrom, oTo);
    return 0;
}
