#pragma once

#include "datasources/metadata/imetadatatfm.h"

#include <vector>

namespace krv::qrfutils
{

// Renumbers the default display channels for a copy of some channels of a file: channel k of the copy is channel
// oChannels[k - 1] of the file. A default whose channel is not copied is dropped. Only keys spelled exactly
// "DefaultRed", "DefaultGreen", "DefaultBlue" or "DefaultGray" count, letter case included; other tags pass unchanged.
// Example: of a copy of channels 4, 3 and 2, "DefaultRed" = 4 becomes 1. Any thread.
class KRV_DATASOURCES_API MetaDataDefaultRGBGMapper : public IMetaDataTfm
{
public:
    // A channel that is listed twice counts by its first place.
    explicit MetaDataDefaultRGBGMapper(const std::vector<unsigned int>& oChannels);
    MetaDataDefaultRGBGMapper(const MetaDataDefaultRGBGMapper& oOther);
    MetaDataDefaultRGBGMapper& operator=(const MetaDataDefaultRGBGMapper& oOther);
    ~MetaDataDefaultRGBGMapper() override;

    krv::datasources::MetadataMap Transform(const krv::datasources::MetadataMap& oMap) const override;

private:
    std::vector<unsigned int> moChannels;
};

} // namespace krv::qrfutils
