#pragma once

#include "datasources/api.h"
#include "datasources/interfaces/accessmode.h"

#include <vector>

namespace krv::gobs
{
class DataType;
class RasterInfo;
} // namespace krv::gobs

namespace krv::datasources
{

class IChannelInfo;
class IHistoryIO;
class IOverviewManager;
class IRasterIO;

// The image channels of a dataset, numbered from 1. The order of the virtual operations is public and fixed.
// Programs mostly use readers and writers, which bring tiles, margins and ownership; this is what those stand on.
class KRV_DATASOURCES_API IRasterDataset
{
public:
    virtual ~IRasterDataset();

    // A new I/O object over the listed channels, owned by the caller; a channel may be listed more than once. The
    // dataset outlives it. Throws DataException for an empty list, a channel that does not exist and channels of
    // several types.
    virtual IRasterIO* GetRasterIO(const std::vector<unsigned int>& oChannels) = 0;
    // Appends a channel, or as many as the description says, all 0; the size of the description matches the image.
    // Throws DataException where it does not, for a type that the format cannot add, and for a dataset that is not open
    // for updating.
    virtual void AddNewChannel(const krv::gobs::RasterInfo& oInfo) = 0;
    // Takes a channel out of the image and its levels; those behind it move up by one number. Throws DataException for
    // a channel that does not exist, for a dataset that is not open for updating, and where the format cannot, as with
    // an only channel. I/O objects made before are of no more use.
    virtual void DeleteChannel(unsigned int nChannel) = 0;
    // Lays out a new image of so many columns and rows with one channel per type, in that order. Throws DataException
    // for a dataset that has an image or is not open for updating, and for sizes and types that the format cannot hold.
    virtual void Create(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes) = 0;
    // The same with the size, the number of channels and the one type of a description.
    virtual void Create(const krv::gobs::RasterInfo& oInfo) = 0;
    // Pixels of a row. Throws DataException while a file has no image, and once it is closed, as the next two do.
    virtual unsigned int GetWidth() const = 0;
    // Rows.
    virtual unsigned int GetHeight() const = 0;
    // Channels have the numbers from 1 to this one.
    virtual unsigned int GetChanCount() const = 0;
    // A new object that the caller deletes. Throws DataException for a channel that does not exist.
    virtual IChannelInfo* GetChannelInfo(unsigned int nChannel) const = 0;
    // The processing history of a channel, owned by the dataset, or null.
    virtual IHistoryIO* GetHistoryIO(unsigned int nChannel) = 0;
    // A new object that the caller deletes, or null when the format has no overviews.
    virtual IOverviewManager* GetOverviewManager() = 0;
    // What can be done with this dataset as it was opened: one that was opened for reading is neither writable nor
    // updatable.
    virtual AccessCapabilities GetRasterCapabilities() = 0;
};

} // namespace krv::datasources
