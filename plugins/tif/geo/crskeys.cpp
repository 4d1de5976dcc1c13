#include "plugins/tif/geo/crskeys.h"

#include "plugins/tif/geo/projectionrules.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/ogc/cs/crsfactory.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <optional>
#include <string>
#include <string_view>

#include <geokeys.h>
#include <geovalues.h>

namespace krv::plugins::tif
{

namespace
{

using krv::ogc::cs::ICRS;
using krv::ogc::cs::ProjectionParameter;

constexpr std::uint16_t USER_DEFINED = 32767;
constexpr std::uint16_t METRE = 9001;
constexpr std::uint16_t DEGREE = 9102;
constexpr double DEGREE_SIZE = M_PI / 180.0;
constexpr double UNIT_ROUNDING = 1e-12;
constexpr std::size_t LONGEST_TEXT = 60000;
const std::string TEXT_PREFIX = "ESRI PE String = ";

// The text of an element of WKT, from its keyword to its closing bracket; empty when there is none.
std::string FindElement(const std::string& definition, const std::string& keyword)
{
    const std::size_t nBegin = definition.find(keyword + "[");
    if (nBegin == std::string::npos)
        return {};
    int nDepth = 0;
    bool bQuoted = false;
    for (std::size_t nAt = nBegin; nAt < definition.size(); ++nAt)
    {
        const char nCharacter = definition[nAt];
        bQuoted = bQuoted != (nCharacter == '"');
        nDepth += bQuoted ? 0 : nCharacter == '[' ? 1 : nCharacter == ']' ? -1 : 0;
        if (!bQuoted && nCharacter == ']' && nDepth == 0)
            return definition.substr(nBegin, nAt - nBegin + 1);
    }
    return {};
}

// The EPSG code at the end of an element; 0 when it has none.
int FindCode(const std::string& element)
{
    constexpr std::string_view START = "ID[\"EPSG\",";
    const std::size_t nAt = element.rfind(START);
    if (nAt == std::string::npos)
        return 0;
    int nCode = 0;
    const char* pBegin = element.data() + nAt + START.size();
    const auto oResult = std::from_chars(pBegin, element.data() + element.size(), nCode);
    const bool bOwn = oResult.ec == std::errc() && std::string_view(oResult.ptr) == "]]";
    return bOwn ? nCode : 0;
}

std::uint16_t ToCode(int nCode)
{
    return nCode > 0 && nCode < USER_DEFINED ? static_cast<std::uint16_t>(nCode) : std::uint16_t{0};
}

void SetModel(GeoKeyList& oKeys, const ICRS& oCRS)
{
    const int nModel = oCRS.IsProjected()    ? ModelTypeProjected
                       : oCRS.IsGeographic() ? ModelTypeGeographic
                                             : ModelTypeGeocentric;
    oKeys.Set(GTModelTypeGeoKey, static_cast<std::uint16_t>(nModel));
}

void SetUnits(GeoKeyList& oKeys, const ICRS& oCRS)
{
    if (oCRS.IsProjected() && oCRS.GetUnitFactor() == 1.0)
        oKeys.Set(ProjLinearUnitsGeoKey, METRE);
    else if (oCRS.IsProjected())
    {
        oKeys.Set(ProjLinearUnitsGeoKey, USER_DEFINED);
        oKeys.Set(ProjLinearUnitSizeGeoKey, std::vector<double>{oCRS.GetUnitFactor()});
    }
    else if (oCRS.IsGeographic() && std::abs(oCRS.GetUnitFactor() / DEGREE_SIZE - 1.0) < UNIT_ROUNDING)
        oKeys.Set(GeogAngularUnitsGeoKey, DEGREE);
}

void SetHeights(GeoKeyList& oKeys, const ICRS& oCRS)
{
    if (!oCRS.HasVertical())
        return;
    const std::uint16_t nCode = ToCode(FindCode(FindElement(oCRS.GetWKT(), "VERTCRS")));
    if (nCode != 0)
        oKeys.Set(VerticalCSTypeGeoKey, nCode);
}

std::optional<GeoKeyList> ByCode(const ICRS& oCRS)
{
    const std::uint16_t nCode = ToCode(oCRS.GetEPSG());
    if (nCode == 0)
        return std::nullopt;
    GeoKeyList oKeys;
    SetModel(oKeys, oCRS);
    oKeys.Set(GTCitationGeoKey, oCRS.GetName());
    oKeys.Set(oCRS.IsProjected() ? ProjectedCSTypeGeoKey : GeographicTypeGeoKey, nCode);
    SetUnits(oKeys, oCRS);
    SetHeights(oKeys, oCRS);
    return oKeys;
}

// The geographic system below: by its code, else by datum and ellipsoid. Citations name the parts.
void SetBase(GeoKeyList& oKeys, const ICRS& oCRS)
{
    const std::string definition = oCRS.GetWKT();
    const std::string base = FindElement(definition, oCRS.IsProjected() ? "BASEGEOGCRS" : "GEOGCRS");
    const std::uint16_t nBase = ToCode(FindCode(base));
    if (nBase != 0)
        return oKeys.Set(GeographicTypeGeoKey, nBase);
    oKeys.Set(GeographicTypeGeoKey, USER_DEFINED);
    const std::size_t nName = base.find('"') + 1;
    oKeys.Set(GeogCitationGeoKey, "GCS Name = " + base.substr(nName, base.find('"', nName) - nName) +
                                      "|Datum = " + oCRS.GetDatumName() + "|Ellipsoid = " + oCRS.GetEllipsoidName());
    const std::uint16_t nDatum = ToCode(FindCode(FindElement(base, "DATUM")));
    oKeys.Set(GeogGeodeticDatumGeoKey, nDatum != 0 ? nDatum : USER_DEFINED);
    oKeys.Set(GeogAngularUnitsGeoKey, DEGREE);
    if (nDatum != 0)
        return;
    oKeys.Set(GeogEllipsoidGeoKey, USER_DEFINED);
    oKeys.Set(GeogSemiMajorAxisGeoKey, std::vector<double>{oCRS.GetSemiMajorAxis()});
    if (oCRS.GetInverseFlattening() != 0.0)
        oKeys.Set(GeogInvFlatteningGeoKey, std::vector<double>{oCRS.GetInverseFlattening()});
    else
        oKeys.Set(GeogSemiMinorAxisGeoKey, std::vector<double>{oCRS.GetSemiMajorAxis()});
}

// The way to WGS 84 that a bound system carries along: three shifts, or with rotations and scale seven numbers.
void SetShift(GeoKeyList& oKeys, const ICRS& oCRS)
{
    const std::string definition = oCRS.GetWKT();
    if (!definition.starts_with("BOUNDCRS["))
        return;
    constexpr std::string_view START = "TOWGS84[";
    const std::string shift = FindElement(oCRS.GetWKT1(), "TOWGS84");
    std::vector<double> oNumbers;
    const char* const pEnd = shift.data() + shift.size();
    for (const char* pAt = shift.data() + std::min(START.size(), shift.size()); pAt < pEnd; ++pAt)
    {
        double nNumber = 0;
        const auto oResult = std::from_chars(pAt, pEnd, nNumber);
        if (oResult.ec != std::errc())
            return;
        oNumbers.push_back(nNumber);
        pAt = oResult.ptr;
    }
    if (oNumbers.size() != 7)
        return;
    if (definition.find("METHOD[\"Geocentric translations") != std::string::npos)
        oNumbers.resize(3);
    oKeys.Set(GeogTOWGS84GeoKey, oNumbers);
}

const ProjectionParameter* FindParameter(const std::vector<ProjectionParameter>& oParameters, const std::string& name)
{
    for (const ProjectionParameter& oParameter : oParameters)
        if (oParameter.name == name)
            return &oParameter;
    return nullptr;
}

bool SetParameters(GeoKeyList& oKeys, const ProjectionRule& oRule, const ICRS& oCRS)
{
    const std::vector<ProjectionParameter> oParameters = oCRS.GetProjectionParameters();
    for (const ParameterRule& oParameterRule : oRule.parameters)
    {
        if (oParameterRule.name == nullptr)
            continue;
        const ProjectionParameter* pParameter = FindParameter(oParameters, oParameterRule.name);
        if (pParameter == nullptr)
            return false;
        const bool bAngle = oParameterRule.kind == eAngle || oParameterRule.kind == eAzimuth;
        const double nUnit = bAngle ? DEGREE_SIZE : oParameterRule.kind == eLength ? oCRS.GetUnitFactor() : 1.0;
        const bool bSame = std::abs(pParameter->unitFactor / nUnit - 1.0) < UNIT_ROUNDING;
        const double nValue = bSame ? pParameter->value : pParameter->value * pParameter->unitFactor / nUnit;
        oKeys.Set(static_cast<std::uint16_t>(oParameterRule.keys[0]), std::vector<double>{nValue});
    }
    return true;
}

std::optional<GeoKeyList> ByParts(const ICRS& oCRS)
{
    if (!oCRS.IsProjected() && !oCRS.IsGeographic())
        return std::nullopt;
    GeoKeyList oKeys;
    SetModel(oKeys, oCRS);
    oKeys.Set(GTCitationGeoKey, oCRS.GetName());
    SetBase(oKeys, oCRS);
    SetShift(oKeys, oCRS);
    SetUnits(oKeys, oCRS);
    SetHeights(oKeys, oCRS);
    if (!oCRS.IsProjected())
        return oKeys;
    const ProjectionRule* pRule = FindProjectionRule(oCRS.GetProjectionMethod());
    if (pRule == nullptr || !SetParameters(oKeys, *pRule, oCRS))
        return std::nullopt;
    oKeys.Set(GeogAngularUnitsGeoKey, DEGREE);
    oKeys.Set(ProjectedCSTypeGeoKey, USER_DEFINED);
    oKeys.Set(PCSCitationGeoKey, oCRS.GetName());
    oKeys.Set(ProjectionGeoKey, USER_DEFINED);
    oKeys.Set(ProjCoordTransGeoKey, static_cast<std::uint16_t>(pRule->method));
    return oKeys;
}

std::optional<GeoKeyList> ByText(const ICRS& oCRS, const std::string& definition)
{
    if (definition.size() > LONGEST_TEXT || definition.find('|') != std::string::npos)
        return std::nullopt;
    GeoKeyList oKeys;
    SetModel(oKeys, oCRS);
    const bool bProjected = oCRS.IsProjected();
    oKeys.Set(bProjected ? ProjectedCSTypeGeoKey : GeographicTypeGeoKey, USER_DEFINED);
    oKeys.Set(bProjected ? PCSCitationGeoKey : GTCitationGeoKey, TEXT_PREFIX + definition);
    return oKeys;
}

} // namespace

std::vector<GeoKeyList> ProposeKeys(const ICRS& oCRS)
{
    std::vector<GeoKeyList> oProposals;
    const auto Add = [&oProposals](std::optional<GeoKeyList> oKeys)
    {
        if (oKeys)
            oProposals.push_back(std::move(*oKeys));
    };
    Add(ByCode(oCRS));
    Add(ByParts(oCRS));
    try
    {
        Add(ByText(oCRS, oCRS.GetWKT1()));
    }
    catch (const krv::DataException&)
    {
        // Not every system has that form.
    }
    Add(ByText(oCRS, oCRS.GetWKT()));
    Add(ByText(oCRS, oCRS.GetPROJJSON()));
    return oProposals;
}

} // namespace krv::plugins::tif
