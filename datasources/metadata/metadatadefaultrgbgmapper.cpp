#include "datasources/metadata/metadatadefaultrgbgmapper.h"

#include "datasources/metadata/detail/metadatakeys.h"

#include <algorithm>
#include <cstdint>
#include <string_view>

namespace krv::qrfutils
{

namespace
{

bool IsDisplayDefault(const std::string& key)
{
    using namespace krv::datasources::detail;
    return key == DEFAULT_RED || key == DEFAULT_GREEN || key == DEFAULT_BLUE || key == DEFAULT_GRAY;
}

// The integer at the front of a text: white space, a sign, digits; 0 without digits. Digits beyond 64 bits are left
// out: the number is then far from any channel's.
std::int64_t LeadingInteger(std::string_view text)
{
    text.remove_prefix(std::min(text.find_first_not_of(" \t\n\v\f\r"), text.size()));
    const bool bNegative = text.starts_with('-');
    if (bNegative || text.starts_with('+'))
        text.remove_prefix(1);
    constexpr std::int64_t LIMIT = INT64_MAX / 10 - 1;
    std::int64_t nValue = 0;
    for (const char cDigit : text)
    {
        if (cDigit < '0' || cDigit > '9' || nValue > LIMIT)
            break;
        nValue = nValue * 10 + (cDigit - '0');
    }
    return bNegative ? -nValue : nValue;
}

} // namespace

MetaDataDefaultRGBGMapper::MetaDataDefaultRGBGMapper(const std::vector<unsigned int>& oChannels) : moChannels(oChannels)
{
}

MetaDataDefaultRGBGMapper::MetaDataDefaultRGBGMapper(const MetaDataDefaultRGBGMapper& oOther) = default;

MetaDataDefaultRGBGMapper& MetaDataDefaultRGBGMapper::operator=(const MetaDataDefaultRGBGMapper& oOther) = default;

MetaDataDefaultRGBGMapper::~MetaDataDefaultRGBGMapper() = default;

krv::datasources::MetadataMap MetaDataDefaultRGBGMapper::Transform(const krv::datasources::MetadataMap& oMap) const
{
    krv::datasources::MetadataMap oResult(oMap);
    for (auto oEntry = oResult.begin(); oEntry != oResult.end();)
    {
        if (!IsDisplayDefault(oEntry->first))
        {
            ++oEntry;
            continue;
        }
        const std::int64_t nChannel = LeadingInteger(oEntry->second);
        const auto oFound = std::find(moChannels.begin(), moChannels.end(), nChannel);
        if (oFound == moChannels.end())
        {
            oEntry = oResult.erase(oEntry);
            continue;
        }
        oEntry->second = std::to_string(oFound - moChannels.begin() + 1);
        ++oEntry;
    }
    return oResult;
}

} // namespace krv::qrfutils
