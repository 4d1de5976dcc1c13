#include "datasources/reader/tiledreader.h"

#include "datasources/reader/detail/rasterchannels.h"
#include "datasources/reader/rasteriterator.h"
#include "gobs/raster/raster.h"
#include "gobs/tile/tileiterator.h"

namespace krv::datasources
{

struct TiledReader::State
{
    krv::gobs::TileIterator moTiles{0, 0};
    unsigned int mnTileWidth = 0; // as it was asked for
    unsigned int mnTileHeight = 0;
    unsigned int mnXMargin = 0;
    unsigned int mnYMargin = 0;
    eMarginBehaviour meMarginBehaviour = eMirror;
};

TiledReader::TiledReader() : mpoState(std::make_shared<State>()) {}
TiledReader::TiledReader(const TiledReader&) = default;
TiledReader::~TiledReader() = default;

void TiledReader::SetGrid(unsigned int nWidth, unsigned int nHeight, unsigned int nTileWidth, unsigned int nTileHeight)
{
    krv::gobs::TileIterator oTiles(nWidth, nHeight);
    oTiles.SetChunkSize(nTileWidth, nTileHeight);
    mpoState->moTiles = oTiles;
    mpoState->mnTileWidth = nTileWidth;
    mpoState->mnTileHeight = nTileHeight;
}

void TiledReader::SetTileSize(unsigned int nWidth, unsigned int nHeight)
{
    mpoState->moTiles.SetChunkSize(nWidth, nHeight);
    mpoState->mnTileWidth = nWidth;
    mpoState->mnTileHeight = nHeight;
}

void TiledReader::KeepMargins(unsigned int nXMargin, unsigned int nYMargin, eMarginBehaviour eBehaviour)
{
    mpoState->mnXMargin = nXMargin;
    mpoState->mnYMargin = nYMargin;
    mpoState->meMarginBehaviour = eBehaviour;
}

krv::gobs::Raster* TiledReader::ReadNew(const krv::gobs::Tile& oWindow)
{
    const Place oPlace = Place::Current();
    const krv::gobs::RasterContext oContext(detail::ToPosition(oWindow.GetX(), oPlace),
                                            detail::ToPosition(oWindow.GetY(), oPlace), GetXMargin(), GetYMargin());
    auto oRaster = std::make_unique<krv::gobs::Raster>(
        krv::gobs::RasterInfo(oWindow.GetWidth(), oWindow.GetHeight(), GetChansCount(), GetDataType()), oContext);
    ReadRaster(oRaster.get()); // virtual: a derived reader fills its own way
    return oRaster.release();
}

krv::gobs::Raster* TiledReader::GetRaster(unsigned int nIndex)
{
    return ReadNew(mpoState->moTiles.GetTile(nIndex));
}

krv::gobs::Raster* TiledReader::ReadRaster(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight)
{
    return ReadNew({nX, nY, nWidth, nHeight});
}

RasterIterator TiledReader::FindRaster(unsigned int nX, unsigned int nY)
{
    return RasterIterator(this, mpoState->moTiles.GetTileIndex(nX, nY));
}

RasterIterator TiledReader::Begin()
{
    return RasterIterator(this);
}

RasterIterator TiledReader::End()
{
    return RasterIterator(this, GetTileCount());
}

unsigned int TiledReader::GetTileCount() const
{
    return mpoState->moTiles.GetTileRange() + 1;
}

unsigned int TiledReader::GetTileWidth() const
{
    return mpoState->mnTileWidth;
}

unsigned int TiledReader::GetTileHeight() const
{
    return mpoState->mnTileHeight;
}

unsigned int TiledReader::GetXMargin() const
{
    return mpoState->mnXMargin;
}

unsigned int TiledReader::GetYMargin() const
{
    return mpoState->mnYMargin;
}

eMarginBehaviour TiledReader::GetMarginBehaviour() const
{
    return mpoState->meMarginBehaviour;
}

} // namespace krv::datasources
