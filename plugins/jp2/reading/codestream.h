#pragma once

#include "plugins/support/file/file.h"

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace krv::plugins::jp2
{

// A rectangle on the reference grid, or of samples of a component: ends are exclusive.
struct GridRect
{
    std::uint32_t mnX0 = 0;
    std::uint32_t mnY0 = 0;
    std::uint32_t mnX1 = 0;
    std::uint32_t mnY1 = 0;

    friend bool operator==(const GridRect&, const GridRect&) = default;
};

// Tiles by columns and rows, ends inclusive.
struct TileRange
{
    std::uint32_t mnLeft = 0;
    std::uint32_t mnTop = 0;
    std::uint32_t mnRight = 0;
    std::uint32_t mnBottom = 0;
};

// How the samples of a component are coded.
struct Coding
{
    unsigned int mnLevels = 0;     // decompositions
    unsigned int mnBlockWidth = 6; // of code-blocks, as exponents of 2
    unsigned int mnBlockHeight = 6;
    unsigned int mnStyle = 0;
    bool mbReversible = false;
    // Of precincts, one for each resolution from the smallest one: exponents, the width in the lower four bits; empty
    // for the largest there are.
    std::vector<unsigned char> moPrecincts;
};

struct Component
{
    unsigned int mnBits = 8;
    bool mbSigned = false;
    unsigned int mnStepX = 1; // on the reference grid
    unsigned int mnStepY = 1;
};

// A part of a tile's data in the file, from its SOT marker on.
struct TilePart
{
    std::uint64_t mnOffset = 0;
    std::uint64_t mnBytes = 0;
    std::uint32_t mnNumber = 0; // among all of the codestream
};

// Division and shift upwards, of positions on the reference grid.
constexpr std::uint32_t DivideUp(std::uint64_t nValue, std::uint64_t nBy)
{
    return static_cast<std::uint32_t>((nValue + nBy - 1) / nBy);
}

constexpr std::uint32_t ShiftUp(std::uint64_t nValue, unsigned int nBits)
{
    return static_cast<std::uint32_t>((nValue + (std::uint64_t{1} << nBits) - 1) >> nBits);
}

// The main header of a JPEG 2000 codestream (ITU-T T.800, annex A) and where the data of its tiles lie. What OpenJPEG
// is to see passes here first: sizes are checked, and any rectangle of tiles is made a codestream of its own. One
// thread at a time.
class Codestream
{
public:
    // The codestream begins at nOffset and ends before nEnd. Throws FileFormatException for a damaged header, and for
    // sizes that are out of range.
    Codestream(std::shared_ptr<support::File> poFile, std::uint64_t nOffset, std::uint64_t nEnd);

    const std::shared_ptr<support::File>& GetFile() const { return mpoFile; }
    const GridRect& GetImage() const { return moImage; }
    const std::vector<Component>& GetComponents() const { return moComponents; }
    const Coding& GetCoding(std::size_t nComponent) const;
    bool HasColourTransform() const { return mbColourTransform; }
    unsigned int GetLayers() const { return mnLayers; }
    // 0 to 4: LRCP, RLCP, RPCL, PCRL, CPRL.
    unsigned int GetProgression() const { return mnProgression; }
    // Of all components: how many resolutions can be left out at most.
    unsigned int CountLevels() const;
    // The first comment that is text; empty when there is none.
    const std::string& GetComment() const { return moComment; }

    std::uint32_t GetTileWidth() const { return mnTileWidth; }
    std::uint32_t GetTileHeight() const { return mnTileHeight; }
    std::uint32_t GetTileLeft() const { return mnTileX; } // of the first tile
    std::uint32_t GetTileTop() const { return mnTileY; }
    std::uint32_t GetTilesAcross() const { return mnTilesAcross; }
    std::uint32_t GetTilesDown() const { return mnTilesDown; }
    // The part of the image that tiles cover.
    GridRect GetRect(const TileRange& oTiles) const;
    // The tiles that a rectangle of the image touches.
    TileRange FindTiles(const GridRect& oRect) const;

    // A codestream of the tiles alone, as pieces: bytes, or a place in the file.
    struct Piece
    {
        std::vector<unsigned char> moBytes;
        std::uint64_t mnOffset = 0; // where moBytes is empty
        std::uint64_t mnBytes = 0;
    };
    // nMemory: what the decoder may take for the structure of a tile, beside twice the bytes of its data. Throws
    // FileFormatException for tiles that are missing, truncated or damaged, or take more.
    std::vector<Piece> CutOut(const TileRange& oTiles, std::uint64_t nMemory);

private:
    class Header;
    struct Tile
    {
        std::vector<TilePart> moParts;
        unsigned int mnStated = 0; // how many there are; 0 as long as nobody said so
    };

    [[noreturn]] void Fail(const std::string& what) const;
    void ReadSize(Header& oHeader);
    void ReadStyle(Header& oHeader);
    void ReadComponentStyle(Header& oHeader);
    void ReadPackedHeaders(Header& oHeader);
    void ReadComment(Header& oHeader);
    void CheckSize() const;

    const std::vector<TilePart>& FindParts(std::uint32_t nTile);
    bool ScanPart();
    bool HasSamples(std::uint32_t nTile) const;
    std::vector<unsigned char> MakeMainHeader(const TileRange& oTiles, const std::vector<std::uint32_t>& oParts) const;
    void AppendPackedHeaders(std::vector<unsigned char>& oBytes, const std::vector<std::uint32_t>& oParts) const;
    // What decoding a tile takes beside its pixels, roughly.
    struct Structure
    {
        double mnMemory = 0; // bytes
        double mnPackets = 0;
    };
    Structure FindStructure(std::uint32_t nTile, const std::vector<TilePart>& oParts) const;

    std::shared_ptr<support::File> mpoFile;
    std::uint64_t mnEnd;
    GridRect moImage;
    std::uint32_t mnTileX = 0, mnTileY = 0, mnTileWidth = 0, mnTileHeight = 0;
    std::uint32_t mnTilesAcross = 0, mnTilesDown = 0;
    std::vector<Component> moComponents;
    std::optional<Coding> moCoding;
    std::map<std::size_t, Coding> moOwnCodings; // of components
    bool mbColourTransform = false;
    unsigned int mnLayers = 1;
    unsigned int mnProgression = 0;
    std::string moComment;

    std::vector<unsigned char> moSize;     // the SIZ segment
    std::vector<unsigned char> moSegments; // the others that decoding needs, but for packed packet headers
    std::map<unsigned int, std::vector<unsigned char>> moPacked; // PPM, by their number
    std::vector<std::vector<unsigned char>> moPackedParts;       // of each tile-part

    std::map<std::uint32_t, Tile> moTiles;
    std::uint64_t mnScanned = 0; // where the next tile-part is looked for; the end when all are known
    std::uint32_t mnParts = 0;
    std::string moTrouble; // why the rest of the tile-parts is not known
};

} // namespace krv::plugins::jp2
