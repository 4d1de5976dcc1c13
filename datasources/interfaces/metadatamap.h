#pragma once

#include "datasources/api.h"

#include <map>
#include <string>

namespace krv::datasources
{

namespace detail
{

// The order of metadata keys: both keys end at their first NUL; A to Z count as a to z and nothing else changes; bytes
// compare unsigned; a prefix sorts first. No locale takes part.
// For std::map: true when oFirst sorts before oSecond. Throws nothing.
struct KRV_DATASOURCES_API CaseInsensitiveCompare
{
    bool operator()(const std::string& oFirst, const std::string& oSecond) const;
};

} // namespace detail

// Metadata tags. Keys that differ only in letter case are one key, which keeps the case of its first insertion.
// Keys and values are UTF-8. Example: oTags["scene"] = "alps"; oTags.at("SCENE") is "alps".
using MetadataMap = std::map<std::string, std::string, detail::CaseInsensitiveCompare>;

} // namespace krv::datasources
