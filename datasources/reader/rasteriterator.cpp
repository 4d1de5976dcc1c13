#include "datasources/reader/rasteriterator.h"

#include "datasources/reader/irasteriterable.h"

#include <algorithm>

namespace krv::datasources
{

RasterIterator::RasterIterator(IRasterIterable* poIterable) : mpoIterable(poIterable), mnIndex(0) {}

RasterIterator::RasterIterator(IRasterIterable* poIterable, unsigned int nIndex)
    : mpoIterable(poIterable), mnIndex(std::min(nIndex, poIterable->GetTileCount()))
{
}

RasterIterator::RasterIterator(const RasterIterator& oOther) = default;
RasterIterator& RasterIterator::operator=(const RasterIterator& oOther) = default;
RasterIterator::~RasterIterator() = default;

krv::gobs::Raster* RasterIterator::operator*() const
{
    return mpoIterable->GetRaster(mnIndex);
}

bool RasterIterator::operator==(const RasterIterator& oOther) const
{
    return mpoIterable == oOther.mpoIterable && mnIndex == oOther.mnIndex;
}

bool RasterIterator::operator!=(const RasterIterator& oOther) const
{
    return !(*this == oOther);
}

RasterIterator& RasterIterator::operator++()
{
    const unsigned int nCount = mpoIterable->GetTileCount();
    mnIndex = nCount == 0 || mnIndex >= nCount - 1 ? nCount : mnIndex + 1;
    return *this;
}

RasterIterator RasterIterator::operator++(int)
{
    const RasterIterator oBefore(*this);
    ++*this;
    return oBefore;
}

RasterIterator& RasterIterator::operator--()
{
    mnIndex = mnIndex == 0 ? mpoIterable->GetTileCount() : mnIndex - 1;
    return *this;
}

RasterIterator RasterIterator::operator--(int)
{
    const RasterIterator oBefore(*this);
    --*this;
    return oBefore;
}

} // namespace krv::datasources
