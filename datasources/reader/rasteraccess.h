#pragma once

#include "datasources/reader/irasterreader.h"

#include <memory>

namespace krv::datasources
{

class IDataset;

namespace detail
{
class RasterChannels;
}

// The answers that the standard readers and writers give alike: tile grid, margins, size, type and what the dataset
// says of itself.
class KRV_DATASOURCES_API RasterAccess : public virtual IRasterReader
{
public:
    RasterAccess(const RasterAccess&) = delete;
    RasterAccess& operator=(const RasterAccess&) = delete;
    ~RasterAccess() override;

    RasterIterator FindRaster(unsigned int nX, unsigned int nY) override;
    RasterIterator Begin() override;
    RasterIterator End() override;
    unsigned int GetTileCount() const override;
    void SetOptimalTileSize() override;
    void SetTileSize(unsigned int nWidth, unsigned int nHeight) override;
    unsigned int GetTileWidth() const override;
    unsigned int GetTileHeight() const override;
    const std::vector<IChannelInfo*>& GetChannelsInfo() const override;

    IFileFormat* GetFileFormat() const override;
    unsigned int GetXMargin() const override;
    unsigned int GetYMargin() const override;
    eMarginBehaviour GetMarginBehaviour() const override;
    AuxiliaryData GetAuxiliaryData() const override;
    krv::ogc::cs::ICRS* GetCRS() const override;
    krv::ogc::cs::GeocodingInfo* GetGeocodingInfo() const override;
    unsigned int GetWidth() const override;
    unsigned int GetHeight() const override;
    unsigned int GetChansCount() const override;
    const krv::gobs::DataType& GetDataType() const override;

    // What is read or written: the dataset, null before there is one, which stays where it is, and the numbers of its
    // channels, or of its bitmaps.
    IDataset* GetDataset() const;
    const std::vector<unsigned int>& GetChannels() const;

protected:
    // No dataset, no channels, no margins, eMirror.
    RasterAccess();

    std::unique_ptr<detail::RasterChannels> mpoChannels;
};

} // namespace krv::datasources
