#pragma once

#include "gobs/api.h"

namespace krv::gobs
{

class Mask;
class Raster;

// Makes a mask for a raster's region. The order of the virtual operations is fixed.
class KRV_GOBS_API IMaskBuilder
{
public:
    virtual ~IMaskBuilder();

    // A new mask over the raster's full extent, owned by the caller.
    virtual Mask* BuildMask(const Raster& oRaster) const = 0;
};

} // namespace krv::gobs
