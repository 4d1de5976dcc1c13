#include "datasources/writer/multitypeoverviewwriteraccessor.h"

#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <map>
#include <memory>
#include <utility>

namespace krv::datasources
{

MultiTypeOverviewWriterAccessor::MultiTypeOverviewWriterAccessor(IRasterDataset* poRasterDataset,
                                                                 const std::vector<unsigned int>& oChannels,
                                                                 const MixedTypes& oTypes)
    : BasicOverviewWriterAccessor(poRasterDataset, oChannels), moTypes(oTypes)
{
}

MultiTypeOverviewWriterAccessor::~MultiTypeOverviewWriterAccessor() = default;

std::vector<unsigned int> MultiTypeOverviewWriterAccessor::GetLevels() const
{
    std::vector<unsigned int> oLevels = Manager(Place::Current()).GetLevels();
    std::sort(oLevels.begin(), oLevels.end());
    oLevels.erase(std::unique(oLevels.begin(), oLevels.end()), oLevels.end());
    return oLevels;
}

IRasterWriter* MultiTypeOverviewWriterAccessor::CreateRasterWriter(unsigned int nLevel)
{
    const Place oPlace = Place::Current();
    IOverviewManager& oManager = Manager(oPlace);
    IRasterDataset& oDataset = GetRasterDataset();
    std::map<krv::gobs::DataType, std::pair<std::vector<unsigned int>, std::vector<unsigned int>>> oByType;
    for (unsigned int nPlace = 0; nPlace < GetChannels().size(); ++nPlace)
    {
        const std::unique_ptr<IChannelInfo> oInfo(oDataset.GetChannelInfo(GetChannels()[nPlace]));
        if (oInfo == nullptr)
            throw krv::DataException(
                "The dataset gave no description of channel " + std::to_string(GetChannels()[nPlace]), oPlace);
        auto& [oNumbers, oPlaces] = oByType[oInfo->GetDataType()];
        oNumbers.push_back(GetChannels()[nPlace]);
        oPlaces.push_back(nPlace);
    }
    std::vector<std::unique_ptr<IRasterWriter>> oOwned;
    for (const auto& [oType, oMembers] : oByType)
        oOwned.push_back(
            std::make_unique<BasicWriter>(&oDataset, oManager.GetOverviewIO(nLevel, oMembers.first), oMembers.first));
    std::vector<ChannelWriter> oWriters;
    oWriters.reserve(oOwned.size());
    auto oNext = oOwned.begin();
    for (const auto& [oType, oMembers] : oByType)
        oWriters.push_back({(oNext++)->get(), oMembers.second});
    for (auto& oWriter : oOwned)
        static_cast<void>(oWriter.release());
    return new MultiTypeWriter(&oDataset, oWriters, GetChannels(), moTypes);
}

} // namespace krv::datasources
