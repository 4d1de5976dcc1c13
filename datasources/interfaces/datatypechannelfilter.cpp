#include "datasources/interfaces/datatypechannelfilter.h"

#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/irasterdataset.h"
#include "toolkit/exceptions/exceptions.h"

#include <memory>

namespace krv::datasources
{

DataTypeChannelFilter::DataTypeChannelFilter(const krv::gobs::DataType& oType) : moType(oType) {}

DataTypeChannelFilter::DataTypeChannelFilter(const DataTypeChannelFilter&) = default;
DataTypeChannelFilter& DataTypeChannelFilter::operator=(const DataTypeChannelFilter&) = default;
DataTypeChannelFilter::~DataTypeChannelFilter() = default;

std::vector<unsigned int> DataTypeChannelFilter::Accept(const IRasterDataset& oDataset) const
{
    std::vector<unsigned int> oAccepted;
    const unsigned int nCount = oDataset.GetChanCount();
    for (unsigned int nChannel = 1; nChannel <= nCount && nChannel != 0; ++nChannel)
    {
        if (Accept(oDataset, nChannel))
            oAccepted.push_back(nChannel);
    }
    return oAccepted;
}

bool DataTypeChannelFilter::Accept(const IRasterDataset& oDataset, unsigned int nChannel) const
{
    const std::unique_ptr<IChannelInfo> oInfo(oDataset.GetChannelInfo(nChannel));
    if (oInfo == nullptr)
        throw krv::DataException("The dataset gave no description of channel " + std::to_string(nChannel));
    return oInfo->GetDataType() == moType;
}

} // namespace krv::datasources
