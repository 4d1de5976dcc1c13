#include "datasources/metadata/displaydefaults.h"

#include "datasources/interfaces/idataset.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/detail/metadatakeys.h"
#include "datasources/metadata/referencetag.h"

#include <locale>
#include <sstream>

namespace krv::datasources
{

namespace
{

unsigned int GetDefault(const AuxiliaryData& oData, const char* pKey)
{
    std::istringstream oText(oData.GetFileMetadataValue(pKey));
    oText.imbue(std::locale::classic());
    unsigned int nChannel = 0;
    return oText >> nChannel ? nChannel : 0;
}

void SetDefault(IDataset& oDataset, const char* pKey, unsigned int nChannel)
{
    AuxiliaryData oData = oDataset.ReadAuxiliaryData();
    oData.SetFileMetadataValue(pKey, std::to_string(nChannel));
    oDataset.WriteAuxiliaryData(oData);
}

bool GetReference(IDataset& oDataset, const char* pKey, unsigned int nChannel, std::string& file, std::string& layer,
                  unsigned int& nNumber)
{
    const std::string tag = oDataset.ReadAuxiliaryData().GetChanMetadataValue(pKey, nChannel);
    return ParseRefMetadataTag(tag, file, layer, nNumber);
}

void SetReference(IDataset& oDataset, const char* pKey, unsigned int nChannel, const std::string& tag)
{
    AuxiliaryData oData = oDataset.ReadAuxiliaryData();
    oData.SetChanMetadataValue(pKey, tag, nChannel);
    oDataset.WriteAuxiliaryData(oData);
}

} // namespace

unsigned int GetDefaultRed(IDataset* poDataset)
{
    return GetDefaultRed(poDataset->ReadAuxiliaryData());
}

unsigned int GetDefaultGreen(IDataset* poDataset)
{
    return GetDefaultGreen(poDataset->ReadAuxiliaryData());
}

unsigned int GetDefaultBlue(IDataset* poDataset)
{
    return GetDefaultBlue(poDataset->ReadAuxiliaryData());
}

unsigned int GetDefaultGrey(IDataset* poDataset)
{
    return GetDefaultGrey(poDataset->ReadAuxiliaryData());
}

unsigned int GetDefaultRed(const AuxiliaryData& oData)
{
    return GetDefault(oData, detail::DEFAULT_RED);
}

unsigned int GetDefaultGreen(const AuxiliaryData& oData)
{
    return GetDefault(oData, detail::DEFAULT_GREEN);
}

unsigned int GetDefaultBlue(const AuxiliaryData& oData)
{
    return GetDefault(oData, detail::DEFAULT_BLUE);
}

unsigned int GetDefaultGrey(const AuxiliaryData& oData)
{
    return GetDefault(oData, detail::DEFAULT_GRAY);
}

void SetDefaultRed(IDataset* poDataset, unsigned int nChannel)
{
    SetDefault(*poDataset, detail::DEFAULT_RED, nChannel);
}

void SetDefaultGreen(IDataset* poDataset, unsigned int nChannel)
{
    SetDefault(*poDataset, detail::DEFAULT_GREEN, nChannel);
}

void SetDefaultBlue(IDataset* poDataset, unsigned int nChannel)
{
    SetDefault(*poDataset, detail::DEFAULT_BLUE, nChannel);
}

void SetDefaultGrey(IDataset* poDataset, unsigned int nChannel)
{
    SetDefault(*poDataset, detail::DEFAULT_GRAY, nChannel);
}

bool GetDefaultLUT(IDataset* poDataset, unsigned int nChannel, std::string& file, std::string& layer,
                   unsigned int& nNumber)
{
    return GetReference(*poDataset, detail::DEFAULT_LUT, nChannel, file, layer, nNumber);
}

bool GetDefaultPCT(IDataset* poDataset, unsigned int nChannel, std::string& file, std::string& layer,
                   unsigned int& nNumber)
{
    return GetReference(*poDataset, detail::DEFAULT_PCT, nChannel, file, layer, nNumber);
}

void SetDefaultLUT(IDataset* poDataset, unsigned int nChannel, const std::string& file, const std::string& layer,
                   unsigned int nNumber)
{
    SetReference(*poDataset, detail::DEFAULT_LUT, nChannel, BuildRefMetadataTag(file, layer, nNumber));
}

void SetDefaultPCT(IDataset* poDataset, unsigned int nChannel, const std::string& file, const std::string& layer,
                   unsigned int nNumber)
{
    SetReference(*poDataset, detail::DEFAULT_PCT, nChannel, BuildRefMetadataTag(file, layer, nNumber));
}

} // namespace krv::datasources
