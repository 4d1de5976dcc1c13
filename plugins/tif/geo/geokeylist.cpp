#include "plugins/tif/geo/geokeylist.h"

#include "plugins/tif/reading/tiffvalues.h"
#include "toolkit/xml/xmlutil.h"

#include <algorithm>
#include <bit>
#include <string_view>

#include <geotiff.h>
#include <geovalues.h>

namespace krv::plugins::tif
{

namespace
{

constexpr std::uint16_t TAG_KEYS = 34735;
constexpr std::uint16_t TAG_DOUBLES = 34736;
constexpr std::uint16_t TAG_TEXTS = 34737;
constexpr std::uint16_t VERSION = 1;
// Of a key: itself, the tag of its values or 0, their number, their place or the value.
constexpr std::size_t ENTRY_VALUES = 4;
// Texts are stored one behind the other, each with this at its end.
constexpr char TEXT_END = '|';

std::vector<double> GetDoubles(const TagList& oTags)
{
    std::vector<double> oDoubles;
    const Tag* pTag = oTags.Find(TAG_DOUBLES);
    for (std::size_t nAt = 0; pTag != nullptr && pTag->mnType == TIFF_DOUBLE && nAt + 8 <= pTag->moBytes.size();
         nAt += 8)
        oDoubles.push_back(std::bit_cast<double>(ReadNumber(pTag->moBytes.data() + nAt, 8, oTags.IsBigEndian())));
    return oDoubles;
}

} // namespace

GeoKeyList GeoKeyList::From(const TagList& oTags)
{
    const std::vector<std::uint64_t> oNumbers = oTags.GetNumbers(TAG_KEYS);
    std::vector<std::uint16_t> oShorts(oNumbers.size());
    std::transform(oNumbers.begin(), oNumbers.end(), oShorts.begin(),
                   [](std::uint64_t nNumber) { return static_cast<std::uint16_t>(nNumber); });
    return Parse(oShorts, GetDoubles(oTags), oTags.GetText(TAG_TEXTS), nullptr);
}

GeoKeyList GeoKeyList::From(TIFF* poTiff, std::string* pDamage)
{
    return Parse(ReadShorts(poTiff, TAG_KEYS), ReadDoubles(poTiff, TAG_DOUBLES), ReadText(poTiff, TAG_TEXTS), pDamage);
}

GeoKeyList GeoKeyList::Parse(const std::vector<std::uint16_t>& oShorts, const std::vector<double>& oDoubles,
                             const std::string& texts, std::string* pDamage)
{
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
        case TAG_DOUBLES:
            if (Expect(Holds(oDoubles.size()), key + " points outside the list of numbers"))
                oList.Set(nKey, std::vector<double>(oDoubles.data() + nValue, oDoubles.data() + nValue + nCount));
            break;
        case TAG_KEYS:
            if (Expect(Holds(oShorts.size()), key + " points outside the directory"))
                oList.Set(nKey, oShorts[nValue]);
            break;
        case TAG_TEXTS:
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

void GeoKeyList::Store(TagList& oTags) const
{
    std::vector<std::uint64_t> oShorts = {VERSION, 1, 0, moKeys.size()};
    std::vector<double> oDoubles;
    std::string texts;
    for (const auto& [nKey, oValue] : moKeys)
    {
        oShorts.push_back(nKey);
        if (const std::uint16_t* pCode = std::get_if<std::uint16_t>(&oValue))
            oShorts.insert(oShorts.end(), {0, 1, *pCode});
        else if (const std::vector<double>* pNumbers = std::get_if<std::vector<double>>(&oValue))
        {
            oShorts.insert(oShorts.end(), {TAG_DOUBLES, pNumbers->size(), oDoubles.size()});
            oDoubles.insert(oDoubles.end(), pNumbers->begin(), pNumbers->end());
        }
        else
        {
            const std::string text = std::get<std::string>(oValue) + TEXT_END;
            oShorts.insert(oShorts.end(), {TAG_TEXTS, text.size(), texts.size()});
            texts += text;
        }
    }
    oTags.Remove(TAG_KEYS);
    oTags.Remove(TAG_DOUBLES);
    oTags.SetText(TAG_TEXTS, texts);
    if (moKeys.empty())
        return;
    oTags.SetNumbers(TAG_KEYS, TIFF_SHORT, oShorts);
    if (!oDoubles.empty())
        oTags.SetDoubles(TAG_DOUBLES, oDoubles);
}

} // namespace krv::plugins::tif
