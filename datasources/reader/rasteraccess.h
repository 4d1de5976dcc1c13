#pragma once

#include "datasources/reader/idatasetaccess.h"
#include "datasources/reader/tiledreader.h"

#include <memory>

namespace krv::datasources
{

namespace detail
{
class RasterChannels;
struct OpenedChannels;
} // namespace detail

class IRasterIO;

// The answers that the standard readers and writers give alike: tile grid, margins, size, type and what the dataset
// says of itself.
// Not made by programs: BasicReader and BasicWriter are.
class KRV_DATASOURCES_API RasterAccess : public IDatasetAccess, public TiledReader
{
public:
    RasterAccess(const RasterAccess&) = delete;
    RasterAccess& operator=(const RasterAccess&) = delete;
    ~RasterAccess() override;

    // Does nothing before the channels are open.
    void SetOptimalTileSize() override;
    const std::vector<IChannelInfo*>& GetChannelsInfo() const override;

    // What IRasterReader says of each counts here: who owns results and where they are null.
    IFileFormat* GetFileFormat() const override;
    AuxiliaryData GetAuxiliaryData() const override;
    krv::ogc::cs::ICRS* GetCRS() const override;
    krv::ogc::cs::GeocodingInfo* GetGeocodingInfo() const override;
    unsigned int GetWidth() const override;
    unsigned int GetHeight() const override;
    unsigned int GetChansCount() const override;
    const krv::gobs::DataType& GetDataType() const override;

    IDataset* GetDataset() const override;
    const std::vector<unsigned int>& GetChannels() const override;
    // Whether those numbers are of bitmaps.
    bool IsOfBitmaps() const;

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

    // Takes over what was opened, with a tile grid over it.
    void Commit(detail::OpenedChannels oOpened);
    void SetLimitedMargins(unsigned int nXMargin, unsigned int nYMargin, eMarginBehaviour eBehaviour,
                           const krv::Place& oPlace);

    std::unique_ptr<detail::RasterChannels> mpoChannels;
};

} // namespace krv::datasources
