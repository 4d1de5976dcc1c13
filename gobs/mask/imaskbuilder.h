#pragma once

#include "gobs/api.h"

namespace krv::gobs
{

class Mask;
class Raster;

// Makes a mask for a raster's region. The order of the virtual operations is fixed.
// Builders of this library: by values (MaskDecisionBuilder), polygons (PolygonMaskBuilder), bitmaps (BitmapMaskBuilder)
// and everything that an image declares (ValiditySource). What a set bit means is told by each.
class KRV_GOBS_API IMaskBuilder
{
public:
    virtual ~IMaskBuilder();

    // A new mask over the raster's full extent, owned by the caller.
    // The raster's pixels count only where the builder decides by values; else its place and size do. Throws what
    // reading a mask from a file throws.
    virtual Mask* BuildMask(const Raster& oRaster) const = 0;
};

} // namespace krv::gobs
