#include "plugins/gdball/pictures/vips/claims.h"

#include "plugins/gdball/pictures/pnmheader.h"
#include "plugins/support/codec/checksum.h"
#include "plugins/support/file/numbers.h"
#include "toolkit/core/numbertext.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <span>
#include <vector>

namespace krv::plugins::gdball
{

namespace
{

using support::File;
using support::ReadNumber;

std::string Size(std::uint64_t nWidth, std::uint64_t nHeight)
{
    return std::to_string(nWidth) + " x " + std::to_string(nHeight) + " pixels";
}

[[noreturn]] void Refuse(const File& oFile, const std::string& what)
{
    throw FileFormatException(oFile.GetName(), oFile.GetName() + ": " + what);
}

void CheckFits(const File& oFile, std::uint64_t nWidth, std::uint64_t nHeight, std::uint64_t nLeast)
{
    if (nLeast > oFile.GetSize())
        Refuse(oFile, "the file is cut off, or its size is wrong: " + std::to_string(oFile.GetSize()) +
                          " bytes cannot hold " + Size(nWidth, nHeight));
}

Claims ReadPngClaims(const File& oFile)
{
    constexpr std::uint64_t MOST_RATIO = 1032; // of deflate
    unsigned char aHead[29];
    oFile.Read(0, aHead, sizeof(aHead));
    const std::uint64_t nWidth = ReadNumber(aHead + 16, 4, true), nHeight = ReadNumber(aHead + 20, 4, true);
    const std::uint64_t nBits = aHead[24];
    const std::uint64_t nChannels = aHead[25] == 2 ? 3 : aHead[25] == 4 ? 2 : aHead[25] == 6 ? 4 : 1;
    if (nWidth < (std::uint64_t{1} << 31) && nHeight < (std::uint64_t{1} << 31))
        CheckFits(oFile, nWidth, nHeight, (nWidth * nBits * nChannels / 8 + 1) / MOST_RATIO * nHeight);
    Claims oClaims;
    oClaims.mbWhole = aHead[28] != 0;
    return oClaims;
}

// From marker to marker up to the first scan.
Claims ReadJpegClaims(const File& oFile)
{
    constexpr unsigned int SOI = 0xD8, EOI = 0xD9, SOS = 0xDA, DHT = 0xC4, JPG = 0xC8, DAC = 0xCC;
    Claims oClaims;
    std::uint64_t nBlocks = 0, nWidth = 0, nHeight = 0;
    unsigned int nComponents = 0, nFrame = 0;
    unsigned char aBytes[10];
    for (std::uint64_t nAt = 2; oFile.ReadUpTo(nAt, aBytes, 4) == 4;)
    {
        const unsigned int nMarker = aBytes[1];
        if (aBytes[0] != 0xFF || nMarker == 0xFF || (nMarker >= 0xD0 && nMarker <= SOI))
        {
            nAt += aBytes[0] != 0xFF || nMarker == 0xFF ? 1 : 2;
            continue;
        }
        if (nMarker == EOI)
            break;
        const std::uint64_t nLength = ReadNumber(aBytes + 2, 2, true);
        if (nMarker >= 0xC0 && nMarker <= 0xCF && nMarker != DHT && nMarker != JPG && nMarker != DAC)
        {
            std::vector<unsigned char> oFrame(static_cast<std::size_t>(nLength));
            if (nLength < 8 || oFile.ReadUpTo(nAt + 2, oFrame.data(), oFrame.size()) != oFrame.size())
                break;
            nFrame = nMarker;
            nHeight = ReadNumber(oFrame.data() + 3, 2, true);
            nWidth = ReadNumber(oFrame.data() + 5, 2, true);
            nComponents = oFrame[7];
            std::uint64_t nMostX = 1, nMostY = 1;
            for (std::size_t nPart = 8; nPart + 3 <= oFrame.size(); nPart += 3)
            {
                nMostX = std::max<std::uint64_t>(nMostX, oFrame[nPart + 1] >> 4);
                nMostY = std::max<std::uint64_t>(nMostY, oFrame[nPart + 1] & 15);
            }
            for (std::size_t nPart = 8; nPart + 3 <= oFrame.size(); nPart += 3)
                nBlocks += (nWidth * (oFrame[nPart + 1] >> 4) / nMostX + 7) / 8 *
                           ((nHeight * (oFrame[nPart + 1] & 15) / nMostY + 7) / 8);
        }
        if (nMarker == SOS)
        {
            constexpr unsigned int PROGRESSIVE = 0xC2, LAST_HUFFMAN = 0xC2;
            constexpr std::uint64_t COEFFICIENT_BYTES = 128; // of a block
            oFile.ReadUpTo(nAt + 4, aBytes, 1);
            oClaims.mbWhole = nFrame == PROGRESSIVE || aBytes[0] < nComponents;
            oClaims.mnCoefficients = oClaims.mbWhole ? nBlocks * COEFFICIENT_BYTES : 0;
            // Each block is at least one code of one bit.
            if (nFrame >= 0xC0 && nFrame <= LAST_HUFFMAN)
                CheckFits(oFile, nWidth, nHeight, nBlocks / 8);
            break;
        }
        nAt += 2 + nLength;
    }
    return oClaims;
}

PnmHeader ReadPnmHeader(const File& oFile)
{
    std::vector<unsigned char> oBytes(4096);
    oBytes.resize(oFile.ReadUpTo(0, oBytes.data(), oBytes.size()));
    const auto oHeader = ParsePnmHeader(oBytes.data(), oBytes.size());
    if (!oHeader)
        Refuse(oFile, "its header is damaged");
    return *oHeader;
}

Claims ReadPnmClaims(const File& oFile)
{
    const PnmHeader oHeader = ReadPnmHeader(oFile);
    const std::uint64_t nPixels = oHeader.CountPixelBytes();
    if (nPixels > oFile.GetSize() || oHeader.mnBytes > oFile.GetSize() - nPixels)
        CheckFits(oFile, oHeader.mnWidth, oHeader.mnHeight, UINT64_MAX);
    Claims oClaims;
    oClaims.moHeader = oHeader.Write();
    oClaims.mnSkipped = oHeader.mnBytes;
    return oClaims;
}

// The bytes of a file one after the other, read in pieces that stay in the processor's cache.
class Sequence
{
public:
    Sequence(const File& oFile, std::uint64_t nBegin)
        : moFile(oFile), mnPlace(nBegin),
          moPiece(static_cast<std::size_t>(std::min<std::uint64_t>(PIECE, oFile.GetSize())))
    {
    }

    // The place of the next byte.
    std::uint64_t GetPlace() const { return mnPlace - (mnHeld - mnUsed); }

    // Some of the next bytes, at most so many; none at the end of the file.
    std::span<const unsigned char> Next(std::uint64_t nMost)
    {
        if (mnUsed == mnHeld)
        {
            mnHeld = moFile.ReadUpTo(mnPlace, moPiece.data(), moPiece.size());
            mnPlace += mnHeld;
            mnUsed = 0;
        }
        const auto nBytes = static_cast<std::size_t>(std::min<std::uint64_t>(nMost, mnHeld - mnUsed));
        mnUsed += nBytes;
        return {moPiece.data() + mnUsed - nBytes, nBytes};
    }

    // So many bytes; false when the file ends before.
    bool Take(unsigned char* pTarget, std::size_t nBytes)
    {
        for (std::size_t nDone = 0; nDone < nBytes;)
        {
            const auto oBytes = Next(nBytes - nDone);
            if (oBytes.empty())
                return false;
            std::copy(oBytes.begin(), oBytes.end(), pTarget + nDone);
            nDone += oBytes.size();
        }
        return true;
    }

private:
    static constexpr std::size_t PIECE = std::size_t{1} << 18;

    const File& moFile;
    std::uint64_t mnPlace; // behind what is held
    std::size_t mnHeld = 0, mnUsed = 0;
    std::vector<unsigned char> moPiece;
};

// Numbers between blanks. libvips takes bits of PBM that stand without any, as they may, for one large number.
void CheckText(const File& oFile, const PnmHeader& oHeader)
{
    const std::uint64_t nSamples = oHeader.mnWidth * oHeader.mnHeight * oHeader.GetChannels();
    const std::uint32_t nMost = oHeader.IsBits() ? 1 : ParseNumber<std::uint32_t>(oHeader.moMaximum).value_or(0);
    Sequence oSequence(oFile, oHeader.mnBytes);
    std::uint64_t nFound = 0;
    std::uint32_t nValue = 0;
    bool bInside = false;
    while (nFound < nSamples || bInside)
    {
        std::uint64_t nAt = oSequence.GetPlace();
        const auto oBytes = oSequence.Next(UINT64_MAX);
        if (oBytes.empty())
            break;
        for (auto oByte = oBytes.begin(); oByte != oBytes.end() && (nFound < nSamples || bInside); ++oByte, ++nAt)
        {
            const unsigned char nLetter = *oByte;
            const bool bDigit = nLetter >= '0' && nLetter <= '9';
            if (!bDigit && nLetter != ' ' && (nLetter < '\t' || nLetter > '\r'))
                Refuse(oFile, "byte " + std::to_string(nAt) + " is no part of a sample");
            const bool bNew = bDigit && !bInside;
            nValue = bNew ? nLetter - '0' : bDigit ? std::min(nValue * 10 + (nLetter - '0'), 99999u) : nValue;
            nFound += bNew ? 1 : 0;
            if (bInside && bDigit && oHeader.IsBits())
                Refuse(oFile, "bits without blanks between them are not read");
            bInside = bDigit;
            if (bDigit && nValue > nMost)
                Refuse(oFile, "the sample at byte " + std::to_string(nAt) + " is larger than the maximum");
        }
    }
    if (nFound < nSamples)
        Refuse(oFile, "the file is cut off: it has " + std::to_string(nFound) + " of " + std::to_string(nSamples) +
                          " samples");
}

void CheckPng(const File& oFile)
{
    constexpr std::uint64_t SIGNATURE = 8;
    constexpr std::uint64_t END = 0x49454E44;          // IEND
    constexpr std::uint64_t TRANSPARENCY = 0x74524E53; // tRNS
    Sequence oSequence(oFile, SIGNATURE);
    for (std::uint64_t nType = 0; nType != END;)
    {
        const std::uint64_t nAt = oSequence.GetPlace();
        unsigned char aHead[8];
        if (!oSequence.Take(aHead, sizeof(aHead)))
            Refuse(oFile, "the file is cut off after " + std::to_string(oFile.GetSize()) + " bytes");
        nType = ReadNumber(aHead + 4, 4, true);
        std::uint32_t nSum = codec::Checksum(0, aHead + 4, 4);
        std::uint64_t nLeft = ReadNumber(aHead, 4, true);
        while (nLeft > 0)
        {
            const auto oBytes = oSequence.Next(nLeft);
            if (oBytes.empty())
                break;
            nSum = codec::Checksum(nSum, oBytes.data(), oBytes.size());
            nLeft -= oBytes.size();
        }
        unsigned char aSum[4];
        if (nLeft > 0 || !oSequence.Take(aSum, sizeof(aSum)))
            Refuse(oFile, "the file is cut off within the part at byte " + std::to_string(nAt));
        // Parts that do not change pixels begin with a small letter, but for that of transparency.
        if (nSum != ReadNumber(aSum, 4, true) && (aHead[4] < 'a' || nType == TRANSPARENCY))
            Refuse(oFile,
                   "the part at byte " + std::to_string(nAt) + " is damaged: its checksum is not that of its bytes");
    }
}

} // namespace

Claims ReadClaims(const File& oFile, PictureKind eKind)
{
    switch (eKind)
    {
    case PictureKind::ePng:
        return ReadPngClaims(oFile);
    case PictureKind::eJpeg:
        return ReadJpegClaims(oFile);
    case PictureKind::ePnm:
        return ReadPnmClaims(oFile);
    default:
        break;
    }
    Claims oClaims;
    oClaims.mbWhole = eKind == PictureKind::eGif || eKind == PictureKind::eWebp || eKind == PictureKind::eHeif;
    return oClaims;
}

void CheckWhole(const File& oFile, PictureKind eKind)
{
    if (eKind == PictureKind::ePng)
        return CheckPng(oFile);
    if (eKind != PictureKind::ePnm)
        return;
    const PnmHeader oHeader = ReadPnmHeader(oFile);
    if (oHeader.IsText())
        CheckText(oFile, oHeader);
}

} // namespace krv::plugins::gdball
