#pragma once

#include "datasources/reader/idatasetaccess.h"
#include "datasources/reader/irasterreader.h"

#include <memory>

namespace krv::datasources
{

namespace detail
{
class RasterChannels;
}

class IRasterIO;

// The answers that the standard readers and writers give alike: tile grid, margins, size, type and what the dataset
// says of itself.
class KRV_DATASOURCES_API RasterAccess : public IDatasetAccess, public virtual IRasterReader
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

    IDataset* GetDataset() const override;
    const std::vector<unsigned int>& GetChannels() const override;

protected:
    // No dataset, no channels, no margins, eMirror.
    RasterAccess();

    // How a derived class outside the library sets up its state; its own constructor and destructor do no more.
    // What the rasters are taken from, which GetDataset and GetChannels answer. Size, type and tiles stay what they
    // are.
    void SetDataset(IDataset* poDataset, const std::vector<unsigned int>& oChannels, bool bTakeOwnership);
    // How the pixels of these channels get into the rasters, all in one type: the size of the image and its tiles are
    // those of the I/O, and each channel is described by its type. Throws DataException for null; the former I/O stays.
    void SetRasterIO(std::unique_ptr<IRasterIO> oRasterIO, const krv::gobs::DataType& oType);

    std::unique_ptr<detail::RasterChannels> mpoChannels;
};

} // namespace krv::datasources
