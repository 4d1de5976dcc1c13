#pragma once

#include "plugins/jp2/writing/tileencoder.h"
#include "plugins/support/file/file.h"
#include "plugins/support/image/iblocksource.h"
#include "plugins/support/writing/heldblocks.h"

#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <vector>

namespace krv::plugins::jp2
{

// The tiles of an image that is being written, in any order. A whole tile is encoded at once; the pixels of others
// wait, in memory up to a bound and beyond it in the file as they are, so that each tile is encoded once. The file
// belongs to the store, and is nobody's result.
class TileStore : public support::IBlockSource
{
public:
    // oBeforeWrite: called before each change; throws when there must be none.
    TileStore(std::shared_ptr<support::File> poFile, TileEncoder oEncoder, std::function<void()> oBeforeWrite);
    ~TileStore() override;

    const support::ImageLayout& GetLayout() const override { return moLayout; }
    std::string GetName() const override { return mpoFile->GetName(); }
    void ReadBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart, unsigned char* pTarget,
                   std::size_t nPitch) override;
    void WriteBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart, const unsigned char* pSource,
                    std::size_t nPitch) override;

    // Encodes what waits, and zeros for tiles that nobody wrote.
    void Complete();

    const TileEncoder& GetEncoder() const { return moEncoder; }
    // Of the completed tiles, in their order: the part of the file that holds a tile from its first marker on.
    std::uint64_t CountTiles() const { return moTiles.size(); }
    std::uint64_t GetTileOffset(std::uint64_t nTile) const;
    std::uint64_t GetTileBytes(std::uint64_t nTile) const;
    // The main header of a codestream of such tiles, as if the first one were all of the image.
    std::vector<unsigned char> ReadMainHeader() const;

private:
    struct Tile
    {
        std::uint64_t mnOffset = 0; // of the encoded tile with its header
        std::uint64_t mnBytes = 0;  // 0: not encoded
        std::uint64_t mnRoom = 0;
        std::uint32_t mnHeaderBytes = 0;
        std::uint64_t mnPixels = 0; // where pixels lie that are newer; 0: nowhere
    };

    support::PixelRect GetRect(std::uint64_t nTile) const;
    std::size_t GetPitch(std::uint64_t nTile) const { return GetRect(nTile).mnWidth * moLayout.GetPixelBytes(0); }
    // What the file has of a tile; leaves the memory alone when it has nothing.
    void Load(std::uint64_t nTile, unsigned char* pTarget, std::size_t nPitch);
    void Encode(std::uint64_t nTile, const unsigned char* pPixels, std::size_t nPitch);
    void PutAside(std::uint64_t nTile, const unsigned char* pPixels);

    std::shared_ptr<support::File> mpoFile;
    TileEncoder moEncoder;
    support::ImageLayout moLayout;
    std::function<void()> moBeforeWrite;
    std::vector<Tile> moTiles;
    std::uint64_t mnEnd; // of the file
    bool mbCompleting = false;
    support::HeldBlocks moHeld;
};

} // namespace krv::plugins::jp2
