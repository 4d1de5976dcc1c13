#pragma once

#include "datasources/api.h"

#include <vector>

namespace krv::datasources
{

class IRasterDataset;

// Chooses channels of a dataset. The order of the virtual operations is public and fixed.
class KRV_DATASOURCES_API IChannelFilter
{
public:
    virtual ~IChannelFilter();

    // The accepted channels, from 1, ascending.
    virtual std::vector<unsigned int> Accept(const IRasterDataset& oDataset) const = 0;
    virtual bool Accept(const IRasterDataset& oDataset, unsigned int nChannel) const = 0;
};

} // namespace krv::datasources
