#include "datasources/metadata/droppedtags.h"

#include <string_view>

#include <strings.h>

namespace krv::datasources
{

namespace
{

bool IsStatistics(const std::string& key)
{
    const auto Begins = [&](std::string_view begin)
    {
        return ::strncasecmp(key.c_str(), begin.data(), begin.size()) == 0;
    };
    return Begins("STATISTICS_") || Begins("Histogram_") || ::strcasecmp(key.c_str(), "LAYER_CRC") == 0;
}

// Lets `fDrop` work on the map of the file, as channel 0, and on those of the channels. Maps that stay as they are are
// not set.
template <class Drop>
bool DropFromAll(AuxiliaryData& oRecord, Drop&& fDrop)
{
    MetadataMap oFileMap = oRecord.GetFileMetadata();
    bool bAny = fDrop(oFileMap, 0u);
    if (bAny)
        oRecord.SetFileMetadata(oFileMap);
    for (unsigned int nChannel = 1; nChannel <= oRecord.GetChannelCount(); ++nChannel)
        if (MetadataMap oMap = oRecord.GetChanMetadata(nChannel); fDrop(oMap, nChannel))
        {
            oRecord.SetChanMetadata(oMap, nChannel);
            bAny = true;
        }
    return bAny;
}

} // namespace

bool DropStatistics(MetadataMap& oMap)
{
    return std::erase_if(oMap, [](const auto& oEntry) { return IsStatistics(oEntry.first); }) != 0;
}

bool DropStatistics(AuxiliaryData& oRecord)
{
    return DropFromAll(oRecord, [](MetadataMap& oMap, unsigned int) { return DropStatistics(oMap); });
}

bool DropRemoved(AuxiliaryData& oRecord, const AuxiliaryData& oBefore)
{
    const auto DropRemovedOf = [&oBefore](MetadataMap& oMap, unsigned int nChannel)
    {
        if (nChannel > oBefore.GetChannelCount())
            return false;
        const MetadataMap& oOld = nChannel == 0 ? oBefore.GetFileMetadata() : oBefore.GetChanMetadata(nChannel);
        const auto IsRemoved = [&oOld](const auto& oEntry)
        {
            const auto oFound = oOld.find(oEntry.first);
            return oEntry.second.empty() && oFound != oOld.end() && !oFound->second.empty();
        };
        return std::erase_if(oMap, IsRemoved) != 0;
    };
    return DropFromAll(oRecord, DropRemovedOf);
}

} // namespace krv::datasources
