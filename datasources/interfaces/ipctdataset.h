#pragma once

#include "datasources/api.h"

#include <string>
#include <vector>

namespace krv::gobs
{
class PCT;
}

namespace krv::datasources
{

// The pseudocolour tables of a dataset, each with a number from 1. The order of the virtual operations is public and
// fixed.
// FindPCT finds the table of a channel and is what programs call; PCTRasterReader shows the colours.
class KRV_DATASOURCES_API IPCTDataset
{
public:
    virtual ~IPCTDataset();

    // The numbers of the tables, ascending; empty when there are none.
    virtual std::vector<unsigned int> GetPCTList() const = 0;
    // A new table owned by the caller. Throws DataException for a number that is not in the list.
    virtual krv::gobs::PCT* GetPCT(unsigned int nPCT) const = 0;
    // The channel that the table belongs to by the format's own rules, or 0.
    virtual unsigned int GetPCTChannel(unsigned int nPCT) const = 0;
    // Empty where the format keeps none. Throws DataException for a number that is not in the list, as the operations
    // below do.
    virtual std::string GetPCTDescription(unsigned int nPCT) const = 0;
    // Stores a table for a channel (0: none) and returns its number. The argument is not kept. Throws DataException for
    // a channel that does not exist, for a table that the format cannot hold, such as a second one, and for a dataset
    // that is not open for updating.
    virtual unsigned int CreatePCT(const krv::gobs::PCT& oTable, unsigned int nChannel) = 0;
    // Replaces the colours; number and channel stay. The argument is not kept. Throws DataException for a dataset that
    // is not open for updating and for a table that the format cannot hold.
    virtual void UpdatePCT(unsigned int nPCT, const krv::gobs::PCT& oTable) = 0;
    // Throws DataException where the format has no place for it.
    virtual void SetPCTDescription(unsigned int nPCT, const std::string& oDescription) = 0;
    // The other tables keep their numbers. Tags that refer to the table stay.
    virtual void DeletePCT(unsigned int nPCT) = 0;
};

} // namespace krv::datasources
