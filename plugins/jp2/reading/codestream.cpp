#include "plugins/jp2/reading/codestream.h"

#include "plugins/support/file/numbers.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <climits>
#include <numeric>
#include <utility>

namespace krv::plugins::jp2
{

namespace
{

using support::AppendNumber;
using support::ReadNumber;

enum Marker : unsigned int
{
    SOC = 0xFF4F,
    CAP = 0xFF50,
    SIZ = 0xFF51,
    COD = 0xFF52,
    COC = 0xFF53,
    TLM = 0xFF55,
    PLM = 0xFF57,
    PPM = 0xFF60,
    CRG = 0xFF63,
    COM = 0xFF64,
    SOT = 0xFF90,
    SOD = 0xFF93,
    EOC = 0xFFD9
};

constexpr std::size_t SOT_BYTES = 12;
constexpr std::uint64_t MAXIMUM_HEADER_BYTES = std::uint64_t{64} << 20;
constexpr std::uint32_t MAXIMUM_TILES = 65535;
constexpr std::size_t MAXIMUM_COMPONENTS = 16384;
constexpr std::size_t MAXIMUM_PARTS = 255;  // of a tile
constexpr std::size_t SEGMENT_ROOM = 65000; // of packed headers in one marker
constexpr unsigned int MAXIMUM_LEVELS = 32;
constexpr unsigned int LARGEST_PRECINCT = 15; // exponent
constexpr std::size_t READ_BYTES = 4096;

// What OpenJPEG takes for a code-block, its share of trees, and a precinct of a band, roughly.
constexpr double CODE_BLOCK_BYTES = 700;
constexpr double PRECINCT_BYTES = 300;
constexpr double PACKET_BYTES = 2;
// Each packet has a byte at least. Where so many lack theirs, looking for them takes longer than decoding.
constexpr double MOST_MISSING = 1 << 18;

unsigned int GetExponent(const Coding& oCoding, unsigned int nResolution, unsigned int nShift)
{
    return nResolution < oCoding.moPrecincts.size() ? oCoding.moPrecincts[nResolution] >> nShift & 15u
                                                    : LARGEST_PRECINCT;
}

double CountSpans(std::uint64_t nBegin, std::uint64_t nEnd, unsigned int nExponent)
{
    return nEnd <= nBegin ? 0.0 : static_cast<double>(((nEnd - 1) >> nExponent) - (nBegin >> nExponent) + 1);
}

} // namespace

// A marker segment, read from its first to its last byte.
class Codestream::Header
{
public:
    Header(const Codestream& oStream, std::uint64_t nOffset) : moStream(oStream), mnNext(nOffset) {}

    // Goes on to the next marker; those without a segment have no bytes.
    unsigned int Next()
    {
        mnMarker = static_cast<unsigned int>(ReadNumber(Load(mnNext, 2), 2, true));
        mnBegin = mnNext + 2;
        mnNext = mnBegin;
        if (mnMarker == SOC || mnMarker == SOD || mnMarker == EOC)
            return mnMarker;
        if (mnMarker < 0xFF00)
            moStream.Fail("a marker is expected at offset " + std::to_string(mnBegin - 2));
        const std::uint64_t nBytes = ReadNumber(Load(mnBegin, 2), 2, true);
        if (nBytes < 2)
            moStream.Fail("the marker at offset " + std::to_string(mnBegin - 2) + " has no valid length");
        mnNext = mnBegin + nBytes;
        const unsigned char* pBytes = Load(mnBegin, static_cast<std::size_t>(nBytes));
        moSegment.assign(pBytes, pBytes + nBytes);
        mnAt = 2;
        return mnMarker;
    }

    std::uint64_t GetEnd() const { return mnNext; }
    const std::vector<unsigned char>& GetSegment() const { return moSegment; }
    std::size_t GetLeft() const { return moSegment.size() - mnAt; }

    std::uint32_t Take(std::size_t nBytes)
    {
        if (GetLeft() < nBytes)
            moStream.Fail("the marker at offset " + std::to_string(mnBegin - 2) + " is too short");
        mnAt += nBytes;
        return static_cast<std::uint32_t>(ReadNumber(moSegment.data() + mnAt - nBytes, nBytes, true));
    }

    Coding TakeCoding(bool bPrecincts)
    {
        Coding oCoding;
        oCoding.mnLevels = Take(1);
        oCoding.mnBlockWidth = Take(1) + 2;
        oCoding.mnBlockHeight = Take(1) + 2;
        oCoding.mnStyle = Take(1);
        oCoding.mbReversible = Take(1) == 1;
        if (oCoding.mnLevels > MAXIMUM_LEVELS || oCoding.mnBlockWidth > 10 || oCoding.mnBlockHeight > 10 ||
            oCoding.mnBlockWidth + oCoding.mnBlockHeight > 12)
            moStream.Fail("the coding style is out of range");
        for (unsigned int nAt = 0; bPrecincts && nAt <= oCoding.mnLevels; ++nAt)
            oCoding.moPrecincts.push_back(static_cast<unsigned char>(Take(1)));
        return oCoding;
    }

    // The component of a segment that is one's own, and whether its precincts are told.
    std::pair<std::size_t, Coding> TakeOwnCoding()
    {
        const std::size_t nComponent = Take(moStream.moComponents.size() < 257 ? 1 : 2);
        const bool bPrecincts = (Take(1) & 1) != 0;
        return {nComponent, TakeCoding(bPrecincts)};
    }

private:
    // Bytes of the file; valid until the next call.
    const unsigned char* Load(std::uint64_t nOffset, std::size_t nBytes)
    {
        if (nOffset + nBytes > moStream.mnEnd)
            moStream.Fail("the codestream is truncated in its header");
        if (nOffset < mnBuffered || nOffset + nBytes > mnBuffered + moBuffer.size())
        {
            moBuffer.resize(static_cast<std::size_t>(
                std::min<std::uint64_t>(std::max(nBytes, READ_BYTES), moStream.mnEnd - nOffset)));
            moStream.mpoFile->Read(nOffset, moBuffer.data(), moBuffer.size());
            mnBuffered = nOffset;
        }
        return moBuffer.data() + (nOffset - mnBuffered);
    }

    const Codestream& moStream;
    std::uint64_t mnNext;
    std::uint64_t mnBegin = 0; // of the segment
    unsigned int mnMarker = 0;
    std::size_t mnAt = 0;
    std::vector<unsigned char> moSegment;
    std::vector<unsigned char> moBuffer;
    std::uint64_t mnBuffered = 0;
};

void Codestream::Fail(const std::string& what) const
{
    throw krv::FileFormatException(mpoFile->GetName(), mpoFile->GetName() + ": " + what);
}

Codestream::Codestream(std::shared_ptr<support::File> poFile, std::uint64_t nOffset, std::uint64_t nEnd)
    : mpoFile(std::move(poFile)), mnEnd(std::min(nEnd, mpoFile->GetSize()))
{
    Header oHeader(*this, nOffset);
    if (oHeader.Next() != SOC || oHeader.Next() != SIZ)
        Fail("there is no codestream at offset " + std::to_string(nOffset));
    ReadSize(oHeader);
    for (unsigned int nMarker = oHeader.Next(); nMarker != SOT; nMarker = oHeader.Next())
    {
        if (oHeader.GetEnd() - nOffset > MAXIMUM_HEADER_BYTES)
            Fail("the header of the codestream is larger than 64 MiB");
        if (nMarker == SOD || nMarker == EOC || nMarker == SOC || nMarker == SIZ)
            Fail("the header of the codestream is not followed by tiles");
        if (nMarker == COD)
            ReadStyle(oHeader);
        if (nMarker == COC)
            ReadComponentStyle(oHeader);
        if (nMarker == COM)
            ReadComment(oHeader);
        if (nMarker == PPM)
            ReadPackedHeaders(oHeader);
        // Tables of lengths are wrong for a part of the tiles.
        if (nMarker == COM || nMarker == PPM || nMarker == TLM || nMarker == PLM || nMarker == CRG)
            continue;
        AppendNumber(moSegments, nMarker, 2, true);
        moSegments.insert(moSegments.end(), oHeader.GetSegment().begin(), oHeader.GetSegment().end());
    }
    if (!moCoding)
        Fail("the codestream does not say how it is coded");
    mnScanned = oHeader.GetEnd() - SOT_BYTES;
    std::vector<unsigned char> oPacked;
    for (const auto& [nNumber, oBytes] : moPacked)
        oPacked.insert(oPacked.end(), oBytes.begin(), oBytes.end());
    for (std::size_t nAt = 0; nAt < oPacked.size();)
    {
        if (oPacked.size() - nAt < 4)
            Fail("the packed packet headers are truncated");
        const std::uint64_t nBytes = ReadNumber(oPacked.data() + nAt, 4, true);
        if (nBytes > oPacked.size() - nAt - 4)
            Fail("the packed packet headers are truncated");
        const auto oBegin = oPacked.begin() + static_cast<std::ptrdiff_t>(nAt);
        moPackedParts.emplace_back(oBegin, oBegin + 4 + static_cast<std::ptrdiff_t>(nBytes));
        nAt += 4 + static_cast<std::size_t>(nBytes);
    }
}

void Codestream::ReadSize(Header& oHeader)
{
    moSize = oHeader.GetSegment();
    oHeader.Take(2);
    moImage.mnX1 = oHeader.Take(4);
    moImage.mnY1 = oHeader.Take(4);
    moImage.mnX0 = oHeader.Take(4);
    moImage.mnY0 = oHeader.Take(4);
    mnTileWidth = oHeader.Take(4);
    mnTileHeight = oHeader.Take(4);
    mnTileX = oHeader.Take(4);
    mnTileY = oHeader.Take(4);
    const std::size_t nComponents = oHeader.Take(2);
    if (nComponents == 0 || nComponents > MAXIMUM_COMPONENTS || oHeader.GetLeft() != 3 * nComponents)
        Fail("the codestream says that it has " + std::to_string(nComponents) + " components, and describes " +
             std::to_string(oHeader.GetLeft() / 3));
    for (std::size_t nAt = 0; nAt < nComponents; ++nAt)
    {
        const std::uint32_t nSample = oHeader.Take(1);
        Component oComponent{(nSample & 127) + 1, nSample >= 128, 0, 0};
        oComponent.mnStepX = oHeader.Take(1);
        oComponent.mnStepY = oHeader.Take(1);
        moComponents.push_back(oComponent);
    }
    CheckSize();
    mnTilesAcross = DivideUp(moImage.mnX1 - mnTileX, mnTileWidth);
    mnTilesDown = DivideUp(moImage.mnY1 - mnTileY, mnTileHeight);
    if (std::uint64_t{mnTilesAcross} * mnTilesDown > MAXIMUM_TILES)
        Fail("the codestream says that it has " + std::to_string(std::uint64_t{mnTilesAcross} * mnTilesDown) +
             " tiles; there can be 65535");
}

void Codestream::CheckSize() const
{
    const auto IsSound = [](std::uint64_t nBegin, std::uint64_t nEnd, std::uint64_t nTile, std::uint64_t nTileSize)
    {
        return nBegin < nEnd && nEnd <= INT_MAX && nTile <= nBegin && nTileSize > 0 && nTile + nTileSize > nBegin;
    };
    if (!IsSound(moImage.mnX0, moImage.mnX1, mnTileX, mnTileWidth) ||
        !IsSound(moImage.mnY0, moImage.mnY1, mnTileY, mnTileHeight))
        Fail("the size of the image or of its tiles is out of range");
    for (const Component& oOne : moComponents)
        if (oOne.mnStepX == 0 || oOne.mnStepY == 0 ||
            DivideUp(moImage.mnX0, oOne.mnStepX) >= DivideUp(moImage.mnX1, oOne.mnStepX) ||
            DivideUp(moImage.mnY0, oOne.mnStepY) >= DivideUp(moImage.mnY1, oOne.mnStepY))
            Fail("a component of the image has no samples");
}

void Codestream::ReadStyle(Header& oHeader)
{
    const bool bPrecincts = (oHeader.Take(1) & 1) != 0;
    mnProgression = oHeader.Take(1);
    mnLayers = oHeader.Take(2);
    mbColourTransform = oHeader.Take(1) != 0;
    moCoding = oHeader.TakeCoding(bPrecincts);
}

void Codestream::ReadComponentStyle(Header& oHeader)
{
    auto [nComponent, oCoding] = oHeader.TakeOwnCoding();
    if (nComponent >= moComponents.size())
        Fail("the codestream describes a component that it does not have");
    moOwnCodings[nComponent] = std::move(oCoding);
}

void Codestream::ReadPackedHeaders(Header& oHeader)
{
    const unsigned int nNumber = oHeader.Take(1);
    const std::vector<unsigned char>& oSegment = oHeader.GetSegment();
    moPacked[nNumber].assign(oSegment.begin() + 3, oSegment.end());
}

void Codestream::ReadComment(Header& oHeader)
{
    constexpr std::uint32_t LATIN_TEXT = 1;
    if (oHeader.Take(2) != LATIN_TEXT || !moComment.empty())
        return;
    const std::vector<unsigned char>& oSegment = oHeader.GetSegment();
    moComment.assign(oSegment.begin() + 4, oSegment.end());
}

const Coding& Codestream::GetCoding(std::size_t nComponent) const
{
    const auto oOwn = moOwnCodings.find(nComponent);
    return oOwn != moOwnCodings.end() ? oOwn->second : *moCoding;
}

unsigned int Codestream::CountLevels() const
{
    unsigned int nLevels = moOwnCodings.size() < moComponents.size() ? moCoding->mnLevels : MAXIMUM_LEVELS;
    for (const auto& [nComponent, oCoding] : moOwnCodings)
        nLevels = std::min(nLevels, oCoding.mnLevels);
    return nLevels;
}

GridRect Codestream::GetRect(const TileRange& oTiles) const
{
    const auto End = [](std::uint64_t nFirst, std::uint64_t nSize, std::uint64_t nTile, std::uint32_t nEnd)
    {
        return static_cast<std::uint32_t>(std::min<std::uint64_t>(nFirst + (nTile + 1) * nSize, nEnd));
    };
    return {std::max(moImage.mnX0, mnTileX + oTiles.mnLeft * mnTileWidth),
            std::max(moImage.mnY0, mnTileY + oTiles.mnTop * mnTileHeight),
            End(mnTileX, mnTileWidth, oTiles.mnRight, moImage.mnX1),
            End(mnTileY, mnTileHeight, oTiles.mnBottom, moImage.mnY1)};
}

TileRange Codestream::FindTiles(const GridRect& oRect) const
{
    return {(oRect.mnX0 - mnTileX) / mnTileWidth, (oRect.mnY0 - mnTileY) / mnTileHeight,
            (oRect.mnX1 - 1 - mnTileX) / mnTileWidth, (oRect.mnY1 - 1 - mnTileY) / mnTileHeight};
}

// Notes one more tile-part; false at the end. Nothing of a tile is read but the twelve bytes at its head.
bool Codestream::ScanPart()
{
    if (mnScanned >= mnEnd)
        return false;
    const auto Stop = [this](const std::string& trouble)
    {
        moTrouble = trouble;
        mnScanned = mnEnd;
        return false;
    };
    unsigned char aBytes[SOT_BYTES];
    const std::uint64_t nOffset = mnScanned;
    const auto nRead = mpoFile->ReadUpTo(nOffset, aBytes,
                                         static_cast<std::size_t>(std::min<std::uint64_t>(SOT_BYTES, mnEnd - nOffset)));
    if (nRead >= 2 && ReadNumber(aBytes, 2, true) == EOC)
        return Stop("");
    if (nRead < SOT_BYTES)
        return Stop("the codestream ends without its last marker");
    if (ReadNumber(aBytes, 2, true) != SOT || ReadNumber(aBytes + 2, 2, true) != SOT_BYTES - 2)
        return Stop("there is no tile at offset " + std::to_string(nOffset));
    const auto nTile = static_cast<std::uint32_t>(ReadNumber(aBytes + 4, 2, true));
    std::uint64_t nBytes = ReadNumber(aBytes + 6, 4, true);
    if (nTile >= mnTilesAcross * mnTilesDown)
        return Stop("tile " + std::to_string(nTile) + " at offset " + std::to_string(nOffset) + " does not exist");
    if (nBytes == 0)
    {
        // The last one, up to the end.
        nBytes = mnEnd - nOffset;
        unsigned char aLast[2];
        mpoFile->Read(mnEnd - 2, aLast, 2);
        if (ReadNumber(aLast, 2, true) == EOC)
            nBytes -= 2;
    }
    if (nBytes < SOT_BYTES + 2)
        return Stop("the part of a tile at offset " + std::to_string(nOffset) + " has no valid length");
    Tile& oTile = moTiles[nTile];
    if (oTile.moParts.size() == MAXIMUM_PARTS)
        return Stop("tile " + std::to_string(nTile) + " has too many parts");
    oTile.moParts.push_back({nOffset, nBytes, mnParts++});
    oTile.mnStated = std::max(oTile.mnStated, static_cast<unsigned int>(aBytes[11]));
    mnScanned = nOffset + nBytes;
    if (mnScanned >= mnEnd && oTile.mnStated != oTile.moParts.size())
        moTrouble = "the codestream ends without its last marker";
    return true;
}

// The parts of a tile may lie anywhere. Some writers give their number as one less than it is: it counts only when all
// lie together and another tile follows.
const std::vector<TilePart>& Codestream::FindParts(std::uint32_t nTile)
{
    const auto IsComplete = [this](const Tile& oTile)
    {
        return oTile.mnStated != 0 && oTile.moParts.size() >= oTile.mnStated &&
               oTile.moParts.back().mnNumber + 1 < mnParts &&
               oTile.moParts.back().mnNumber - oTile.moParts.front().mnNumber + 1 == oTile.moParts.size();
    };
    Tile& oTile = moTiles[nTile];
    while (!IsComplete(oTile) && ScanPart())
    {
    }
    const std::string name = "tile " + std::to_string(nTile);
    const std::string cause = moTrouble.empty() ? "" : ": " + moTrouble;
    if (oTile.moParts.empty() && HasSamples(nTile))
        Fail(name + " is missing" + cause);
    if (oTile.moParts.size() < oTile.mnStated && !moTrouble.empty())
        Fail(name + " is not whole" + cause);
    return oTile.moParts;
}

// Tiles between the samples of all components need not be there.
bool Codestream::HasSamples(std::uint32_t nTile) const
{
    const std::uint32_t nColumn = nTile % mnTilesAcross, nRow = nTile / mnTilesAcross;
    const GridRect oRect = GetRect({nColumn, nRow, nColumn, nRow});
    const auto Has = [&oRect](const Component& oOne)
    {
        return DivideUp(oRect.mnX0, oOne.mnStepX) < DivideUp(oRect.mnX1, oOne.mnStepX) &&
               DivideUp(oRect.mnY0, oOne.mnStepY) < DivideUp(oRect.mnY1, oOne.mnStepY);
    };
    return std::any_of(moComponents.begin(), moComponents.end(), Has);
}

std::vector<unsigned char> Codestream::MakeMainHeader(const TileRange& oTiles,
                                                      const std::vector<std::uint32_t>& oParts) const
{
    const GridRect oRect = GetRect(oTiles);
    std::vector<unsigned char> oBytes;
    AppendNumber(oBytes, SOC, 2, true);
    AppendNumber(oBytes, SIZ, 2, true);
    oBytes.insert(oBytes.end(), moSize.begin(), moSize.begin() + 4);
    for (const std::uint32_t nNumber : {oRect.mnX1, oRect.mnY1, oRect.mnX0, oRect.mnY0, mnTileWidth, mnTileHeight,
                                        mnTileX + oTiles.mnLeft * mnTileWidth, mnTileY + oTiles.mnTop * mnTileHeight})
        AppendNumber(oBytes, nNumber, 4, true);
    oBytes.insert(oBytes.end(), moSize.begin() + 36, moSize.end());
    oBytes.insert(oBytes.end(), moSegments.begin(), moSegments.end());
    if (!moPackedParts.empty())
        AppendPackedHeaders(oBytes, oParts);
    return oBytes;
}

void Codestream::AppendPackedHeaders(std::vector<unsigned char>& oBytes, const std::vector<std::uint32_t>& oParts) const
{
    std::vector<unsigned char> oPacked;
    for (const std::uint32_t nPart : oParts)
    {
        if (nPart >= moPackedParts.size())
            Fail("there are not as many packed packet headers as parts of tiles");
        oPacked.insert(oPacked.end(), moPackedParts[nPart].begin(), moPackedParts[nPart].end());
    }
    for (std::size_t nAt = 0, nNumber = 0; nAt < oPacked.size(); nAt += SEGMENT_ROOM, ++nNumber)
    {
        const std::size_t nBytes = std::min(SEGMENT_ROOM, oPacked.size() - nAt);
        if (nNumber > 255)
            Fail("the packed packet headers of a tile are too large");
        AppendNumber(oBytes, PPM, 2, true);
        AppendNumber(oBytes, nBytes + 3, 2, true);
        AppendNumber(oBytes, nNumber, 1, true);
        oBytes.insert(oBytes.end(), oPacked.begin() + static_cast<std::ptrdiff_t>(nAt),
                      oPacked.begin() + static_cast<std::ptrdiff_t>(nAt + nBytes));
    }
}

std::vector<Codestream::Piece> Codestream::CutOut(const TileRange& oTiles, std::uint64_t nMemory)
{
    std::vector<Piece> oPieces(1);
    std::vector<std::uint32_t> oNumbers;
    std::uint32_t nNumber = 0;
    for (std::uint32_t nRow = oTiles.mnTop; nRow <= oTiles.mnBottom; ++nRow)
        for (std::uint32_t nColumn = oTiles.mnLeft; nColumn <= oTiles.mnRight; ++nColumn, ++nNumber)
        {
            const std::uint32_t nTile = nRow * mnTilesAcross + nColumn;
            const std::vector<TilePart>& oParts = FindParts(nTile);
            for (std::size_t nPart = 0; nPart < oParts.size(); ++nPart)
            {
                const TilePart& oPart = oParts[nPart];
                if (oPart.mnOffset + oPart.mnBytes > mnEnd || oPart.mnBytes > UINT32_MAX)
                    Fail("the file is truncated: tile " + std::to_string(nTile) + " wants " +
                         std::to_string(oPart.mnBytes) + " bytes at offset " + std::to_string(oPart.mnOffset) +
                         ", and the codestream ends at " + std::to_string(mnEnd));
                Piece oHead;
                AppendNumber(oHead.moBytes, SOT, 2, true);
                AppendNumber(oHead.moBytes, SOT_BYTES - 2, 2, true);
                AppendNumber(oHead.moBytes, nNumber, 2, true);
                AppendNumber(oHead.moBytes, oPart.mnBytes, 4, true);
                AppendNumber(oHead.moBytes, nPart, 1, true);
                AppendNumber(oHead.moBytes, oParts.size(), 1, true);
                oPieces.push_back(std::move(oHead));
                oPieces.push_back({{}, oPart.mnOffset + SOT_BYTES, oPart.mnBytes - SOT_BYTES});
                oNumbers.push_back(oPart.mnNumber);
            }
            // Large tiles that are what they say have data.
            const auto AddBytes = [](std::uint64_t nSum, const TilePart& oPart)
            {
                return nSum + oPart.mnBytes;
            };
            const std::uint64_t nData = std::accumulate(oParts.begin(), oParts.end(), std::uint64_t{0}, AddBytes);
            const Structure oStructure = FindStructure(nTile, oParts);
            if (oStructure.mnMemory > static_cast<double>(nMemory + 2 * nData))
                Fail("tile " + std::to_string(nTile) + " is cut into so many code-blocks or packets that decoding it " +
                     "takes more than " + std::to_string(nMemory >> 20) + " MiB");
            if (moPackedParts.empty() && oStructure.mnPackets > static_cast<double>(nData) + MOST_MISSING)
                Fail("tile " + std::to_string(nTile) + " is not whole: it has " + std::to_string(nData) +
                     " bytes, and says to have more packets");
        }
    oPieces.front().moBytes = MakeMainHeader(oTiles, oNumbers);
    oPieces.emplace_back();
    AppendNumber(oPieces.back().moBytes, EOC, 2, true);
    return oPieces;
}

// Headers of a tile may say otherwise than the main header.
Codestream::Structure Codestream::FindStructure(std::uint32_t nTile, const std::vector<TilePart>& oParts) const
{
    std::optional<Coding> oTileCoding;
    std::map<std::size_t, Coding> oTileCodings;
    double nLayers = mnLayers;
    for (const TilePart& oPart : oParts)
    {
        Header oHeader(*this, oPart.mnOffset + SOT_BYTES);
        for (unsigned int nMarker = oHeader.Next(); nMarker != SOD; nMarker = oHeader.Next())
        {
            if (oHeader.GetEnd() > oPart.mnOffset + oPart.mnBytes || nMarker == SOT || nMarker == EOC || nMarker == SOC)
                Fail("the header of tile " + std::to_string(nTile) + " is damaged");
            if (nMarker == COD)
            {
                const bool bPrecincts = (oHeader.Take(1) & 1) != 0;
                oHeader.Take(1);
                nLayers = std::max<double>(nLayers, oHeader.Take(2));
                oHeader.Take(1);
                oTileCoding = oHeader.TakeCoding(bPrecincts);
            }
            if (nMarker == COC)
            {
                const auto [nComponent, oCoding] = oHeader.TakeOwnCoding();
                oTileCodings[nComponent] = oCoding;
            }
        }
    }
    const std::uint32_t nColumn = nTile % mnTilesAcross, nRow = nTile / mnTilesAcross;
    const GridRect oRect = GetRect({nColumn, nRow, nColumn, nRow});
    double nBytes = 0, nAllPrecincts = 0, nMostPrecincts = 0, nMostResolutions = 0;
    for (std::size_t nAt = 0; nAt < moComponents.size(); ++nAt)
    {
        const auto oOwn = oTileCodings.find(nAt);
        const Coding& oCoding = oOwn != oTileCodings.end() ? oOwn->second : oTileCoding ? *oTileCoding : GetCoding(nAt);
        const Component& oComponent = moComponents[nAt];
        const GridRect oSamples = {DivideUp(oRect.mnX0, oComponent.mnStepX), DivideUp(oRect.mnY0, oComponent.mnStepY),
                                   DivideUp(oRect.mnX1, oComponent.mnStepX), DivideUp(oRect.mnY1, oComponent.mnStepY)};
        nMostResolutions = std::max(nMostResolutions, oCoding.mnLevels + 1.0);
        for (unsigned int nResolution = 0; nResolution <= oCoding.mnLevels; ++nResolution)
        {
            const unsigned int nShift = oCoding.mnLevels - nResolution;
            const unsigned int nBand = nResolution == 0 ? 0 : 1;
            const unsigned int nAcross = GetExponent(oCoding, nResolution, 0);
            const unsigned int nDown = GetExponent(oCoding, nResolution, 4);
            const double nPrecincts =
                CountSpans(ShiftUp(oSamples.mnX0, nShift), ShiftUp(oSamples.mnX1, nShift), nAcross) *
                CountSpans(ShiftUp(oSamples.mnY0, nShift), ShiftUp(oSamples.mnY1, nShift), nDown);
            const double nBlocks =
                CountSpans(ShiftUp(oSamples.mnX0, nShift + nBand), ShiftUp(oSamples.mnX1, nShift + nBand),
                           std::min(oCoding.mnBlockWidth, nAcross - std::min(nBand, nAcross))) *
                CountSpans(ShiftUp(oSamples.mnY0, nShift + nBand), ShiftUp(oSamples.mnY1, nShift + nBand),
                           std::min(oCoding.mnBlockHeight, nDown - std::min(nBand, nDown)));
            nBytes += (nBand == 0 ? 1 : 3) * (nBlocks * CODE_BLOCK_BYTES + nPrecincts * PRECINCT_BYTES);
            nMostPrecincts = std::max(nMostPrecincts, nPrecincts);
            nAllPrecincts += nPrecincts;
        }
    }
    nBytes += nLayers * nMostResolutions * static_cast<double>(moComponents.size()) * nMostPrecincts * PACKET_BYTES;
    return {nBytes, nLayers * nAllPrecincts};
}

} // namespace krv::plugins::jp2
