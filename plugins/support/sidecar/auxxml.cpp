#include "plugins/support/sidecar/auxxml.h"

#include "datasources/metadata/classnames.h"
#include "datasources/metadata/droppedtags.h"
#include "toolkit/core/numbertext.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/xml/xmlwriter.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <map>
#include <sstream>
#include <utility>
#include <vector>

namespace krv::plugins::support
{

using krv::datasources::AuxiliaryData;
using krv::datasources::MetadataMap;
using krv::ogc::cs::GeocodingInfo;
using krv::xml::Element;

namespace
{

constexpr char ROOT[] = "PAMDataset";
constexpr char BAND[] = "PAMRasterBand";
constexpr char HISTOGRAMS[] = "Histograms";
constexpr char METADATA[] = "Metadata";
constexpr char CATEGORIES[] = "CategoryNames";
constexpr char CATEGORY[] = "Category";
constexpr unsigned int MOST_CATEGORIES = 65536;
constexpr char STAMP[] = "WrittenBeside";
constexpr char DESCRIPTION[] = "Description";
constexpr char BLANKS[] = " \t\r\n";
// Elements of a band, and the keys of its channel.
constexpr std::pair<const char*, const char*> VALUES[] = {{"NoDataValue", "NO_DATA_VALUE"},
                                                          {"UnitType", "UnitType"},
                                                          {"Offset", "Offset"},
                                                          {"Scale", "Scale"},
                                                          {"ColorInterp", "ColorInterp"}};
// Tags that repeat how the image's own file is laid out, in the words of another program.
constexpr const char* FOREIGN_DOMAINS[] = {"ENVI", "IMAGE_STRUCTURE", "DERIVED_SUBDATASETS"};

std::string Trim(const std::string& text)
{
    const std::size_t nFirst = text.find_first_not_of(BLANKS);
    return nFirst == std::string::npos ? std::string()
                                       : text.substr(nFirst, text.find_last_not_of(BLANKS) - nFirst + 1);
}

std::string GetAttribute(const Element& oElement, std::string_view name)
{
    const std::string* const poValue = oElement.FindAttribute(name);
    return poValue != nullptr ? *poValue : std::string();
}

// Six numbers between commas.
std::optional<GeocodingInfo> ParseTerms(const std::string& text)
{
    std::istringstream oParts(text);
    std::array<double, 6> aTerms{};
    for (double& nTerm : aTerms)
    {
        std::string part;
        std::getline(oParts, part, ',');
        part = Trim(part);
        const auto oNumber = krv::ParseNumber<double>(std::string_view(part).substr(part.starts_with('+') ? 1 : 0));
        if (!oNumber || !std::isfinite(*oNumber))
            return std::nullopt;
        nTerm = *oNumber;
    }
    const GeocodingInfo oInfo(aTerms[0], aTerms[1], aTerms[2], aTerms[3], aTerms[4], aTerms[5]);
    return oInfo.IsInvertible() ? std::optional(oInfo) : std::nullopt;
}

std::string WriteTerms(const GeocodingInfo& oInfo)
{
    std::string text;
    for (const double nTerm : oInfo.GetTerms())
        text += (text.empty() ? "" : ", ") + krv::NumberText(nTerm);
    return text;
}

Element MakeElement(const std::string& name, const std::string& text)
{
    Element oElement;
    oElement.name = name;
    oElement.text = krv::xml::MakeXmlText(text);
    return oElement;
}

// A key with its domain apart; the colon of one that no domain can be is the key's own.
std::pair<std::string, std::string> SplitKey(const std::string& key)
{
    const std::size_t nColon = key.find(':');
    if (nColon == std::string::npos || nColon == 0 || nColon + 1 == key.size())
        return {"", key};
    return {key.substr(0, nColon), key.substr(nColon + 1)};
}

void AppendMetadata(const MetadataMap& oMap, Element& oParent)
{
    std::map<std::string, Element> oDomains;
    for (const auto& [key, value] : oMap)
    {
        const auto [domain, name] = SplitKey(key);
        Element oItem = MakeElement("MDI", value);
        oItem.attributes.emplace_back("key", krv::xml::MakeXmlText(name));
        Element& oDomain = oDomains[domain];
        oDomain.name = METADATA;
        oDomain.children.push_back(std::move(oItem));
    }
    for (auto& [domain, oElement] : oDomains)
    {
        if (!domain.empty())
            oElement.attributes.emplace_back("domain", krv::xml::MakeXmlText(domain));
        oParent.children.push_back(std::move(oElement));
    }
}

// Takes the names of classes out of a map: a list of them all from value 0, with empty ones between.
void MoveCategories(MetadataMap& oMap, Element& oBand)
{
    std::map<unsigned int, std::string> oNames;
    for (const auto& [key, name] : oMap)
        if (const auto oValue = krv::datasources::ParseClassNameKey(key); oValue && *oValue < MOST_CATEGORIES)
            oNames[*oValue] = name;
    if (oNames.empty())
        return;
    Element oList = MakeElement(CATEGORIES, "");
    oList.children.resize(oNames.rbegin()->first + 1, MakeElement(CATEGORY, ""));
    for (const auto& [nValue, name] : oNames)
    {
        oList.children[nValue].text = krv::xml::MakeXmlText(name);
        oMap.erase(krv::datasources::MakeClassNameKey(nValue));
    }
    oBand.children.push_back(std::move(oList));
}

bool IsForeign(const std::string& domain)
{
    return std::any_of(std::begin(FOREIGN_DOMAINS), std::end(FOREIGN_DOMAINS),
                       [&domain](const char* pOne) { return domain == pOne; });
}

} // namespace

AuxXml::AuxXml(unsigned int nChannels) : moTags(nChannels)
{
    moRoot.name = ROOT;
}

AuxXml::AuxXml(const std::string& text, const std::string& name, unsigned int nChannels) : AuxXml(nChannels)
{
    Element oRoot = krv::xml::ParseTree(text.data(), text.size(), name);
    if (oRoot.name != ROOT)
        throw DataException(name + ": the root is " + oRoot.name + ", not " + ROOT);
    moRoot.attributes = std::move(oRoot.attributes);
    for (Element& oChild : oRoot.children)
    {
        if (oChild.name == "SRS")
            moCRS = Trim(oChild.text);
        else if (oChild.name == "GeoTransform")
            moGeocoding = ParseTerms(oChild.text);
        else if (oChild.name == METADATA && !IsForeign(GetAttribute(oChild, "domain")) &&
                 GetAttribute(oChild, "format").empty())
            ReadMetadata(oChild, 0);
        else if (oChild.name == BAND)
            ReadBand(oChild);
        else if (oChild.name == STAMP)
            moStamp = Stamp{krv::ParseNumber<std::uint64_t>(GetAttribute(oChild, "bytes")).value_or(0),
                            krv::ParseNumber<std::int64_t>(GetAttribute(oChild, "time")).value_or(0)};
        else
            moRoot.children.push_back(std::move(oChild));
    }
}

void AuxXml::ReadMetadata(const Element& oElement, unsigned int nChannel)
{
    const std::string domain = GetAttribute(oElement, "domain");
    for (const Element& oItem : oElement.children)
    {
        const std::string name = GetAttribute(oItem, "key");
        if (oItem.name != "MDI" || name.empty())
            continue;
        const std::string key = domain.empty() ? name : domain + ":" + name;
        if (nChannel == 0)
            moTags.SetFileMetadataValue(key, oItem.text);
        else
            moTags.SetChanMetadataValue(key, oItem.text, nChannel);
    }
}

void AuxXml::ReadBand(const Element& oBand)
{
    const unsigned int nChannel = krv::ParseNumber<unsigned int>(GetAttribute(oBand, "band")).value_or(0);
    if (nChannel == 0 || nChannel > moTags.GetChannelCount())
        return moRoot.children.push_back(oBand);
    Element oRest;
    oRest.name = BAND;
    oRest.attributes = oBand.attributes;
    for (const Element& oChild : oBand.children)
    {
        const auto* const pValue = std::find_if(std::begin(VALUES), std::end(VALUES),
                                                [&oChild](const auto& oOne) { return oChild.name == oOne.first; });
        if (pValue != std::end(VALUES))
            moTags.SetChanMetadataValue(pValue->second, Trim(oChild.text), nChannel);
        else if (oChild.name == DESCRIPTION)
            moTags.SetChannelDescription(oChild.text, nChannel);
        else if (oChild.name == METADATA && !IsForeign(GetAttribute(oChild, "domain")))
            ReadMetadata(oChild, nChannel);
        else if (oChild.name == CATEGORIES)
            ReadCategories(oChild, nChannel);
        else
            oRest.children.push_back(oChild);
    }
    if (!oRest.children.empty())
        moRoot.children.push_back(std::move(oRest));
}

void AuxXml::SetTags(const krv::datasources::AuxiliaryData& oTags)
{
    krv::datasources::AuxiliaryData oNew = oTags;
    krv::datasources::DropRemoved(oNew, moTags);
    moTags = std::move(oNew);
}

void AuxXml::ReadCategories(const Element& oList, unsigned int nChannel)
{
    unsigned int nValue = 0;
    for (const Element& oItem : oList.children)
    {
        if (oItem.name != CATEGORY || nValue >= MOST_CATEGORIES)
            continue;
        if (const std::string name = Trim(oItem.text); !name.empty())
            moTags.SetChanMetadataValue(krv::datasources::MakeClassNameKey(nValue), name, nChannel);
        ++nValue;
    }
}

bool AuxXml::DropStatistics()
{
    bool bAny = krv::datasources::DropStatistics(moTags);
    const auto IsHistograms = [](const Element& oOne)
    {
        return oOne.name == HISTOGRAMS;
    };
    for (Element& oBand : moRoot.children)
        if (oBand.name == BAND && std::erase_if(oBand.children, IsHistograms) > 0)
            bAny = true;
    std::erase_if(moRoot.children, [](const Element& oOne) { return oOne.name == BAND && oOne.children.empty(); });
    return bAny;
}

bool AuxXml::IsEmpty() const
{
    bool bEmpty = moRoot.children.empty() && moCRS.empty() && !moGeocoding && moTags.GetFileMetadata().empty();
    for (unsigned int nChannel = 1; bEmpty && nChannel <= moTags.GetChannelCount(); ++nChannel)
        bEmpty = moTags.GetChanMetadata(nChannel).empty() && moTags.GetChannelDescription(nChannel).empty();
    return bEmpty;
}

std::string AuxXml::Write() const
{
    Element oRoot = moRoot;
    if (!moCRS.empty())
        oRoot.children.push_back(MakeElement("SRS", moCRS));
    if (moGeocoding)
        oRoot.children.push_back(MakeElement("GeoTransform", WriteTerms(*moGeocoding)));
    AppendMetadata(moTags.GetFileMetadata(), oRoot);
    for (unsigned int nChannel = 1; nChannel <= moTags.GetChannelCount(); ++nChannel)
    {
        MetadataMap oMap = moTags.GetChanMetadata(nChannel);
        const std::string number = std::to_string(nChannel), description = moTags.GetChannelDescription(nChannel);
        const auto oFound = std::find_if(oRoot.children.begin(), oRoot.children.end(),
                                         [&number](const Element& oOne)
                                         { return oOne.name == BAND && GetAttribute(oOne, "band") == number; });
        if (oMap.empty() && description.empty())
            continue;
        Element oNew = MakeElement(BAND, "");
        oNew.attributes.emplace_back("band", number);
        Element& oBand = oFound == oRoot.children.end() ? oNew : *oFound;
        if (!description.empty())
            oBand.children.push_back(MakeElement(DESCRIPTION, description));
        for (const auto& [pElement, pKey] : VALUES)
            if (const auto oValue = oMap.find(pKey); oValue != oMap.end())
            {
                oBand.children.push_back(MakeElement(pElement, oValue->second));
                oMap.erase(oValue);
            }
        MoveCategories(oMap, oBand);
        AppendMetadata(oMap, oBand);
        if (oFound == oRoot.children.end())
            oRoot.children.push_back(std::move(oNew));
    }
    if (moStamp)
    {
        Element oStamp = MakeElement(STAMP, "");
        oStamp.attributes = {{"bytes", std::to_string(moStamp->mnBytes)}, {"time", std::to_string(moStamp->mnTime)}};
        oRoot.children.push_back(std::move(oStamp));
    }
    return krv::xml::WriteTree(oRoot);
}

} // namespace krv::plugins::support
