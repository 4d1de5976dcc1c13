#pragma once

#include "gobs/raster/raster.h"
#include "gobs/resampling/levelreducer.h"
#include "gobs/resampling/nodatasamples.h"

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <utility>
#include <vector>

namespace krv::gobs
{

// Gathers rows of pixels into the tiles of a grid and stores each tile when the
// last of its pixels has come. Every pixel of the bounds comes once.
// Memory: the tiles that have begun and are not complete. One thread at a time.
class KRV_GOBS_API TileGatherer
{
public:
    // Gets the tile for good, a raster without margins at its place in the level. What it throws passes to whoever
    // brings pixels.
    using Store = std::function<void(std::unique_ptr<Raster> poTile)>;

    // oBounds: of the level, what will come. Tiles are those of the level's grid; those at its edges are cut.
    TileGatherer(const PixelBounds& oBounds, unsigned int nTileWidth, unsigned int nTileHeight, unsigned int nChannels,
                 const DataType& oType, Store oStore);

    // Memory for a block of pixels that lie in one tile and within the bounds; null for others.
    // The memory is the tile's own, so that pixels need no further copy; valid until the next call.
    unsigned char* Find(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight)
    {
        if (mpoLast != nullptr && mpoLast->moPart.Contains(nX, nY) &&
            mpoLast->moPart.Contains(nX + nWidth - 1, nY + nHeight - 1))
            return GetPlace(*mpoLast, nX, nY);
        return FindTile(nX, nY, nWidth, nHeight);
    }
    // Bytes from row to row where Find said last.
    std::size_t GetPitch() const { return mpoLast->moPart.GetWidth() * mnPixelBytes; }
    // As many pixels were written there.
    // To be called once they are written, before anything else is found. Stores the tile when these were its last ones.
    void Note(std::size_t nCount)
    {
        mpoLast->mnMissing -= nCount;
        if (mpoLast->mnMissing == 0)
            StoreLast();
    }
    // Any pixels of a row; those outside the bounds are left out.
    // pPixels: nCount pixels side by side, all channels of each. Copies them.
    void Put(unsigned int nX, unsigned int nY, unsigned int nCount, const unsigned char* pPixels);

private:
    struct Tile
    {
        PixelBounds moPart; // of the level
        std::unique_ptr<Raster> mpoRaster;
        std::uint64_t mnMissing = 0; // pixels
    };

    Tile& Get(unsigned int nX, unsigned int nY);
    unsigned char* GetPlace(Tile& oTile, unsigned int nX, unsigned int nY) const
    {
        const std::size_t nPixel =
            std::size_t{nY - oTile.moPart.mnTop} * oTile.moPart.GetWidth() + (nX - oTile.moPart.mnLeft);
        return oTile.mpoRaster->GetBuffer() + nPixel * mnPixelBytes;
    }
    unsigned char* FindTile(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight);
    void StoreLast();
    PixelBounds GetPart(unsigned int nColumn, unsigned int nRow) const;

    PixelBounds moBounds;
    unsigned int mnTileWidth; // of the level's grid
    unsigned int mnTileHeight;
    unsigned int mnChannels;
    DataType moType;
    std::size_t mnPixelBytes;                                      // all channels
    Store moStore;                                                 // where complete tiles go
    std::map<std::pair<unsigned int, unsigned int>, Tile> moTiles; // that have begun, by row and column
    Tile* mpoLast = nullptr;                                       // the one used last: rows come in runs
};

// Where the pixels of a level go, and those of the mask's level when there is
// one.
// One thread at a time. The use: Begin, write pixels there, End; Begin and End come in pairs.
class KRV_GOBS_API LevelTarget
{
public:
    // poFinisher: borrowed; gives values that are not valid their value. oForm: of the image that the level is made of.
    LevelTarget(TileGatherer oPixels, const SourceForm& oForm, const IValueFinisher* poFinisher);

    // poMask: a target of one 8-bit channel, 1 for a pixel that is valid in any channel.
    void SetMask(std::unique_ptr<TileGatherer> poMask) { mpoMask = std::move(poMask); }

    // Memory for pixels of a row, or of rows, which End takes. They may reach outside of what is to be made.
    // Rows of that memory lie GetPitch() bytes apart. Contents are undefined: all of it is to be written.
    unsigned char* Begin(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight = 1)
    {
        mnX = nX;
        mnY = nY;
        mnWidth = nWidth;
        mnHeight = nHeight;
        mpDirect = moPixels.Find(nX, nY, nWidth, nHeight);
        return mpDirect != nullptr ? mpDirect : BeginApart();
    }
    // Bytes from row to row of that memory.
    std::size_t GetPitch() const { return mpDirect != nullptr ? moPixels.GetPitch() : mnWidth * mnPixelBytes; }
    // pValid: a byte per value, or null when all are valid.
    // All pixels of Begin are there. pValid is read before this returns.
    void End(const unsigned char* pValid)
    {
        if (mpDirect != nullptr && pValid == nullptr && mpoMask == nullptr && !mbFinish)
            moPixels.Note(std::size_t{mnWidth} * mnHeight);
        else
            EndRows(pValid);
    }

private:
    unsigned char* BeginApart();
    void EndRows(const unsigned char* pValid);

    TileGatherer moPixels;                 // the level's own
    std::unique_ptr<TileGatherer> mpoMask; // null: the level has no mask
    const IValueFinisher* mpoFinisher;     // borrowed; null: values are always valid
    bool mbFinish;                         // valid values too
    unsigned int mnChannels;
    std::size_t mnPixelBytes;
    std::vector<unsigned char> moApart; // pixels that lie in several tiles, on their way to Put
    std::vector<unsigned char> moMaskRow;
    unsigned int mnX = 0; // of the last Begin, as the three below
    unsigned int mnY = 0;
    unsigned int mnWidth = 0;
    unsigned int mnHeight = 0;
    unsigned char* mpDirect = nullptr; // in a tile; null: moApart
};

} // namespace krv::gobs
