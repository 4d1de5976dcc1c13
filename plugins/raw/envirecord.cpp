#include "plugins/raw/envirecord.h"

#include "datasources/metadata/droppedtags.h"
#include "plugins/raw/rawform.h"
#include "toolkit/core/lettercase.h"
#include "toolkit/core/numbertext.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/ogc/cs/crsfactory.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <set>
#include <tuple>
#include <utility>
#include <vector>

namespace krv::plugins::raw
{

using krv::datasources::AuxiliaryData;
using krv::datasources::MetadataMap;
using krv::ogc::cs::GeocodingInfo;
using krv::ogc::cs::ICRS;

namespace
{

constexpr char MAP_INFO[] = "map info";
constexpr char CRS_TEXT[] = "coordinate system string";
constexpr char NO_DATA_KEY[] = "data ignore value";
constexpr char NO_DATA_TAG[] = "NO_DATA_VALUE";
constexpr char UNITS_KEY[] = "wavelength units";
constexpr char UNITS_TAG[] = "WavelengthUnits";
constexpr char DEFAULT_KEY[] = "default bands";
constexpr const char* DEFAULT_COLOURS[] = {"DefaultRed", "DefaultGreen", "DefaultBlue"};
constexpr char DEFAULT_GREY[] = "DefaultGray";

// Keys whose values belong to the channels one by one, and the channels' tags.
constexpr std::pair<const char*, const char*> LISTS[] = {
    {"wavelength", "Wavelength"}, {"fwhm", "FWHM"}, {"data gain values", "Scale"}, {"data offset values", "Offset"}};
constexpr char NAMES_KEY[] = "band names";
constexpr char DESCRIPTION_KEY[] = "description";
constexpr char DESCRIPTION_TAG[] = "ImageDescription";

// Keys that never are tags: what they say is the form of the pixels, or said elsewhere.
bool IsOwn(const std::string& normal)
{
    static const std::set<std::string> KEYS = {"samples",   "lines",       "bands",      "header offset",
                                               "file type", "data type",   "interleave", "byte order",
                                               "classes",   "class lookup"};
    return KEYS.contains(normal);
}

AuxiliaryData MakeEmpty(const AuxiliaryData& oTags)
{
    return AuxiliaryData(oTags.GetChannelCount());
}

// The value of each channel, or nothing when the count is another.
std::vector<std::string> ReadPerChannel(const HeaderText& oHeader, const char* pKey, unsigned int nChannels)
{
    std::vector<std::string> oParts = oHeader.GetList(pKey);
    if (oParts.size() != nChannels)
        oParts.clear();
    return oParts;
}

void ReadDefaults(const HeaderText& oHeader, AuxiliaryData& oTags)
{
    std::vector<std::string> oBands = oHeader.GetList(DEFAULT_KEY);
    for (std::string& band : oBands) // some write 29.0
        if (const auto oNumber = ParseReal(band); oNumber && *oNumber == std::trunc(*oNumber))
            band = krv::NumberText(*oNumber);
    for (std::size_t n = 0; oBands.size() == 3 && n < 3; ++n)
        oTags.SetFileMetadataValue(DEFAULT_COLOURS[n], oBands[n]);
    if (oBands.size() == 1)
        oTags.SetFileMetadataValue(DEFAULT_GREY, oBands.front());
}

// Takes a value out of a map; empty when it is not there.
std::string Take(MetadataMap& oMap, const std::string& key)
{
    const auto oFound = oMap.find(key);
    if (oFound == oMap.end())
        return {};
    std::string value = oFound->second;
    oMap.erase(oFound);
    return value;
}

// A value for each channel, said only when all have one.
void WritePerChannel(std::vector<MetadataMap>& oChannels, const char* pKey, const char* pTag, HeaderText& oHeader)
{
    std::vector<std::string> oParts;
    for (const MetadataMap& oMap : oChannels)
        if (const auto oFound = oMap.find(pTag); oFound != oMap.end() && !oFound->second.empty())
            oParts.push_back(oFound->second);
    if (oParts.size() != oChannels.size() || !HeaderText::CanHoldList(oParts))
        return oHeader.Remove(pKey);
    for (MetadataMap& oMap : oChannels)
        oMap.erase(pTag);
    oHeader.SetList(pKey, oParts);
}

// One value that all channels share.
void WriteShared(std::vector<MetadataMap>& oChannels, const char* pKey, const char* pTag, HeaderText& oHeader)
{
    const auto oFirst = oChannels.front().find(pTag);
    const std::string value = oFirst == oChannels.front().end() ? std::string() : oFirst->second;
    const bool bSame = std::all_of(oChannels.begin(), oChannels.end(),
                                   [&](const MetadataMap& oMap)
                                   {
                                       const auto oFound = oMap.find(pTag);
                                       return oFound != oMap.end() && oFound->second == value;
                                   });
    if (!bSame || value.empty() || !HeaderText::CanHold(pKey, value))
        return;
    for (MetadataMap& oMap : oChannels)
        oMap.erase(pTag);
    oHeader.Set(pKey, value);
}

void WriteDefaults(MetadataMap& oFile, HeaderText& oHeader)
{
    std::vector<std::string> oParts;
    for (const char* const pTag : DEFAULT_COLOURS)
        if (const auto oFound = oFile.find(pTag); oFound != oFile.end())
            oParts.push_back(oFound->second);
    const bool bColours = oParts.size() == 3;
    if (const auto oGrey = oFile.find(DEFAULT_GREY); !bColours && oGrey != oFile.end())
        oParts = {oGrey->second};
    const bool bNumbers =
        std::all_of(oParts.begin(), oParts.end(),
                    [](const std::string& part) { return krv::ParseNumber<unsigned int>(part).has_value(); });
    if (oParts.empty() || !bNumbers || (!bColours && oParts.size() != 1))
        return oHeader.Remove(DEFAULT_KEY);
    for (const char* const pTag : DEFAULT_COLOURS)
        if (bColours)
            oFile.erase(pTag);
    if (!bColours)
        oFile.erase(DEFAULT_GREY);
    oHeader.SetList(DEFAULT_KEY, oParts);
}

// One that all channels have is the file's.
void WriteNoData(MetadataMap& oFile, std::vector<MetadataMap>& oChannels, HeaderText& oHeader)
{
    oHeader.Remove(NO_DATA_KEY);
    if (const auto oFound = oFile.find(NO_DATA_TAG);
        oFound != oFile.end() && !oFound->second.empty() && HeaderText::CanHold(NO_DATA_KEY, oFound->second))
        oHeader.Set(NO_DATA_KEY, Take(oFile, NO_DATA_TAG));
    else if (oFound == oFile.end())
        WriteShared(oChannels, NO_DATA_KEY, NO_DATA_TAG, oHeader);
}

void WriteNames(std::vector<std::string>& oNames, HeaderText& oHeader)
{
    const bool bNone = std::all_of(oNames.begin(), oNames.end(), [](const std::string& name) { return name.empty(); });
    if (bNone || !HeaderText::CanHoldList(oNames))
        return oHeader.Remove(NAMES_KEY);
    oHeader.SetList(NAMES_KEY, oNames);
    std::fill(oNames.begin(), oNames.end(), std::string());
}

struct MapInfo
{
    std::string moProjection;
    std::array<double, 6> moNumbers{}; // reference pixel, its place on the map, steps
    std::vector<std::string> moRest;   // zone and hemisphere, datum, units=, rotation=
};

std::optional<MapInfo> ReadMapInfo(const HeaderText& oHeader)
{
    const auto oParts = oHeader.GetList(MAP_INFO);
    MapInfo oInfo;
    if (oParts.size() < 1 + oInfo.moNumbers.size())
        return std::nullopt;
    oInfo.moProjection = oParts.front();
    for (std::size_t n = 0; n < oInfo.moNumbers.size(); ++n)
    {
        const auto oNumber = ParseReal(oParts[n + 1]);
        if (!oNumber)
            return std::nullopt;
        oInfo.moNumbers[n] = *oNumber;
    }
    oInfo.moRest.assign(oParts.begin() + 1 + oInfo.moNumbers.size(), oParts.end());
    return oInfo;
}

bool IsRotated(const MapInfo& oInfo)
{
    return std::any_of(oInfo.moRest.begin(), oInfo.moRest.end(),
                       [](const std::string& part)
                       {
                           const std::string upper = krv::ToUpper(part);
                           const std::size_t nSign = upper.find('=');
                           if (!upper.starts_with("ROTATION") || nSign == std::string::npos)
                               return false;
                           const std::size_t nValue = upper.find_first_not_of(' ', nSign + 1);
                           const auto oAngle = ParseReal(nValue == std::string::npos ? "" : upper.substr(nValue));
                           return !oAngle || *oAngle != 0;
                       });
}

// The letters and digits, as capitals.
std::string Bare(const std::string& name)
{
    std::string bare;
    for (const char c : krv::ToUpper(name))
        if ((c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9'))
            bare += c;
    return bare;
}

struct Datum
{
    const char* mpName; // bare
    int mnGeographic;
    int mnNorth; // of UTM zone 0
    int mnSouth;
    int mnFirstZone;
    int mnLastZone;
};

constexpr Datum DATUMS[] = {{"WGS84", 4326, 32600, 32700, 1, 60},        {"WGS72", 4322, 32200, 32300, 1, 60},
                            {"NORTHAMERICA1983", 4269, 26900, 0, 1, 23}, {"NAD83", 4269, 26900, 0, 1, 23},
                            {"NORTHAMERICA1927", 4267, 26700, 0, 1, 22}, {"NAD27", 4267, 26700, 0, 1, 22},
                            {"EUROPEAN1950", 4230, 23000, 0, 28, 38},    {"ETRS89", 4258, 25800, 0, 28, 38}};

const Datum* FindDatum(const std::vector<std::string>& oParts)
{
    for (const std::string& part : oParts)
        for (const Datum& oDatum : DATUMS)
            if (Bare(part) == oDatum.mpName)
                return &oDatum;
    return nullptr;
}

// The code of the system that the names say; 0 when they do not.
int FindCode(const MapInfo& oInfo)
{
    const Datum* const pDatum = FindDatum(oInfo.moRest);
    const std::string projection = Bare(oInfo.moProjection);
    if (pDatum == nullptr)
        return 0;
    if (projection.starts_with("GEOGRAPHIC"))
        return pDatum->mnGeographic;
    if (projection != "UTM" || oInfo.moRest.size() < 2)
        return 0;
    const int nZone = krv::ParseNumber<int>(oInfo.moRest[0]).value_or(0);
    const std::string side = Bare(oInfo.moRest[1]);
    const int nBase = side == "NORTH" || side == "N"   ? pDatum->mnNorth
                      : side == "SOUTH" || side == "S" ? pDatum->mnSouth
                                                       : 0;
    return nBase != 0 && nZone >= pDatum->mnFirstZone && nZone <= pDatum->mnLastZone ? nBase + nZone : 0;
}

// The parts of map info behind its numbers, and the name before them.
std::pair<std::string, std::vector<std::string>> DescribeSystem(const ICRS* poCRS)
{
    if (poCRS == nullptr)
        return {"Arbitrary", {}};
    const int nCode = poCRS->GetEPSG();
    const std::string units = "units=" + std::string(poCRS->IsGeographic()           ? "Degrees"
                                                     : poCRS->GetUnitFactor() == 1.0 ? "Meters"
                                                                                     : poCRS->GetUnitName());
    for (const Datum& oDatum : DATUMS)
        for (const auto& [nBase, pSide] : {std::pair{oDatum.mnNorth, "North"}, std::pair{oDatum.mnSouth, "South"}})
            if (nBase != 0 && nCode >= nBase + oDatum.mnFirstZone && nCode <= nBase + oDatum.mnLastZone)
                return {"UTM",
                        {std::to_string(nCode - nBase), pSide,
                         oDatum.mnGeographic == 4326 ? std::string("WGS-84") : std::string(oDatum.mpName), units}};
    const auto* const pGeographic = std::find_if(std::begin(DATUMS), std::end(DATUMS),
                                                 [nCode](const Datum& oDatum) { return oDatum.mnGeographic == nCode; });
    if (poCRS->IsGeographic())
        return {"Geographic Lat/Lon",
                {nCode == 4326                     ? "WGS-84"
                 : pGeographic != std::end(DATUMS) ? pGeographic->mpName
                                                   : "Unknown",
                 units}};
    return {"Arbitrary", {units}};
}

bool IsNear(double nFirst, double nSecond)
{
    return std::fabs(nFirst - nSecond) <= 1e-9 * std::max(std::fabs(nFirst), std::fabs(nSecond));
}

// Whether two systems that the same header gives differ in names alone.
bool IsSameByNumbers(const ICRS& oFirst, const ICRS& oSecond)
{
    const auto oParameters = oFirst.GetProjectionParameters(), oOthers = oSecond.GetProjectionParameters();
    return oFirst.IsGeographic() == oSecond.IsGeographic() &&
           oFirst.GetProjectionMethod() == oSecond.GetProjectionMethod() &&
           IsNear(oFirst.GetSemiMajorAxis(), oSecond.GetSemiMajorAxis()) &&
           IsNear(oFirst.GetInverseFlattening(), oSecond.GetInverseFlattening()) &&
           IsNear(oFirst.GetUnitFactor(), oSecond.GetUnitFactor()) &&
           std::equal(oParameters.begin(), oParameters.end(), oOthers.begin(), oOthers.end(),
                      [](const auto& oOne, const auto& oOther) {
                          return oOne.name == oOther.name &&
                                 IsNear(oOne.value * oOne.unitFactor, oOther.value * oOther.unitFactor);
                      });
}

void SetMapInfo(const MapInfo& oInfo, HeaderText& oHeader)
{
    std::vector<std::string> oParts{oInfo.moProjection};
    for (const double nNumber : oInfo.moNumbers)
        oParts.push_back(krv::NumberText(nNumber));
    oParts.insert(oParts.end(), oInfo.moRest.begin(), oInfo.moRest.end());
    oHeader.SetList(MAP_INFO, oParts);
}

} // namespace

AuxiliaryData ReadTags(const HeaderText& oHeader, unsigned int nChannels)
{
    AuxiliaryData oTags(nChannels);
    std::set<std::string> oTaken;
    const auto SetChannels = [&](const char* pKey, const auto& oSet)
    {
        const auto oParts = ReadPerChannel(oHeader, pKey, nChannels);
        for (std::size_t n = 0; n < oParts.size(); ++n)
            oSet(oParts[n], static_cast<unsigned int>(n) + 1);
        if (!oParts.empty())
            oTaken.insert(pKey);
        return !oParts.empty();
    };
    for (const auto& [pKey, pTag] : LISTS)
        SetChannels(pKey, [&oTags, pTag = pTag](const std::string& part, unsigned int nChannel)
                    { oTags.SetChanMetadataValue(pTag, part, nChannel); });
    SetChannels(NAMES_KEY, [&oTags](const std::string& part, unsigned int nChannel)
                { oTags.SetChannelDescription(part, nChannel); });
    const std::string units = oHeader.GetText(UNITS_KEY);
    for (unsigned int nChannel = 1; oTaken.contains("wavelength") && !units.empty() && nChannel <= nChannels;
         ++nChannel)
    {
        oTags.SetChanMetadataValue(UNITS_TAG, units, nChannel);
        oTaken.insert(UNITS_KEY);
    }
    ReadDefaults(oHeader, oTags);
    for (const auto& [pKey, pTag] : {std::pair{NO_DATA_KEY, NO_DATA_TAG}, {DESCRIPTION_KEY, DESCRIPTION_TAG}})
    {
        if (const std::string text = oHeader.GetText(pKey); !text.empty())
            oTags.SetFileMetadataValue(pTag, text);
        oTaken.insert(pKey);
    }
    if (const std::size_t nDefaults = oHeader.GetList(DEFAULT_KEY).size(); nDefaults == 1 || nDefaults == 3)
        oTaken.insert(DEFAULT_KEY);
    if (ReadGeocoding(oHeader))
        oTaken.insert(MAP_INFO);
    if (std::string trouble; ReadCRS(oHeader, &trouble) != nullptr && trouble.empty())
        oTaken.insert(CRS_TEXT);
    for (const std::string& key : oHeader.GetKeys())
        if (const std::string normal = HeaderText::Normalise(key); !IsOwn(normal) && !oTaken.contains(normal))
            oTags.SetFileMetadataValue(key, *oHeader.Find(key));
    return oTags;
}

AuxiliaryData WriteTags(AuxiliaryData oTags, HeaderText& oHeader)
{
    const unsigned int nChannels = oTags.GetChannelCount();
    const AuxiliaryData oOld = ReadTags(oHeader, nChannels);
    krv::datasources::DropRemoved(oTags, oOld);
    MetadataMap oFile = oTags.GetFileMetadata();
    std::vector<MetadataMap> oChannels;
    std::vector<std::string> oNames;
    for (unsigned int nChannel = 1; nChannel <= nChannels; ++nChannel)
    {
        oChannels.push_back(oTags.GetChanMetadata(nChannel));
        oNames.push_back(oTags.GetChannelDescription(nChannel));
    }
    for (const auto& [key, value] : oOld.GetFileMetadata())
        if (!oFile.contains(key))
            oHeader.Remove(key);
    WriteNoData(oFile, oChannels, oHeader);
    WriteDefaults(oFile, oHeader);
    WriteNames(oNames, oHeader);
    for (const auto& [pKey, pTag] : LISTS)
        WritePerChannel(oChannels, pKey, pTag, oHeader);
    if (oHeader.Find("wavelength"))
        WriteShared(oChannels, UNITS_KEY, UNITS_TAG, oHeader);
    const std::string description = Take(oFile, DESCRIPTION_TAG);
    oHeader.Remove(DESCRIPTION_KEY);
    if (!description.empty() && HeaderText::CanHold(DESCRIPTION_KEY, "{" + description + "}") &&
        description.find('}') == std::string::npos)
        oHeader.Set(DESCRIPTION_KEY, "{" + description + "}");
    else if (!description.empty())
        oFile[DESCRIPTION_TAG] = description;

    AuxiliaryData oLeft = MakeEmpty(oTags);
    const std::set<std::string> MAPPED = {
        NO_DATA_KEY, DEFAULT_KEY,  NAMES_KEY, DESCRIPTION_KEY,    UNITS_KEY,           MAP_INFO,
        CRS_TEXT,    "wavelength", "fwhm",    "data gain values", "data offset values"};
    for (const auto& [key, value] : oFile)
    {
        const std::string normal = HeaderText::Normalise(key);
        const bool bKept = oOld.GetFileMetadata().contains(key) && oOld.GetFileMetadataValue(key) == value;
        if (bKept && oHeader.Find(key))
            continue;
        const bool bFree =
            !MAPPED.contains(normal) || ((normal == MAP_INFO || normal == CRS_TEXT) && !oHeader.Find(key));
        if (!IsOwn(normal) && bFree && HeaderText::CanHold(key, value))
            oHeader.Set(key, value);
        else
            oLeft.SetFileMetadataValue(key, value);
    }
    for (unsigned int nChannel = 1; nChannel <= nChannels; ++nChannel)
    {
        oLeft.SetChanMetadata(oChannels[nChannel - 1], nChannel);
        oLeft.SetChannelDescription(oNames[nChannel - 1], nChannel);
    }
    return oLeft;
}

std::optional<GeocodingInfo> ReadGeocoding(const HeaderText& oHeader)
{
    const auto oInfo = ReadMapInfo(oHeader);
    if (!oInfo || IsRotated(*oInfo))
        return std::nullopt;
    const auto& [nColumn, nRow, nX, nY, nStepX, nStepY] = oInfo->moNumbers;
    // Reference pixel 1, 1 is the outer corner of the first one.
    const GeocodingInfo oGeocoding(nX - (nColumn - 1) * nStepX, nStepX, 0, nY + (nRow - 1) * nStepY, 0, -nStepY);
    return oGeocoding.IsInvertible() ? std::optional(oGeocoding) : std::nullopt;
}

bool WriteGeocoding(const GeocodingInfo& oGeocoding, const ICRS* poCRS, HeaderText& oHeader)
{
    if (oGeocoding.IsRotated() || oGeocoding.GetXPerColumn() <= 0 || oGeocoding.GetYPerRow() >= 0)
        return false;
    if (const auto oOld = ReadGeocoding(oHeader); oOld && *oOld == oGeocoding)
        return true;
    MapInfo oInfo;
    std::tie(oInfo.moProjection, oInfo.moRest) = DescribeSystem(poCRS);
    oInfo.moNumbers = {
        1, 1, oGeocoding.GetXOffset(), oGeocoding.GetYOffset(), oGeocoding.GetXPerColumn(), -oGeocoding.GetYPerRow()};
    SetMapInfo(oInfo, oHeader);
    return true;
}

void RemoveGeocoding(HeaderText& oHeader)
{
    oHeader.Remove(MAP_INFO);
}

void RemoveCRS(HeaderText& oHeader)
{
    oHeader.Remove(CRS_TEXT);
    if (auto oInfo = ReadMapInfo(oHeader))
    {
        std::tie(oInfo->moProjection, oInfo->moRest) = DescribeSystem(nullptr);
        SetMapInfo(*oInfo, oHeader);
    }
}

std::unique_ptr<ICRS> ReadCRS(const HeaderText& oHeader, std::string* pTrouble)
{
    std::unique_ptr<ICRS> poByText, poByNames;
    const std::string text = oHeader.GetText(CRS_TEXT);
    const auto oInfo = ReadMapInfo(oHeader);
    if (const int nCode = oInfo ? FindCode(*oInfo) : 0; nCode != 0)
        poByNames = krv::ogc::cs::CreateCRSFromEPSG(nCode);
    try
    {
        if (!text.empty())
            poByText = krv::ogc::cs::CreateCRSFromWKT(text);
    }
    catch (const DataException& oError)
    {
        if (pTrouble != nullptr)
            *pTrouble = std::string(CRS_TEXT) + " means nothing: " + oError.GetMessage();
    }
    // The text says more than the names, unless it is the same without its code.
    const bool bNames = poByText == nullptr ||
                        (poByNames != nullptr && poByText->GetEPSG() == 0 && IsSameByNumbers(*poByText, *poByNames));
    return bNames ? std::move(poByNames) : std::move(poByText);
}

bool WriteCRS(const ICRS& oCRS, HeaderText& oHeader)
{
    std::string text;
    try
    {
        text = oCRS.GetWKT1();
    }
    catch (const DataException&)
    {
        return false;
    }
    if (text.find_first_of("{}\n") != std::string::npos)
        return false;
    oHeader.Set(CRS_TEXT, "{" + text + "}");
    if (auto oInfo = ReadMapInfo(oHeader))
    {
        std::tie(oInfo->moProjection, oInfo->moRest) = DescribeSystem(&oCRS);
        SetMapInfo(*oInfo, oHeader);
    }
    return true;
}

std::optional<krv::gobs::PCT> ReadClasses(const HeaderText& oHeader)
{
    const auto oParts = oHeader.GetList("class lookup");
    const auto oCount = krv::ParseNumber<std::size_t>(oHeader.GetText("classes"));
    if (oParts.empty() || oParts.size() % 3 != 0 || oParts.size() > 3 * 65536 ||
        (oCount && *oCount != oParts.size() / 3))
        return std::nullopt;
    std::vector<std::uint16_t> oValues;
    for (const std::string& part : oParts)
    {
        const auto oNumber = krv::ParseNumber<std::uint8_t>(part);
        if (!oNumber)
            return std::nullopt;
        oValues.push_back(static_cast<std::uint16_t>(*oNumber * 257));
    }
    std::vector<krv::gobs::RGBTuple<std::uint16_t>> oColours;
    for (std::size_t n = 0; n < oValues.size(); n += 3)
        oColours.push_back({oValues[n], oValues[n + 1], oValues[n + 2]});
    return krv::gobs::PCT::FromColours(oColours);
}

bool WriteClasses(const krv::gobs::PCT& oTable, HeaderText& oHeader)
{
    std::vector<std::string> oParts;
    double nNext = 0;
    for (const krv::gobs::PCT::Entry& oEntry : oTable.GetEntries())
    {
        if (oEntry.low != nNext || oEntry.high != nNext + 1 || oEntry.alpha != 65535)
            return false;
        nNext = oEntry.high;
        for (const std::uint16_t nPart : {oEntry.colour.red, oEntry.colour.green, oEntry.colour.blue})
        {
            if (nPart % 257 != 0)
                return false;
            oParts.push_back(std::to_string(nPart / 257));
        }
    }
    if (oParts.empty())
        return false;
    oHeader.Set("classes", std::to_string(oParts.size() / 3));
    oHeader.SetList("class lookup", oParts);
    oHeader.Set("file type", "ENVI Classification");
    return true;
}

void RemoveClasses(HeaderText& oHeader)
{
    for (const char* const pKey : {"classes", "class lookup", "class names"})
        oHeader.Remove(pKey);
    oHeader.Set("file type", "ENVI Standard");
}

} // namespace krv::plugins::raw
