#include "datasources/reader/derived/detail/convertedrecord.h"

#include "datasources/metadata/droppedtags.h"
#include "datasources/metadata/levelbook.h"

namespace krv::datasources::detail
{

namespace
{

constexpr const char* UNTRUE[] = {"NO_DATA_VALUE", "Scale",           "Offset",          "UnitType",   "ColorInterp",
                                  "Photometric",   "DEFAULT_PCT_REF", "DEFAULT_LUT_REF", "DefaultRed", "DefaultGreen",
                                  "DefaultBlue",   "DefaultGray",     "AlphaKind",       "Matrix_Type"};

MetadataMap WithoutUntrue(MetadataMap oMap)
{
    DropStatistics(oMap);
    for (const char* const pKey : UNTRUE)
        oMap.erase(pKey);
    return oMap;
}

// All channels of the result are made of all of the source.
void CopyBook(const AuxiliaryData& oSource, AuxiliaryData& oRecord, MethodOfLevels pMethod)
{
    const auto Name = [&](const std::string& method)
    {
        return pMethod != nullptr ? pMethod(method) : method;
    };
    RenameForeignMethod(oRecord, Name(GetLevelMethod(oRecord, 0)));
    for (const unsigned int nLevel : GetBookedLevels(oSource))
    {
        bool bValid = true;
        for (unsigned int n = 1; n <= oSource.GetChannelCount(); ++n)
            bValid = bValid && IsLevelValid(oSource, n, nLevel);
        for (unsigned int n = 1; n <= oRecord.GetChannelCount(); ++n)
            SetLevelValid(oRecord, n, nLevel, bValid, Name(GetLevelMethod(oSource, nLevel)));
    }
}

} // namespace

AuxiliaryData MakeConvertedRecord(const AuxiliaryData& oSource, unsigned int nChannels, MethodOfLevels pMethod)
{
    const AuxiliaryData oClean = oSource.GetCleanedMeta();
    AuxiliaryData oRecord(nChannels);
    oRecord.SetFileMetadata(WithoutUntrue(oClean.GetFileMetadata()));
    if (oClean.GetChannelCount() == 0 || nChannels == 0)
        return oRecord;
    oRecord.SetChanMetadata(WithoutUntrue(oClean.GetChanMetadata(1)), 1);
    oRecord.SetChannelDescription(oClean.GetChannelDescription(1), 1);
    CopyBook(oSource, oRecord, pMethod);
    return oRecord;
}

} // namespace krv::datasources::detail
