#include "benchmarks/support/scene.h"

#include <tiffio.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <memory>
#include <random>
#include <stdexcept>
#include <vector>

namespace krv::benchmarks
{

namespace
{

// The terrain repeats after this many pixels, so that each distinct tile is compressed once.
constexpr unsigned int PERIOD = 2048;

using Tiff = std::unique_ptr<TIFF, decltype(&TIFFClose)>;

Tiff OpenForWriting(const std::string& path)
{
    Tiff oTiff(TIFFOpen(path.c_str(), "w8"), &TIFFClose);
    if (oTiff == nullptr)
        throw std::runtime_error("cannot write " + path);
    return oTiff;
}

// Midpoint displacement on a torus, about 0 to 1.
std::vector<float> MakeTerrain(unsigned int nSeed)
{
    std::mt19937 oRandom(nSeed);
    std::vector<float> oHeights(1ull * PERIOD * PERIOD, 0.5F);
    const auto oAt = [&](unsigned int x, unsigned int y) -> float&
    {
        return oHeights[1ull * (y % PERIOD) * PERIOD + x % PERIOD];
    };
    float nRange = 0.5F;
    for (unsigned int nStep = PERIOD; nStep > 1; nStep /= 2, nRange *= 0.55F)
    {
        std::uniform_real_distribution<float> oShift(-nRange, nRange);
        const unsigned int h = nStep / 2;
        for (unsigned int y = 0; y < PERIOD; y += nStep)
            for (unsigned int x = 0; x < PERIOD; x += nStep)
                oAt(x + h, y + h) = oShift(oRandom) +
                                    (oAt(x, y) + oAt(x + nStep, y) + oAt(x, y + nStep) + oAt(x + nStep, y + nStep)) / 4;
        for (unsigned int y = 0; y < PERIOD; y += h)
            for (unsigned int x = (y / h) % 2 == 0 ? h : 0; x < PERIOD; x += nStep)
                oAt(x, y) = oShift(oRandom) +
                            (oAt(x + h, y) + oAt(x + PERIOD - h, y) + oAt(x, y + h) + oAt(x, y + PERIOD - h)) / 4;
    }
    return oHeights;
}

void StoreSample(unsigned char* pTarget, float nHeight, const SceneKind& oKind)
{
    if (oKind.mbReal)
    {
        const float nMetres = nHeight * 3000.0F;
        std::memcpy(pTarget, &nMetres, sizeof nMetres);
        return;
    }
    const float nScaled = std::fmin(std::fmax(nHeight, 0.0F), 1.0F);
    if (oKind.mnBits == 8)
        *pTarget = static_cast<unsigned char>(nScaled * 255.0F);
    else
    {
        const auto nValue = static_cast<std::uint16_t>(nScaled * 4095.0F);
        std::memcpy(pTarget, &nValue, sizeof nValue);
    }
}

void SetTags(TIFF* poTiff, const SceneFile& oScene)
{
    const SceneKind& oKind = oScene.moKind;
    TIFFSetField(poTiff, TIFFTAG_IMAGEWIDTH, oScene.mnSize);
    TIFFSetField(poTiff, TIFFTAG_IMAGELENGTH, oScene.mnHeight == 0 ? oScene.mnSize : oScene.mnHeight);
    TIFFSetField(poTiff, TIFFTAG_SAMPLESPERPIXEL, oKind.mnChannels);
    TIFFSetField(poTiff, TIFFTAG_BITSPERSAMPLE, oKind.mnBits);
    TIFFSetField(poTiff, TIFFTAG_SAMPLEFORMAT, oKind.mbReal ? SAMPLEFORMAT_IEEEFP : SAMPLEFORMAT_UINT);
    TIFFSetField(poTiff, TIFFTAG_PLANARCONFIG, PLANARCONFIG_CONTIG);
    const bool bColour = oKind.mnChannels == 3;
    TIFFSetField(poTiff, TIFFTAG_PHOTOMETRIC, bColour ? PHOTOMETRIC_RGB : PHOTOMETRIC_MINISBLACK);
    if (!bColour && oKind.mnChannels > 1)
    {
        const std::vector<std::uint16_t> oExtra(oKind.mnChannels - 1, EXTRASAMPLE_UNSPECIFIED);
        TIFFSetField(poTiff, TIFFTAG_EXTRASAMPLES, static_cast<unsigned int>(oExtra.size()), oExtra.data());
    }
    if (oScene.mnTile != 0)
    {
        TIFFSetField(poTiff, TIFFTAG_TILEWIDTH, oScene.mnTile);
        TIFFSetField(poTiff, TIFFTAG_TILELENGTH, oScene.mnTile);
    }
    if (oScene.moCodec == "none")
        return;
    const bool bDeflate = oScene.moCodec == "deflate";
    TIFFSetField(poTiff, TIFFTAG_COMPRESSION,
                 bDeflate                  ? COMPRESSION_ADOBE_DEFLATE
                 : oScene.moCodec == "lzw" ? COMPRESSION_LZW
                                           : COMPRESSION_ZSTD);
    TIFFSetField(poTiff, TIFFTAG_PREDICTOR, oKind.mbReal ? PREDICTOR_FLOATINGPOINT : PREDICTOR_HORIZONTAL);
    if (oScene.moCodec == "zstd")
        TIFFSetField(poTiff, TIFFTAG_ZSTD_LEVEL, 3);
}

// Compresses one period's tiles into a scratch file and returns their stored bytes.
std::vector<std::vector<unsigned char>> MakeTiles(const SceneFile& oScene)
{
    SceneFile oPeriod = oScene;
    oPeriod.mnSize = PERIOD;
    oPeriod.mnHeight = PERIOD;
    const std::string path = oScene.moPath + ".period";
    std::vector<std::vector<float>> oTerrain;
    for (unsigned int nChannel = 0; nChannel < oScene.moKind.mnChannels; ++nChannel)
        oTerrain.push_back(MakeTerrain(11 + nChannel));
    const unsigned int nAcross = oPeriod.TilesAcross();
    const unsigned int nBytes = oScene.moKind.mnBits / 8;
    {
        const Tiff oTiff = OpenForWriting(path);
        SetTags(oTiff.get(), oPeriod);
        std::vector<unsigned char> oTile(oScene.TileBytes());
        for (unsigned int nTile = 0; nTile < nAcross * nAcross; ++nTile)
        {
            unsigned char* pTarget = oTile.data();
            for (unsigned int y = 0; y < oScene.mnTile; ++y)
                for (unsigned int x = 0; x < oScene.mnTile; ++x)
                    for (const auto& oHeights : oTerrain)
                    {
                        const std::size_t nAt = (1ull * (nTile / nAcross) * oScene.mnTile + y) * PERIOD +
                                                (nTile % nAcross) * oScene.mnTile + x;
                        StoreSample(pTarget, oHeights[nAt], oScene.moKind);
                        pTarget += nBytes;
                    }
            TIFFWriteEncodedTile(oTiff.get(), nTile, oTile.data(), static_cast<tmsize_t>(oTile.size()));
        }
    }
    std::vector<std::vector<unsigned char>> oTiles(nAcross * nAcross);
    {
        const Tiff oTiff(TIFFOpen(path.c_str(), "r"), &TIFFClose);
        for (unsigned int nTile = 0; nTile < oTiles.size(); ++nTile)
        {
            oTiles[nTile].resize(TIFFGetStrileByteCount(oTiff.get(), nTile));
            TIFFReadRawTile(oTiff.get(), nTile, oTiles[nTile].data(), static_cast<tmsize_t>(oTiles[nTile].size()));
        }
    }
    std::filesystem::remove(path);
    return oTiles;
}

} // namespace

SceneFile MakeScene(const std::string& folder, const SceneKind& oKind, const std::string& codec, unsigned int nTile,
                    unsigned int nSize, unsigned int nHeight)
{
    SceneFile oScene{oKind, codec, nTile, nSize, {}, nHeight};
    oScene.moPath = folder + "/" + oKind.moName + "_" + codec + "_" + std::to_string(nTile) + "_" +
                    std::to_string(nSize) + (nHeight == 0 ? "" : "x" + std::to_string(nHeight)) + ".tif";
    if (std::filesystem::exists(oScene.moPath))
        return oScene;
    const auto oTiles = MakeTiles(oScene);
    const std::string path = oScene.moPath + ".part";
    {
        const Tiff oTiff = OpenForWriting(path);
        SetTags(oTiff.get(), oScene);
        const unsigned int nAcross = oScene.TilesAcross();
        const unsigned int nPeriodAcross = PERIOD / nTile;
        for (unsigned int nIndex = 0; nIndex < nAcross * oScene.TilesDown(); ++nIndex)
        {
            auto oTile = oTiles[(nIndex / nAcross % nPeriodAcross) * nPeriodAcross + nIndex % nAcross % nPeriodAcross];
            TIFFWriteRawTile(oTiff.get(), nIndex, oTile.data(), static_cast<tmsize_t>(oTile.size()));
        }
    }
    std::filesystem::rename(path, oScene.moPath);
    return oScene;
}

std::string MakeLayout(const std::string& folder, const Layout& oLayout, unsigned int nSize)
{
    constexpr unsigned int STRIP = 16;
    std::string path = folder + "/layout_" + oLayout.moName + "_" + std::to_string(nSize) + ".tif";
    std::replace(path.begin(), path.end(), ' ', '_');
    if (std::filesystem::exists(path))
        return path;
    std::vector<std::vector<float>> oTerrain;
    for (unsigned int nChannel = 0; nChannel < oLayout.mnChannels; ++nChannel)
        oTerrain.push_back(MakeTerrain(11 + nChannel));
    {
        const Tiff oTiff = OpenForWriting(path + ".part");
        TIFF* const poTiff = oTiff.get();
        SetTags(poTiff, {{"", oLayout.mnChannels, oLayout.mnBits, false}, "none", oLayout.mnTile, nSize, path});
        TIFFSetField(poTiff, TIFFTAG_COMPRESSION, oLayout.mnCompression);
        TIFFSetField(poTiff, TIFFTAG_PLANARCONFIG, oLayout.mbSeparate ? PLANARCONFIG_SEPARATE : PLANARCONFIG_CONTIG);
        if (oLayout.mnCompression == COMPRESSION_JPEG && oLayout.mnChannels == 3)
        {
            TIFFSetField(poTiff, TIFFTAG_PHOTOMETRIC, PHOTOMETRIC_YCBCR);
            TIFFSetField(poTiff, TIFFTAG_JPEGCOLORMODE, JPEGCOLORMODE_RGB);
        }
        if (oLayout.mnTile == 0)
            TIFFSetField(poTiff, TIFFTAG_ROWSPERSTRIP, STRIP);
        const unsigned int nWide = oLayout.mnTile == 0 ? nSize : oLayout.mnTile;
        const unsigned int nHigh = oLayout.mnTile == 0 ? STRIP : oLayout.mnTile;
        const unsigned int nAcross = nSize / nWide, nPlane = nAcross * (nSize / nHigh);
        const unsigned int nInBlock = oLayout.mbSeparate ? 1 : oLayout.mnChannels;
        std::vector<unsigned char> oBlock(std::size_t{nWide} * nHigh * nInBlock * oLayout.mnBits / 8);
        for (unsigned int nBlock = 0; nBlock < nPlane * oLayout.mnChannels / nInBlock; ++nBlock)
        {
            std::fill(oBlock.begin(), oBlock.end(), static_cast<unsigned char>(0));
            std::size_t nAt = 0;
            for (unsigned int y = 0; y < nHigh; ++y)
                for (unsigned int x = 0; x < nWide; ++x)
                    for (unsigned int c = 0; c < nInBlock; ++c, ++nAt)
                    {
                        const unsigned int nRow = nBlock % nPlane / nAcross * nHigh + y;
                        const unsigned int nColumn = nBlock % nPlane % nAcross * nWide + x;
                        const float nHeight =
                            oTerrain[nBlock / nPlane + c][std::size_t{nRow % PERIOD} * PERIOD + nColumn % PERIOD];
                        if (oLayout.mnBits == 1)
                            oBlock[nAt / 8] |= nHeight > 0.5F ? 128U >> nAt % 8 : 0U;
                        else
                            StoreSample(&oBlock[nAt], nHeight, {"", 1, 8, false});
                    }
            const auto nBytes = static_cast<tmsize_t>(oBlock.size());
            const tmsize_t nWritten = oLayout.mnTile == 0 ? TIFFWriteEncodedStrip(poTiff, nBlock, oBlock.data(), nBytes)
                                                          : TIFFWriteEncodedTile(poTiff, nBlock, oBlock.data(), nBytes);
            if (nWritten != nBytes)
                throw std::runtime_error("libtiff cannot write " + path);
        }
    }
    std::filesystem::rename(path + ".part", path);
    return path;
}

std::string MakeSparse(const std::string& folder, unsigned int nSize, unsigned int nTile)
{
    const std::string path = folder + "/sparse_" + std::to_string(nSize) + ".tif";
    if (std::filesystem::exists(path))
        return path;
    const Tiff oTiff = OpenForWriting(path);
    SetTags(oTiff.get(), {{"sparse", 1, 8, false}, "none", nTile, nSize, path});
    TIFFWriteCheck(oTiff.get(), 1, "MakeSparse");
    TIFFWriteDirectory(oTiff.get());
    return path;
}

} // namespace krv::benchmarks
