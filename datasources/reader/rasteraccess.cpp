#include "datasources/reader/rasteraccess.h"

#include "datasources/interfaces/channelinfo.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/reader/detail/rasterchannels.h"
#include "datasources/reader/rasteriterator.h"

namespace krv::datasources
{

RasterAccess::RasterAccess() : mpoChannels(std::make_unique<detail::RasterChannels>()) {}

RasterAccess::~RasterAccess() = default;

void RasterAccess::SetDataset(IDataset* poDataset, const std::vector<unsigned int>& oChannels, bool bTakeOwnership)
{
    mpoChannels->SetChannels(oChannels);
    mpoChannels->SetDataset({poDataset, {bTakeOwnership}});
}

void RasterAccess::SetRasterIO(std::unique_ptr<IRasterIO> oRasterIO, const krv::gobs::DataType& oType)
{
    detail::OpenedChannels oOpened = detail::OpenRasterIO(std::move(oRasterIO), oType, Place::Current());
    for (std::size_t nChannel = 0; nChannel < GetChannels().size(); ++nChannel)
        oOpened.moInfos.Add(std::make_unique<ChannelInfo>(oType));
    mpoChannels->Commit(std::move(oOpened));
}

RasterIterator RasterAccess::FindRaster(unsigned int nX, unsigned int nY)
{
    return RasterIterator(this, mpoChannels->GetOpened().moGrid.GetTiles().GetTileIndex(nX, nY));
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
    return mpoChannels->GetOpened().moGrid.GetCount();
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
    return mpoChannels->GetDataset()->GetFileFormat();
}

krv::ogc::cs::ICRS* RasterAccess::GetCRS() const
{
    return mpoChannels->GetDataset()->ReadCRS();
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
    return mpoChannels->GetOpened().moGrid.GetTileWidth();
}

unsigned int RasterAccess::GetTileHeight() const
{
    return mpoChannels->GetOpened().moGrid.GetTileHeight();
}

const std::vector<IChannelInfo*>& RasterAccess::GetChannelsInfo() const
{
    return mpoChannels->GetOpened().moInfos.Get();
}

unsigned int RasterAccess::GetXMargin() const
{
    return mpoChannels->GetXMargin();
}

unsigned int RasterAccess::GetYMargin() const
{
    return mpoChannels->GetYMargin();
}

eMarginBehaviour RasterAccess::GetMarginBehaviour() const
{
    return mpoChannels->GetMarginBehaviour();
}

unsigned int RasterAccess::GetWidth() const
{
    return mpoChannels->GetOpened().mnWidth;
}

unsigned int RasterAccess::GetHeight() const
{
    return mpoChannels->GetOpened().mnHeight;
}

unsigned int RasterAccess::GetChansCount() const
{
    return static_cast<unsigned int>(mpoChannels->GetChannels().size());
}

const krv::gobs::DataType& RasterAccess::GetDataType() const
{
    return mpoChannels->GetOpened().moType;
}

IDataset* RasterAccess::GetDataset() const
{
    return mpoChannels->GetDataset();
}

const std::vector<unsigned int>& RasterAccess::GetChannels() const
{
    return mpoChannels->GetChannels();
}

} // namespace krv::datasources
