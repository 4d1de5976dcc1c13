#include "plugins/support/overviewmanager.h"

#include "datasources/metadata/levelbook.h"
#include "plugins/support/image/rasterio.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>

namespace krv::plugins::support
{

LevelStore::~LevelStore() = default;

krv::datasources::AuxiliaryData LevelStore::ReadLevelRecord(unsigned int)
{
    return krv::datasources::AuxiliaryData(GetBook().GetChannelCount());
}

unsigned int LevelStore::FindChannel(unsigned int nChannel) const
{
    return nChannel <= GetBook().GetChannelCount() ? nChannel : 0;
}

OverviewManager::~OverviewManager() = default;

void OverviewManager::Fail(const std::string& what, const Place& oPlace) const
{
    throw DataException(moDataset.GetFileName() + ": " + what, oPlace);
}

bool OverviewManager::Has(unsigned int nLevel) const
{
    const std::vector<unsigned int> oLevels = GetLevels();
    return std::find(oLevels.begin(), oLevels.end(), nLevel) != oLevels.end();
}

LevelStore::Level OverviewManager::Get(unsigned int nLevel, const Place& oPlace) const
{
    for (const LevelStore::Level& oLevel : moLevels.GetLevels())
        if (oLevel.mnNumber == nLevel)
            return oLevel;
    Fail("level " + std::to_string(nLevel) + " does not exist", oPlace);
}

unsigned int OverviewManager::GetChannel(unsigned int nChannel, const Place& oPlace) const
{
    const unsigned int nFound = moLevels.FindChannel(nChannel);
    if (nFound == 0)
        Fail("channel " + std::to_string(nChannel) + " does not exist", oPlace);
    return nFound;
}

std::vector<unsigned int> OverviewManager::GetLevels() const
{
    std::vector<unsigned int> oNumbers;
    for (const LevelStore::Level& oLevel : moLevels.GetLevels())
        oNumbers.push_back(oLevel.mnNumber);
    return oNumbers;
}

krv::datasources::IRasterIO* OverviewManager::GetOverviewIO(unsigned int nLevel,
                                                            const std::vector<unsigned int>& oChannels)
{
    const Place oPlace = Place::Current();
    Get(nLevel, oPlace);
    std::vector<unsigned int> oPlaces;
    for (const unsigned int nChannel : oChannels)
        oPlaces.push_back(GetChannel(nChannel, oPlace));
    return new OverviewIO(nLevel, moLevels.OpenLevel(nLevel), oPlaces);
}

bool OverviewManager::IsValid(unsigned int nChannel, unsigned int nLevel) const
{
    const unsigned int nFound = moLevels.FindChannel(nChannel);
    return nFound != 0 && Has(nLevel) && IsLevelValid(moLevels.GetBook(), nFound, nLevel);
}

unsigned int OverviewManager::GetLevelWidth(unsigned int nLevel) const
{
    return Get(nLevel, Place::Current()).mnWidth;
}

unsigned int OverviewManager::GetLevelHeight(unsigned int nLevel) const
{
    return Get(nLevel, Place::Current()).mnHeight;
}

krv::datasources::AuxiliaryData OverviewManager::GetAuxiliaryData(unsigned int nLevel)
{
    Get(nLevel, Place::Current());
    return moLevels.ReadLevelRecord(nLevel);
}

std::string OverviewManager::GetResamplingName() const
{
    const std::vector<LevelStore::Level> oLevels = moLevels.GetLevels();
    if (!moLevels.GetMethod().empty() || oLevels.empty())
        return moLevels.GetMethod();
    return GetLevelMethod(moLevels.GetBook(), oLevels.front().mnNumber);
}

void OverviewManager::SetResamplingName(const std::string& oName)
{
    const Place oPlace = Place::Current();
    moDataset.CheckWriting("overviews cannot be written", oPlace);
    const std::string method = krv::datasources::ParseLevelMethod(oName);
    if (method.empty())
        throw ParameterException("The resampling method " + oName + " is not known", ParameterException::eInvalidValue,
                                 "name", oPlace);
    moLevels.GetMethod() = method;
}

void OverviewManager::CreateLevel(unsigned int nLevel)
{
    const Place oPlace = Place::Current();
    moDataset.CheckWriting("overviews cannot be written", oPlace);
    if (Has(nLevel))
        Fail("level " + std::to_string(nLevel) + " exists already", oPlace);
    const unsigned int nWidth = moDataset.GetWidth(), nHeight = moDataset.GetHeight();
    if (nLevel < 2 || (nWidth == 1 && nHeight == 1))
        Fail("there is no level " + std::to_string(nLevel) + " of such an image", oPlace);
    krv::datasources::AuxiliaryData oBook = moLevels.GetBook();
    krv::datasources::SetLevelInvalid(oBook, nLevel);
    moLevels.MakeLevel({nLevel, (nWidth - 1) / nLevel + 1, (nHeight - 1) / nLevel + 1}, oBook, oPlace);
}

void OverviewManager::DeleteLevel(unsigned int nLevel)
{
    const Place oPlace = Place::Current();
    Get(nLevel, oPlace);
    moDataset.CheckWriting("overviews cannot be deleted", oPlace);
    krv::datasources::AuxiliaryData oBook = moLevels.GetBook();
    krv::datasources::RemoveLevel(oBook, nLevel);
    moLevels.DropLevel(nLevel, oBook, oPlace);
}

void OverviewManager::SetValid(unsigned int nChannel, unsigned int nLevel, bool bValid)
{
    const Place oPlace = Place::Current();
    Get(nLevel, oPlace);
    const unsigned int nFound = GetChannel(nChannel, oPlace);
    moDataset.CheckWriting("overviews cannot be written", oPlace);
    krv::datasources::AuxiliaryData oBook = moLevels.GetBook();
    SetLevelValid(oBook, nFound, nLevel, bValid, moLevels.GetMethod());
    moLevels.WriteBook(oBook, bValid, oPlace);
}

} // namespace krv::plugins::support
