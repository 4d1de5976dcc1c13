#include "datasources/metadata/referencetag.h"

#include "toolkit/core/numbertext.h"

#include <filesystem>
#include <string_view>
#include <system_error>

namespace krv::datasources
{

namespace
{

constexpr std::string_view PREFIX = "gdb:";

// One optional sign, then digits alone. A minus gives the two's complement.
bool ParseSigned(std::string_view text, unsigned int& nNumber)
{
    const bool bNegative = text.starts_with('-');
    if (bNegative || text.starts_with('+'))
        text.remove_prefix(1);
    const auto oValue = krv::ParseNumber<unsigned int>(text);
    if (oValue)
        nNumber = bNegative ? 0u - *oValue : *oValue;
    return oValue.has_value();
}

} // namespace

std::string BuildRefMetadataTag(const std::string& file, const std::string& layer, unsigned int nNumber)
{
    std::string tag(PREFIX);
    tag += file;
    if (!layer.empty() || nNumber != 0)
        tag += "/{" + layer + ":" + std::to_string(static_cast<int>(nNumber)) + "}";
    return tag;
}

bool ParseRefMetadataTag(const std::string& tag, std::string& file, std::string& layer, unsigned int& nNumber)
{
    if (!tag.starts_with(PREFIX))
        return false;
    // A copy, since the tag may be one of the results.
    const std::string copy(tag, PREFIX.size());
    const std::string_view text(copy);
    const auto nOpen = text.rfind('{');
    const auto nClose = text.rfind('}');
    if (nOpen == std::string_view::npos || nClose == std::string_view::npos)
    {
        file = text;
        layer.clear();
        nNumber = 0;
        return true;
    }
    file = text.substr(0, nOpen);
    if (file.ends_with('/'))
        file.pop_back();
    if (nClose < nOpen)
        return false;
    const std::string_view segment = text.substr(nOpen + 1, nClose - nOpen - 1);
    const auto nColon = segment.find(':');
    if (nColon == std::string_view::npos)
        return false;
    layer = segment.substr(0, nColon);
    return !layer.empty() && ParseSigned(segment.substr(nColon + 1), nNumber);
}

bool IsReferenceTo(const std::string& reference, const std::string& file)
{
    std::error_code oNone;
    const std::filesystem::path oBeside = std::filesystem::path(file).parent_path() / reference;
    return reference == file || std::filesystem::equivalent(reference, file, oNone) ||
           std::filesystem::equivalent(oBeside, file, oNone);
}

} // namespace krv::datasources
