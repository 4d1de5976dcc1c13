#include "datasources/reader/detail/rasterchannels.h"

#include "datasources/interfaces/channelinfo.h"
#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/ioverviewio.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/metadata/auxiliarydata.h"
#include "gobs/raster/raster.h"
#include "toolkit/ogc/cs/geocodinginfo.h"

#include <cstring>
#include <limits>
#include <numeric>

namespace krv::datasources::detail
{

namespace
{

// The full extent of a raster and the sides of it whose margins do not lie wholly inside the image. The tests on the
// right and at the bottom take a margin that ends exactly at the edge for outside, intended.
struct Extent
{
    Extent(const krv::gobs::Raster& oRaster, unsigned int nImageWidth, unsigned int nImageHeight, const Place& oPlace)
        : mnX(ToPosition(static_cast<long long>(oRaster.GetX()) - oRaster.GetXMargin(), oPlace)),
          mnY(ToPosition(static_cast<long long>(oRaster.GetY()) - oRaster.GetYMargin(), oPlace)),
          mnWidth(ToPosition(static_cast<long long>(oRaster.GetFullWidth()), oPlace)),
          mnHeight(ToPosition(static_cast<long long>(oRaster.GetFullHeight()), oPlace))
    {
        const int nRight = ToPosition(static_cast<long long>(mnX) + mnWidth, oPlace);
        const int nBottom = ToPosition(static_cast<long long>(mnY) + mnHeight, oPlace);
        if (mnX < 0)
            mnOutside |= krv::gobs::eLeftSide;
        if (mnY < 0)
            mnOutside |= krv::gobs::eTopSide;
        if (nRight >= static_cast<long long>(nImageWidth))
            mnOutside |= krv::gobs::eRightSide;
        if (nBottom >= static_cast<long long>(nImageHeight))
            mnOutside |= krv::gobs::eBottomSide;
        mbCentreInside = oRaster.GetX() >= 0 && oRaster.GetY() >= 0 &&
                         static_cast<long long>(oRaster.GetX()) + oRaster.GetWidth() <= nImageWidth &&
                         static_cast<long long>(oRaster.GetY()) + oRaster.GetHeight() <= nImageHeight;
    }

    unsigned int MarginOf(krv::gobs::eMarginSide eSide, unsigned int nMargin) const
    {
        return (mnOutside & eSide) != 0 ? nMargin : 0;
    }

    int mnX;
    int mnY;
    int mnWidth;
    int mnHeight;
    unsigned int mnOutside = 0;
    bool mbCentreInside = false;
};

void MeasureImage(OpenedChannels& oOpened, const Place& oPlace)
{
    if (oOpened.mpoRasterIO == nullptr)
        throw krv::DataException("The dataset gave no raster I/O for the channels", oPlace);
    const IRasterIO& oRasterIO = *oOpened.mpoRasterIO;
    oOpened.mnWidth = oRasterIO.GetFileWidth();
    oOpened.mnHeight = oRasterIO.GetFileHeight();
    oOpened.mnTileWidth = oRasterIO.GetTileWidth();
    oOpened.mnTileHeight = oRasterIO.GetTileHeight();
}

} // namespace

OpenedChannels OpenChannels(IRasterDataset& oDataset, const std::vector<unsigned int>& oChannels,
                            std::unique_ptr<IRasterIO> oRasterIO, const Place& oPlace)
{
    OpenedChannels oOpened;
    for (const unsigned int nChannel : oChannels)
    {
        std::unique_ptr<IChannelInfo> oInfo(oDataset.GetChannelInfo(nChannel));
        if (oInfo == nullptr)
            throw krv::DataException("The dataset gave no description of channel " + std::to_string(nChannel), oPlace);
        oOpened.moInfos.Add(std::move(oInfo));
    }
    oOpened.moType = oOpened.moInfos.Get().front()->GetDataType();
    krv::gobs::NativeDataTypeCode eCode{};
    if (!oOpened.moType.FindNativeCode(eCode) || eCode == krv::gobs::eDT_BIT)
        throw krv::DataException("Channel " + std::to_string(oChannels.front()) + " is of the type " +
                                     oOpened.moType.Describe() + ", which no I/O hands out",
                                 oPlace);
    oOpened.mpoRasterIO = std::move(oRasterIO);
    if (oOpened.mpoRasterIO == nullptr)
        oOpened.mpoRasterIO.reset(oDataset.GetRasterIO(oChannels));
    MeasureImage(oOpened, oPlace);
    return oOpened;
}

OpenedChannels OpenBitmaps(IBitmapDataset& oDataset, const std::vector<unsigned int>& oBitmaps, const Place& oPlace)
{
    OpenedChannels oOpened;
    oOpened.moType = krv::gobs::DataType(krv::gobs::eDT_8U);
    for (std::size_t nIndex = 0; nIndex < oBitmaps.size(); ++nIndex)
        oOpened.moInfos.Add(std::make_unique<ChannelInfo>(oOpened.moType));
    oOpened.mpoRasterIO.reset(oDataset.GetBitmapIO(oBitmaps));
    MeasureImage(oOpened, oPlace);
    return oOpened;
}

OpenedChannels OpenRasterIO(std::unique_ptr<IRasterIO> oRasterIO, const krv::gobs::DataType& oType, const Place& oPlace)
{
    OpenedChannels oOpened;
    oOpened.moType = oType;
    oOpened.mpoRasterIO = std::move(oRasterIO);
    MeasureImage(oOpened, oPlace);
    return oOpened;
}

std::vector<unsigned int> FirstChannels(unsigned int nCount)
{
    std::vector<unsigned int> oChannels(nCount);
    std::iota(oChannels.begin(), oChannels.end(), 1u);
    return oChannels;
}

std::vector<unsigned int> AllChannels(const IRasterDataset& oDataset)
{
    return FirstChannels(oDataset.GetChanCount());
}

AuxiliaryData SelectChannelData(IDataset& oDataset, const std::vector<unsigned int>& oChannels)
{
    AuxiliaryData oResult(static_cast<unsigned int>(oChannels.size()));
    const AuxiliaryData oSource = oDataset.ReadAuxiliaryData();
    oResult.SetFileMetadata(oSource.GetFileMetadata());
    unsigned int nPosition = 0;
    for (const unsigned int nChannel : oChannels)
    {
        ++nPosition;
        oResult.SetChanMetadata(oSource.GetChanMetadata(nChannel), nPosition);
        oResult.SetChannelDescription(oSource.GetChannelDescription(nChannel), nPosition);
    }
    return oResult;
}

int ToPosition(long long nValue, const Place& oPlace)
{
    if (nValue < std::numeric_limits<int>::min() || nValue > std::numeric_limits<int>::max())
        throw krv::DataException("The raster's window does not fit signed 32-bit pixel positions", oPlace);
    return static_cast<int>(nValue);
}

RasterChannels::~RasterChannels()
{
    moOpened.mpoRasterIO.reset();
    mpoDataset.reset();
}

void RasterChannels::SetDataset(OwnedOrBorrowed<IDataset> oDataset)
{
    mpoDataset = std::move(oDataset);
}

void RasterChannels::DropOwnedDataset()
{
    if (mpoDataset.get_deleter().mbOwned)
        mpoDataset.reset();
}

bool RasterChannels::HasLevels() const
{
    return !mbBitmaps && dynamic_cast<const IRasterDataset*>(GetDataset()) != nullptr &&
           dynamic_cast<const IOverviewIO*>(moOpened.mpoRasterIO.get()) == nullptr;
}

void RasterChannels::Read(krv::gobs::Raster& oRaster, eMarginBehaviour eBehaviour, const Place& oPlace)
{
    IRasterIO& oRasterIO = *moOpened.mpoRasterIO;
    const unsigned int nXMargin = oRaster.GetXMargin();
    const unsigned int nYMargin = oRaster.GetYMargin();
    if (nXMargin < 1 && nYMargin < 1)
    {
        if (oRaster.GetX() < 0 || oRaster.GetY() < 0)
            throw krv::DataException("The raster's window starts outside the image", oPlace);
        oRasterIO.ReadWindow(static_cast<unsigned int>(oRaster.GetX()), static_cast<unsigned int>(oRaster.GetY()),
                             oRaster.GetWidth(), oRaster.GetHeight(), oRaster.GetBuffer());
        return;
    }

    const Extent oExtent(oRaster, moOpened.mnWidth, moOpened.mnHeight, oPlace);
    const auto nFullWidth = static_cast<unsigned int>(oExtent.mnWidth);
    const auto nFullHeight = static_cast<unsigned int>(oExtent.mnHeight);
    if (oExtent.mnOutside == 0)
    {
        oRasterIO.ReadWindow(static_cast<unsigned int>(oExtent.mnX), static_cast<unsigned int>(oExtent.mnY), nFullWidth,
                             nFullHeight, oRaster.GetBuffer());
        return;
    }
    if (!oExtent.mbCentreInside)
        std::memset(oRaster.GetBuffer(), 0, oRaster.GetBufferSize()); // else what no file has would be undefined
    const unsigned int nLeft = oExtent.MarginOf(krv::gobs::eLeftSide, nXMargin);
    const unsigned int nTop = oExtent.MarginOf(krv::gobs::eTopSide, nYMargin);
    const unsigned int nRight = oExtent.MarginOf(krv::gobs::eRightSide, nXMargin);
    const unsigned int nBottom = oExtent.MarginOf(krv::gobs::eBottomSide, nYMargin);
    oRasterIO.ReadWindow(oExtent.mnX, oExtent.mnY, nFullWidth, nFullHeight, nLeft, nTop, nFullWidth - nLeft - nRight,
                         nFullHeight - nTop - nBottom, oRaster.GetBuffer());
    FillMargins(oRaster, eBehaviour, oPlace);
}

void RasterChannels::FillMargins(krv::gobs::Raster& oRaster, eMarginBehaviour eBehaviour, const Place& oPlace) const
{
    if (eBehaviour == eException)
        throw krv::DataException("Margin behaviour is eException", oPlace);
    const Extent oExtent(oRaster, moOpened.mnWidth, moOpened.mnHeight, oPlace);
    krv::gobs::FillRasterMargins(&oRaster, eBehaviour, oExtent.mnOutside);
}

void RasterChannels::ReadInside(krv::gobs::Raster& oRaster, const Place& oPlace)
{
    const Extent oExtent(oRaster, moOpened.mnWidth, moOpened.mnHeight, oPlace);
    const auto nFullWidth = static_cast<unsigned int>(oExtent.mnWidth);
    const auto nFullHeight = static_cast<unsigned int>(oExtent.mnHeight);
    moOpened.mpoRasterIO->ReadWindow(oExtent.mnX, oExtent.mnY, nFullWidth, nFullHeight, 0, 0, nFullWidth, nFullHeight,
                                     oRaster.GetBuffer());
}

void RasterChannels::Write(const krv::gobs::Raster& oRaster, const Place& oPlace)
{
    IRasterIO& oRasterIO = *moOpened.mpoRasterIO;
    auto* const pBuffer = const_cast<unsigned char*>(oRaster.GetBuffer()); // the contract's writing takes it so
    const unsigned int nXMargin = oRaster.GetXMargin();
    const unsigned int nYMargin = oRaster.GetYMargin();
    if (nXMargin == 0 && nYMargin == 0)
    {
        if (oRaster.GetX() < 0 || oRaster.GetY() < 0)
            throw krv::DataException("The raster's window starts outside the image", oPlace);
        oRasterIO.WriteWindow(static_cast<unsigned int>(oRaster.GetX()), static_cast<unsigned int>(oRaster.GetY()),
                              oRaster.GetWidth(), oRaster.GetHeight(), pBuffer);
        return;
    }
    const Extent oExtent(oRaster, moOpened.mnWidth, moOpened.mnHeight, oPlace);
    oRasterIO.WriteWindow(oExtent.mnX, oExtent.mnY, static_cast<unsigned int>(oExtent.mnWidth),
                          static_cast<unsigned int>(oExtent.mnHeight), nXMargin, nYMargin, oRaster.GetWidth(),
                          oRaster.GetHeight(), pBuffer);
}

krv::ogc::cs::GeocodingInfo* RasterChannels::GetGeocodingInfo() const
{
    using krv::ogc::cs::GeocodingInfo;
    const auto* const poGeocoded = dynamic_cast<const IGeocodedDataset*>(mpoDataset.get());
    if (poGeocoded == nullptr)
        return nullptr;
    const GeocodingInfo& oGeocoding = poGeocoded->GetGeocoding();
    const auto* const poRasterDataset = dynamic_cast<const IRasterDataset*>(mpoDataset.get());
    if (poRasterDataset == nullptr || !IsOpen())
        return new GeocodingInfo(oGeocoding);
    const double nXRatio = static_cast<double>(poRasterDataset->GetWidth()) / moOpened.mpoRasterIO->GetFileWidth();
    const double nYRatio = static_cast<double>(poRasterDataset->GetHeight()) / moOpened.mpoRasterIO->GetFileHeight();
    if (!(nXRatio > 0) || !(nYRatio > 0))
        return new GeocodingInfo(oGeocoding);
    return new GeocodingInfo(oGeocoding.GetXOffset(), oGeocoding.GetXPerColumn() * nXRatio,
                             oGeocoding.GetXPerRow() * nYRatio, oGeocoding.GetYOffset(),
                             oGeocoding.GetYPerColumn() * nXRatio, oGeocoding.GetYPerRow() * nYRatio);
}

AuxiliaryData RasterChannels::GetAuxiliaryData() const
{
    if (!mbBitmaps)
        return SelectChannelData(*mpoDataset, moChannels);
    AuxiliaryData oResult(static_cast<unsigned int>(moChannels.size()));
    oResult.SetFileMetadata(mpoDataset->ReadAuxiliaryData().GetFileMetadata());
    const auto* const poBitmaps = dynamic_cast<const IBitmapDataset*>(mpoDataset.get());
    unsigned int nPosition = 0;
    for (const unsigned int nBitmap : moChannels)
    {
        ++nPosition;
        oResult.SetChannelDescription(poBitmaps->GetBitmapDescription(nBitmap), nPosition);
        oResult.SetChanMetadata(poBitmaps->GetBitmapMetadata(nBitmap), nPosition);
    }
    return oResult;
}

} // namespace krv::datasources::detail
