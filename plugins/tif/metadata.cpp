#include "plugins/tif/metadata.h"

#include "plugins/tif/geokeydirectory.h"
#include "plugins/tif/geokeys.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/xml/xmltree.h"

#include <array>
#include <charconv>
#include <cstring>
#include <string_view>

namespace krv::plugins::tif
{

namespace
{

using krv::datasources::AuxiliaryData;

constexpr std::uint32_t TAG_METADATA = 42112;
constexpr std::uint32_t TAG_NO_DATA = 42113;
constexpr std::uint32_t TAG_RPC = 50844;
constexpr std::uint32_t TAG_GEO_KEYS = 34735;
constexpr std::size_t RPC_VALUES = 92;
constexpr std::size_t MAXIMUM_XMP_BYTES = std::size_t{1} << 20;

void SetText(AuxiliaryData& oData, const char* pKey, const std::string& text)
{
    if (!text.empty())
        oData.SetFileMetadataValue(pKey, text);
}

void ReadBaseline(TIFF* poTiff, AuxiliaryData& oData)
{
    constexpr std::pair<std::uint32_t, const char*> TEXTS[] = {
        {TIFFTAG_IMAGEDESCRIPTION, "ImageDescription"},
        {TIFFTAG_DOCUMENTNAME, "DocumentName"},
        {TIFFTAG_PAGENAME, "PageName"},
        {TIFFTAG_MAKE, "Make"},
        {TIFFTAG_MODEL, "Model"},
        {TIFFTAG_SOFTWARE, "Software"},
        {TIFFTAG_DATETIME, "DateTime"},
        {TIFFTAG_ARTIST, "Artist"},
        {TIFFTAG_HOSTCOMPUTER, "HostComputer"},
        {TIFFTAG_COPYRIGHT, "Copyright"},
    };
    for (const auto& [nTag, pKey] : TEXTS)
        SetText(oData, pKey, ReadText(poTiff, nTag));
    const std::string xmp = ReadText(poTiff, TIFFTAG_XMLPACKET);
    if (xmp.size() <= MAXIMUM_XMP_BYTES)
        SetText(oData, "XMP", xmp);
    SetText(oData, "NO_DATA_VALUE", ReadText(poTiff, TAG_NO_DATA));
}

void ReadResolution(TIFF* poTiff, AuxiliaryData& oData)
{
    constexpr const char* UNITS[] = {"", "none", "inch", "centimetre"};
    float nResolution = 0;
    bool bAny = false;
    if (TIFFGetField(poTiff, TIFFTAG_XRESOLUTION, &nResolution) == 1)
        SetText(oData, "XResolution", NumberText(nResolution)), bAny = true;
    if (TIFFGetField(poTiff, TIFFTAG_YRESOLUTION, &nResolution) == 1)
        SetText(oData, "YResolution", NumberText(nResolution)), bAny = true;
    std::uint16_t nUnit = 0;
    if (bAny && TIFFGetFieldDefaulted(poTiff, TIFFTAG_RESOLUTIONUNIT, &nUnit) == 1 && nUnit < std::size(UNITS))
        SetText(oData, "ResolutionUnit", UNITS[nUnit]);
    std::uint16_t nOrientation = ORIENTATION_TOPLEFT;
    if (TIFFGetField(poTiff, TIFFTAG_ORIENTATION, &nOrientation) == 1 && nOrientation != ORIENTATION_TOPLEFT)
        SetText(oData, "Orientation", std::to_string(nOrientation));
}

const char* PhotometricText(std::uint16_t nPhotometric)
{
    switch (nPhotometric)
    {
    case PHOTOMETRIC_MINISWHITE:
        return "MinIsWhite";
    case PHOTOMETRIC_MASK:
        return "Mask";
    case PHOTOMETRIC_SEPARATED:
        return "Separated";
    case PHOTOMETRIC_CIELAB:
        return "CIELab";
    case PHOTOMETRIC_ICCLAB:
        return "ICCLab";
    case PHOTOMETRIC_ITULAB:
        return "ITULab";
    case PHOTOMETRIC_CFA:
        return "CFA";
    default:
        return "";
    }
}

void ReadGeography(TIFF* poTiff, AuxiliaryData& oData)
{
    if (!ReadShorts(poTiff, TAG_GEO_KEYS).empty())
        SetText(oData, "RasterType", IsPixelPoint(poTiff) ? "Point" : "Area");
    const std::vector<double> oRpc = ReadDoubles(poTiff, TAG_RPC);
    std::string text;
    for (std::size_t nAt = 0; oRpc.size() == RPC_VALUES && nAt < RPC_VALUES; ++nAt)
        text += (nAt == 0 ? "" : " ") + NumberText(oRpc[nAt]);
    SetText(oData, "RPC", text);

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
    unsigned int nSample = 0;
    const char* pEnd = pSample->data() + pSample->size();
    const auto oResult = std::from_chars(pSample->data(), pEnd, nSample);
    if (oResult.ec != std::errc() || oResult.ptr != pEnd || nSample >= nChannels)
        return std::nullopt;
    return nSample + 1;
}

std::string ItemKey(const krv::xml::Element& oItem)
{
    constexpr std::pair<std::string_view, const char*> ROLES[] = {
        {"scale", "Scale"}, {"offset", "Offset"}, {"unittype", "UnitType"}, {"colorinterp", "ColorInterp"}};
    const std::string role = Attribute(oItem, "role");
    for (const auto& [name, pKey] : ROLES)
        if (role == name && oItem.FindAttribute("sample") != nullptr)
            return pKey;
    const std::string domain = Attribute(oItem, "domain");
    const std::string name = Attribute(oItem, "name");
    return domain.empty() || name.empty() ? name : domain + ":" + name;
}

std::string FromHex(const std::string& text)
{
    const auto Digit = [](char nDigit)
    {
        const std::size_t nAt = std::string_view("0123456789abcdef").find(nDigit);
        return nAt == std::string_view::npos ? 0u : static_cast<unsigned int>(nAt);
    };
    std::string bytes;
    for (std::size_t nAt = 0; nAt + 1 < text.size(); nAt += 2)
        bytes += static_cast<char>(Digit(text[nAt]) << 4 | Digit(text[nAt + 1]));
    return bytes;
}

void ReadItems(TIFF* poTiff, AuxiliaryData& oData)
{
    const std::string text = ReadText(poTiff, TAG_METADATA);
    if (text.empty())
        return;
    krv::xml::Element oRoot;
    try
    {
        oRoot = krv::xml::ParseTree(text.data(), text.size(), std::string(TIFFFileName(poTiff)) + ", tag 42112");
    }
    catch (const krv::DataException&)
    {
        // Nothing is lost when another program wrote something else there.
        return SetText(oData, "MetadataXML", text);
    }
    for (const krv::xml::Element& oItem : oRoot.children)
    {
        const auto oKey = FindItemKey(oItem, oData.GetChannelCount());
        if (!oKey)
            continue;
        const auto& [nChannel, key] = *oKey;
        const std::string value = Attribute(oItem, "encoding") == "hex" ? FromHex(oItem.text) : oItem.text;
        if (nChannel == 0)
            oData.SetFileMetadataValue(key, value);
        else if (key == "\nDescription")
            oData.SetChannelDescription(value, nChannel);
        else
            oData.SetChanMetadataValue(key, value, nChannel);
    }
}

} // namespace

std::string NumberText(double nValue)
{
    std::array<char, 32> aText;
    const auto oResult = std::to_chars(aText.data(), aText.data() + aText.size(), nValue);
    return std::string(aText.data(), oResult.ptr);
}

std::optional<std::pair<unsigned int, std::string>> FindItemKey(const krv::xml::Element& oItem, unsigned int nChannels)
{
    const std::optional<unsigned int> oChannel = ItemChannel(oItem, nChannels);
    const std::string key = ItemKey(oItem);
    if (oItem.name != "Item" || !oChannel || key.empty())
        return std::nullopt;
    if (*oChannel != 0 && Attribute(oItem, "role") == "description")
        return std::pair(*oChannel, std::string("\nDescription"));
    return std::pair(*oChannel, key);
}

bool IsItemText(const std::string& text)
{
    try
    {
        krv::xml::ParseTree(text.data(), text.size(), "tag 42112");
        return true;
    }
    catch (const krv::DataException&)
    {
        return false;
    }
}

std::string ReadText(TIFF* poTiff, std::uint32_t nTag)
{
    const TIFFField* poField = TIFFFindField(poTiff, nTag, TIFF_ANY);
    if (poField == nullptr)
        return {};
    // A number: for a tag that libtiff does not know it is what the file says, any 16 bits.
    const int nType = static_cast<int>(TIFFFieldDataType(poField));
    if (nType != TIFF_ASCII && nType != TIFF_BYTE && nType != TIFF_UNDEFINED)
        return {};
    const char* pText = nullptr;
    if (TIFFFieldPassCount(poField) == 0)
        return TIFFGetField(poTiff, nTag, &pText) == 1 && pText != nullptr ? std::string(pText) : std::string();
    std::uint32_t nCount = 0;
    std::uint16_t nShortCount = 0;
    const bool bLong = TIFFFieldReadCount(poField) == TIFF_VARIABLE2;
    const int nFound =
        bLong ? TIFFGetField(poTiff, nTag, &nCount, &pText) : TIFFGetField(poTiff, nTag, &nShortCount, &pText);
    if (nFound != 1 || pText == nullptr)
        return {};
    return std::string(pText, strnlen(pText, bLong ? nCount : nShortCount));
}

AuxiliaryData ReadMetadata(Page& oPage)
{
    TIFF* poTiff = oPage.GetTiff();
    AuxiliaryData oData(oPage.GetForm().mnChannels);
    SetColours(oPage.GetForm(), oData);
    ReadBaseline(poTiff, oData);
    ReadResolution(poTiff, oData);
    SetText(oData, "Photometric", PhotometricText(oPage.GetForm().mnPhotometric));
    ReadGeography(poTiff, oData);
    ReadItems(poTiff, oData);
    return oData;
}

} // namespace krv::plugins::tif
