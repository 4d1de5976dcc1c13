#pragma once

#include "datasources/api.h"

#include <string>
#include <vector>

namespace krv::datasources
{

class IDataset;
class IRasterReader;

// The reader for callers that do not care which: BasicReader where the dataset serves the channels in one type, else
// MultiTypeReader. The caller owns the result.

// The dataset stays the caller's and outlives the reader.
// oChannels: from 1; an empty list is all of them. Throws what the readers' constructors throw.
KRV_DATASOURCES_API IRasterReader* CreateDefaultReader(IDataset* poDataset, const std::vector<unsigned int>& oChannels);

// The reader owns the dataset that it opens; a fallback opens the file a second time.
KRV_DATASOURCES_API IRasterReader* CreateDefaultReader(std::string fileName,
                                                       const std::vector<unsigned int>& oChannels);

// False, and nothing touched, for every input: no dataset prescribes a pseudocolour display, intended.
KRV_DATASOURCES_API bool GetPCTParameters(IDataset* poDataset, const std::vector<unsigned int>& oChannels,
                                          unsigned int& nPctChannel, std::string& pctName, unsigned int& nPctIndex);

} // namespace krv::datasources
