#include "datasources/interfaces/ichannelinfo.h"
#include "gobs/raster/datatype.h"
#include "tests/plugins/tif/tifsupport.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <bit>
#include <cmath>
#include <cstring>
#include <random>

#include <gtest/gtest.h>
#include <tiffio.h>

namespace
{

using krv::test::OpenTif;
using krv::test::TemporaryFile;
using Random = std::mt19937;

unsigned int Pick(Random& oRandom, unsigned int nFrom, unsigned int nTo)
{
    return std::uniform_int_distribution<unsigned int>(nFrom, nTo)(oRandom);
}

struct Sample
{
    unsigned int bits; // of one part
    unsigned int parts;
    std::uint16_t format;
    const char* type; // as handed out
};

constexpr Sample SAMPLES[] = {
    {1, 1, 1, "8U"},    {2, 1, 1, "8U"},    {3, 1, 1, "8U"},    {4, 1, 1, "8U"},    {7, 1, 2, "8S"},
    {8, 1, 1, "8U"},    {8, 1, 2, "8S"},    {8, 1, 4, "8U"},    {9, 1, 1, "16U"},   {12, 1, 2, "16S"},
    {15, 1, 1, "16U"},  {16, 1, 1, "16U"},  {16, 1, 2, "16S"},  {16, 1, 3, "32R"},  {17, 1, 1, "32U"},
    {24, 1, 1, "32U"},  {24, 1, 2, "32S"},  {24, 1, 3, "32R"},  {31, 1, 2, "32S"},  {32, 1, 1, "32U"},
    {32, 1, 2, "32S"},  {32, 1, 3, "32R"},  {37, 1, 2, "64S"},  {40, 1, 1, "64U"},  {48, 1, 2, "64S"},
    {56, 1, 1, "64U"},  {63, 1, 1, "64U"},  {64, 1, 1, "64U"},  {64, 1, 2, "64S"},  {64, 1, 3, "64R"},
    {5, 2, 5, "C16S"},  {8, 2, 5, "C16S"},  {16, 2, 5, "C16S"}, {24, 2, 5, "C32S"}, {32, 2, 5, "C32S"},
    {16, 2, 6, "C32R"}, {24, 2, 6, "C32R"}, {32, 2, 6, "C32R"}, {64, 2, 6, "C64R"},
};

// A file of random pixels and what its reader has to hand out.
struct Made
{
    Sample sample;
    unsigned int width, height, channels;
    bool planar, tiled, big, reversed, bigEndian;
    std::uint32_t blockWidth, blockHeight;
    std::uint16_t compression, predictor;
    std::size_t partBytes;
    std::vector<unsigned char> pixels; // pixel interleaved, as handed out

    std::size_t ValueBytes() const { return partBytes * sample.parts; }
    std::string Describe() const
    {
        return std::to_string(width) + " x " + std::to_string(height) + " x " + std::to_string(channels) + " of " +
               std::to_string(sample.parts) + " * " + std::to_string(sample.bits) + " bits, format " +
               std::to_string(sample.format) + ", blocks " + std::to_string(blockWidth) + " x " +
               std::to_string(blockHeight) + (planar ? ", planar" : "") + (tiled ? ", tiled" : "") +
               (reversed ? ", reversed" : "") + (bigEndian ? ", big-endian" : "") + ", codec " +
               std::to_string(compression) + ", predictor " + std::to_string(predictor);
    }
};

// The widened bits of a stored number, as a word whose low bytes are handed out.
std::uint64_t Widen(const Sample& oSample, std::uint64_t nBits)
{
    if (oSample.format == 3 || oSample.format == 6)
    {
        if (oSample.bits >= 32)
            return nBits;
        const unsigned int nFraction = oSample.bits == 16 ? 10 : 16;
        const unsigned int nExponents = oSample.bits - 1 - nFraction;
        const int nBias = (1 << (nExponents - 1)) - 1;
        const auto nExponent = static_cast<int>(nBits >> nFraction & ((1u << nExponents) - 1));
        const auto nMantissa = static_cast<double>(nBits & ((1u << nFraction) - 1));
        const std::uint32_t nSign = nBits >> (oSample.bits - 1) != 0 ? 0x80000000u : 0u;
        if (nExponent == (1 << nExponents) - 1)
            return nSign | 0x7F800000u |
                   static_cast<std::uint32_t>(nBits & ((1u << nFraction) - 1)) << (23 - nFraction);
        const double nValue =
            nExponent == 0 ? std::ldexp(nMantissa, 1 - nBias - static_cast<int>(nFraction))
                           : std::ldexp(nMantissa + (1u << nFraction), nExponent - nBias - static_cast<int>(nFraction));
        return nSign | std::bit_cast<std::uint32_t>(static_cast<float>(nValue));
    }
    const bool bSigned = oSample.format == 2 || oSample.format == 5;
    if (bSigned && oSample.bits < 64 && nBits >> (oSample.bits - 1) != 0)
        return nBits | ~std::uint64_t{0} << oSample.bits;
    return nBits;
}

// Writes bit fields most significant bit first.
void PutBits(std::vector<unsigned char>& oBytes, std::size_t nAt, std::uint64_t nValue, unsigned int nBits)
{
    for (unsigned int nBit = 0; nBit < nBits; ++nBit)
        if ((nValue >> (nBits - 1 - nBit) & 1) != 0)
            oBytes[(nAt + nBit) / 8] |= static_cast<unsigned char>(0x80u >> (nAt + nBit) % 8);
}

// One part in the form in which libtiff takes it: words of 16, 24, 32 and 64 bits in this machine's order.
void PutPart(std::vector<unsigned char>& oRow, std::size_t nBitAt, const Made& oMade, std::uint64_t nValue)
{
    const unsigned int nBits = oMade.sample.bits;
    if (nBits % 8 != 0)
        return PutBits(oRow, nBitAt, nValue, nBits);
    const unsigned int nBytes = nBits / 8;
    const bool bTaken =
        nBytes == 1 || nBytes == 2 || nBytes == 4 || nBytes == 8 || (nBytes == 3 && oMade.sample.parts == 1);
    for (unsigned int nByte = 0; nByte < nBytes; ++nByte)
    {
        const unsigned int nPlace = bTaken || !oMade.bigEndian ? nByte : nBytes - 1 - nByte;
        oRow[nBitAt / 8 + nPlace] = static_cast<unsigned char>(nValue >> (8 * nByte));
    }
}

class Maker
{
public:
    explicit Maker(unsigned int nSeed) : moRandom(nSeed) {}

    Made Make(const std::string& fileName)
    {
        Made oMade = Choose();
        oMade.pixels.assign(std::size_t{oMade.width} * oMade.height * oMade.channels * oMade.ValueBytes(), 0);
        const std::string mode = std::string("w") + (oMade.bigEndian ? "b" : "l") + (oMade.big ? "8" : "4");
        TIFF* poTiff = TIFFOpen(fileName.c_str(), mode.c_str());
        EXPECT_NE(poTiff, nullptr);
        SetTags(poTiff, oMade);
        for (unsigned int nPlane = 0; nPlane < (oMade.planar ? oMade.channels : 1); ++nPlane)
            for (unsigned int nY = 0; nY < oMade.height; nY += oMade.blockHeight)
                for (unsigned int nX = 0; nX < oMade.width; nX += oMade.blockWidth)
                    if ((nX | nY | nPlane) == 0 || Pick(moRandom, 0, 9) != 0) // the others are not stored
                        WriteBlock(poTiff, oMade, nPlane, nX, nY);
        TIFFClose(poTiff);
        return oMade;
    }

private:
    Made Choose()
    {
        Made oMade{};
        oMade.sample = SAMPLES[Pick(moRandom, 0, std::size(SAMPLES) - 1)];
        const bool bWide = Pick(moRandom, 0, 7) == 0; // so that rows are worked on in several pieces
        oMade.width = bWide ? Pick(moRandom, 500, 3000) : Pick(moRandom, 1, 90);
        oMade.height = Pick(moRandom, 1, bWide ? 5 : 90);
        oMade.channels = Pick(moRandom, 0, 7) == 0 ? Pick(moRandom, 6, 40) : Pick(moRandom, 1, 5);
        oMade.planar = oMade.channels > 1 && Pick(moRandom, 0, 1) == 1;
        oMade.tiled = Pick(moRandom, 0, 1) == 1;
        oMade.big = Pick(moRandom, 0, 3) == 0;
        oMade.bigEndian = Pick(moRandom, 0, 2) == 0;
        // libtiff turns round the parts of small complex values together.
        if (oMade.sample.parts == 2 &&
            (oMade.sample.bits == 8 || (oMade.sample.bits == 16 && oMade.sample.format == 6)))
            oMade.bigEndian = false;
        oMade.reversed = Pick(moRandom, 0, 7) == 0;
        oMade.blockWidth = oMade.tiled ? 16 * Pick(moRandom, 1, 3) : oMade.width;
        oMade.blockHeight = oMade.tiled ? 16 * Pick(moRandom, 1, 3) : Pick(moRandom, 1, oMade.height);
        constexpr std::uint16_t CODECS[] = {COMPRESSION_NONE,          COMPRESSION_NONE,    COMPRESSION_LZW,
                                            COMPRESSION_ADOBE_DEFLATE, COMPRESSION_DEFLATE, COMPRESSION_ZSTD,
                                            COMPRESSION_PACKBITS,      COMPRESSION_LZMA};
        oMade.compression = CODECS[Pick(moRandom, 0, std::size(CODECS) - 1)];
        const unsigned int nBits = oMade.sample.bits * oMade.sample.parts;
        const bool bPredicts = oMade.compression != COMPRESSION_NONE && oMade.compression != COMPRESSION_PACKBITS;
        const bool bWord = nBits == 8 || nBits == 16 || nBits == 32 || nBits == 64;
        oMade.predictor = 1;
        if (bPredicts && bWord && Pick(moRandom, 0, 1) == 1)
            oMade.predictor = 2;
        if (bPredicts && oMade.sample.format == 3 && Pick(moRandom, 0, 1) == 1)
            oMade.predictor = 3;
        // libtiff 4.5 writes this one wrongly and reads it rightly.
        if (oMade.predictor == 3)
            oMade.bigEndian = false;
        oMade.partBytes = 1;
        while (oMade.partBytes * 8 < oMade.sample.bits)
            oMade.partBytes *= 2;
        if (oMade.sample.format == 5)
            oMade.partBytes = std::max<std::size_t>(oMade.partBytes, 2);
        if (oMade.sample.format == 3 || oMade.sample.format == 6)
            oMade.partBytes = std::max<std::size_t>(oMade.partBytes, 4);
        return oMade;
    }

    void SetTags(TIFF* poTiff, const Made& oMade)
    {
        TIFFSetField(poTiff, TIFFTAG_IMAGEWIDTH, oMade.width);
        TIFFSetField(poTiff, TIFFTAG_IMAGELENGTH, oMade.height);
        TIFFSetField(poTiff, TIFFTAG_SAMPLESPERPIXEL, oMade.channels);
        TIFFSetField(poTiff, TIFFTAG_BITSPERSAMPLE, oMade.sample.bits * oMade.sample.parts);
        TIFFSetField(poTiff, TIFFTAG_SAMPLEFORMAT, oMade.sample.format);
        TIFFSetField(poTiff, TIFFTAG_PLANARCONFIG, oMade.planar ? PLANARCONFIG_SEPARATE : PLANARCONFIG_CONTIG);
        TIFFSetField(poTiff, TIFFTAG_PHOTOMETRIC, PHOTOMETRIC_MINISBLACK);
        TIFFSetField(poTiff, TIFFTAG_COMPRESSION, oMade.compression);
        if (oMade.reversed)
            TIFFSetField(poTiff, TIFFTAG_FILLORDER, FILLORDER_LSB2MSB);
        if (oMade.predictor != 1)
            TIFFSetField(poTiff, TIFFTAG_PREDICTOR, oMade.predictor);
        if (oMade.tiled)
        {
            TIFFSetField(poTiff, TIFFTAG_TILEWIDTH, oMade.blockWidth);
            TIFFSetField(poTiff, TIFFTAG_TILELENGTH, oMade.blockHeight);
        }
        else
            TIFFSetField(poTiff, TIFFTAG_ROWSPERSTRIP, oMade.blockHeight);
    }

    void WriteBlock(TIFF* poTiff, Made& oMade, unsigned int nPlane, unsigned int nX, unsigned int nY)
    {
        const unsigned int nRows = oMade.tiled ? oMade.blockHeight : std::min(oMade.blockHeight, oMade.height - nY);
        const unsigned int nPlaneChannels = oMade.planar ? 1 : oMade.channels;
        const std::size_t nRowBytes =
            (std::size_t{oMade.blockWidth} * nPlaneChannels * oMade.sample.bits * oMade.sample.parts + 7) / 8;
        std::vector<unsigned char> oBlock;
        for (unsigned int nRow = 0; nRow < nRows; ++nRow)
        {
            std::vector<unsigned char> oRow(nRowBytes);
            for (unsigned int nColumn = 0; nColumn < oMade.blockWidth; ++nColumn)
                for (unsigned int nChannel = 0; nChannel < nPlaneChannels; ++nChannel)
                    for (unsigned int nPart = 0; nPart < oMade.sample.parts; ++nPart)
                    {
                        const std::uint64_t nValue = RandomBits(oMade.sample.bits);
                        const std::size_t nSample = std::size_t{nColumn} * nPlaneChannels + nChannel;
                        PutPart(oRow, (nSample * oMade.sample.parts + nPart) * oMade.sample.bits, oMade, nValue);
                        if (nX + nColumn < oMade.width && nY + nRow < oMade.height)
                            Expect(oMade, nX + nColumn, nY + nRow, oMade.planar ? nPlane : nChannel, nPart, nValue);
                    }
            oBlock.insert(oBlock.end(), oRow.begin(), oRow.end());
        }
        const auto nBytes = static_cast<tmsize_t>(oBlock.size());
        const tmsize_t nDone =
            oMade.tiled
                ? TIFFWriteEncodedTile(poTiff, TIFFComputeTile(poTiff, nX, nY, 0, static_cast<std::uint16_t>(nPlane)),
                                       oBlock.data(), nBytes)
                : TIFFWriteEncodedStrip(poTiff, TIFFComputeStrip(poTiff, nY, static_cast<std::uint16_t>(nPlane)),
                                        oBlock.data(), nBytes);
        EXPECT_EQ(nDone, nBytes) << oMade.Describe();
    }

    // Any bits; now and then all of one kind above or below a place: ends of ranges, infinities, tiny numbers.
    std::uint64_t RandomBits(unsigned int nBits)
    {
        const std::uint64_t nAll = ~std::uint64_t{0} >> (64 - nBits);
        const unsigned int nKind = Pick(moRandom, 0, 15);
        const unsigned int nPlace = Pick(moRandom, 0, nBits - 1);
        if (nKind < 4)
            return (nKind % 2 == 0 ? nAll << nPlace & nAll : nAll >> nPlace) & (nKind < 2 ? nAll : nAll >> 1);
        return (std::uint64_t{moRandom()} << 32 | moRandom()) & nAll;
    }

    static void Expect(Made& oMade, unsigned int nX, unsigned int nY, unsigned int nChannel, unsigned int nPart,
                       std::uint64_t nValue)
    {
        const std::size_t nAt = (std::size_t{nY} * oMade.width + nX) * oMade.channels + nChannel;
        const std::uint64_t nWide = Widen(oMade.sample, nValue);
        std::memcpy(oMade.pixels.data() + (nAt * oMade.sample.parts + nPart) * oMade.partBytes, &nWide,
                    oMade.partBytes);
    }

    Random moRandom;
};

struct Window
{
    int x, y;
    unsigned int width, height, partX, partY, partWidth, partHeight;
};

// Anywhere across the image and its borders; now and then a block as it stands, with a margin or without.
Window ChooseWindow(Random& oRandom, const Made& oMade, const krv::datasources::IRasterIO& oIO)
{
    Window oWindow{};
    if (Pick(oRandom, 0, 3) == 0)
    {
        const unsigned int nMargin = Pick(oRandom, 0, 1) * Pick(oRandom, 1, 17);
        const unsigned int nX = Pick(oRandom, 0, (oMade.width - 1) / oIO.GetTileWidth()) * oIO.GetTileWidth();
        const unsigned int nY = Pick(oRandom, 0, (oMade.height - 1) / oIO.GetTileHeight()) * oIO.GetTileHeight();
        oWindow.x = static_cast<int>(nX - nMargin);
        oWindow.y = static_cast<int>(nY - nMargin);
        oWindow.partWidth = oWindow.width = std::min(oIO.GetTileWidth(), oMade.width - nX) + 2 * nMargin;
        oWindow.partHeight = oWindow.height = std::min(oIO.GetTileHeight(), oMade.height - nY) + 2 * nMargin;
        return oWindow;
    }
    oWindow.x = static_cast<int>(Pick(oRandom, 0, oMade.width + 40)) - 20;
    oWindow.y = static_cast<int>(Pick(oRandom, 0, oMade.height + 40)) - 20;
    oWindow.width = Pick(oRandom, 1, oMade.width > 400 ? oMade.width : 60);
    oWindow.height = Pick(oRandom, 1, 60);
    oWindow.partX = Pick(oRandom, 0, oWindow.width);
    oWindow.partY = Pick(oRandom, 0, oWindow.height);
    oWindow.partWidth = Pick(oRandom, 0, oWindow.width - oWindow.partX);
    oWindow.partHeight = Pick(oRandom, 0, oWindow.height - oWindow.partY);
    if (Pick(oRandom, 0, 2) == 0)
        oWindow.partX = oWindow.partY = 0, oWindow.partWidth = oWindow.width, oWindow.partHeight = oWindow.height;
    return oWindow;
}

// The plain model: pixel by pixel, what is not read keeps what was there.
std::vector<unsigned char> Model(const Made& oMade, const Window& oWindow, const std::vector<unsigned int>& oChannels,
                                 unsigned char nFill)
{
    const std::size_t nBytes = oMade.ValueBytes();
    std::vector<unsigned char> oBuffer(std::size_t{oWindow.width} * oWindow.height * oChannels.size() * nBytes, nFill);
    for (unsigned int nRow = 0; nRow < oWindow.partHeight; ++nRow)
        for (unsigned int nColumn = 0; nColumn < oWindow.partWidth; ++nColumn)
        {
            const int nX = oWindow.x + static_cast<int>(oWindow.partX + nColumn);
            const int nY = oWindow.y + static_cast<int>(oWindow.partY + nRow);
            if (nX < 0 || nY < 0 || nX >= static_cast<int>(oMade.width) || nY >= static_cast<int>(oMade.height))
                continue;
            const std::size_t nFrom = static_cast<std::size_t>(nY) * oMade.width + static_cast<std::size_t>(nX);
            const std::size_t nTo = std::size_t{oWindow.partY + nRow} * oWindow.width + oWindow.partX + nColumn;
            for (std::size_t nAt = 0; nAt < oChannels.size(); ++nAt)
                std::memcpy(oBuffer.data() + (nTo * oChannels.size() + nAt) * nBytes,
                            oMade.pixels.data() + (nFrom * oMade.channels + oChannels[nAt] - 1) * nBytes, nBytes);
        }
    return oBuffer;
}

std::vector<unsigned int> ChooseChannels(Random& oRandom, unsigned int nCount)
{
    if (Pick(oRandom, 0, 1) == 0)
        return krv::test::AllChannels(nCount);
    std::vector<unsigned int> oChannels(Pick(oRandom, 1, 9));
    for (unsigned int& nChannel : oChannels)
        nChannel = Pick(oRandom, 1, nCount);
    return oChannels;
}

constexpr unsigned int SEEDS_PER_TEST = 25;

class TifWindows : public ::testing::TestWithParam<unsigned int>
{
};

TEST_P(TifWindows, AnyWindowOfAnyFileEqualsThePlainModel)
{
    for (unsigned int nSeed = GetParam(); nSeed < GetParam() + SEEDS_PER_TEST; ++nSeed)
    {
        const TemporaryFile oName;
        const Made oMade = Maker(nSeed).Make(oName.GetName());
        SCOPED_TRACE("seed " + std::to_string(nSeed) + ": " + oMade.Describe());
        const OpenTif oFile(oName.GetName());
        const std::unique_ptr<krv::datasources::IChannelInfo> poInfo(oFile->GetChannelInfo(oMade.channels));
        ASSERT_EQ(poInfo->GetDataType().Describe(), oMade.sample.type);
        Random oRandom(nSeed);
        for (int nTry = 0; nTry < 60; ++nTry)
        {
            const std::vector<unsigned int> oChannels = ChooseChannels(oRandom, oMade.channels);
            const std::unique_ptr<krv::datasources::IRasterIO> poIO(oFile->GetRasterIO(oChannels));
            const Window oWindow = ChooseWindow(oRandom, oMade, *poIO);
            std::vector<unsigned char> oBuffer =
                Model(oMade, {0, 0, oWindow.width, oWindow.height, 0, 0, 0, 0}, oChannels, 0xA7);
            poIO->ReadWindow(oWindow.x, oWindow.y, oWindow.width, oWindow.height, oWindow.partX, oWindow.partY,
                             oWindow.partWidth, oWindow.partHeight, oBuffer.data());
            ASSERT_TRUE(oBuffer == Model(oMade, oWindow, oChannels, 0xA7))
                << "window " << oWindow.x << ", " << oWindow.y << ", " << oWindow.width << " x " << oWindow.height
                << ", part " << oWindow.partX << ", " << oWindow.partY << ", " << oWindow.partWidth << " x "
                << oWindow.partHeight << ", try " << nTry;
        }
    }
}

INSTANTIATE_TEST_SUITE_P(Seeds, TifWindows, ::testing::Range(0u, 300u, SEEDS_PER_TEST));

} // namespace
