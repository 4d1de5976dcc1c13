#pragma once

#include "toolkit/core/lettercase.h"
#include "toolkit/core/numbertext.h"
#include "toolkit/exceptions/place.h"

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <type_traits>
#include <utility>
#include <vector>

namespace krv::plugins::support
{

// What users may say of a new file: KEY=VALUE, separated by blanks, in any letter case. A format adds its keys, in
// capitals, with the place that the value of each goes to; one that is not given leaves its place alone.
// Example:
//   Options oOptions;
//   oOptions.AddNumber("LEVEL", nLevel, 1, 9);
//   oOptions.Parse("level=7");
// Places outlive the object.
class Options
{
public:
    // A key as users are told of it, and what it takes: "YES, NO", "a number from 1 to 9".
    // A plain value.
    struct Description
    {
        std::string moKey; // in capitals
        std::string moTakes;
    };

    // One of some words, in capitals. usual: a word for what the place holds already, which texts do not list.
    template <typename T>
    void AddChoice(const std::string& key, T& oTarget,
                   const std::vector<std::pair<std::string, std::type_identity_t<T>>>& oChoices,
                   const std::string& usual = {})
    {
        std::string takes;
        for (const auto& [word, oValue] : oChoices)
            takes += (takes.empty() ? "" : ", ") + word;
        const auto Take = [&oTarget, oChoices, usual](const std::string& value)
        {
            const std::string upper = krv::ToUpper(value);
            for (const auto& [word, oValue] : oChoices)
                if (word == upper)
                    return oTarget = oValue, true;
            return !usual.empty() && upper == usual;
        };
        moKeys.push_back({{key, takes}, Take});
    }

    // YES or NO.
    void AddFlag(const std::string& key, bool& bTarget) { AddChoice(key, bTarget, {{"YES", true}, {"NO", false}}); }

    // A whole number from nFrom to nTo, decimal digits alone.
    template <typename T>
    void AddNumber(const std::string& key, T& oTarget, std::uint32_t nFrom, std::uint32_t nTo)
    {
        const auto Take = [&oTarget, nFrom, nTo](const std::string& value)
        {
            const std::optional<std::uint32_t> oNumber = krv::ParseNumber<std::uint32_t>(value);
            const bool bFits = oNumber && *oNumber >= nFrom && *oNumber <= nTo;
            if (bFits)
                oTarget = static_cast<T>(*oNumber);
            return bFits;
        };
        moKeys.push_back({{key, "a number from " + std::to_string(nFrom) + " to " + std::to_string(nTo)}, Take});
    }

    // Any text without blanks, as it stands.
    void AddText(const std::string& key, std::string& target);

    // Throws DataException for what is not of the form, a key that is not known or given twice, and a value that the
    // key does not take.
    void Parse(const std::string& options, const Place& oPlace = Place::Current());

    // Whether the text that was parsed has a key.
    bool IsGiven(const std::string& key) const;

    // In the order in which the keys were added.
    std::vector<Description> Describe() const;

private:
    struct Key
    {
        Description moDescription;                            // as users are told
        std::function<bool(const std::string& value)> moTake; // false for what it does not take
        bool mbGiven = false;                                 // the text that was parsed has it
    };

    std::string ListKeys() const;

    std::vector<Key> moKeys; // in the order in which they were added
};

} // namespace krv::plugins::support
