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
class KRV_DATASOURCES_API IRasterDataset
{
public:
    virtual ~IRasterDataset();

    // A new I/O object over the listed channels, owned by the caller; a channel may be listed more than once. The
    // dataset outlives it. Throws DataException for an empty list, a channel that does not exist and channels of
    // several types.
    virtual IRasterIO* GetRasterIO(const std::vector<unsigned int>& oChannels) = 0;
    // Appends a channel; the size of the description matches the image.
    virtual void AddNewChannel(const krv::gobs::RasterInfo& oInfo) = 0;
    virtual void DeleteChannel(unsigned int nChannel) = 0;
    // Lays out a new image with one channel per type, or of one type for all.
    virtual void Create(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes) = 0;
    virtual void Create(const krv::gobs::RasterInfo& oInfo) = 0;
    virtual unsigned int GetWidth() const = 0;
    virtual unsigned int GetHeight() const = 0;
    virtual unsigned int GetChanCount() const = 0;
    // A new object that the caller deletes. Throws DataException for a channel that does not exist.
    virtual IChannelInfo* GetChannelInfo(unsigned int nChannel) const = 0;
    // The processing history of a channel, owned by the dataset, or null.
    virtual IHistoryIO* GetHistoryIO(unsigned int nChannel) = 0;
    // A new object that the caller deletes, or null when the format has no overviews.
    virtual IOverviewManager* GetOverviewManager() = 0;
    virtual AccessCapabilities GetRasterCapabilities() = 0;
};

} // namespace krv::datasources
