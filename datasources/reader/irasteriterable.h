#pragma once

#include "datasources/api.h"

#include <vector>

namespace krv::gobs
{
class Raster;
}

namespace krv::datasources
{

class IChannelInfo;
class RasterIterator;

// The tile grid of a reader or writer. A virtual base, so that a class that is both has one grid.
// The order of the virtual operations is fixed.
// RasterRange goes over it in a range loop.
class KRV_DATASOURCES_API IRasterIterable
{
public:
    virtual ~IRasterIterable();

    // A new raster of tile nIndex with the current margins, owned by the caller.
    // Tiles count from 0, row by row from the upper left. Throws OutOfBoundsException for an index beyond the last one,
    // and what reading throws.
    virtual krv::gobs::Raster* GetRaster(unsigned int nIndex) = 0;
    // The tile that holds a pixel; End() for a pixel outside the image.
    virtual RasterIterator FindRaster(unsigned int nX, unsigned int nY) = 0;
    // The first tile, from the upper left; End() where there are no tiles.
    virtual RasterIterator Begin() = 0;
    // The position behind the last tile.
    virtual RasterIterator End() = 0;
    // 0 for a writer whose image is not laid out yet.
    virtual unsigned int GetTileCount() const = 0;
    // Takes the format's preferred block as tile.
    virtual void SetOptimalTileSize() = 0;
    // In pixels; 0 counts as 1. Indices of existing iterators then mean other tiles.
    virtual void SetTileSize(unsigned int nWidth, unsigned int nHeight) = 0;
    // The columns of a whole tile; those at the right edge of the image may have fewer.
    virtual unsigned int GetTileWidth() const = 0;
    // The rows of a whole tile; those at the bottom may have fewer.
    virtual unsigned int GetTileHeight() const = 0;
    // One description per channel, in the order of the channels in rasters; owned by this object.
    virtual const std::vector<IChannelInfo*>& GetChannelsInfo() const = 0;
};

} // namespace krv::datasources
