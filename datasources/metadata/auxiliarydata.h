#pragma once

#include "datasources/api.h"
#include "datasources/interfaces/metadatamap.h"
#include "toolkit/exceptions/place.h"

#include <string>
#include <vector>

namespace krv::qrfutils
{
class IMetadataFilter;
}

namespace krv::datasources
{

// The textual metadata of a dataset: tags of the file, tags of each channel, and a free-text description per channel.
// A plain value. Channels count from 1; a channel number of 0 or above the count throws OutOfBoundsException
// "Out of bounds." and leaves the object untouched. May be read by several threads at once.
// Changes are the program's alone until a dataset or a writer gets the record (WriteAuxiliaryData, SetAuxiliaryData).
// Example: AuxiliaryData oData = poDataset->ReadAuxiliaryData(); oData.SetChannelDescription("near infrared", 4);
class KRV_DATASOURCES_API AuxiliaryData
{
public:
    // No channels.
    AuxiliaryData();
    // The number of channels is fixed here; only assignment changes it.
    explicit AuxiliaryData(unsigned int nChannelCount);
    AuxiliaryData(const AuxiliaryData& oOther);
    // Leaves no channels behind.
    AuxiliaryData(AuxiliaryData&& oOther) noexcept;
    // When the copy fails the object keeps what it had.
    AuxiliaryData& operator=(const AuxiliaryData& oOther);
    AuxiliaryData& operator=(AuxiliaryData&& oOther) noexcept;
    ~AuxiliaryData();

    // References live until the record changes.
    const MetadataMap& GetFileMetadata() const;
    const MetadataMap& GetChanMetadata(unsigned int nChannel) const;
    // Empty when there is no such key.
    std::string GetFileMetadataValue(const std::string& key) const;
    std::string GetChanMetadataValue(const std::string& key, unsigned int nChannel) const;

    // Empty when nobody gave one.
    std::string GetChannelDescription(unsigned int nChannel) const;
    unsigned int GetChannelCount() const;
    // Set by the whole-map setters; assigned by the single-value setters: true after a change, false after none.
    // Setting a tag to the value that it holds therefore clears it, intended.
    bool IsModified() const;
    // The channel's tags whose key matches "^_Overview_[0-9]+$", letter case counted.
    MetadataMap GetChanOverviewMetadata(unsigned int nChannel);
    // A copy without the entries that the filters select; null filters nothing. The filters stay the caller's.
    AuxiliaryData GetFilteredMeta(krv::qrfutils::IMetadataFilter* poFileFilter,
                                  krv::qrfutils::IMetadataFilter* poChanFilter) const;
    // A copy without the bookkeeping tags: "_DBLayout" of the file, "_Overview_<n>" and "LAYER_CRC" of channels.
    AuxiliaryData GetCleanedMeta() const;

    // Replaces all tags.
    void SetFileMetadata(const MetadataMap& oMap);
    void SetChanMetadata(const MetadataMap& oMap, unsigned int nChannel);

    // A key that differs from one that is there in letter case alone sets that one's value.
    void SetFileMetadataValue(const std::string& key, const std::string& value);
    void SetChanMetadataValue(const std::string& key, const std::string& value, unsigned int nChannel);
    // Empties the value and keeps the key, and leaves the modified flag, both intended: formats see that the tag was
    // dropped.
    void RemoveFileMetadataValue(const std::string& key);
    void RemoveChanMetadataValue(const std::string& key, unsigned int nChannel);
    // Merges a map into the channel's. Without `bOverwrite` the first key that is already present throws
    // krv::Exception; the entries before it stay. The channel's own map may be given.
    void AppendChanMetadata(const MetadataMap& oMap, unsigned int nChannel, bool bOverwrite);
    void SetChannelDescription(const std::string& description, unsigned int nChannel);

private:
    // The line number is part of the contract.
    void CheckChanBounds(unsigned int nChannel, const krv::Place& oPlace = krv::Place::AtLine(354)) const;

    MetadataMap moFileMetadata;
    std::vector<MetadataMap> moChanMetadata;
    bool mbModified = false;
    std::vector<std::string> moChanDescriptions;
};

} // namespace krv::datasources
