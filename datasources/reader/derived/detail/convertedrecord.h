#pragma once

#include "datasources/metadata/auxiliarydata.h"

#include <string>

namespace krv::datasources::detail
{

// The record of channels that are made of the values of others: the file's tags, and in channel 1 those of the source's
// first channel with its description, without what other values make untrue: no-data, statistics, scale and unit,
// colours and their tables, display defaults. Of levels it says what the source's record does of its first channel, by
// the method that oMethod makes of the source's.
using MethodOfLevels = std::string (*)(const std::string& method);
AuxiliaryData MakeConvertedRecord(const AuxiliaryData& oSource, unsigned int nChannels,
                                  MethodOfLevels pMethod = nullptr);

} // namespace krv::datasources::detail
