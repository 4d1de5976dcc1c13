#pragma once

#include "datasources/reader/rasteraccess.h"
#include "toolkit/exceptions/place.h"

#include <initializer_list>
#include <memory>
#include <string>
#include <vector>

namespace krv::datasources
{

class IBitmapDataset;
class IChannelFilter;
class IChannelInfo;
class IDataset;
class IRasterDataset;
class IRasterIO;

// Serves the selected channels of one dataset as a grid of tiles with margins. Some margins are made up, although the
// image has pixels there: a side of a tile whose margin ends exactly at the right or bottom edge of the image, or lies
// partly outside, is made as a whole from the pixels of the tile itself (FillRasterMargins), intended. Tiles beside the
// last ones so get wrong edges under filters and other work on neighbourhoods, for which there is ExactHaloReader.
//
// All channels have one data type; which lists of channels can be read together is the dataset's to say. Pixels go
// straight from the format into the raster.
// Example: BasicReader oReader("scene.tif"); for (auto poTile : RasterRange(oReader)) Use(*poTile);
class KRV_DATASOURCES_API BasicReader : public RasterAccess
{
public:
    // All channels of a file. Whatever fails after the file was opened is a DataException with the same message.
    explicit BasicReader(const std::string& fileName);
    // The channels of a file, from 1, in this order; an empty list is all of them. Failures pass as they are.
    BasicReader(const std::string& fileName, const std::vector<unsigned int>& oChannels);
    // The same for a list in place, the empty one too.
    BasicReader(const std::string& fileName, std::initializer_list<unsigned int> oChannels)
        : BasicReader(fileName, std::vector<unsigned int>(oChannels))
    {
    }
    // The channels that a filter accepts.
    BasicReader(const std::string& fileName, const IChannelFilter& oFilter);
    // Bitmaps as 8-bit channels of 0 and 1; an empty list is all of them. With bTakeOwnership the reader deletes the
    // dataset; it stays the caller's when the constructor throws.
    BasicReader(IBitmapDataset* poDataset, const std::vector<unsigned int>& oBitmaps, bool bTakeOwnership);
    // The channels of an open dataset; ownership as above.
    BasicReader(IDataset* poDataset, const std::vector<unsigned int>& oChannels, bool bTakeOwnership);
    // Channels through another I/O than the dataset's own: an overview level. The reader takes the I/O over, also when
    // the constructor throws; the dataset stays the caller's and outlives the reader.
    BasicReader(IRasterDataset* poRasterDataset, IRasterIO* poRasterIO, const std::vector<unsigned int>& oChannels);

    ~BasicReader() override;

    // As IRasterReader; the margins of tiles that are read afterwards.
    void SetMargins(unsigned int nXMargin, unsigned int nYMargin, eMarginBehaviour eBehaviour) override;
    using RasterAccess::ReadRaster;

    // The caller's raster, whose margins may differ from the reader's. Margins that are not read are made as the class
    // says.
    void ReadRaster(krv::gobs::Raster* poRaster) override;

    // Null for bitmaps and for a reader of a level.
    IOverviewReaderAccessor* GetOverviewReaderAccessor() override;
    // Whether the dataset goes with this reader, from now on.
    void OwnDataset(bool bOwned);

protected:
    // For derived readers, which set up their own state by SetDataset and SetRasterIO.
    BasicReader();

    // Makes the margins of the sides that ReadRaster did not read. Throws DataException under eException.
    void FillMargins(krv::gobs::Raster* poRaster);

private:
    friend class ExactHaloReader; // which makes the margins itself

    // The dataset is borrowed until everything is open.
    void UseChannels(IDataset* poDataset, const std::vector<unsigned int>& oChannels,
                     std::unique_ptr<IRasterIO> oRasterIO, const krv::Place& oPlace);
    void UseFile(std::unique_ptr<IDataset> oDataset, const std::vector<unsigned int>& oChannels,
                 const krv::Place& oPlace);
};

} // namespace krv::datasources
