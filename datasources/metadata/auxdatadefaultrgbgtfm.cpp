#include "datasources/metadata/auxdatadefaultrgbgtfm.h"

#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/metadatadefaultrgbgmapper.h"

namespace krv::qrfutils
{

AuxDataDefaultRGBGTfm::AuxDataDefaultRGBGTfm(const std::vector<unsigned int>& oChannels)
    : mpoMapper(std::make_shared<const MetaDataDefaultRGBGMapper>(oChannels))
{
}

AuxDataDefaultRGBGTfm::AuxDataDefaultRGBGTfm(const AuxDataDefaultRGBGTfm& oOther) = default;

AuxDataDefaultRGBGTfm& AuxDataDefaultRGBGTfm::operator=(const AuxDataDefaultRGBGTfm& oOther) = default;

AuxDataDefaultRGBGTfm::~AuxDataDefaultRGBGTfm() = default;

krv::datasources::AuxiliaryData AuxDataDefaultRGBGTfm::Transform(const krv::datasources::AuxiliaryData& oData) const
{
    krv::datasources::AuxiliaryData oResult(oData);
    oResult.SetFileMetadata(mpoMapper->Transform(oData.GetFileMetadata()));
    return oResult;
}

} // namespace krv::qrfutils
