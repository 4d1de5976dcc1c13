#include "datasources/writer/basicoverviewwriteraccessor.h"

#include "datasources/interfaces/ilevelstates.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/reader/detail/leveldata.h"
#include "datasources/writer/basicwriter.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>

namespace krv::datasources
{

BasicOverviewWriterAccessor::BasicOverviewWriterAccessor(IRasterDataset* poRasterDataset,
                                                         const std::vector<unsigned int>& oChannels)
    : mpoRasterDataset(poRasterDataset), moChannels(oChannels)
{
    if (poRasterDataset == nullptr)
        throw krv::DataException("The raster dataset is NULL");
    if (oChannels.empty())
        throw krv::DataException(
            "No channels were specified for pyramiding. Are you sure this file contains raster data?");
    mpoManager.reset(poRasterDataset->GetOverviewManager());
}

BasicOverviewWriterAccessor::BasicOverviewWriterAccessor(const BasicOverviewWriterAccessor& oOther) = default;
BasicOverviewWriterAccessor&
BasicOverviewWriterAccessor::operator=(const BasicOverviewWriterAccessor& oOther) = default;
BasicOverviewWriterAccessor::~BasicOverviewWriterAccessor() = default;

IOverviewManager& BasicOverviewWriterAccessor::Manager(const Place& oPlace) const
{
    if (mpoManager == nullptr)
        throw krv::DataException("The dataset has no overviews", oPlace);
    return *mpoManager;
}

std::vector<unsigned int> BasicOverviewWriterAccessor::GetLevels() const
{
    return Manager(Place::Current()).GetLevels();
}

bool BasicOverviewWriterAccessor::IsValid(unsigned int nChannel, unsigned int nLevel) const
{
    const Place oPlace = Place::Current();
    return Manager(oPlace).IsValid(detail::ChannelAt(moChannels, nChannel, oPlace), nLevel);
}

bool BasicOverviewWriterAccessor::IsLevelValid(unsigned int nLevel) const
{
    const IOverviewManager& oManager = Manager(Place::Current());
    return std::all_of(moChannels.begin(), moChannels.end(),
                       [&](unsigned int nChannel) { return oManager.IsValid(nChannel, nLevel); });
}

AuxiliaryData BasicOverviewWriterAccessor::GetAuxiliaryData(unsigned int nLevel)
{
    return detail::SelectLevelData(Manager(Place::Current()).GetAuxiliaryData(nLevel), moChannels);
}

unsigned int BasicOverviewWriterAccessor::GetChanCount() const
{
    return static_cast<unsigned int>(moChannels.size());
}

IRasterWriter* BasicOverviewWriterAccessor::CreateRasterWriter(unsigned int nLevel)
{
    IOverviewManager& oManager = Manager(Place::Current());
    return new BasicWriter(mpoRasterDataset, oManager.GetOverviewIO(nLevel, moChannels), moChannels);
}

void BasicOverviewWriterAccessor::CreateLevel(unsigned int nLevel)
{
    Manager(Place::Current()).CreateLevel(nLevel);
}

void BasicOverviewWriterAccessor::SetValid(unsigned int nChannel, unsigned int nLevel, bool bValid)
{
    const Place oPlace = Place::Current();
    Manager(oPlace).SetValid(detail::ChannelAt(moChannels, nChannel, oPlace), nLevel, bValid);
}

void BasicOverviewWriterAccessor::SetLevelValid(unsigned int nLevel, bool bValid)
{
    SetChannelsValid(Manager(Place::Current()), moChannels, nLevel, bValid);
}

void BasicOverviewWriterAccessor::SetResamplingName(const std::string& oName)
{
    Manager(Place::Current()).SetResamplingName(oName);
}

} // namespace krv::datasources
