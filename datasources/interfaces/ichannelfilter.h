#pragma once

#include "datasources/api.h"

#include <vector>

namespace krv::datasources
{

class IRasterDataset;

// Chooses channels of a dataset. The order of the virtual operations is public and fixed.
// Readers and writers ask it once, while they are made, and keep nothing of it.
class KRV_DATASOURCES_API IChannelFilter
{
public:
    virtual ~IChannelFilter();

    // The accepted channels, from 1, ascending.
    // Empty when it accepts none.
    virtual std::vector<unsigned int> Accept(const IRasterDataset& oDataset) const = 0;
    // Whether a channel (from 1) is accepted. The dataset is only asked. Throws DataException for a channel that does
    // not exist.
    virtual bool Accept(const IRasterDataset& oDataset, unsigned int nChannel) const = 0;
};

} // namespace krv::datasources
