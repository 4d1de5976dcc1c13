#include "datasources/reader/rasteraccess.h"

#include "datasources/interfaces/channelinfo.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/reader/detail/rasterchannels.h"
#include "toolkit/exceptions/exceptions.h"

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
    Commit(std::move(oOpened));
}

void RasterAccess::Commit(detail::OpenedChannels oOpened)
{
    SetGrid(oOpened.mnWidth, oOpened.mnHeight, oOpened.mnTileWidth, oOpened.mnTileHeight);
    mpoChannels->Commit(std::move(oOpened));
}

void RasterAccess::SetOptimalTileSize()
{
    const detail::OpenedChannels& oOpened = mpoChannels->GetOpened();
    if (oOpened.mpoRasterIO != nullptr)
        TiledReader::SetTileSize(oOpened.mpoRasterIO->GetTileWidth(), oOpened.mpoRasterIO->GetTileHeight());
}

void RasterAccess::SetLimitedMargins(unsigned int nXMargin, unsigned int nYMargin, eMarginBehaviour eBehaviour,
                                     const Place& oPlace)
{
    // Stored before the check, intended: the behaviour is a setting of its own.
    KeepMargins(GetXMargin(), GetYMargin(), eBehaviour);
    const bool bFits = nXMargin <= GetWidth() / 2 && nYMargin <= GetHeight() / 2;
    if (!bFits && eBehaviour != eReplicate)
        throw krv::DataException("Margins can't be wider than half of the file", oPlace);
    KeepMargins(nXMargin, nYMargin, eBehaviour);
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

const std::vector<IChannelInfo*>& RasterAccess::GetChannelsInfo() const
{
    return mpoChannels->GetOpened().moInfos.Get();
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

bool RasterAccess::IsOfBitmaps() const
{
    return mpoChannels->IsBitmaps();
}

} // namespace krv::datasources
