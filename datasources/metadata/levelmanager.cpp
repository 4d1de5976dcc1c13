#include "datasources/metadata/levelmanager.h"

#include "datasources/interfaces/irasterio.h"
#include "datasources/metadata/levelbook.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>

namespace krv::datasources
{

LevelStore::~LevelStore() = default;

AuxiliaryData LevelStore::ReadLevelRecord(unsigned int)
{
    return AuxiliaryData(GetBook().GetChannelCount());
}

unsigned int LevelStore::FindChannel(unsigned int nChannel) const
{
    return nChannel <= GetBook().GetChannelCount() ? nChannel : 0;
}

LevelManager::~LevelManager() = default;

void LevelManager::Fail(const std::string& what, const Place& oPlace) const
{
    throw DataException(GetImageName() + ": " + what, oPlace);
}

bool LevelManager::Has(unsigned int nLevel) const
{
    const std::vector<unsigned int> oLevels = GetLevels();
    return std::find(oLevels.begin(), oLevels.end(), nLevel) != oLevels.end();
}

LevelStore::Level LevelManager::Get(unsigned int nLevel, const Place& oPlace) const
{
    for (const LevelStore::Level& oLevel : moLevels.GetLevels())
        if (oLevel.mnNumber == nLevel)
            return oLevel;
    Fail("level " + std::to_string(nLevel) + " does not exist", oPlace);
}

unsigned int LevelManager::GetChannel(unsigned int nChannel, const Place& oPlace) const
{
    const unsigned int nFound = moLevels.FindChannel(nChannel);
    if (nFound == 0)
        Fail("channel " + std::to_string(nChannel) + " does not exist", oPlace);
    return nFound;
}

std::vector<unsigned int> LevelManager::GetLevels() const
{
    std::vector<unsigned int> oNumbers;
    for (const LevelStore::Level& oLevel : moLevels.GetLevels())
        oNumbers.push_back(oLevel.mnNumber);
    return oNumbers;
}

IRasterIO* LevelManager::GetOverviewIO(unsigned int nLevel, const std::vector<unsigned int>& oChannels)
{
    const Place oPlace = Place::Current();
    Get(nLevel, oPlace);
    std::vector<unsigned int> oPlaces;
    for (const unsigned int nChannel : oChannels)
        oPlaces.push_back(GetChannel(nChannel, oPlace));
    return OpenLevelIO(nLevel, oPlaces);
}

bool LevelManager::IsValid(unsigned int nChannel, unsigned int nLevel) const
{
    const unsigned int nFound = moLevels.FindChannel(nChannel);
    return nFound != 0 && Has(nLevel) && IsLevelValid(moLevels.GetBook(), nFound, nLevel);
}

unsigned int LevelManager::GetLevelWidth(unsigned int nLevel) const
{
    return Get(nLevel, Place::Current()).mnWidth;
}

unsigned int LevelManager::GetLevelHeight(unsigned int nLevel) const
{
    return Get(nLevel, Place::Current()).mnHeight;
}

AuxiliaryData LevelManager::GetAuxiliaryData(unsigned int nLevel)
{
    Get(nLevel, Place::Current());
    return moLevels.ReadLevelRecord(nLevel);
}

std::string LevelManager::GetResamplingName() const
{
    const std::vector<LevelStore::Level> oLevels = moLevels.GetLevels();
    if (!moLevels.GetMethod().empty() || oLevels.empty())
        return moLevels.GetMethod();
    return GetLevelMethod(moLevels.GetBook(), oLevels.front().mnNumber);
}

void LevelManager::SetResamplingName(const std::string& oName)
{
    const Place oPlace = Place::Current();
    CheckWriting("overviews cannot be written", oPlace);
    const std::string method = ParseLevelMethod(oName);
    if (method.empty())
        throw ParameterException("The resampling method " + oName + " is not known", ParameterException::eInvalidValue,
                                 "name", oPlace);
    moLevels.GetMethod() = method;
}

void LevelManager::CreateLevel(unsigned int nLevel)
{
    const Place oPlace = Place::Current();
    CheckWriting("overviews cannot be written", oPlace);
    if (Has(nLevel))
        Fail("level " + std::to_string(nLevel) + " exists already", oPlace);
    const unsigned int nWidth = GetImageWidth(), nHeight = GetImageHeight();
    if (nLevel < 2 || (nWidth == 1 && nHeight == 1))
        Fail("there is no level " + std::to_string(nLevel) + " of such an image", oPlace);
    AuxiliaryData oBook = moLevels.GetBook();
    SetLevelInvalid(oBook, nLevel);
    moLevels.MakeLevel({nLevel, (nWidth - 1) / nLevel + 1, (nHeight - 1) / nLevel + 1}, oBook, oPlace);
}

void LevelManager::DeleteLevel(unsigned int nLevel)
{
    const Place oPlace = Place::Current();
    Get(nLevel, oPlace);
    CheckWriting("overviews cannot be deleted", oPlace);
    AuxiliaryData oBook = moLevels.GetBook();
    RemoveLevel(oBook, nLevel);
    moLevels.DropLevel(nLevel, oBook, oPlace);
}

void LevelManager::SetValid(unsigned int nChannel, unsigned int nLevel, bool bValid)
{
    StoreStates({nChannel}, nLevel, bValid, Place::Current());
}

void LevelManager::SetChannelsValid(const std::vector<unsigned int>& oChannels, unsigned int nLevel, bool bValid)
{
    StoreStates(oChannels, nLevel, bValid, Place::Current());
}

void LevelManager::StoreStates(const std::vector<unsigned int>& oChannels, unsigned int nLevel, bool bValid,
                               const Place& oPlace)
{
    Get(nLevel, oPlace);
    std::vector<unsigned int> oFound;
    for (const unsigned int nChannel : oChannels)
        oFound.push_back(GetChannel(nChannel, oPlace));
    CheckWriting("overviews cannot be written", oPlace);
    AuxiliaryData oBook = moLevels.GetBook();
    for (const unsigned int nChannel : oFound)
        SetLevelValid(oBook, nChannel, nLevel, bValid, moLevels.GetMethod());
    moLevels.WriteBook(oBook, bValid, oPlace);
}

} // namespace krv::datasources
