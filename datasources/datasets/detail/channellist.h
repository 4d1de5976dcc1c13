#pragma once

#include "gobs/raster/datatype.h"
#include "toolkit/exceptions/place.h"

#include <string>
#include <vector>

namespace krv::datasources::detail
{

// The bytes of a value; throws DataException for a type that no I/O hands out. name: of the dataset, for messages.
std::size_t CheckChannelType(const krv::gobs::DataType& oType, unsigned int nChannel, const std::string& name,
                             const Place& oPlace);

// Throws DataException for a size or a number of channels that an image cannot have.
void CheckImageSize(unsigned int nWidth, unsigned int nHeight, std::size_t nChannels, const std::string& name,
                    const Place& oPlace);

// Checks the list of an I/O object over channels of these types: throws DataException for an empty one, for a channel
// that does not exist and for channels of several types. Returns the one type.
krv::gobs::DataType CheckChannelList(const std::vector<unsigned int>& oChannels,
                                     const std::vector<krv::gobs::DataType>& oTypes, const std::string& name,
                                     const Place& oPlace);

} // namespace krv::datasources::detail
