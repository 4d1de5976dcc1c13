#pragma once

#include "datasources/reader/irasteriterable.h"
#include "datasources/reader/rasteriterator.h"
#include "gobs/raster/raster.h"

#include <cstddef>
#include <iterator>
#include <memory>

namespace krv::datasources
{

// The tiles of a reader or writer for a range loop, each owned by the loop:
//     for (std::unique_ptr<krv::gobs::Raster> oTile : RasterRange(oReader))
// Each step reads one tile. The reader outlives the range and keeps its tile size meanwhile.
// No raster is kept: memory is that of one tile, unless the loop keeps more.
class RasterRange
{
public:
    // One pass: two iterators are equal at the same tile, and each look at a tile reads it anew.
    class Iterator
    {
    public:
        // What range loops and algorithms of the standard library ask for.
        using iterator_category = std::input_iterator_tag;
        using difference_type = std::ptrdiff_t;
        using value_type = std::unique_ptr<krv::gobs::Raster>;
        using pointer = void;
        using reference = value_type;

        explicit Iterator(const RasterIterator& oPosition) : moPosition(oPosition) {}

        // Reads the tile. Throws what the reader throws.
        // Never null.
        value_type operator*() const { return value_type(*moPosition); }
        Iterator& operator++()
        {
            ++moPosition;
            return *this;
        }
        void operator++(int) { ++moPosition; }
        bool operator==(const Iterator& oOther) const { return moPosition == oOther.moPosition; }

    private:
        RasterIterator moPosition;
    };

    // oIterable: the caller's.
    explicit RasterRange(IRasterIterable& oIterable) : mpoIterable(&oIterable) {}

    // From the top left tile on, row by row.
    Iterator begin() const { return Iterator(mpoIterable->Begin()); }

    // The position behind the last tile; it reads nothing.
    Iterator end() const { return Iterator(mpoIterable->End()); }

private:
    IRasterIterable* mpoIterable; // borrowed
};

} // namespace krv::datasources
