#pragma once

#include "gobs/api.h"
#include "gobs/raster/datatype.h"
#include "toolkit/raster/copydata.h"

namespace krv::gobs
{

// The buffer type of a raster type. Throws ParameterException for a type that CopyData does not know (one-bit rasters
// and types outside the table).
// The numbers of both enumerations are the same today, and nobody relies on it but this function.
// For calls of krv::raster::CopyData, Merger and Splitter with the buffers of rasters.
KRV_GOBS_API raster::BufferType QRFDataType2RasterBufferType(const DataType& oType);

} // namespace krv::gobs
