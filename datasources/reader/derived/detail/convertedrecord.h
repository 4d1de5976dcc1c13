#pragma once

#include "datasources/metadata/auxiliarydata.h"

namespace krv::datasources::detail
{

// The record of channels that are made of the values of others: the file's tags, and in channel 1 those of the source's
// first channel with its description, without what other values make untrue: no-data, statistics, scale and unit,
// colours and their tables, display defaults, the bookkeeping of levels.
AuxiliaryData MakeConvertedRecord(const AuxiliaryData& oSource, unsigned int nChannels);

} // namespace krv::datasources::detail
