#pragma once

#include "datasources/api.h"

#include <vector>

namespace krv::datasources
{

class AuxiliaryData;
class IRasterReader;

// The overview levels of a fixed list of channels. A level's number is its reduction factor (2, 4, 8); a channel is a
// position in the list, from 1, not a channel number of the file. The order of the virtual operations is fixed.
// One thread at a time, that of the reader or writer that it came from.
class KRV_DATASOURCES_API IOverviewAccessor
{
public:
    virtual ~IOverviewAccessor();

    // Those of any channel of the file, valid or not; empty when there are none.
    virtual std::vector<unsigned int> GetLevels() const = 0;
    // Whether a channel has the level and its pixels are up to date. Throws OutOfBoundsException for a position outside
    // the list; a level that does not exist is false.
    virtual bool IsValid(unsigned int nChannel, unsigned int nLevel) const = 0;
    // Whether every channel of the list has the level, up to date.
    virtual bool IsLevelValid(unsigned int nLevel) const = 0;
    // The level's file metadata, and the metadata of each channel of the list.
    virtual AuxiliaryData GetAuxiliaryData(unsigned int nLevel) = 0;
    // The length of the list.
    virtual unsigned int GetChanCount() const = 0;
};

// Example, the coarsest level: poAccessor->CreateRasterReader(poAccessor->GetLevels().back()).
class KRV_DATASOURCES_API IOverviewReaderAccessor : public IOverviewAccessor
{
public:
    ~IOverviewReaderAccessor() override;

    // A new reader over a level, owned by the caller; accessor and dataset outlive it.
    // Throws DataException for a level that is not there. A level that is not up to date is read as it is: ask
    // IsLevelValid.
    virtual IRasterReader* CreateRasterReader(unsigned int nLevel) = 0;
};

} // namespace krv::datasources
