#pragma once

#include "datasources/metadata/iauxdatatfm.h"

#include <memory>
#include <vector>

namespace krv::qrfutils
{

class IMetaDataTfm;

// MetaDataDefaultRGBGMapper applied to the tags of the file; those of the channels and their descriptions pass
// unchanged. The result is flagged as modified. Copies share the mapper.
// For copies of some channels: the display defaults of the copy name the copy's own channels.
class KRV_DATASOURCES_API AuxDataDefaultRGBGTfm : public IAuxDataTfm
{
public:
    // oChannels: of the file, from 1, in the order of the copy.
    explicit AuxDataDefaultRGBGTfm(const std::vector<unsigned int>& oChannels);
    AuxDataDefaultRGBGTfm(const AuxDataDefaultRGBGTfm& oOther);
    AuxDataDefaultRGBGTfm& operator=(const AuxDataDefaultRGBGTfm& oOther);
    ~AuxDataDefaultRGBGTfm() override;

    // A new record with as many channels as the given one has.
    krv::datasources::AuxiliaryData Transform(const krv::datasources::AuxiliaryData& oData) const override;

private:
    std::shared_ptr<const IMetaDataTfm> mpoMapper;
};

} // namespace krv::qrfutils
