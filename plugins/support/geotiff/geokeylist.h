#pragma once

#include "plugins/support/geotiff/geotags.h"

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <variant>
#include <vector>

namespace krv::plugins::support
{

// The geographic keys of a page as values: a code, numbers or a text each.
// A plain value; keys ascend, as the file wants them.
class GeoKeyList
{
public:
    // The three places where a key's value can be: the directory, the list of doubles, the texts.
    using Value = std::variant<std::uint16_t, std::vector<double>, std::string>;

    // The keys of a directory. What is damaged in them is left out, and the first of it told in pDamage; texts that are
    // not there, and keys whose values stand in unknown places, are no damage.
    static GeoKeyList From(const GeoTags& oTags, std::string* pDamage = nullptr);

    // Replaces the value that the key has.
    void Set(std::uint16_t nKey, Value oValue) { moKeys[nKey] = std::move(oValue); }
    void Remove(std::uint16_t nKey) { moKeys.erase(nKey); }

    // Whether there is no key at all.
    bool IsEmpty() const { return moKeys.empty(); }

    // The value of a key that holds a code; the default when it is absent.
    std::uint16_t GetCode(std::uint16_t nKey, std::uint16_t nDefault = 0) const;
    // A code that stands for something: 0 when it is absent or "user-defined".
    std::uint16_t FindCode(std::uint16_t nKey) const;
    // The values of a key that holds numbers, or the code of one that holds a code; none when it is absent.
    std::vector<double> GetNumbers(std::uint16_t nKey) const;

    // The first of them.
    std::optional<double> GetNumber(std::uint16_t nKey) const;
    // The text of a key as UTF-8, without blanks and separators at its ends; "" when it is absent.
    std::string GetText(std::uint16_t nKey) const;

    // Replaces the three tags of the keys; removes them when there are no keys.
    // oTags: of the page that is written; its scale, tie points and matrix stay.
    void Store(GeoTags& oTags) const;

private:
    template <class Kind>
    const Kind* Find(std::uint16_t nKey) const;

    std::map<std::uint16_t, Value> moKeys; // ascending by key
};

} // namespace krv::plugins::support
