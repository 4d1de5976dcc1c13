#pragma once

#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/irasterio.h"
#include "gobs/raster/datatype.h"
#include "gobs/raster/margins.h"
#include "toolkit/core/ownedorborrowed.h"
#include "toolkit/exceptions/exceptions.h"

#include <memory>
#include <string>
#include <utility>
#include <vector>

namespace krv::gobs
{
class Raster;
}

namespace krv::ogc::cs
{
class GeocodingInfo;
}

namespace krv::datasources
{

class AuxiliaryData;
class IBitmapDataset;
class IDataset;
class IRasterDataset;

namespace detail
{

// Owns channel descriptions and hands them out as the interfaces want them.
class ChannelInfos
{
public:
    void Add(std::unique_ptr<IChannelInfo> oInfo)
    {
        moOwned.push_back(std::move(oInfo));
        moInfos.push_back(moOwned.back().get());
    }
    const std::vector<IChannelInfo*>& Get() const { return moInfos; }

private:
    std::vector<std::unique_ptr<IChannelInfo>> moOwned;
    std::vector<IChannelInfo*> moInfos;
};

// Everything that becomes known when channels are opened; made as a whole or not at all.
struct OpenedChannels
{
    std::unique_ptr<IRasterIO> mpoRasterIO;
    ChannelInfos moInfos;
    krv::gobs::DataType moType;
    unsigned int mnWidth = 0;
    unsigned int mnHeight = 0;
    unsigned int mnTileWidth = 0; // as the I/O prefers
    unsigned int mnTileHeight = 0;
};

// Opens image channels in the type of the first; a given I/O is used instead of the dataset's own and taken over.
OpenedChannels OpenChannels(IRasterDataset& oDataset, const std::vector<unsigned int>& oChannels,
                            std::unique_ptr<IRasterIO> oRasterIO, const Place& oPlace);

// Opens bitmaps as 8-bit unsigned channels.
OpenedChannels OpenBitmaps(IBitmapDataset& oDataset, const std::vector<unsigned int>& oBitmaps, const Place& oPlace);

// An I/O alone, without descriptions.
OpenedChannels OpenRasterIO(std::unique_ptr<IRasterIO> oRasterIO, const krv::gobs::DataType& oType,
                            const Place& oPlace);

// The facet of a dataset. Throws DataException with the message for null and for one without the facet.
template <typename Facet>
Facet& RequireFacet(IDataset* poDataset, const std::string& message, const Place& oPlace)
{
    auto* const poFacet = dynamic_cast<Facet*>(poDataset);
    if (poFacet == nullptr)
        throw krv::DataException(message, oPlace);
    return *poFacet;
}

// 1, 2, ... the count, and the dataset's channel count
std::vector<unsigned int> FirstChannels(unsigned int nCount);
std::vector<unsigned int> AllChannels(const IRasterDataset& oDataset);

// The file metadata of a dataset, and metadata and descriptions of the listed channels in the order of the list.
AuxiliaryData SelectChannelData(IDataset& oDataset, const std::vector<unsigned int>& oChannels);

// The signed 32-bit number that a raster's position is; throws DataException when it is none.
int ToPosition(long long nValue, const Place& oPlace);

// What readers and writers have in common: the dataset and the opened channels.
class RasterChannels
{
public:
    RasterChannels() = default;
    RasterChannels(const RasterChannels&) = delete;
    RasterChannels& operator=(const RasterChannels&) = delete;
    // Deletes the I/O, then the dataset if it is owned, then the descriptions.
    ~RasterChannels();

    void SetDataset(OwnedOrBorrowed<IDataset> oDataset);
    void SetOwned(bool bOwned) { mpoDataset.get_deleter().mbOwned = bOwned; }
    // A dataset that is only borrowed stays.
    void DropOwnedDataset();
    void SetChannels(std::vector<unsigned int> oChannels) { moChannels = std::move(oChannels); }
    // The numbers of the channels are those of bitmaps.
    void SetBitmaps() { mbBitmaps = true; }
    void Commit(OpenedChannels oOpened) { moOpened = std::move(oOpened); }

    IDataset* GetDataset() const { return mpoDataset.get(); }
    const std::vector<unsigned int>& GetChannels() const { return moChannels; }
    bool IsBitmaps() const { return mbBitmaps; }
    bool IsOpen() const { return moOpened.mpoRasterIO != nullptr; }
    // Whether the dataset's levels are levels of these rasters, which are no bitmaps and no level.
    bool HasLevels() const;
    const OpenedChannels& GetOpened() const { return moOpened; }

    // Fills a raster of the right count and type, margins by its own description. Margins that lie wholly inside the
    // image are read with it, the others are made afterwards by FillMargins.
    void Read(krv::gobs::Raster& oRaster, eMarginBehaviour eBehaviour, const Place& oPlace);
    void FillMargins(krv::gobs::Raster& oRaster, eMarginBehaviour eBehaviour, const Place& oPlace) const;
    // What of a raster and its margins lies in the image; every other pixel stays as it is.
    void ReadInside(krv::gobs::Raster& oRaster, const Place& oPlace);

    // Stores the centre of a raster of the right count and type.
    void Write(const krv::gobs::Raster& oRaster, const Place& oPlace);

    // A new object, or null without georeferencing.
    krv::ogc::cs::GeocodingInfo* GetGeocodingInfo() const;
    AuxiliaryData GetAuxiliaryData() const;

private:
    OwnedOrBorrowed<IDataset> mpoDataset;
    bool mbBitmaps = false;
    std::vector<unsigned int> moChannels;
    OpenedChannels moOpened;
};

} // namespace detail

} // namespace krv::datasources
