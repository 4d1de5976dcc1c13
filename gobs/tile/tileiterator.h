#pragma once

#include "gobs/api.h"

namespace krv::gobs
{

// One rectangle of a tile grid, in whole pixels of the image.
// A plain value. Nothing is checked.
class Tile
{
public:
    Tile(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight)
        : mnX(nX), mnY(nY), mnWidth(nWidth), mnHeight(nHeight)
    {
    }

    // Column and row of the top left pixel.
    unsigned int GetX() const { return mnX; }
    unsigned int GetY() const { return mnY; }
    // Pixels; less than the size of the grid's tiles at the right and lower edge.
    unsigned int GetWidth() const { return mnWidth; }
    unsigned int GetHeight() const { return mnHeight; }

    friend bool operator==(const Tile&, const Tile&) = default;

private:
    unsigned int mnX;
    unsigned int mnY;
    unsigned int mnWidth;
    unsigned int mnHeight;
};

// The grid of tiles over an image: row by row from the top left, numbered from 0; the last column and row are cut at
// the image's edge. A new grid is one tile of the whole image.
// A plain value. Example, all tiles of an image with pixels: for (i = 0; i <= oGrid.GetTileRange(); ++i)
// oGrid.GetTile(i).
class KRV_GOBS_API TileIterator
{
public:
    // The size of the image in pixels.
    TileIterator(unsigned int nWidth, unsigned int nHeight);

    // Sets the tile size; 0 counts as 1. Throws DataException, and changes nothing, when the grid would have more than
    // 4294967295 tiles.
    void SetChunkSize(unsigned int nWidth, unsigned int nHeight);

    // Index of the last tile; 4294967295, so that one more is 0, for an image without pixels.
    unsigned int GetTileRange() const;

    // Index of the tile that holds a pixel; the number of tiles for a pixel outside the image.
    unsigned int GetTileIndex(unsigned int nX, unsigned int nY) const;

    // Throws OutOfBoundsException for an index beyond the last tile.
    Tile GetTile(unsigned int nIndex) const;

private:
    unsigned int mnWidth; // of the image
    unsigned int mnHeight;
    unsigned int mnTileWidth; // at least 1
    unsigned int mnTileHeight;
    unsigned int mnColumns; // of tiles
    unsigned int mnRows;    // of tiles
};

} // namespace krv::gobs
