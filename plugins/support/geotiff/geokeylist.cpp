#include "plugins/support/geotiff/geokeylist.h"

#include "toolkit/xml/xmlutil.h"

#include <algorithm>
#include <string_view>

#include <geotiff.h>
#include <geovalues.h>

namespace krv::plugins::support
{

namespace
{

constexpr std::uint16_t VERSION = 1;
// The numbers of a key: itself, the tag of its values or 0, their number, their place or the value.
constexpr std::size_t ENTRY_VALUES = 4;
// Texts are stored one behind the other, each with this at its end.
constexpr char TEXT_END = '|';

} // namespace

GeoKeyList GeoKeyList::From(const GeoTags& oTags, std::string* pDamage)
{
    const std::vector<std::uint16_t>& oShorts = oTags.moKeys;
    const std::vector<double>& oDoubles = oTags.moDoubles;
    const std::string& texts = oTags.moTexts;
    GeoKeyList oList;
    const auto Expect = [pDamage](bool bSound, const std::string& damage)
    {
        if (!bSound && pDamage != nullptr && pDamage->empty())
            *pDamage = damage;
        return bSound;
    };
    if (oShorts.empty() || !Expect(oShorts.size() >= ENTRY_VALUES, "the directory is too short"))
        return oList;
    const std::size_t nKeys = oShorts[3];
    const std::size_t nFound = oShorts.size() / ENTRY_VALUES - 1;
    Expect(oShorts[0] == VERSION, "version " + std::to_string(oShorts[0]) + " is not known");
    Expect(nKeys <= nFound, std::to_string(nKeys) + " keys are announced, " + std::to_string(nFound) + " found");
    for (std::size_t nAt = 1; nAt <= std::min(nKeys, nFound); ++nAt)
    {
        const std::uint16_t* const pEntry = oShorts.data() + nAt * ENTRY_VALUES;
        const std::uint16_t nKey = pEntry[0];
        const std::size_t nCount = pEntry[2];
        const std::size_t nValue = pEntry[3];
        const std::string key = "key " + std::to_string(nKey);
        const auto Holds = [nCount, nValue](std::size_t nValues)
        {
            return nCount > 0 && nValue + nCount <= nValues;
        };
        switch (pEntry[1])
        {
        case 0:
            if (Expect(nCount == 1, key + " has " + std::to_string(nCount) + " values in the place of one"))
                oList.Set(nKey, pEntry[3]);
            break;
        case TAG_GEO_DOUBLES:
            if (Expect(Holds(oDoubles.size()), key + " points outside the list of numbers"))
                oList.Set(nKey, std::vector<double>(oDoubles.data() + nValue, oDoubles.data() + nValue + nCount));
            break;
        case TAG_GEO_KEYS:
            if (Expect(Holds(oShorts.size()), key + " points outside the directory"))
                oList.Set(nKey, oShorts[nValue]);
            break;
        case TAG_GEO_TEXTS:
            if (nCount > 0 && nValue < texts.size())
            {
                const std::string text = texts.substr(nValue, nCount);
                oList.Set(nKey, text.substr(0, text.size() - (text.ends_with(TEXT_END) ? 1 : 0)));
            }
            break;
        default:
            break;
        }
    }
    return oList;
}

template <class Kind>
const Kind* GeoKeyList::Find(std::uint16_t nKey) const
{
    const auto oFound = moKeys.find(nKey);
    return oFound == moKeys.end() ? nullptr : std::get_if<Kind>(&oFound->second);
}

std::uint16_t GeoKeyList::GetCode(std::uint16_t nKey, std::uint16_t nDefault) const
{
    const auto* const pCode = Find<std::uint16_t>(nKey);
    return pCode == nullptr ? nDefault : *pCode;
}

std::uint16_t GeoKeyList::FindCode(std::uint16_t nKey) const
{
    const std::uint16_t nCode = GetCode(nKey);
    return nCode == KvUserDefined ? std::uint16_t{KvUndefined} : nCode;
}

std::vector<double> GeoKeyList::GetNumbers(std::uint16_t nKey) const
{
    if (const auto* const pCode = Find<std::uint16_t>(nKey))
        return {static_cast<double>(*pCode)};
    const auto* const pNumbers = Find<std::vector<double>>(nKey);
    return pNumbers == nullptr ? std::vector<double>() : *pNumbers;
}

std::optional<double> GeoKeyList::GetNumber(std::uint16_t nKey) const
{
    const std::vector<double> oNumbers = GetNumbers(nKey);
    return oNumbers.empty() ? std::nullopt : std::optional(oNumbers.front());
}

std::string GeoKeyList::GetText(std::uint16_t nKey) const
{
    constexpr std::string_view SEPARATORS(" \t\r\n|\0", 6);
    const auto* const pText = Find<std::string>(nKey);
    const auto nFirst = pText == nullptr ? std::string::npos : pText->find_first_not_of(SEPARATORS);
    if (nFirst == std::string::npos)
        return {};
    const std::string text = pText->substr(nFirst, pText->find_last_not_of(SEPARATORS) - nFirst + 1);
    const std::basic_string<XMLCh> wide = XmlTranscode(text); // bytes that are no UTF-8 become replacement characters
    return XmlTranscode(wide.data(), wide.size());
}

void GeoKeyList::Store(GeoTags& oTags) const
{
    oTags.moKeys.clear();
    oTags.moDoubles.clear();
    oTags.moTexts.clear();
    if (moKeys.empty())
        return;
    const auto Add = [&oTags](std::uint16_t nTag, std::size_t nCount, std::size_t nValue)
    {
        oTags.moKeys.insert(oTags.moKeys.end(),
                            {nTag, static_cast<std::uint16_t>(nCount), static_cast<std::uint16_t>(nValue)});
    };
    oTags.moKeys = {VERSION, 1, 0, static_cast<std::uint16_t>(moKeys.size())};
    for (const auto& [nKey, oValue] : moKeys)
    {
        oTags.moKeys.push_back(nKey);
        if (const std::uint16_t* pCode = std::get_if<std::uint16_t>(&oValue))
            Add(0, 1, *pCode);
        else if (const std::vector<double>* pNumbers = std::get_if<std::vector<double>>(&oValue))
        {
            Add(TAG_GEO_DOUBLES, pNumbers->size(), oTags.moDoubles.size());
            oTags.moDoubles.insert(oTags.moDoubles.end(), pNumbers->begin(), pNumbers->end());
        }
        else
        {
            const std::string text = std::get<std::string>(oValue) + TEXT_END;
            Add(TAG_GEO_TEXTS, text.size(), oTags.moTexts.size());
            oTags.moTexts += text;
        }
    }
}

} // namespace krv::plugins::support
