#pragma once

#include "datasources/reader/irasterreader.h"

#include <memory>

namespace krv::gobs
{
class Tile;
}

namespace krv::datasources
{

// The tile grid and the margins of a reader or writer, and the rasters that they make.
// A base of readers, not made by programs. IRasterIterable and IRasterReader say what each operation does.
class KRV_DATASOURCES_API TiledReader : public virtual IRasterReader
{
public:
    TiledReader& operator=(const TiledReader&) = delete;
    ~TiledReader() override;

    using IRasterReader::ReadRaster;
    // New rasters of this reader's type and channels with the current margins, filled by the other ReadRaster.
    krv::gobs::Raster* GetRaster(unsigned int nIndex) override;
    krv::gobs::Raster* ReadRaster(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight) override;
    // The tile that holds a pixel; End for a pixel outside the image.
    RasterIterator FindRaster(unsigned int nX, unsigned int nY) override;
    RasterIterator Begin() override;
    RasterIterator End() override;
    // 0 for an image without pixels.
    unsigned int GetTileCount() const override;
    // In pixels. Iterators of the grid before lose their meaning.
    void SetTileSize(unsigned int nWidth, unsigned int nHeight) override;
    unsigned int GetTileWidth() const override;
    unsigned int GetTileHeight() const override;
    // Pixels on each side of a tile.
    unsigned int GetXMargin() const override;
    unsigned int GetYMargin() const override;
    eMarginBehaviour GetMarginBehaviour() const override;

protected:
    // No tiles, no margins, eMirror.
    TiledReader();
    // Shares grid and margins.
    TiledReader(const TiledReader& oOther);

    // A grid over an image of a size. Throws DataException, and changes nothing, when there would be too many tiles.
    // nTileWidth, nTileHeight: pixels; 0 counts as 1.
    void SetGrid(unsigned int nWidth, unsigned int nHeight, unsigned int nTileWidth, unsigned int nTileHeight);
    // Without any check.
    void KeepMargins(unsigned int nXMargin, unsigned int nYMargin, eMarginBehaviour eBehaviour);

private:
    krv::gobs::Raster* ReadNew(const krv::gobs::Tile& oWindow);

    struct State;

    std::shared_ptr<State> mpoState;
};

} // namespace krv::datasources
