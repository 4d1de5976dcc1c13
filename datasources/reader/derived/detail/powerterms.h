#pragma once

#include "datasources/reader/derived/totalpowerrasterreader.h"
#include "gobs/power/powersum.h"
#include "gobs/raster/datatype.h"

#include <string>
#include <vector>

namespace krv::datasources::detail
{

// What is known of a channel.
struct PowerChannel
{
    unsigned int mnNumber = 0; // from 1
    krv::gobs::DataType moType;
    std::string moDescription;
    std::string moMatrixType; // the channel's tag, else the file's
    bool mbAlpha = false;
};

// The channels of a reader, of the types that are beneath its own, and of a dataset.
std::vector<PowerChannel> DescribeChannels(const IRasterReader& oReader);
std::vector<PowerChannel> DescribeChannels(IDataset& oDataset, const Place& oPlace);

// One term per channel, eNone for those that do not count. Throws DataException, which names the channel.
std::vector<krv::gobs::PowerTerm> MakePowerTerms(const std::vector<PowerChannel>& oChannels,
                                                 const PowerRequest& oRequest, const Place& oPlace);

} // namespace krv::datasources::detail
