#pragma once

#include "plugins/tif/writing/taglist.h"

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <variant>
#include <vector>

namespace krv::plugins::tif
{

// The geographic keys of a page as values: a code, numbers or a text each.
class GeoKeyList
{
public:
    using Value = std::variant<std::uint16_t, std::vector<double>, std::string>;

    // The keys of the tags; what is damaged in them is left out.
    static GeoKeyList From(const TagList& oTags);

    void Set(std::uint16_t nKey, Value oValue) { moKeys[nKey] = std::move(oValue); }
    void Remove(std::uint16_t nKey) { moKeys.erase(nKey); }
    std::uint16_t GetCode(std::uint16_t nKey, std::uint16_t nDefault) const;
    bool IsEmpty() const { return moKeys.empty(); }

    // Replaces the three tags of the keys; removes them when there are no keys.
    void Store(TagList& oTags) const;

private:
    std::map<std::uint16_t, Value> moKeys;
};

} // namespace krv::plugins::tif
