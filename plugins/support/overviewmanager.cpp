#include "plugins/support/overviewmanager.h"

#include "plugins/support/image/rasterio.h"

namespace krv::plugins::support
{

LevelStore::~LevelStore() = default;

OverviewManager::~OverviewManager() = default;

krv::datasources::IRasterIO* OverviewManager::OpenLevelIO(unsigned int nLevel,
                                                          const std::vector<unsigned int>& oChannels)
{
    return new OverviewIO(nLevel, moLevels.OpenLevel(nLevel), oChannels);
}

} // namespace krv::plugins::support
