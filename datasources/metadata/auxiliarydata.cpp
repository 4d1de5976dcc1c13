#include "datasources/metadata/auxiliarydata.h"

#include "datasources/metadata/logicalorfilter.h"
#include "datasources/metadata/metadatafilters.h"
#include "toolkit/exceptions/exceptions.h"

#include <memory>
#include <utility>

namespace krv::datasources
{

namespace
{

constexpr const char* OVERVIEW_TAGS = "^_Overview_[0-9]+$";

std::string FindValue(const MetadataMap& oMap, const std::string& key)
{
    const auto oFound = oMap.find(key);
    return oFound == oMap.end() ? std::string() : oFound->second;
}

bool SetValue(MetadataMap& oMap, const std::string& key, const std::string& value)
{
    const auto [oEntry, bInserted] = oMap.try_emplace(key, value);
    if (bInserted)
        return true;
    if (oEntry->second == value)
        return false;
    oEntry->second = value;
    return true;
}

void ClearValue(MetadataMap& oMap, const std::string& key)
{
    const auto oFound = oMap.find(key);
    if (oFound != oMap.end())
        oFound->second.clear();
}

void EraseSelected(MetadataMap& oMap, const krv::qrfutils::IMetadataFilter& oFilter)
{
    std::erase_if(oMap, [&oFilter](const auto& oEntry) { return oFilter(oEntry.first, oEntry.second); });
}

void InsertNew(MetadataMap& oMap, const MetadataMap& oAdded)
{
    for (const auto& [key, value] : oAdded)
    {
        if (!oMap.try_emplace(key, value).second)
            throw krv::Exception("Duplicate key \"" + key + "\" found while appending metadata tags",
                                 krv::Place::None());
    }
}

} // namespace

AuxiliaryData::AuxiliaryData() = default;

AuxiliaryData::AuxiliaryData(unsigned int nChannelCount)
    : moChanMetadata(nChannelCount), moChanDescriptions(nChannelCount)
{
}

AuxiliaryData::AuxiliaryData(const AuxiliaryData& oOther) = default;

AuxiliaryData::AuxiliaryData(AuxiliaryData&& oOther) noexcept = default;

AuxiliaryData& AuxiliaryData::operator=(const AuxiliaryData& oOther)
{
    if (this != &oOther)
        *this = AuxiliaryData(oOther);
    return *this;
}

AuxiliaryData& AuxiliaryData::operator=(AuxiliaryData&& oOther) noexcept = default;

AuxiliaryData::~AuxiliaryData() = default;

const MetadataMap& AuxiliaryData::GetFileMetadata() const
{
    return moFileMetadata;
}

const MetadataMap& AuxiliaryData::GetChanMetadata(unsigned int nChannel) const
{
    CheckChanBounds(nChannel);
    return moChanMetadata[nChannel - 1];
}

std::string AuxiliaryData::GetFileMetadataValue(const std::string& key) const
{
    return FindValue(moFileMetadata, key);
}

std::string AuxiliaryData::GetChanMetadataValue(const std::string& key, unsigned int nChannel) const
{
    CheckChanBounds(nChannel);
    return FindValue(moChanMetadata[nChannel - 1], key);
}

std::string AuxiliaryData::GetChannelDescription(unsigned int nChannel) const
{
    CheckChanBounds(nChannel);
    return moChanDescriptions[nChannel - 1];
}

unsigned int AuxiliaryData::GetChannelCount() const
{
    return static_cast<unsigned int>(moChanMetadata.size());
}

bool AuxiliaryData::IsModified() const
{
    return mbModified;
}

MetadataMap AuxiliaryData::GetChanOverviewMetadata(unsigned int nChannel)
{
    CheckChanBounds(nChannel);
    const krv::qrfutils::LogicalOrFilter oFilter(krv::qrfutils::GetMetadataFilterRegEx(OVERVIEW_TAGS, false));
    MetadataMap oSelected;
    for (const auto& oEntry : moChanMetadata[nChannel - 1])
    {
        if (oFilter(oEntry.first, oEntry.second))
            oSelected.insert(oSelected.end(), oEntry);
    }
    return oSelected;
}

AuxiliaryData AuxiliaryData::GetFilteredMeta(krv::qrfutils::IMetadataFilter* poFileFilter,
                                             krv::qrfutils::IMetadataFilter* poChanFilter) const
{
    AuxiliaryData oFiltered(*this);
    if (poFileFilter != nullptr)
        EraseSelected(oFiltered.moFileMetadata, *poFileFilter);
    if (poChanFilter != nullptr)
    {
        for (MetadataMap& oMap : oFiltered.moChanMetadata)
            EraseSelected(oMap, *poChanFilter);
    }
    return oFiltered;
}

AuxiliaryData AuxiliaryData::GetCleanedMeta() const
{
    const std::unique_ptr<krv::qrfutils::IMetadataFilter> oFileFilter(
        krv::qrfutils::GetMetadataFilter("_DBLayout", false));
    krv::qrfutils::LogicalOrFilter oChanFilter(krv::qrfutils::GetMetadataFilterRegEx(OVERVIEW_TAGS, false));
    oChanFilter.PushBack(krv::qrfutils::GetMetadataFilter("LAYER_CRC", false));
    return GetFilteredMeta(oFileFilter.get(), &oChanFilter);
}

void AuxiliaryData::SetFileMetadata(const MetadataMap& oMap)
{
    moFileMetadata = oMap;
    mbModified = true;
}

void AuxiliaryData::SetChanMetadata(const MetadataMap& oMap, unsigned int nChannel)
{
    CheckChanBounds(nChannel);
    moChanMetadata[nChannel - 1] = oMap;
    mbModified = true;
}

void AuxiliaryData::SetFileMetadataValue(const std::string& key, const std::string& value)
{
    mbModified = SetValue(moFileMetadata, key, value);
}

void AuxiliaryData::SetChanMetadataValue(const std::string& key, const std::string& value, unsigned int nChannel)
{
    CheckChanBounds(nChannel);
    mbModified = SetValue(moChanMetadata[nChannel - 1], key, value);
}

void AuxiliaryData::RemoveFileMetadataValue(const std::string& key)
{
    ClearValue(moFileMetadata, key);
}

void AuxiliaryData::RemoveChanMetadataValue(const std::string& key, unsigned int nChannel)
{
    CheckChanBounds(nChannel);
    ClearValue(moChanMetadata[nChannel - 1], key);
}

void AuxiliaryData::AppendChanMetadata(const MetadataMap& oMap, unsigned int nChannel, bool bOverwrite)
{
    CheckChanBounds(nChannel);
    MetadataMap& oOwn = moChanMetadata[nChannel - 1];
    if (!bOverwrite)
        return InsertNew(oOwn, oMap);
    MetadataMap oMerged(oMap);
    oMerged.insert(oOwn.begin(), oOwn.end());
    oOwn.swap(oMerged);
}

void AuxiliaryData::SetChannelDescription(const std::string& description, unsigned int nChannel)
{
    CheckChanBounds(nChannel);
    moChanDescriptions[nChannel - 1] = description;
}

void AuxiliaryData::CheckChanBounds(unsigned int nChannel, const krv::Place& oPlace) const
{
    if (nChannel < 1 || nChannel > GetChannelCount())
        throw krv::OutOfBoundsException({nChannel}, "Out of bounds.", oPlace);
}

} // namespace krv::datasources
