#include "plugins/krvdsk/link/linkedlevels.h"

#include "plugins/krvdsk/link/linkedio.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <set>

namespace krv::plugins::krvdsk
{

using krv::datasources::AuxiliaryData;
using krv::datasources::IOverviewManager;

LinkedLevels::LinkedLevels(std::shared_ptr<Link> poLink, std::unique_ptr<IOverviewManager> poOwn,
                           std::unique_ptr<IOverviewManager> poTheirs, Sources oSources, unsigned int nChannels)
    : mpoLink(std::move(poLink)), mpoOwn(std::move(poOwn)), mpoTheirs(std::move(poTheirs)),
      moSources(std::move(oSources)), mnChannels(nChannels)
{
}

LinkedLevels::~LinkedLevels() = default;

void LinkedLevels::Fail(const std::string& what, const Place& oPlace) const
{
    throw DataException(mpoLink->GetOwner() + ": " + what, oPlace);
}

bool LinkedLevels::Has(const IOverviewManager* poManager, unsigned int nLevel)
{
    if (poManager == nullptr)
        return false;
    const std::vector<unsigned int> oLevels = poManager->GetLevels();
    return std::find(oLevels.begin(), oLevels.end(), nLevel) != oLevels.end();
}

IOverviewManager& LinkedLevels::GetOwn(const char* pWhat, const Place& oPlace) const
{
    if (!mpoOwn)
        Fail(std::string("all of it lies in ") + mpoLink->GetName() + ": " + pWhat, oPlace);
    return *mpoOwn;
}

IOverviewManager& LinkedLevels::FindLevel(unsigned int nLevel, const Place& oPlace) const
{
    if (Has(mpoOwn.get(), nLevel))
        return *mpoOwn;
    if (!Has(mpoTheirs.get(), nLevel))
        Fail("there is no level " + std::to_string(nLevel), oPlace);
    return *mpoTheirs;
}

std::vector<unsigned int> LinkedLevels::GetLevels() const
{
    std::set<unsigned int> oLevels;
    for (const IOverviewManager* const poManager : {mpoOwn.get(), mpoTheirs.get()})
        if (poManager != nullptr)
            for (const unsigned int nLevel : poManager->GetLevels())
                oLevels.insert(nLevel);
    return {oLevels.begin(), oLevels.end()};
}

krv::datasources::IRasterIO* LinkedLevels::GetOverviewIO(unsigned int nLevel,
                                                         const std::vector<unsigned int>& oChannels)
{
    const Place oPlace = Place::Current();
    IOverviewManager& oLevel = FindLevel(nLevel, oPlace);
    std::vector<unsigned int> oSources;
    for (const unsigned int nChannel : oChannels)
        oSources.push_back(moSources(nChannel));
    const auto nLinked = oSources.size() - static_cast<std::size_t>(std::count(oSources.begin(), oSources.end(), 0U));
    if (nLinked == 0 || nLinked < oSources.size())
    {
        const bool bThere = Has(mpoOwn.get(), nLevel) && (nLinked == 0 || Has(mpoTheirs.get(), nLevel));
        if (!bThere)
            Fail("level " + std::to_string(nLevel) + " is not there for all of these channels", oPlace);
        return mpoOwn->GetOverviewIO(nLevel, oChannels);
    }
    if (!Has(mpoTheirs.get(), nLevel))
        Fail("linked channels have no level " + std::to_string(nLevel), oPlace);
    return new LinkedLevelIO(nLevel, mpoLink, {oLevel.GetLevelWidth(nLevel), oLevel.GetLevelHeight(nLevel)},
                             [&] { return mpoTheirs->GetOverviewIO(nLevel, oSources); });
}

void LinkedLevels::CreateLevel(unsigned int nLevel)
{
    GetOwn("levels are made there", Place::Current()).CreateLevel(nLevel);
}

bool LinkedLevels::IsValid(unsigned int nChannel, unsigned int nLevel) const
{
    const unsigned int nSource = moSources(nChannel);
    if (nSource == 0)
        return mpoOwn && mpoOwn->IsValid(nChannel, nLevel);
    return mpoTheirs && mpoTheirs->IsValid(nSource, nLevel);
}

void LinkedLevels::DeleteLevel(unsigned int nLevel)
{
    GetOwn("levels are deleted there", Place::Current()).DeleteLevel(nLevel);
}

std::string LinkedLevels::GetResamplingName() const
{
    const std::string own = mpoOwn ? mpoOwn->GetResamplingName() : std::string();
    return own.empty() && mpoTheirs ? mpoTheirs->GetResamplingName() : own;
}

void LinkedLevels::SetValid(unsigned int nChannel, unsigned int nLevel, bool bValid)
{
    const Place oPlace = Place::Current();
    if (moSources(nChannel) != 0)
        Fail("the levels of channel " + std::to_string(nChannel) + " lie in " + mpoLink->GetName(), oPlace);
    GetOwn("levels are changed there", oPlace).SetValid(nChannel, nLevel, bValid);
}

unsigned int LinkedLevels::GetLevelWidth(unsigned int nLevel) const
{
    return FindLevel(nLevel, Place::Current()).GetLevelWidth(nLevel);
}

unsigned int LinkedLevels::GetLevelHeight(unsigned int nLevel) const
{
    return FindLevel(nLevel, Place::Current()).GetLevelHeight(nLevel);
}

AuxiliaryData LinkedLevels::GetAuxiliaryData(unsigned int nLevel)
{
    FindLevel(nLevel, Place::Current());
    AuxiliaryData oData(mnChannels);
    if (Has(mpoOwn.get(), nLevel))
        oData = mpoOwn->GetAuxiliaryData(nLevel);
    if (!Has(mpoTheirs.get(), nLevel))
        return oData;
    const AuxiliaryData oTheirs = mpoTheirs->GetAuxiliaryData(nLevel);
    if (!Has(mpoOwn.get(), nLevel))
        oData.SetFileMetadata(oTheirs.GetFileMetadata());
    for (unsigned int nChannel = 1; nChannel <= mnChannels && nChannel <= oData.GetChannelCount(); ++nChannel)
        if (const unsigned int nSource = moSources(nChannel); nSource != 0 && nSource <= oTheirs.GetChannelCount())
        {
            oData.SetChanMetadata(oTheirs.GetChanMetadata(nSource), nChannel);
            oData.SetChannelDescription(oTheirs.GetChannelDescription(nSource), nChannel);
        }
    return oData;
}

void LinkedLevels::SetResamplingName(const std::string& oName)
{
    GetOwn("levels are made there", Place::Current()).SetResamplingName(oName);
}

} // namespace krv::plugins::krvdsk
