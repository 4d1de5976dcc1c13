#include "datasources/interfaces/ichannelinfo.h"
#include "gobs/raster/datatype.h"
#include "tests/plugins/tif/tifsupport.h"
#include "tests/support/tiffwriter.h"

#include <algorithm>
#include <bit>
#include <cmath>
#include <cstring>
#include <random>

#include <gtest/gtest.h>

namespace
{

using namespace krv::test;
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
    Bytes pixels; // pixel interleaved, as handed out

    std::size_t ValueBytes() const { return partBytes * sample.parts; }
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
void PutBits(Bytes& oBytes, std::size_t nAt, std::uint64_t nValue, unsigned int nBits)
{
    for (unsigned int nBit = 0; nBit < nBits; ++nBit)
        if ((nValue >> (nBits - 1 - nBit) & 1) != 0)
            oBytes[(nAt + nBit) / 8] |= static_cast<unsigned char>(0x80u >> (nAt + nBit) % 8);
}

// One part in the form in which libtiff takes it: words of 16, 24, 32 and 64 bits in this machine's order.
void PutPart(Bytes& oRow, std::size_t nBitAt, const Made& oMade, std::uint64_t nValue)
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
        const auto poTiff =
            NewTiff(fileName, std::string("w") + (oMade.bigEndian ? "b" : "l") + (oMade.big ? "8" : "4"));
        SetForm(poTiff.get(), {.mnWidth = oMade.width,
                               .mnHeight = oMade.height,
                               .mnChannels = static_cast<std::uint16_t>(oMade.channels),
                               .mnBits = static_cast<std::uint16_t>(oMade.sample.bits * oMade.sample.parts),
                               .mnFormat = oMade.sample.format,
                               .mnCompression = oMade.compression,
                               .mnPredictor = oMade.predictor,
                               .mbSeparate = oMade.planar,
                               .mnRows = oMade.blockHeight,
                               .mnTileWidth = oMade.tiled ? oMade.blockWidth : 0});
        if (oMade.reversed)
            TIFFSetField(poTiff.get(), TIFFTAG_FILLORDER, FILLORDER_LSB2MSB);
        for (unsigned int nPlane = 0; nPlane < (oMade.planar ? oMade.channels : 1); ++nPlane)
            for (unsigned int nY = 0; nY < oMade.height; nY += oMade.blockHeight)
                for (unsigned int nX = 0; nX < oMade.width; nX += oMade.blockWidth)
                    if ((nX | nY | nPlane) == 0 || Pick(moRandom, 0, 9) != 0) // the others are not stored
                        WriteRandomBlock(poTiff.get(), oMade, static_cast<std::uint16_t>(nPlane), nX, nY);
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

    void WriteRandomBlock(TIFF* poTiff, Made& oMade, std::uint16_t nPlane, unsigned int nX, unsigned int nY)
    {
        const unsigned int nRows = oMade.tiled ? oMade.blockHeight : std::min(oMade.blockHeight, oMade.height - nY);
        const unsigned int nPlaneChannels = oMade.planar ? 1 : oMade.channels;
        const std::size_t nRowBytes =
            (std::size_t{oMade.blockWidth} * nPlaneChannels * oMade.sample.bits * oMade.sample.parts + 7) / 8;
        Bytes oBlock;
        for (unsigned int nRow = 0; nRow < nRows; ++nRow)
        {
            Bytes oRow(nRowBytes);
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
        WriteBlock(poTiff,
                   oMade.tiled ? TIFFComputeTile(poTiff, nX, nY, 0, nPlane) : TIFFComputeStrip(poTiff, nY, nPlane),
                   oBlock);
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
    unsigned int x, y, width, height;
};

// Anywhere inside; now and then a block as it stands. What lies outside is the shared base's, whatever the file is.
Window ChooseWindow(Random& oRandom, const Made& oMade, const krv::datasources::IRasterIO& oIO)
{
    const bool bBlock = Pick(oRandom, 0, 3) == 0;
    Window oWindow{Pick(oRandom, 0, oMade.width - 1), Pick(oRandom, 0, oMade.height - 1), 0, 0};
    if (bBlock)
    {
        oWindow.x -= oWindow.x % oIO.GetTileWidth();
        oWindow.y -= oWindow.y % oIO.GetTileHeight();
    }
    const unsigned int nRight = oMade.width - oWindow.x, nBelow = oMade.height - oWindow.y;
    oWindow.width = bBlock ? std::min(oIO.GetTileWidth(), nRight) : Pick(oRandom, 1, nRight);
    oWindow.height = bBlock ? std::min(oIO.GetTileHeight(), nBelow) : Pick(oRandom, 1, nBelow);
    return oWindow;
}

// The plain model: pixel by pixel.
Bytes Model(const Made& oMade, const Window& oWindow, const std::vector<unsigned int>& oChannels)
{
    Bytes oBuffer;
    for (unsigned int nY = oWindow.y; nY < oWindow.y + oWindow.height; ++nY)
        for (unsigned int nX = oWindow.x; nX < oWindow.x + oWindow.width; ++nX)
            for (const unsigned int nChannel : oChannels)
            {
                const std::size_t nAt = (std::size_t{nY} * oMade.width + nX) * oMade.channels + nChannel - 1;
                const auto oValue = oMade.pixels.begin() + static_cast<std::ptrdiff_t>(nAt * oMade.ValueBytes());
                oBuffer.insert(oBuffer.end(), oValue, oValue + static_cast<std::ptrdiff_t>(oMade.ValueBytes()));
            }
    return oBuffer;
}

std::vector<unsigned int> ChooseChannels(Random& oRandom, unsigned int nCount)
{
    if (Pick(oRandom, 0, 1) == 0)
        return AllChannels(nCount);
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
        const TempFolder oFolder;
        const Made oMade = Maker(nSeed).Make(oFolder.File("made.tif"));
        SCOPED_TRACE("seed " + std::to_string(nSeed));
        const TifPointer oFile = OpenTif(oFolder.File("made.tif"));
        const std::unique_ptr<krv::datasources::IChannelInfo> poInfo(oFile->GetChannelInfo(oMade.channels));
        ASSERT_EQ(poInfo->GetDataType().Describe(), oMade.sample.type);
        Random oRandom(nSeed);
        for (int nTry = 0; nTry < 60; ++nTry)
        {
            const std::vector<unsigned int> oChannels = ChooseChannels(oRandom, oMade.channels);
            const IOPointer poIO(oFile->GetRasterIO(oChannels));
            const Window oWindow = ChooseWindow(oRandom, oMade, *poIO);
            const Bytes oExpected = Model(oMade, oWindow, oChannels);
            Bytes oBuffer(oExpected.size());
            poIO->ReadWindow(oWindow.x, oWindow.y, oWindow.width, oWindow.height, oBuffer.data());
            ASSERT_TRUE(oBuffer == oExpected) << "try " << nTry;
        }
    }
}

INSTANTIATE_TEST_SUITE_P(Seeds, TifWindows, ::testing::Range(0u, 300u, SEEDS_PER_TEST));

} // namespace
