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

bool DropStatisticsOf(MetadataMap& oMap)
{
    return std::erase_if(oMap, [](const auto& oEntry) { return IsStatistics(oEntry.first); }) != 0;
}

bool DropRemovedOf(MetadataMap& oMap)
{
    return std::erase_if(oMap, [](const auto& oEntry) { return oEntry.second.empty(); }) != 0;
}

// Lets `pDrop` work on the map of the file and on those of the channels. Maps that stay as they are are not set.
bool DropFromAll(AuxiliaryData& oRecord, bool (*pDrop)(MetadataMap&))
{
    MetadataMap oFileMap = oRecord.GetFileMetadata();
    bool bAny = pDrop(oFileMap);
    if (bAny)
        oRecord.SetFileMetadata(oFileMap);
    for (unsigned int nChannel = 1; nChannel <= oRecord.GetChannelCount(); ++nChannel)
        if (MetadataMap oMap = oRecord.GetChanMetadata(nChannel); pDrop(oMap))
        {
            oRecord.SetChanMetadata(oMap, nChannel);
            bAny = true;
        }
    return bAny;
}

} // namespace

bool DropStatistics(MetadataMap& oMap)
{
    return DropStatisticsOf(oMap);
}

bool DropStatistics(AuxiliaryData& oRecord)
{
    return DropFromAll(oRecord, DropStatisticsOf);
}

bool DropRemoved(AuxiliaryData& oRecord)
{
    return DropFromAll(oRecord, DropRemovedOf);
}

} // namespace krv::datasources
