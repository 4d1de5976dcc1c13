#include "plugins/tif/writing/metadataitems.h"

#include "toolkit/xml/xmltree.h"
#include "toolkit/xml/xmlwriter.h"

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
    const bool bText = krv::xml::IsXmlText(value);
    SetAttribute(oItem, "encoding", bText ? "" : "hex");
    oItem.text = bText ? value : ToHex(value);
}

Element MakeItem(const MetadataKey& oKey, const std::string& value)
{
    Element oItem;
    oItem.name = "Item";
    std::string name = oKey.mbDescription ? "DESCRIPTION" : krv::xml::MakeXmlText(oKey.moKey);
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
    return krv::xml::WriteTree(oRoot);
}

} // namespace krv::plugins::tif
