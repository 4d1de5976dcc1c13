#pragma once

#include "datasources/api.h"
#include "gobs/raster/datatype.h"

#include <string>
#include <vector>

namespace krv::datasources
{

class IDataset;
class IRasterWriter;

// The writer for callers that do not care which: BasicWriter where the dataset takes the channels in one type, else
// MultiTypeWriter of the promoted type. The caller owns the result.

// The dataset stays the caller's and outlives the writer; an empty list is all channels.
// oChannels: from 1. Throws what the writers' constructors throw.
KRV_DATASOURCES_API IRasterWriter* CreateDefaultWriter(IDataset* poDataset, const std::vector<unsigned int>& oChannels);

// Channels of an existing file. The writer owns the dataset that it opens; a fallback opens the file a second time.
KRV_DATASOURCES_API IRasterWriter* CreateDefaultWriter(const std::string& fileName,
                                                       const std::vector<unsigned int>& oChannels);

// Channels of a new file, each of its own type; CreateNewFile lays the image out. A file that is there is written as it
// is. Throws DataException when there are other numbers of types than of channels.
KRV_DATASOURCES_API IRasterWriter* CreateDefaultWriter(const std::string& fileName,
                                                       const std::vector<unsigned int>& oChannels,
                                                       const std::vector<krv::gobs::DataType>& oTypes,
                                                       const std::string& format, const std::string& options);

} // namespace krv::datasources
