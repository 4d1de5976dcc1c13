#pragma once

#include "datasources/api.h"

namespace krv::gobs
{
class Raster;
}

namespace krv::datasources
{

class IRasterIterable;

// A position in a tile grid; the end is the position behind the last tile. Copies are cheap; the reader or writer
// outlives its iterators.
// RasterRange is the same with owning pointers and is what new programs take.
class KRV_DATASOURCES_API RasterIterator
{
public:
    // The first tile. poIterable: borrowed, not null.
    explicit RasterIterator(IRasterIterable* poIterable);
    // An index beyond the last tile is the end.
    RasterIterator(IRasterIterable* poIterable, unsigned int nIndex);
    RasterIterator(const RasterIterator& oOther);
    RasterIterator& operator=(const RasterIterator& oOther);
    ~RasterIterator();

    // A new raster that the caller deletes; every call reads the tile anew.
    krv::gobs::Raster* operator*() const;

    // Equal at the same tile of the same reader or writer.
    bool operator==(const RasterIterator& oOther) const;
    bool operator!=(const RasterIterator& oOther) const;

    // The end stays the end; a step back from the first tile leads to the end, and from the end to the last tile,
    // intended: there is no position before the first.
    RasterIterator& operator++();
    RasterIterator operator++(int);
    RasterIterator& operator--();
    RasterIterator operator--(int);

private:
    IRasterIterable* mpoIterable; // borrowed
    unsigned int mnIndex;         // of the tile; the number of tiles at the end
};

} // namespace krv::datasources
