#include "datasources/reader/rasteraccess.h"

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/reader/detail/rasterchannels.h"
#include "datasources/reader/rasteriterator.h"

namespace krv::datasources
{

RasterAccess::RasterAccess() : mpoChannels(std::make_unique<detail::RasterChannels>()) {}

RasterAccess::~RasterAccess() = default;

RasterIterator RasterAccess::FindRaster(unsigned int nX, unsigned int nY)
{
    return RasterIterator(this, mpoChannels->moOpened.moTiles.GetTileIndex(nX, nY));
}

RasterIterator RasterAccess::Begin()
{
    return RasterIterator(this);
}

RasterIterator RasterAccess::End()
{
    return RasterIterator(this, GetTileCount());
}

unsigned int RasterAccess::GetTileCount() const
{
    return mpoChannels->GetTileCount();
}

void RasterAccess::SetOptimalTileSize()
{
    mpoChannels->SetOptimalTileSize();
}

void RasterAccess::SetTileSize(unsigned int nWidth, unsigned int nHeight)
{
    mpoChannels->SetTileSize(nWidth, nHeight);
}

IFileFormat* RasterAccess::GetFileFormat() const
{
    return mpoChannels->mpoDataset->GetFileFormat();
}

krv::ogc::cs::ICRS* RasterAccess::GetCRS() const
{
    return mpoChannels->mpoDataset->ReadCRS();
}

krv::ogc::cs::GeocodingInfo* RasterAccess::GetGeocodingInfo() const
{
    return mpoChannels->GetGeocodingInfo();
}

AuxiliaryData RasterAccess::GetAuxiliaryData() const
{
    return mpoChannels->GetAuxiliaryData();
}

unsigned int RasterAccess::GetTileWidth() const
{
    return mpoChannels->moOpened.mnTileWidth;
}

unsigned int RasterAccess::GetTileHeight() const
{
    return mpoChannels->moOpened.mnTileHeight;
}

const std::vector<IChannelInfo*>& RasterAccess::GetChannelsInfo() const
{
    return mpoChannels->moOpened.moInfos.Get();
}

unsigned int RasterAccess::GetXMargin() const
{
    return mpoChannels->mnXMargin;
}

unsigned int RasterAccess::GetYMargin() const
{
    return mpoChannels->mnYMargin;
}

eMarginBehaviour RasterAccess::GetMarginBehaviour() const
{
    return mpoChannels->meMarginBehaviour;
}

unsigned int RasterAccess::GetWidth() const
{
    return mpoChannels->moOpened.mnWidth;
}

unsigned int RasterAccess::GetHeight() const
{
    return mpoChannels->moOpened.mnHeight;
}

unsigned int RasterAccess::GetChansCount() const
{
    return static_cast<unsigned int>(mpoChannels->moChannels.size());
}

const krv::gobs::DataType& RasterAccess::GetDataType() const
{
    return mpoChannels->moOpened.moType;
}

IDataset* RasterAccess::GetDataset() const
{
    return mpoChannels->mpoDataset;
}

const std::vector<unsigned int>& RasterAccess::GetChannels() const
{
    return mpoChannels->moChannels;
}

} // namespace krv::datasources
