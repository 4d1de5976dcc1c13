#pragma once

#include "datasources/api.h"

namespace krv::datasources
{

// A dataset that can forget where its image lies. The order of the virtual operations is public and fixed.
// UpdateCRS and SetGeocoding replace; they cannot say "none".
class KRV_DATASOURCES_API IPlaceRemoval
{
public:
    virtual ~IPlaceRemoval();

    // The dataset has no reference system afterwards, unless a file beside it says one. Throws DataException for a
    // dataset that is not open for writing, and where the format fixes the system.
    virtual void RemoveCRS() = 0;
    // The geocoding is the identity afterwards, and says nothing. Throws the same.
    virtual void RemoveGeocoding() = 0;
};

} // namespace krv::datasources
