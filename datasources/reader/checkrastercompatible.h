#pragma once

#include "datasources/api.h"
#include "toolkit/exceptions/place.h"

namespace krv::datasources
{
class IRasterReader;
}

namespace krv::gobs
{

class Raster;

// Throws DataException unless the raster can take what the reader reads (or hold what a writer writes): a null raster,
// another channel count and another data type, all six fields compared, in this order. The message names what was
// expected and what was found. Nothing is read.
// For readers and writers of one's own, before they touch the raster. Position, size and margins may be any.
KRV_DATASOURCES_API void CheckRasterCompatible(const Raster* poRaster, const krv::datasources::IRasterReader* poReader,
                                               const krv::Place& oPlace = krv::Place::Current());

} // namespace krv::gobs
