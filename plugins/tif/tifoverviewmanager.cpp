#include "plugins/tif/tifoverviewmanager.h"

#include "datasources/metadata/auxiliarydata.h"
#include "plugins/support/image/rasterio.h"
#include "plugins/tif/tifdataset.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>

namespace krv::plugins::tif
{

TifOverviewManager::TifOverviewManager(TifDataset& oDataset, PixelUse eUse) : moDataset(oDataset), meUse(eUse) {}

TifOverviewManager::~TifOverviewManager() = default;

const PageLevel* TifOverviewManager::Find(unsigned int nLevel) const
{
    const std::vector<PageLevel>& oLevels = moDataset.GetLevels(meUse);
    const auto oFound = std::find_if(oLevels.begin(), oLevels.end(),
                                     [nLevel](const PageLevel& oLevel) { return oLevel.mnLevel == nLevel; });
    return oFound == oLevels.end() ? nullptr : &*oFound;
}

const PageLevel& TifOverviewManager::Get(unsigned int nLevel, const Place& oPlace) const
{
    const PageLevel* pLevel = Find(nLevel);
    if (pLevel == nullptr)
        throw DataException(moDataset.GetName() + ": level " + std::to_string(nLevel) + " does not exist", oPlace);
    return *pLevel;
}

// The channel of the pages: those of a bitmap have one, whatever its number.
unsigned int TifOverviewManager::FindChannel(unsigned int nChannel) const
{
    if (meUse == PixelUse::eBitmap)
        return nChannel != 0 && nChannel == moDataset.GetLevelBitmap() ? 1 : 0;
    return nChannel <= moDataset.GetChanCount() ? nChannel : 0;
}

unsigned int TifOverviewManager::GetChannel(unsigned int nChannel, const Place& oPlace) const
{
    const unsigned int nFound = FindChannel(nChannel);
    if (nFound == 0)
        throw DataException(moDataset.GetName() + ": channel " + std::to_string(nChannel) + " does not exist", oPlace);
    return nFound;
}

std::vector<unsigned int> TifOverviewManager::GetLevels() const
{
    std::vector<unsigned int> oNumbers;
    for (const PageLevel& oLevel : moDataset.GetLevels(meUse))
        oNumbers.push_back(oLevel.mnLevel);
    return oNumbers;
}

krv::datasources::IRasterIO* TifOverviewManager::GetOverviewIO(unsigned int nLevel,
                                                               const std::vector<unsigned int>& oChannels)
{
    const Place oPlace = Place::Current();
    const PageLevel& oLevel = Get(nLevel, oPlace);
    std::vector<unsigned int> oPageChannels;
    for (const unsigned int nChannel : oChannels)
        oPageChannels.push_back(GetChannel(nChannel, oPlace));
    return new support::OverviewIO(nLevel, moDataset.OpenPage(oLevel.moPage.mnOffset, meUse), oPageChannels);
}

bool TifOverviewManager::IsValid(unsigned int nChannel, unsigned int nLevel) const
{
    const unsigned int nFound = FindChannel(nChannel);
    return nFound != 0 && Find(nLevel) != nullptr && moDataset.IsLevelValid(nFound, nLevel, meUse);
}

unsigned int TifOverviewManager::GetLevelWidth(unsigned int nLevel) const
{
    return static_cast<unsigned int>(Get(nLevel, Place::Current()).moPage.mnWidth);
}

unsigned int TifOverviewManager::GetLevelHeight(unsigned int nLevel) const
{
    return static_cast<unsigned int>(Get(nLevel, Place::Current()).moPage.mnHeight);
}

// The name of a page made here is no metadata of its pixels.
krv::datasources::AuxiliaryData TifOverviewManager::GetAuxiliaryData(unsigned int nLevel)
{
    const PageSummary& oPage = Get(nLevel, Place::Current()).moPage;
    krv::datasources::AuxiliaryData oData = moDataset.ReadPageMetadata(oPage.mnOffset);
    krv::datasources::MetadataMap oMap = oData.GetFileMetadata();
    if (oPage.mnNumber != 0 && oMap.erase("PageName") != 0)
        oData.SetFileMetadata(oMap);
    return oData;
}

std::string TifOverviewManager::GetResamplingName() const
{
    return moDataset.GetResamplingName(meUse);
}

void TifOverviewManager::CreateLevel(unsigned int nLevel)
{
    moDataset.CreateLevel(nLevel, meUse, Place::Current());
}

void TifOverviewManager::DeleteLevel(unsigned int nLevel)
{
    const Place oPlace = Place::Current();
    Get(nLevel, oPlace);
    moDataset.DeleteLevel(nLevel, meUse, oPlace);
}

void TifOverviewManager::SetValid(unsigned int nChannel, unsigned int nLevel, bool bValid)
{
    const Place oPlace = Place::Current();
    Get(nLevel, oPlace);
    moDataset.SetLevelValid(GetChannel(nChannel, oPlace), nLevel, bValid, meUse, oPlace);
}

void TifOverviewManager::SetResamplingName(const std::string& oName)
{
    moDataset.SetResamplingName(oName, Place::Current());
}

} // namespace krv::plugins::tif
