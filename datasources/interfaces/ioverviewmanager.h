#pragma once

#include "datasources/api.h"

#include <string>
#include <vector>

namespace krv::datasources
{

class AuxiliaryData;
class IRasterIO;

// The overviews (reduced-resolution levels) of a raster dataset. A level's number is its reduction factor: 2, 4, 8.
// Channels are the file's, from 1. Managers are used while their dataset lives but may be destroyed after it: a
// destructor touches no dataset. The order of the virtual operations is public and fixed.
// BuildOverviews makes the pixels of levels; this is the directory of them. One thread at a time, that of the dataset.
class KRV_DATASOURCES_API IOverviewManager
{
public:
    virtual ~IOverviewManager();

    // The existing levels, ascending; empty when there are none.
    virtual std::vector<unsigned int> GetLevels() const = 0;
    // A new IOverviewIO over the channels at a level, owned by the caller. Throws DataException for an unknown level.
    virtual IRasterIO* GetOverviewIO(unsigned int nLevel, const std::vector<unsigned int>& oChannels) = 0;
    // Lays out a level for all channels, not valid yet. Throws DataException for a level that exists, for a factor that
    // makes no smaller image and for a dataset that is not open for updating.
    virtual void CreateLevel(unsigned int nLevel) = 0;
    // Whether a channel has the level and its pixels are up to date; false, not an exception, where there is none.
    virtual bool IsValid(unsigned int nChannel, unsigned int nLevel) const = 0;
    // Takes a level of all channels out of the file. Throws DataException for an unknown level and for a dataset that
    // is not open for updating. I/O objects over the level are of no more use.
    virtual void DeleteLevel(unsigned int nLevel) = 0;
    // The method by which levels were or will be made; empty when unknown.
    virtual std::string GetResamplingName() const = 0;
    // Says whether the pixels of a channel at a level are up to date; whoever writes them calls it at the end. Throws
    // DataException for an unknown channel or level and for a dataset that is not open for updating.
    virtual void SetValid(unsigned int nChannel, unsigned int nLevel, bool bValid) = 0;
    // The columns of a level, in pixels. Throws DataException for an unknown level.
    virtual unsigned int GetLevelWidth(unsigned int nLevel) const = 0;
    // The same for the rows.
    virtual unsigned int GetLevelHeight(unsigned int nLevel) const = 0;
    // The level's metadata, with as many channels as the file. Throws DataException for an unknown level.
    virtual AuxiliaryData GetAuxiliaryData(unsigned int nLevel) = 0;
    // Of the levels that are marked valid from now on: NEAREST, AVERAGE, MODE, BILINEAR, CUBIC, LANCZOS, RMS, MIN, MAX
    // or NONE, in any letter case. Throws ParameterException for another name.
    virtual void SetResamplingName(const std::string& oName) = 0;
};

} // namespace krv::datasources
