#pragma once

#include "tests/support/memorytiff.h"

#include <cstdint>
#include <memory>
#include <random>
#include <string>
#include <vector>

// What the tests of the block codecs share.
namespace krv::test
{

using Bytes = std::vector<unsigned char>;

// Memory of exactly nBytes bytes, so that a sanitizer sees the first byte beyond it.
class Exact
{
public:
    explicit Exact(std::size_t nBytes) : mpoBytes(new unsigned char[nBytes]), mnBytes(nBytes) {}
    explicit Exact(const Bytes& oBytes) : Exact(oBytes.size())
    {
        std::copy(oBytes.begin(), oBytes.end(), mpoBytes.get());
    }

    unsigned char* data() { return mpoBytes.get(); }
    std::size_t size() const { return mnBytes; }
    Bytes ToBytes(std::size_t nCount) const { return {mpoBytes.get(), mpoBytes.get() + nCount}; }
    Bytes ToBytes() const { return ToBytes(mnBytes); }

private:
    std::unique_ptr<unsigned char[]> mpoBytes;
    std::size_t mnBytes;
};

inline Bytes RandomBytes(std::mt19937& oRandom, std::size_t nCount)
{
    Bytes oBytes(nCount);
    for (unsigned char& nByte : oBytes)
        nByte = static_cast<unsigned char>(oRandom());
    return oBytes;
}

// Data of very different compressibility, chosen by nKind: noise, few values, runs, a ramp, slow waves, one value.
inline Bytes MakeData(std::mt19937& oRandom, unsigned int nKind, std::size_t nCount)
{
    Bytes oBytes = RandomBytes(oRandom, nCount);
    unsigned char nValue = 0;
    for (std::size_t i = 0; i < nCount; ++i)
    {
        const unsigned char nNoise = oBytes[i];
        switch (nKind % 6)
        {
        case 0:
            break;
        case 1:
            oBytes[i] = nNoise % 3;
            break;
        case 2:
            nValue = nNoise < 20 ? static_cast<unsigned char>(oRandom()) : nValue;
            oBytes[i] = nValue;
            break;
        case 3:
            oBytes[i] = static_cast<unsigned char>(i / 7);
            break;
        case 4:
            nValue = static_cast<unsigned char>(nValue + nNoise % 5 - 2);
            oBytes[i] = nValue;
            break;
        default:
            oBytes[i] = 77;
        }
    }
    return oBytes;
}

// What a strip of a file written by libtiff is made of.
struct StripKind
{
    std::uint16_t mnCompression = COMPRESSION_NONE;
    std::uint16_t mnPredictor = PREDICTOR_NONE;
    std::uint16_t mnFormat = SAMPLEFORMAT_UINT;
    std::uint16_t mnSampleBytes = 1;
    std::uint16_t mnChannels = 1;
    std::uint32_t mnWidth = 1;
    std::uint32_t mnRows = 1;
    const char* moOrder = ""; // "b" and "l" for a file of big and of little endian
};

// The one stored strip of an image that libtiff coded. decoded: takes what libtiff itself reads out of it.
inline Bytes MakeStrip(const Bytes& oImage, const StripKind& oKind, Bytes* decoded = nullptr)
{
    MemoryTiff oMemory;
    {
        const auto oFile = oMemory.Open((std::string("w") + oKind.moOrder).c_str());
        TIFF* tif = oFile.get();
        TIFFSetField(tif, TIFFTAG_IMAGEWIDTH, oKind.mnWidth);
        TIFFSetField(tif, TIFFTAG_IMAGELENGTH, oKind.mnRows);
        TIFFSetField(tif, TIFFTAG_ROWSPERSTRIP, oKind.mnRows);
        TIFFSetField(tif, TIFFTAG_SAMPLESPERPIXEL, oKind.mnChannels);
        TIFFSetField(tif, TIFFTAG_BITSPERSAMPLE, oKind.mnSampleBytes * 8);
        TIFFSetField(tif, TIFFTAG_SAMPLEFORMAT, oKind.mnFormat);
        TIFFSetField(tif, TIFFTAG_PLANARCONFIG, PLANARCONFIG_CONTIG);
        TIFFSetField(tif, TIFFTAG_PHOTOMETRIC, PHOTOMETRIC_MINISBLACK);
        TIFFSetField(tif, TIFFTAG_COMPRESSION, oKind.mnCompression);
        if (oKind.mnPredictor != PREDICTOR_NONE)
            TIFFSetField(tif, TIFFTAG_PREDICTOR, oKind.mnPredictor);
        Bytes oCopy = oImage; // libtiff works in its argument
        TIFFWriteEncodedStrip(tif, 0, oCopy.data(), static_cast<tmsize_t>(oCopy.size()));
    }
    TIFFErrorHandler oQuiet = TIFFSetWarningHandler(nullptr);
    const auto oFile = oMemory.Open("r");
    TIFFSetWarningHandler(oQuiet);
    Bytes oStrip(TIFFGetStrileByteCount(oFile.get(), 0));
    TIFFReadRawStrip(oFile.get(), 0, oStrip.data(), static_cast<tmsize_t>(oStrip.size()));
    if (decoded != nullptr)
    {
        decoded->resize(oImage.size());
        TIFFReadEncodedStrip(oFile.get(), 0, decoded->data(), static_cast<tmsize_t>(decoded->size()));
    }
    return oStrip;
}

} // namespace krv::test
