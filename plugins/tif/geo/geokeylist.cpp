#include "plugins/tif/geo/geokeylist.h"

#include <bit>

#include <tiff.h>

namespace krv::plugins::tif
{

namespace
{

constexpr std::uint16_t TAG_KEYS = 34735;
constexpr std::uint16_t TAG_DOUBLES = 34736;
constexpr std::uint16_t TAG_TEXTS = 34737;
constexpr std::size_t ENTRY_VALUES = 4;
// Texts are stored one behind the other, each with this at its end.
constexpr char TEXT_END = '|';

std::vector<double> ReadDoubles(const TagList& oTags)
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
    GeoKeyList oList;
    const std::vector<std::uint64_t> oShorts = oTags.GetNumbers(TAG_KEYS);
    const std::vector<double> oDoubles = ReadDoubles(oTags);
    const std::string texts = oTags.GetText(TAG_TEXTS);
    for (std::size_t nAt = ENTRY_VALUES; nAt + ENTRY_VALUES <= oShorts.size(); nAt += ENTRY_VALUES)
    {
        const auto nKey = static_cast<std::uint16_t>(oShorts[nAt]);
        const std::uint64_t nCount = oShorts[nAt + 2];
        const std::uint64_t nValue = oShorts[nAt + 3];
        if (oShorts[nAt + 1] == 0)
            oList.Set(nKey, static_cast<std::uint16_t>(nValue));
        else if (oShorts[nAt + 1] == TAG_DOUBLES && nValue + nCount <= oDoubles.size())
            oList.Set(nKey, std::vector<double>(oDoubles.begin() + static_cast<std::ptrdiff_t>(nValue),
                                                oDoubles.begin() + static_cast<std::ptrdiff_t>(nValue + nCount)));
        else if (oShorts[nAt + 1] == TAG_TEXTS && nValue + nCount <= texts.size())
        {
            std::string text = texts.substr(nValue, nCount);
            if (text.ends_with(TEXT_END))
                text.pop_back();
            oList.Set(nKey, std::move(text));
        }
        else if (oShorts[nAt + 1] == TAG_KEYS && nCount == 1 && nValue < oShorts.size())
            oList.Set(nKey, static_cast<std::uint16_t>(oShorts[nValue]));
    }
    return oList;
}

std::uint16_t GeoKeyList::GetCode(std::uint16_t nKey, std::uint16_t nDefault) const
{
    const auto oFound = moKeys.find(nKey);
    const std::uint16_t* pCode = oFound == moKeys.end() ? nullptr : std::get_if<std::uint16_t>(&oFound->second);
    return pCode == nullptr ? nDefault : *pCode;
}

void GeoKeyList::Store(TagList& oTags) const
{
    std::vector<std::uint64_t> oShorts = {1, 1, 0, moKeys.size()};
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
