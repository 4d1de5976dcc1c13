#include "plugins/tif/writing/metadataitems.h"

#include "plugins/tif/metadata.h"
#include "toolkit/xml/xmltree.h"

#include <cstdint>
#include <string_view>
#include <vector>

namespace krv::plugins::tif
{

const std::string DESCRIPTION_KEY = "\nDescription";

namespace
{

using krv::datasources::AuxiliaryData;
using krv::xml::Element;

constexpr const char* ROOT = "GDALMetadata";
constexpr std::string_view HEX = "0123456789abcdef";

struct Role
{
    const char* mpKey;
    const char* mpName;
    const char* mpRole;
};

constexpr Role ROLES[] = {{"Scale", "SCALE", "scale"},
                          {"Offset", "OFFSET", "offset"},
                          {"UnitType", "UNITTYPE", "unittype"},
                          {"ColorInterp", "COLORINTERP", "colorinterp"},
                          {"\nDescription", "DESCRIPTION", "description"}};

// Length of the character of UTF-8 at a place; 0 when there is none that XML takes.
std::size_t CharacterBytes(std::string_view text, std::size_t nAt)
{
    const auto nFirst = static_cast<unsigned char>(text[nAt]);
    if (nFirst < 0x80)
        return nFirst >= 0x20 || nFirst == '\t' || nFirst == '\n' || nFirst == '\r' ? 1 : 0;
    const std::size_t nBytes = nFirst >= 0xF0 ? 4 : nFirst >= 0xE0 ? 3 : 2;
    if (nFirst < 0xC2 || nFirst > 0xF4 || nAt + nBytes > text.size())
        return 0;
    std::uint32_t nCode = nFirst & (0x7Fu >> nBytes);
    for (std::size_t nNext = 1; nNext < nBytes; ++nNext)
    {
        const auto nByte = static_cast<unsigned char>(text[nAt + nNext]);
        if ((nByte & 0xC0) != 0x80)
            return 0;
        nCode = nCode << 6 | (nByte & 0x3Fu);
    }
    const bool bOverlong = (nBytes == 3 && nCode < 0x800) || (nBytes == 4 && nCode < 0x10000);
    const bool bAllowed = nCode <= 0x10FFFF && (nCode < 0xD800 || nCode > 0xDFFF) && nCode != 0xFFFE && nCode != 0xFFFF;
    return bAllowed && !bOverlong ? nBytes : 0;
}

bool IsXmlText(std::string_view text)
{
    for (std::size_t nAt = 0; nAt < text.size();)
    {
        const std::size_t nBytes = CharacterBytes(text, nAt);
        if (nBytes == 0)
            return false;
        nAt += nBytes;
    }
    return true;
}

std::string Escape(std::string_view text, bool bAttribute)
{
    std::string result;
    for (const char nCharacter : text)
        switch (nCharacter)
        {
        case '&':
            result += "&amp;";
            break;
        case '<':
            result += "&lt;";
            break;
        case '>':
            result += "&gt;";
            break;
        case '\r':
            result += "&#13;";
            break;
        case '"':
            result += bAttribute ? "&quot;" : "\"";
            break;
        case '\n':
            result += bAttribute ? "&#10;" : "\n";
            break;
        case '\t':
            result += bAttribute ? "&#9;" : "\t";
            break;
        default:
            result += nCharacter;
        }
    return result;
}

void Append(std::string& text, const Element& oElement)
{
    text += "<" + oElement.name;
    for (const auto& [name, value] : oElement.attributes)
        text += " " + name + "=\"" + Escape(value, true) + "\"";
    text += ">" + Escape(oElement.text, false);
    for (const Element& oChild : oElement.children)
        Append(text, oChild);
    text += "</" + oElement.name + ">";
}

std::string ToHex(const std::string& bytes)
{
    std::string text;
    for (const char nByte : bytes)
    {
        text += HEX[static_cast<unsigned char>(nByte) >> 4];
        text += HEX[static_cast<unsigned char>(nByte) & 15];
    }
    return text;
}

void SetAttribute(Element& oItem, const std::string& name, const std::string& value)
{
    std::erase_if(oItem.attributes, [&name](const auto& oAttribute) { return oAttribute.first == name; });
    if (!value.empty())
        oItem.attributes.emplace_back(name, value);
}

// What XML cannot hold is written as the hexadecimal digits of its bytes.
void SetText(Element& oItem, const std::string& value)
{
    const bool bText = IsXmlText(value);
    SetAttribute(oItem, "encoding", bText ? "" : "hex");
    oItem.text = bText ? value : ToHex(value);
}

Element MakeItem(const MetadataKey& oKey, const std::string& value)
{
    const auto& [nChannel, key] = oKey;
    Element oItem;
    oItem.name = "Item";
    std::string name = key;
    std::string role;
    for (const Role& oRole : ROLES)
        if (nChannel != 0 && key == oRole.mpKey)
            name = oRole.mpName, role = oRole.mpRole;
    const std::size_t nColon = name.find(':');
    const bool bDomain = nColon != std::string::npos && nColon > 0 && nColon + 1 < name.size();
    SetAttribute(oItem, "name", bDomain ? name.substr(nColon + 1) : name);
    if (bDomain)
        SetAttribute(oItem, "domain", name.substr(0, nColon));
    if (nChannel != 0)
        SetAttribute(oItem, "sample", std::to_string(nChannel - 1));
    SetAttribute(oItem, "role", role);
    SetText(oItem, value);
    return oItem;
}

std::string GetValue(const AuxiliaryData& oData, const MetadataKey& oKey)
{
    if (oKey.first == 0)
        return oData.GetFileMetadataValue(oKey.second);
    return oKey.second == DESCRIPTION_KEY ? oData.GetChannelDescription(oKey.first)
                                          : oData.GetChanMetadataValue(oKey.second, oKey.first);
}

} // namespace

std::string EditItems(const std::string& text, const AuxiliaryData& oNew, const std::set<MetadataKey>& oChanged,
                      const std::set<MetadataKey>& oElsewhere)
{
    Element oRoot;
    oRoot.name = ROOT;
    if (!text.empty())
        oRoot = krv::xml::ParseTree(text.data(), text.size(), "tag 42112");
    std::set<MetadataKey> oMissing = oChanged;
    std::vector<Element> oKept;
    for (Element& oItem : oRoot.children)
    {
        const std::optional<MetadataKey> oKey = FindItemKey(oItem, oNew.GetChannelCount());
        if (!oKey || !oChanged.contains(*oKey))
        {
            oKept.push_back(std::move(oItem));
            continue;
        }
        const std::string value = oElsewhere.contains(*oKey) ? std::string() : GetValue(oNew, *oKey);
        if (value.empty() || oMissing.erase(*oKey) == 0)
            continue;
        SetText(oItem, value);
        oKept.push_back(std::move(oItem));
    }
    for (const MetadataKey& oKey : oMissing)
    {
        const std::string value = oElsewhere.contains(oKey) ? std::string() : GetValue(oNew, oKey);
        if (!value.empty())
            oKept.push_back(MakeItem(oKey, value));
    }
    oRoot.children = std::move(oKept);
    if (oRoot.children.empty() && oRoot.name == ROOT)
        return {};
    std::string result;
    Append(result, oRoot);
    return result;
}

} // namespace krv::plugins::tif
