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
                           std::unique_ptr<IOverviewManager> poTheirs, Owner oOwner)
    : mpoLink(std::move(poLink)), mpoOwn(std::move(poOwn)), mpoTheirs(std::move(poTheirs)), moOwner(std::move(oOwner))
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

IOverviewManager& LinkedLevels::FindLevel(unsigned int nLevel, const Place& oPlace) const
{
    if (Has(mpoOwn.get(), nLevel))
        return *mpoOwn;
    if (!Has(mpoTheirs.get(), nLevel))
        Fail("there is no level " + std::to_string(nLevel), oPlace);
    return *mpoTheirs;
}

unsigned int LinkedLevels::FindSource(unsigned int nChannel, unsigned int nLevel) const
{
    const unsigned int nSource = moOwner.moFindSource(nChannel, nLevel);
    if (nSource == 0 || !Has(mpoTheirs.get(), nLevel))
        return 0;
    const bool bOther = moOwner.mbForAll && Has(mpoOwn.get(), nLevel) &&
                        (mpoOwn->GetLevelWidth(nLevel) != mpoTheirs->GetLevelWidth(nLevel) ||
                         mpoOwn->GetLevelHeight(nLevel) != mpoTheirs->GetLevelHeight(nLevel));
    return bOther ? 0 : nSource;
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
        oSources.push_back(FindSource(nChannel, nLevel));
    const auto nOwn = static_cast<std::size_t>(std::count(oSources.begin(), oSources.end(), 0U));
    if (&oLevel == mpoOwn.get() && (moOwner.mbForAll || nOwn == oSources.size()))
        return mpoOwn->GetOverviewIO(nLevel, oChannels);
    if (nOwn != 0)
        Fail("level " + std::to_string(nLevel) + " is not there for all of these channels", oPlace);
    return new LinkedLevelIO(nLevel, mpoLink, {mpoTheirs->GetLevelWidth(nLevel), mpoTheirs->GetLevelHeight(nLevel)},
                             [&] { return mpoTheirs->GetOverviewIO(nLevel, oSources); });
}

void LinkedLevels::CreateLevel(unsigned int nLevel)
{
    moOwner.moTakeOver(0, nLevel);
    mpoOwn->CreateLevel(nLevel);
}

bool LinkedLevels::IsValid(unsigned int nChannel, unsigned int nLevel) const
{
    const unsigned int nSource = FindSource(nChannel, nLevel);
    if (nSource != 0)
        return mpoTheirs->IsValid(nSource, nLevel);
    return mpoOwn->IsValid(nChannel, nLevel) && !(moOwner.moIsOutdated && moOwner.moIsOutdated(nChannel, nLevel));
}

void LinkedLevels::DeleteLevel(unsigned int nLevel)
{
    const Place oPlace = Place::Current();
    if (&FindLevel(nLevel, oPlace) != mpoOwn.get())
        Fail("level " + std::to_string(nLevel) + " lies in " + mpoLink->GetName() + " and is not deleted from here",
             oPlace);
    mpoOwn->DeleteLevel(nLevel);
}

std::string LinkedLevels::GetResamplingName() const
{
    const std::string own = mpoOwn->GetResamplingName();
    return own.empty() && mpoTheirs ? mpoTheirs->GetResamplingName() : own;
}

void LinkedLevels::SetValid(unsigned int nChannel, unsigned int nLevel, bool bValid)
{
    if (const unsigned int nSource = FindSource(nChannel, nLevel); nSource != 0)
    {
        if (bValid && mpoTheirs->IsValid(nSource, nLevel))
            return; // otherwise it is going to change
        moOwner.moTakeOver(nChannel, nLevel);
        if (!Has(mpoOwn.get(), nLevel))
            mpoOwn->CreateLevel(nLevel);
    }
    mpoOwn->SetValid(nChannel, nLevel, bValid);
    if (bValid && moOwner.moNoteMade)
        moOwner.moNoteMade(nChannel, nLevel);
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
    const bool bOwn = &FindLevel(nLevel, Place::Current()) == mpoOwn.get();
    AuxiliaryData oData(moOwner.mnChannels);
    if (bOwn)
        oData = mpoOwn->GetAuxiliaryData(nLevel);
    if (!Has(mpoTheirs.get(), nLevel))
        return oData;
    const AuxiliaryData oTheirs = mpoTheirs->GetAuxiliaryData(nLevel);
    if (!bOwn)
        oData.SetFileMetadata(oTheirs.GetFileMetadata());
    for (unsigned int nChannel = 1; nChannel <= moOwner.mnChannels && nChannel <= oData.GetChannelCount(); ++nChannel)
        if (const unsigned int nSource = FindSource(nChannel, nLevel);
            nSource != 0 && nSource <= oTheirs.GetChannelCount())
        {
            oData.SetChanMetadata(oTheirs.GetChanMetadata(nSource), nChannel);
            oData.SetChannelDescription(oTheirs.GetChannelDescription(nSource), nChannel);
        }
    return oData;
}

void LinkedLevels::SetResamplingName(const std::string& oName)
{
    mpoOwn->SetResamplingName(oName);
}

} // namespace krv::plugins::krvdsk
