#pragma once

#include "datasources/api.h"
#include "datasources/metadata/auxiliarydata.h"

namespace krv::datasources
{

// Take what a record says of the values of pixels out of it, which no longer holds when pixels change: the keys that
// begin with "STATISTICS_" or "Histogram_", and "LAYER_CRC", in any letter case. True when there was any.
KRV_DATASOURCES_API bool DropStatistics(MetadataMap& oMap);
KRV_DATASOURCES_API bool DropStatistics(AuxiliaryData& oRecord);

// Takes the tags with an empty value out of a record. AuxiliaryData removes a tag by emptying its value, so a format
// calls this before it writes. True when there was any.
KRV_DATASOURCES_API bool DropRemoved(AuxiliaryData& oRecord);

} // namespace krv::datasources
