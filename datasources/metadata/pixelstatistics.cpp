#include "datasources/metadata/pixelstatistics.h"

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

} // namespace

bool DropStatistics(MetadataMap& oMap)
{
    return std::erase_if(oMap, [](const auto& oEntry) { return IsStatistics(oEntry.first); }) != 0;
}

bool DropStatistics(AuxiliaryData& oRecord)
{
    MetadataMap oFileMap = oRecord.GetFileMetadata();
    bool bAny = DropStatistics(oFileMap);
    if (bAny)
        oRecord.SetFileMetadata(oFileMap);
    for (unsigned int nChannel = 1; nChannel <= oRecord.GetChannelCount(); ++nChannel)
        if (MetadataMap oMap = oRecord.GetChanMetadata(nChannel); DropStatistics(oMap))
        {
            oRecord.SetChanMetadata(oMap, nChannel);
            bAny = true;
        }
    return bAny;
}

} // namespace krv::datasources
