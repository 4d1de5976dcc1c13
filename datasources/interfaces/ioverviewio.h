#pragma once

#include "datasources/interfaces/irasterio.h"

namespace krv::datasources
{

// The I/O of one overview level: GetFileWidth and GetFileHeight are the level's size. Readers and writers recognise by
// this type that they already stand on a level.
// The order of the virtual operations is public and fixed. Windows are in pixels of the level.
class KRV_DATASOURCES_API IOverviewIO : public IRasterIO
{
public:
    ~IOverviewIO() override;

    // The level's reduction factor.
    // 2 for half of the size; 1 where full size is shown as a level.
    virtual unsigned int GetLevel() const = 0;
};

} // namespace krv::datasources
