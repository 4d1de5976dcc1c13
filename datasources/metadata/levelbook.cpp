#include "datasources/metadata/levelbook.h"

#include "datasources/metadata/auxiliarydata.h"
#include "gobs/resampling/resampling.h"
#include "toolkit/core/lettercase.h"

#include <algorithm>
#include <charconv>
#include <cstdint>

namespace krv::datasources
{

namespace
{

const std::string VALID = "valid";
const std::string INVALID = "invalid";
// In which other programs say how they made the levels.
const std::string FOREIGN_METHOD_KEY = "IMAGE_STRUCTURE:OVERVIEW_RESAMPLING";

std::string GetKey(unsigned int nLevel)
{
    return "_Overview_" + std::to_string(nLevel);
}

} // namespace

bool IsLevelValid(const AuxiliaryData& oBook, unsigned int nChannel, unsigned int nLevel)
{
    return !oBook.GetChanMetadataValue(GetKey(nLevel), nChannel).starts_with(INVALID);
}

void SetLevelValid(AuxiliaryData& oBook, unsigned int nChannel, unsigned int nLevel, bool bValid,
                   const std::string& method)
{
    const std::string suffix = method.empty() ? std::string() : " " + method;
    oBook.SetChanMetadataValue(GetKey(nLevel), (bValid ? VALID : INVALID) + suffix, nChannel);
    if (!method.empty())
        RenameForeignMethod(oBook, method);
}

bool SetLevelInvalid(AuxiliaryData& oBook, unsigned int nLevel)
{
    bool bNews = false;
    for (unsigned int nChannel = 1; nChannel <= oBook.GetChannelCount(); ++nChannel)
    {
        bNews = bNews || oBook.GetChanMetadataValue(GetKey(nLevel), nChannel) != INVALID;
        SetLevelValid(oBook, nChannel, nLevel, false, {});
    }
    return bNews;
}

void RemoveLevel(AuxiliaryData& oBook, unsigned int nLevel)
{
    for (unsigned int nChannel = 1; nChannel <= oBook.GetChannelCount(); ++nChannel)
        oBook.RemoveChanMetadataValue(GetKey(nLevel), nChannel);
}

void CopyLevel(const AuxiliaryData& oFrom, AuxiliaryData& oTo, unsigned int nLevel)
{
    const std::string key = GetKey(nLevel);
    const unsigned int nChannels = std::min(oFrom.GetChannelCount(), oTo.GetChannelCount());
    for (unsigned int nChannel = 1; nChannel <= nChannels; ++nChannel)
        oTo.SetChanMetadataValue(key, oFrom.GetChanMetadataValue(key, nChannel), nChannel);
}

AuxiliaryData TakeChannels(const AuxiliaryData& oRecord, const std::vector<unsigned int>& oSources,
                           const std::vector<unsigned int>& oLevels)
{
    AuxiliaryData oNew(static_cast<unsigned int>(oSources.size()));
    oNew.SetFileMetadata(oRecord.GetFileMetadata());
    for (unsigned int nChannel = 1; nChannel <= oSources.size(); ++nChannel)
    {
        const unsigned int nSource = oSources[nChannel - 1];
        if (nSource != 0)
        {
            oNew.SetChanMetadata(oRecord.GetChanMetadata(nSource), nChannel);
            oNew.SetChannelDescription(oRecord.GetChannelDescription(nSource), nChannel);
            continue;
        }
        for (const unsigned int nLevel : oLevels)
            SetLevelValid(oNew, nChannel, nLevel, false, {});
    }
    return oNew;
}

std::string GetLevelMethod(const AuxiliaryData& oBook, unsigned int nLevel)
{
    const std::string state = oBook.GetChanMetadataValue(GetKey(nLevel), 1);
    const std::size_t nBlank = state.find(' ');
    return nBlank != std::string::npos ? state.substr(nBlank + 1)
                                       : ParseLevelMethod(oBook.GetFileMetadataValue(FOREIGN_METHOD_KEY));
}

std::vector<unsigned int> GetBookedLevels(const AuxiliaryData& oBook)
{
    std::vector<unsigned int> oLevels;
    if (oBook.GetChannelCount() == 0)
        return oLevels;
    const std::string prefix = GetKey(0).substr(0, GetKey(0).size() - 1);
    for (const auto& [key, value] : oBook.GetChanMetadata(1))
    {
        unsigned int nLevel = 0;
        if (key.starts_with(prefix) &&
            std::from_chars(key.data() + prefix.size(), key.data() + key.size(), nLevel).ptr == key.data() + key.size())
            oLevels.push_back(nLevel);
    }
    return oLevels;
}

void RenameForeignMethod(AuxiliaryData& oBook, const std::string& method)
{
    if (!oBook.GetFileMetadataValue(FOREIGN_METHOD_KEY).empty())
        oBook.SetFileMetadataValue(FOREIGN_METHOD_KEY, method);
}

std::string ParseLevelMethod(const std::string& name)
{
    const std::string upper = ToUpper(name);
    bool bKnown = upper == "NONE";
    for (int nMethod = 0; nMethod <= static_cast<int>(krv::gobs::Resampling::eMax); ++nMethod)
        bKnown = bKnown || upper == GetResamplingName(static_cast<krv::gobs::Resampling>(nMethod));
    return bKnown ? upper : std::string();
}

bool IsLevelSize(unsigned int nFull, unsigned int nReduced, unsigned int nLevel)
{
    const std::uint64_t nDown = nFull / nLevel, nSize = nReduced;
    return nLevel == 1 ? nReduced == nFull : nSize != 0 && nSize <= nDown + 1 && nSize + 1 >= nDown;
}

} // namespace krv::datasources
