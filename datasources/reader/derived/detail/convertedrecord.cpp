#include "datasources/reader/derived/detail/convertedrecord.h"

#include "datasources/metadata/pixelstatistics.h"

namespace krv::datasources::detail
{

namespace
{

constexpr const char* UNTRUE[] = {"NO_DATA_VALUE", "Scale",           "Offset",          "UnitType",   "ColorInterp",
                                  "Photometric",   "DEFAULT_PCT_REF", "DEFAULT_LUT_REF", "DefaultRed", "DefaultGreen",
                                  "DefaultBlue",   "DefaultGray",     "AlphaKind"};

MetadataMap WithoutUntrue(MetadataMap oMap)
{
    DropStatistics(oMap);
    for (const char* const pKey : UNTRUE)
        oMap.erase(pKey);
    return oMap;
}

} // namespace

AuxiliaryData MakeConvertedRecord(const AuxiliaryData& oSource, unsigned int nChannels)
{
    const AuxiliaryData oClean = oSource.GetCleanedMeta();
    AuxiliaryData oRecord(nChannels);
    oRecord.SetFileMetadata(WithoutUntrue(oClean.GetFileMetadata()));
    if (oClean.GetChannelCount() == 0 || nChannels == 0)
        return oRecord;
    oRecord.SetChanMetadata(WithoutUntrue(oClean.GetChanMetadata(1)), 1);
    oRecord.SetChannelDescription(oClean.GetChannelDescription(1), 1);
    return oRecord;
}

} // namespace krv::datasources::detail
