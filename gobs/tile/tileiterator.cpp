#include "gobs/tile/tileiterator.h"

#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <cstdint>
#include <limits>
#include <string>

namespace krv::gobs
{

namespace
{

std::uint64_t TilesAlong(unsigned int nLength, unsigned int nTileLength)
{
    return (std::uint64_t(nLength) + nTileLength - 1) / nTileLength;
}

} // namespace

TileIterator::TileIterator(unsigned int nWidth, unsigned int nHeight)
    : mnWidth(nWidth), mnHeight(nHeight), mnTileWidth(std::max(nWidth, 1u)), mnTileHeight(std::max(nHeight, 1u)),
      mnColumns(nWidth != 0 ? 1 : 0), mnRows(nHeight != 0 ? 1 : 0)
{
}

void TileIterator::SetChunkSize(unsigned int nWidth, unsigned int nHeight)
{
    const unsigned int nTileWidth = std::max(nWidth, 1u);
    const unsigned int nTileHeight = std::max(nHeight, 1u);
    const std::uint64_t nColumns = TilesAlong(mnWidth, nTileWidth);
    const std::uint64_t nRows = TilesAlong(mnHeight, nTileHeight);
    if (nColumns * nRows > std::numeric_limits<unsigned int>::max())
        throw DataException("Tiles of " + std::to_string(nTileWidth) + " x " + std::to_string(nTileHeight) +
                            " pixels are too many for an image of " + std::to_string(mnWidth) + " x " +
                            std::to_string(mnHeight));
    mnTileWidth = nTileWidth;
    mnTileHeight = nTileHeight;
    mnColumns = static_cast<unsigned int>(nColumns);
    mnRows = static_cast<unsigned int>(nRows);
}

unsigned int TileIterator::GetTileRange() const
{
    return mnColumns * mnRows - 1;
}

unsigned int TileIterator::GetTileIndex(unsigned int nX, unsigned int nY) const
{
    if (nX >= mnWidth || nY >= mnHeight)
        return mnColumns * mnRows;
    return nY / mnTileHeight * mnColumns + nX / mnTileWidth;
}

Tile TileIterator::GetTile(unsigned int nIndex) const
{
    if (nIndex >= mnColumns * mnRows)
        throw OutOfBoundsException({nIndex}, "There is no tile " + std::to_string(nIndex) + ": the image has " +
                                                 std::to_string(mnColumns * mnRows));
    const unsigned int nX = nIndex % mnColumns * mnTileWidth;
    const unsigned int nY = nIndex / mnColumns * mnTileHeight;
    return {nX, nY, std::min(mnTileWidth, mnWidth - nX), std::min(mnTileHeight, mnHeight - nY)};
}

} // namespace krv::gobs
