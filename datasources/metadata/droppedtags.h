#pragma once

#include "datasources/api.h"
#include "datasources/metadata/auxiliarydata.h"

namespace krv::datasources
{

// Take what a record says of the values of pixels out of it, which no longer holds when pixels change: the keys that
// begin with "STATISTICS_" or "Histogram_", and "LAYER_CRC", in any letter case. True when there was any.
KRV_DATASOURCES_API bool DropStatistics(MetadataMap& oMap);
KRV_DATASOURCES_API bool DropStatistics(AuxiliaryData& oRecord);

// Takes out of `oRecord` the tags whose value is empty there and not in `oBefore`, the record that the file has now:
// AuxiliaryData removes a tag by emptying its value, so a format calls this before it writes. A tag that was empty
// before, or is new and empty, is kept. True when there was any.
// For authors of formats.
KRV_DATASOURCES_API bool DropRemoved(AuxiliaryData& oRecord, const AuxiliaryData& oBefore);

} // namespace krv::datasources
