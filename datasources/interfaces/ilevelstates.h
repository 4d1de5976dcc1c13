#pragma once

#include "datasources/api.h"

#include <vector>

namespace krv::datasources
{

class IOverviewManager;

// What a manager of overviews may be besides: one that sets the states of many channels with one change of the record
// that holds them all. The order of the virtual operations is public and fixed.
class KRV_DATASOURCES_API ILevelStates
{
public:
    virtual ~ILevelStates();

    // As IOverviewManager::SetValid does of each channel: of all, or of none when it throws.
    virtual void SetChannelsValid(const std::vector<unsigned int>& oChannels, unsigned int nLevel, bool bValid) = 0;
};

// The same of any manager; one that is no ILevelStates does it channel by channel.
KRV_DATASOURCES_API void SetChannelsValid(IOverviewManager& oManager, const std::vector<unsigned int>& oChannels,
                                          unsigned int nLevel, bool bValid);

} // namespace krv::datasources
