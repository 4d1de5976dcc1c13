#include "plugins/tif/writing/metadataitems.h"

#include "toolkit/xml/xmltree.h"

#include <algorithm>
#include <cstdint>
#include <optional>
#include <string_view>
#include <utility>
#include <vector>

namespace krv::plugins::tif
{

namespace
{

using krv::xml::Element;

constexpr const char* ROOT = "GDALMetadata";
constexpr std::string_view HEX = "0123456789abcdef";

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
    std::size_t nBytes = 1;
    for (std::size_t nAt = 0; nAt < text.size() && nBytes != 0; nAt += nBytes)
        nBytes = CharacterBytes(text, nAt);
    return nBytes != 0;
}

// The text as far as XML can hold it, for programs that know nothing of its bytes: what is no UTF-8 is taken for
// Latin-1.
std::string MakeLikeness(std::string_view text)
{
    std::string likeness;
    for (std::size_t nAt = 0; nAt < text.size();)
    {
        const std::size_t nBytes = CharacterBytes(text, nAt);
        const auto nByte = static_cast<unsigned char>(text[nAt]);
        if (nBytes != 0)
            likeness += text.substr(nAt, nBytes);
        else if (nByte >= 0x80)
            likeness.append({static_cast<char>(0xC0 | nByte >> 6), static_cast<char>(0x80 | (nByte & 0x3F))});
        else
            likeness += '?';
        nAt += std::max<std::size_t>(nBytes, 1);
    }
    return likeness;
}

std::string Escape(std::string_view text, bool bAttribute)
{
    // The last three only where they would end an attribute or become blanks in it.
    constexpr std::pair<char, std::string_view> ESCAPES[] = {{'&', "&amp;"},  {'<', "&lt;"},   {'>', "&gt;"},
                                                             {'\r', "&#13;"}, {'"', "&quot;"}, {'\n', "&#10;"},
                                                             {'\t', "&#9;"}};
    const auto* const pEnd = std::end(ESCAPES) - (bAttribute ? 0 : 3);
    std::string result;
    for (const char nCharacter : text)
    {
        const auto* const pFound =
            std::find_if(std::begin(ESCAPES), pEnd, [&](const auto& oEscape) { return oEscape.first == nCharacter; });
        result += pFound == pEnd ? std::string_view(&nCharacter, 1) : pFound->second;
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
    Element oItem;
    oItem.name = "Item";
    std::string name = oKey.mbDescription ? "DESCRIPTION" : MakeLikeness(oKey.moKey);
    std::string role = oKey.mbDescription ? "description" : "";
    for (const ItemRole& oRole : ROLES)
        if (oKey.mnChannel != 0 && !oKey.mbDescription && IsSameKey(oKey.moKey, oRole.mpKey))
            name = oRole.mpName, role = oRole.mpRole;
    const std::size_t nColon = name.find(':');
    const bool bDomain = nColon != std::string::npos && nColon > 0 && nColon + 1 < name.size();
    SetAttribute(oItem, "name", bDomain ? name.substr(nColon + 1) : name);
    if (bDomain)
        SetAttribute(oItem, "domain", name.substr(0, nColon));
    if (oKey.mnChannel != 0)
        SetAttribute(oItem, "sample", std::to_string(oKey.mnChannel - 1));
    SetAttribute(oItem, "role", role);
    const std::optional<MetadataKey> oSaid = FindItemKey(oItem, oKey.mnChannel);
    if (!oSaid || oSaid->moKey != oKey.moKey)
        oItem.attributes.emplace_back("keyhex", ToHex(oKey.moKey));
    SetText(oItem, value);
    return oItem;
}

} // namespace

std::string EditItems(const std::string& text, const std::map<MetadataKey, std::string>& oWanted,
                      unsigned int nChannels)
{
    Element oRoot;
    oRoot.name = ROOT;
    if (!text.empty())
        oRoot = krv::xml::ParseTree(text.data(), text.size(), "tag 42112");
    std::map<MetadataKey, std::string> oMissing = oWanted;
    std::erase_if(oMissing, [](const auto& oPair) { return oPair.second.empty(); });
    std::vector<Element> oKept;
    for (Element& oItem : oRoot.children)
    {
        const std::optional<MetadataKey> oKey = FindItemKey(oItem, nChannels);
        if (!oKey || !oWanted.contains(*oKey))
        {
            oKept.push_back(std::move(oItem));
            continue;
        }
        const auto oFound = oMissing.find(*oKey);
        if (oFound == oMissing.end())
            continue;
        if (oFound->first.moKey == oKey->moKey)
            SetText(oItem, oFound->second);
        else
            oItem = MakeItem(oFound->first, oFound->second);
        oKept.push_back(std::move(oItem));
        oMissing.erase(oFound);
    }
    for (const auto& [oKey, value] : oMissing)
        oKept.push_back(MakeItem(oKey, value));
    oRoot.children = std::move(oKept);
    if (oRoot.children.empty() && oRoot.name == ROOT)
        return {};
    std::string result;
    Append(result, oRoot);
    return result;
}

} // namespace krv::plugins::tif
