#pragma once

#include "datasources/interfaces/windowedio.h"
#include "gobs/raster/datatype.h"
#include "toolkit/core/hblock.h"
#include "toolkit/exceptions/place.h"

#include <algorithm>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <unordered_map>
#include <vector>

namespace krv::datasources::detail
{

// The bytes that the tiles of one dataset take, and may take.
struct MemoryBudget
{
    std::string moName; // of the dataset, for messages
    std::uint64_t mnCeiling;
    std::uint64_t mnUsed = 0;
};

// Channels of one type, pixel interleaved, in tiles that exist from the first writing on; before that all their pixels
// have the fill value.
class MemoryTiles
{
public:
    static constexpr unsigned int TILE_SIZE = 256;

    // nFill becomes a sample by the rule of conversion.
    MemoryTiles(unsigned int nWidth, unsigned int nHeight, const krv::gobs::DataType& oType, unsigned int nChannels,
                std::shared_ptr<MemoryBudget> poBudget, double nFill);
    ~MemoryTiles();
    MemoryTiles(const MemoryTiles&) = delete;
    MemoryTiles& operator=(const MemoryTiles&) = delete;

    unsigned int GetWidth() const { return mnWidth; }
    unsigned int GetHeight() const { return mnHeight; }
    const krv::gobs::DataType& GetType() const { return moType; }
    unsigned int GetChannels() const { return mnChannels; }
    const MemoryBudget& GetBudget() const { return *mpoBudget; }
    std::size_t GetValueBytes() const { return moFill.size(); }
    const std::vector<unsigned char>& GetFill() const { return moFill; } // of one value

    std::uint64_t GetTileNumber(unsigned int nX, unsigned int nY) const;
    // In the image, clipped to it.
    PixelRect GetTileRect(unsigned int nX, unsigned int nY) const;
    // The pixels of a tile, rows without gaps; null before it exists.
    unsigned char* Find(std::uint64_t nTile) const;
    std::uint64_t CountTileBytes(unsigned int nX, unsigned int nY) const;
    // Makes a tile; its pixels are undefined when bFill is not set.
    unsigned char* Make(unsigned int nX, unsigned int nY, bool bFill);

    // The same tiles without one of the channels, of which there are more. Nothing changes when it throws.
    std::shared_ptr<MemoryTiles> Without(unsigned int nChannel) const;

private:
    unsigned int mnWidth;
    unsigned int mnHeight;
    krv::gobs::DataType moType;
    unsigned int mnChannels;
    std::shared_ptr<MemoryBudget> mpoBudget;
    double mnFillValue;
    std::vector<unsigned char> moFill;
    std::unordered_map<std::uint64_t, HBlock> moTiles;
    std::uint64_t mnBytes = 0;
};

// Cuts a rectangle along the tiles; oWork(piece).
template <typename Work>
void ForEachPiece(const PixelRect& oRect, const Work& oWork)
{
    constexpr unsigned int SIZE = MemoryTiles::TILE_SIZE;
    const unsigned int nRight = oRect.mnX + oRect.mnWidth;
    const unsigned int nBottom = oRect.mnY + oRect.mnHeight;
    for (unsigned int nY = oRect.mnY; nY < nBottom; nY = std::min((nY / SIZE + 1) * SIZE, nBottom))
        for (unsigned int nX = oRect.mnX; nX < nRight; nX = std::min((nX / SIZE + 1) * SIZE, nRight))
            oWork(PixelRect{nX, nY, std::min((nX / SIZE + 1) * SIZE, nRight) - nX,
                            std::min((nY / SIZE + 1) * SIZE, nBottom) - nY});
}

// A channel of an image in memory.
struct MemoryChannel
{
    std::shared_ptr<MemoryTiles> mpoTiles;
    unsigned int mnIndex = 0; // in the tiles, from 0
};

// The transfer of windows for channels of one size and type. Base is IRasterIO or IOverviewIO.
template <typename Base>
class MemoryIO : public WindowedIO<Base>
{
public:
    // oBeforeWrite: called before pixels change, may throw. bBits: every byte but 0 is stored as 1.
    MemoryIO(std::vector<MemoryChannel> oChannels, std::function<void()> oBeforeWrite, bool bBits = false);
    ~MemoryIO() override;

    unsigned int GetFileWidth() const override { return First().GetWidth(); }
    unsigned int GetFileHeight() const override { return First().GetHeight(); }
    unsigned int GetTileWidth() const override;
    unsigned int GetTileHeight() const override;

    // Where the pixels of a piece of one tile lie, for who writes them there at once: all of them, before anything else
    // is asked of this object. nPitch: bytes from row to row. Null where they are not laid out as those of a window.
    // Throws what writing throws; nothing has changed then.
    unsigned char* BeginWriting(const PixelRect& oPiece, std::size_t& nPitch);

private:
    const MemoryTiles& First() const { return *moChannels.front().mpoTiles; }
    std::size_t GetPixelBytes() const override { return First().GetValueBytes() * moChannels.size(); }
    void ReadPixels(const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch) override;
    void WritePixels(const PixelRect& oRect, const unsigned char* pSource, std::size_t nPitch) override;
    void ReadPiece(const PixelRect& oPiece, unsigned char* pTarget, std::size_t nPitch);
    void WritePiece(const PixelRect& oPiece, const unsigned char* pSource, std::size_t nPitch);
    void MakeTiles(const PixelRect& oRect, bool bFill);
    unsigned char* GetScratch(const PixelRect& oPiece);

    std::vector<MemoryChannel> moChannels;
    std::vector<std::shared_ptr<MemoryTiles>> moTiles; // each once
    std::vector<std::size_t> moIndices;                // of the channels, as long as all are of the same tiles
    bool mbStraight;                                   // all channels of the same tiles, in their order
    std::function<void()> moBeforeWrite;
    bool mbBits;
    std::vector<unsigned char> moScratch; // of one channel of a piece
};

extern template class MemoryIO<IRasterIO>;
extern template class MemoryIO<IOverviewIO>;

// Of one level.
class MemoryLevelIO : public MemoryIO<IOverviewIO>
{
public:
    MemoryLevelIO(unsigned int nLevel, std::vector<MemoryChannel> oChannels, bool bBits);
    ~MemoryLevelIO() override;

    unsigned int GetLevel() const override { return mnLevel; }

private:
    unsigned int mnLevel;
};

} // namespace krv::datasources::detail
