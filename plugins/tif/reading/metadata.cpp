#include "plugins/tif/reading/metadata.h"

#include "plugins/tif/geo/geokeys.h"
#include "plugins/tif/reading/tiffvalues.h"
#include "toolkit/core/numbertext.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/mathmodel/rpccoefficients.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/xml/xmltree.h"

#include <algorithm>
#include <charconv>
#include <map>
#include <string_view>
#include <utility>

namespace krv::plugins::tif
{

namespace
{

using krv::datasources::AuxiliaryData;

constexpr std::uint32_t TAG_GEO_KEYS = 34735;

void SetText(AuxiliaryData& oData, const char* pKey, const std::string& text)
{
    if (!text.empty())
        oData.SetFileMetadataValue(pKey, text);
}

void ReadBaseline(TIFF* poTiff, AuxiliaryData& oData)
{
    for (const auto& [pKey, nTag] : TEXTS)
    {
        const std::string text = ReadText(poTiff, nTag);
        if (nTag != TIFFTAG_XMLPACKET || text.size() <= MAXIMUM_XMP_BYTES)
            SetText(oData, pKey, text);
    }
}

void ReadResolution(TIFF* poTiff, AuxiliaryData& oData)
{
    bool bAny = false;
    // libtiff keeps one mark for both: it says 0 of the one that is not there, and 0 says nothing.
    const auto SetResolution = [&](const char* pKey, std::uint32_t nTag)
    {
        float nResolution = 0;
        if (TIFFGetField(poTiff, nTag, &nResolution) != 1 || nResolution == 0)
            return;
        SetText(oData, pKey, NumberText(nResolution));
        bAny = true;
    };
    SetResolution("XResolution", TIFFTAG_XRESOLUTION);
    SetResolution("YResolution", TIFFTAG_YRESOLUTION);
    std::uint16_t nUnit = 0;
    if (bAny && TIFFGetFieldDefaulted(poTiff, TIFFTAG_RESOLUTIONUNIT, &nUnit) == 1 &&
        nUnit < std::size(RESOLUTION_UNITS))
        SetText(oData, "ResolutionUnit", RESOLUTION_UNITS[nUnit]);
    std::uint16_t nOrientation = ORIENTATION_TOPLEFT;
    if (TIFFGetField(poTiff, TIFFTAG_ORIENTATION, &nOrientation) == 1 && nOrientation != ORIENTATION_TOPLEFT)
        SetText(oData, "Orientation", std::to_string(nOrientation));
}

const char* PhotometricText(std::uint16_t nPhotometric)
{
    constexpr std::pair<std::uint16_t, const char*> NAMES[] = {
        {PHOTOMETRIC_MINISWHITE, "MinIsWhite"},
        {PHOTOMETRIC_MASK, "Mask"},
        {PHOTOMETRIC_SEPARATED, "Separated"},
        {PHOTOMETRIC_CIELAB, "CIELab"},
        {PHOTOMETRIC_ICCLAB, "ICCLab"},
        {PHOTOMETRIC_ITULAB, "ITULab"},
        {PHOTOMETRIC_CFA, "CFA"},
    };
    for (const auto& [nNumber, pName] : NAMES)
        if (nNumber == nPhotometric)
            return pName;
    return "";
}

void ReadGeography(TIFF* poTiff, AuxiliaryData& oData)
{
    if (!ReadShorts(poTiff, TAG_GEO_KEYS).empty())
        SetText(oData, "RasterType", IsPixelPoint(poTiff) ? "Point" : "Area");
    const std::vector<double> oRpc = ReadDoubles(poTiff, TAG_RPC);
    if (krv::mathmodel::RpcCoefficients::Values oValues{}; oRpc.size() == oValues.size())
    {
        std::copy(oRpc.begin(), oRpc.end(), oValues.begin());
        SetText(oData, "RPC", krv::mathmodel::RpcCoefficients::FromValues(oValues).GetText());
    }

    krv::ogc::cs::GeocodingInfo oInfo;
    if (ReadGeocoding(poTiff, oInfo))
        return;
    std::string points;
    for (const TiePoint& oPoint : ReadTiePoints(poTiff))
        points += (points.empty() ? "" : "; ") + NumberText(oPoint.column) + " " + NumberText(oPoint.row) + " " +
                  NumberText(oPoint.x) + " " + NumberText(oPoint.y) + " " + NumberText(oPoint.z);
    SetText(oData, "GroundControlPoints", points);
}

void SetColours(const PageForm& oForm, AuxiliaryData& oData)
{
    constexpr const char* COLOURS[] = {"Red", "Green", "Blue"};
    const auto nColours = static_cast<unsigned int>(oForm.mnChannels - oForm.moExtraSamples.size());
    if (oForm.mnPhotometric == PHOTOMETRIC_RGB || oForm.mnPhotometric == PHOTOMETRIC_YCBCR)
        for (unsigned int nAt = 0; nAt < 3 && nAt < std::max(nColours, 3u) && nAt < oForm.mnChannels; ++nAt)
            oData.SetChanMetadataValue("ColorInterp", COLOURS[nAt], nAt + 1);
    else if (oForm.mnPhotometric == PHOTOMETRIC_PALETTE)
        oData.SetChanMetadataValue("ColorInterp", "Palette", 1);
    else if (oForm.mnPhotometric == PHOTOMETRIC_MINISBLACK || oForm.mnPhotometric == PHOTOMETRIC_MINISWHITE)
        oData.SetChanMetadataValue("ColorInterp", "Gray", 1);
    const int nAlpha = oForm.GetAlphaChannel();
    if (nAlpha < 0)
        return;
    oData.SetChanMetadataValue("ColorInterp", "Alpha", static_cast<unsigned int>(nAlpha) + 1);
    oData.SetChanMetadataValue("AlphaKind", oForm.IsPremultiplied() ? "Premultiplied" : "Straight",
                               static_cast<unsigned int>(nAlpha) + 1);
}

std::string Attribute(const krv::xml::Element& oElement, std::string_view name)
{
    const std::string* pValue = oElement.FindAttribute(name);
    return pValue == nullptr ? std::string() : *pValue;
}

// Channel numbers count from 1 here; 0 means the file, no value a number that makes no sense.
std::optional<unsigned int> ItemChannel(const krv::xml::Element& oItem, unsigned int nChannels)
{
    const std::string* pSample = oItem.FindAttribute("sample");
    if (pSample == nullptr)
        return 0;
    const std::optional<unsigned int> oSample = ParseNumber<unsigned int>(*pSample);
    return oSample && *oSample < nChannels ? std::optional(*oSample + 1) : std::nullopt;
}

std::string ItemKey(const krv::xml::Element& oItem)
{
    const std::string role = Attribute(oItem, "role");
    for (const ItemRole& oRole : ROLES)
        if (role == oRole.mpRole && oItem.FindAttribute("sample") != nullptr)
            return oRole.mpKey;
    const std::string domain = Attribute(oItem, "domain");
    const std::string name = Attribute(oItem, "name");
    return domain.empty() || name.empty() ? name : domain + ":" + name;
}

// No value for what are no such digits.
std::optional<std::string> FromHex(std::string_view digits)
{
    std::string bytes(digits.size() / 2, '\0');
    for (std::size_t nAt = 0; nAt < bytes.size(); ++nAt)
    {
        unsigned char nByte = 0;
        const char* const pEnd = digits.data() + 2 * nAt + 2;
        if (std::from_chars(pEnd - 2, pEnd, nByte, 16).ptr != pEnd)
            return std::nullopt;
        bytes[nAt] = static_cast<char>(nByte);
    }
    return digits.size() % 2 == 0 ? std::optional(bytes) : std::nullopt;
}

// The item's key and its letter case take the place of what other tags say.
void Put(krv::datasources::MetadataMap& oMap, const std::string& key, const std::string& value)
{
    const auto oFound = oMap.find(key);
    if (oFound != oMap.end() && oFound->first != key)
        oMap.erase(oFound);
    oMap[key] = value;
}

void ReadItems(TIFF* poTiff, AuxiliaryData& oData, std::string* pTrouble)
{
    const std::string text = ReadText(poTiff, TAG_METADATA);
    if (text.empty())
        return;
    krv::xml::Element oRoot;
    try
    {
        oRoot = krv::xml::ParseTree(text.data(), text.size(), "tag 42112");
    }
    catch (const krv::DataException& oException)
    {
        // Nothing is lost when another program wrote something else there.
        if (pTrouble != nullptr)
            *pTrouble = "tag 42112 (metadata, descriptions, states of levels) cannot be read: " +
                        std::string(oException.what());
        return SetText(oData, "MetadataXML", text);
    }
    std::map<unsigned int, krv::datasources::MetadataMap> oMaps;
    for (const krv::xml::Element& oItem : oRoot.children)
    {
        const std::optional<MetadataKey> oKey = FindItemKey(oItem, oData.GetChannelCount());
        if (!oKey)
            continue;
        const unsigned int nChannel = oKey->mnChannel;
        const auto oBytes = Attribute(oItem, "encoding") == "hex" ? FromHex(oItem.text) : std::nullopt;
        const std::string& value = oBytes ? *oBytes : oItem.text;
        if (oKey->mbDescription)
            oData.SetChannelDescription(value, nChannel);
        else
            Put(oMaps.try_emplace(nChannel, nChannel == 0 ? oData.GetFileMetadata() : oData.GetChanMetadata(nChannel))
                    .first->second,
                oKey->moKey, value);
    }
    for (const auto& [nChannel, oMap] : oMaps)
        if (nChannel == 0)
            oData.SetFileMetadata(oMap);
        else
            oData.SetChanMetadata(oMap, nChannel);
}

} // namespace

bool MetadataKey::operator<(const MetadataKey& oOther) const
{
    if (mnChannel != oOther.mnChannel || mbDescription != oOther.mbDescription)
        return std::pair(mnChannel, mbDescription) < std::pair(oOther.mnChannel, oOther.mbDescription);
    return krv::datasources::detail::CaseInsensitiveCompare()(moKey, oOther.moKey);
}

bool IsSameKey(const std::string& first, const std::string& second)
{
    const krv::datasources::detail::CaseInsensitiveCompare oLess;
    return !oLess(first, second) && !oLess(second, first);
}

std::optional<MetadataKey> FindItemKey(const krv::xml::Element& oItem, unsigned int nChannels)
{
    const std::optional<unsigned int> oChannel = ItemChannel(oItem, nChannels);
    if (oItem.name != "Item" || !oChannel)
        return std::nullopt;
    const std::string* const pDigits = oItem.FindAttribute("keyhex");
    if (const auto oBytes = pDigits != nullptr ? FromHex(*pDigits) : std::nullopt)
        return MetadataKey{*oChannel, *oBytes};
    const std::string key = ItemKey(oItem);
    if (key.empty())
        return std::nullopt;
    if (*oChannel != 0 && Attribute(oItem, "role") == "description")
        return MetadataKey{*oChannel, {}, true};
    return MetadataKey{*oChannel, key};
}

std::string WhyNoItems(const std::string& text)
{
    try
    {
        krv::xml::ParseTree(text.data(), text.size(), "tag 42112");
        return {};
    }
    catch (const krv::DataException& oException)
    {
        return oException.what();
    }
}

AuxiliaryData ReadMetadata(Page& oPage, std::string* pTrouble)
{
    TIFF* poTiff = oPage.GetTiff();
    AuxiliaryData oData(oPage.GetForm().mnChannels);
    SetColours(oPage.GetForm(), oData);
    ReadBaseline(poTiff, oData);
    ReadResolution(poTiff, oData);
    SetText(oData, "Photometric", PhotometricText(oPage.GetForm().mnPhotometric));
    ReadGeography(poTiff, oData);
    ReadItems(poTiff, oData, pTrouble);
    return oData;
}

} // namespace krv::plugins::tif
