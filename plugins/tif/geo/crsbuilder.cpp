#include "plugins/tif/geo/crsbuilder.h"

#include "toolkit/exceptions/exceptions.h"
#include "toolkit/ogc/cs/coordinatetransformation.h"

#include <array>
#include <charconv>
#include <cmath>
#include <string_view>
#include <utility>
#include <vector>

namespace krv::plugins::tif
{
namespace
{

using namespace krv::ogc::cs;

constexpr double DEGREE = M_PI / 180.0;
constexpr int EPSG_WGS84 = 4326;
constexpr int FIRST_PRIVATE_CODE = 32768;
// The first edition of the keys gave vertical systems by ellipsoids and datums of their own list.
constexpr int FIRST_OLD_ELLIPSOID = 5001;
constexpr int FIRST_OLD_DATUM = 5101;
constexpr int LAST_OLD_DATUM = 5106;
constexpr auto NO_KEY = static_cast<geokey_t>(0);
constexpr std::string_view TEXT_PREFIX = "ESRI PE String = ";

std::string Quoted(const std::string& text)
{
    std::string result = "\"";
    for (const char nCharacter : text)
    {
        if (nCharacter == '"' || nCharacter == '\\')
            result += '\\';
        result += static_cast<unsigned char>(nCharacter) < ' ' ? ' ' : nCharacter;
    }
    return result + "\"";
}

// Shortest text that reads back as the same number, whatever the locale.
std::string Number(double nValue)
{
    std::array<char, 32> oText = {};
    const auto oResult = std::to_chars(oText.data(), oText.data() + oText.size(), nValue);
    return std::string(oText.data(), oResult.ptr);
}

std::string UnitText(const char* poKind, const std::string& name, double nFactor)
{
    return std::string("{\"type\":\"") + poKind + "\",\"name\":" + Quoted(name) +
           ",\"conversion_factor\":" + Number(nFactor) + "}";
}

std::string Identifier(int nCode)
{
    return nCode == 0 ? std::string() : ",\"id\":{\"authority\":\"EPSG\",\"code\":" + std::to_string(nCode) + "}";
}

std::string Axis(const char* poName, const char* poAbbreviation, const char* poDirection, const std::string& unit)
{
    return std::string("{\"name\":\"") + poName + "\",\"abbreviation\":\"" + poAbbreviation + "\",\"direction\":\"" +
           poDirection + "\",\"unit\":" + unit + "}";
}

std::string System(const char* poKind, const std::string& axes)
{
    return std::string("\"coordinate_system\":{\"subtype\":\"") + poKind + "\",\"axis\":[" + axes + "]}";
}

std::string MapAxes(const char* poEasting, const char* poNorthing, const std::string& unit)
{
    return System("Cartesian", Axis("Easting", "E", poEasting, unit) + "," + Axis("Northing", "N", poNorthing, unit));
}

// Projections seen from a pole, and those of the southern grids, count along other directions; a definition that
// ignores it would not be the same system as the one with a code.
std::string AxesFor(const ICRS& oPlain, const std::string& unit)
{
    const std::string method = oPlain.GetProjectionMethod();
    if (method == "Transverse Mercator (South Orientated)")
        return System("Cartesian", Axis("Westing", "Y", "west", unit) + "," + Axis("Southing", "X", "south", unit));
    const auto oParameters = oPlain.GetProjectionParameters();
    if (!method.starts_with("Polar Stereographic") || oParameters.empty())
        return {};
    const char* poDirection = oParameters.front().value > 0.0 ? "south" : "north";
    return MapAxes(poDirection, poDirection, unit);
}

std::string ProjectedText(const std::string& name, const std::string& base, const std::string& conversion,
                          const std::string& axes)
{
    return "{\"type\":\"ProjectedCRS\",\"name\":" + Quoted(name) + ",\"base_crs\":" + base +
           ",\"conversion\":" + conversion + "," + axes + "}";
}

// The definition that a citation holds: up to the bracket that ends it, since other parts may follow.
std::string CutDefinition(const std::string& citation)
{
    const auto nPrefix = citation.find(TEXT_PREFIX);
    if (nPrefix == std::string::npos)
        return {};
    const std::string text = citation.substr(nPrefix + TEXT_PREFIX.size());
    int nDepth = 0;
    bool bQuoted = false;
    for (std::size_t nAt = 0; nAt < text.size(); ++nAt)
    {
        bQuoted = bQuoted != (text[nAt] == '"');
        const bool bOpen = text[nAt] == '[' || text[nAt] == '{';
        const bool bClose = text[nAt] == ']' || text[nAt] == '}';
        nDepth += bQuoted || bOpen == bClose ? 0 : bOpen ? 1 : -1;
        if (!bQuoted && bClose && nDepth == 0)
            return text.substr(0, nAt + 1);
    }
    return text;
}

// Cuts a nested "VERTCS[...]" out of a definition and returns it; "" when there is none.
std::string CutHeights(std::string& definition)
{
    const auto nStart = definition.find(",VERTCS[");
    if (nStart == std::string::npos)
        return {};
    int nDepth = 0;
    for (auto nAt = nStart; nAt < definition.size(); ++nAt)
    {
        nDepth += definition[nAt] == '[' ? 1 : definition[nAt] == ']' ? -1 : 0;
        if (definition[nAt] != ']' || nDepth != 0)
            continue;
        const std::string heights = definition.substr(nStart + 1, nAt - nStart);
        definition.erase(nStart, nAt - nStart + 1);
        return heights;
    }
    return {};
}

// Definitions of projections that nobody knows are taken as they stand; nothing can be computed by them, not even where
// the false origin lies.
bool CanBeUsed(const ICRS& oSystem)
{
    double nX = 0.0;
    double nY = 0.0;
    for (const ProjectionParameter& oParameter : oSystem.GetProjectionParameters())
        if (oParameter.name.ends_with("asting"))
            nX = oParameter.value;
        else if (oParameter.name.ends_with("orthing"))
            nY = oParameter.value;
    try
    {
        return CoordinateTransformation(oSystem, *CreateCRSFromEPSG(EPSG_WGS84)).Transform(nX, nY) &&
               std::abs(nX) <= 360.0 && std::abs(nY) <= 90.0;
    }
    catch (const krv::DataException&)
    {
        return false;
    }
}

std::unique_ptr<ICRS> Compound(const ICRS& oHorizontal, const ICRS& oVertical, const krv::Place& oPlace)
{
    return CreateCRSFromWKT(
        "{\"type\":\"CompoundCRS\",\"name\":" + Quoted(oHorizontal.GetName() + " + " + oVertical.GetName()) +
            ",\"components\":[" + oHorizontal.GetPROJJSON() + "," + oVertical.GetPROJJSON() + "]}",
        oPlace);
}

std::string ShiftParameter(const char* poName, double nValue, const std::string& unit, int nCode)
{
    return std::string("{\"name\":\"") + poName + "\",\"value\":" + Number(nValue) + ",\"unit\":" + unit +
           Identifier(nCode) + "}";
}

std::string ShiftText(const std::vector<double>& oShift)
{
    const std::string arcSecond = UnitText("AngularUnit", "arc-second", DEGREE / 3600.0);
    std::string parameters = ShiftParameter("X-axis translation", oShift[0], "\"metre\"", 8605) + "," +
                             ShiftParameter("Y-axis translation", oShift[1], "\"metre\"", 8606) + "," +
                             ShiftParameter("Z-axis translation", oShift[2], "\"metre\"", 8607);
    if (oShift.size() < 7)
        return "{\"name\":\"Transformation to WGS84\",\"method\":{\"name\":\"Geocentric translations (geog2D domain)\""
               ",\"id\":{\"authority\":\"EPSG\",\"code\":9603}},\"parameters\":[" +
               parameters + "]}";
    parameters += "," + ShiftParameter("X-axis rotation", oShift[3], arcSecond, 8608) + "," +
                  ShiftParameter("Y-axis rotation", oShift[4], arcSecond, 8609) + "," +
                  ShiftParameter("Z-axis rotation", oShift[5], arcSecond, 8610) + "," +
                  ShiftParameter("Scale difference", oShift[6], UnitText("ScaleUnit", "parts per million", 1e-6), 8611);
    return "{\"name\":\"Transformation to WGS84\",\"method\":{\"name\":\"Position Vector transformation (geog2D "
           "domain)\""
           ",\"id\":{\"authority\":\"EPSG\",\"code\":9606}},\"parameters\":[" +
           parameters + "]}";
}

} // namespace

CRSBuilder::CRSBuilder(const GeoKeyDirectory& oKeys, const krv::Place& oPlace) : moKeys(oKeys), moPlace(oPlace)
{
    ReadDefinition();
}

std::unique_ptr<ICRS> CRSBuilder::Build() const
{
    if (!FindContradiction().empty())
        return nullptr;
    CRS poSystem = BuildFromText();
    if (!poSystem)
        poSystem = BuildHorizontal();
    return poSystem ? WithHeights(std::move(poSystem)) : nullptr;
}

// The model that the keys state, by its key or by naming a projection; 0 when they leave it open. A base system alone
// leaves it open.
int CRSBuilder::FindStatedModel() const
{
    const int nModel = moKeys.GetCode(GTModelTypeGeoKey);
    if (nModel == ModelTypeProjected || nModel == ModelTypeGeographic || nModel == ModelTypeGeocentric)
        return nModel;
    const bool bProjected = moKeys.HasCode(ProjectedCSTypeGeoKey) || moKeys.HasCode(ProjectionGeoKey) ||
                            moKeys.HasCode(ProjCoordTransGeoKey);
    return bProjected ? int{ModelTypeProjected} : 0;
}

int CRSBuilder::FindModel() const
{
    const int nModel = FindStatedModel();
    return nModel == 0 && moKeys.HasCode(GeographicTypeGeoKey) ? int{ModelTypeGeographic} : nModel;
}

CRSBuilder::CRS CRSBuilder::BuildHorizontal() const
{
    switch (FindModel())
    {
    case ModelTypeProjected:
        return BuildProjected();
    case ModelTypeGeographic:
        return BuildGeographic();
    case ModelTypeGeocentric:
        return BuildGeocentric();
    default:
        return nullptr;
    }
}

// Some writers put the whole definition as text into a citation when the keys cannot say it.
void CRSBuilder::ReadDefinition()
{
    if (moKeys.HasCode(ProjectedCSTypeGeoKey))
        return;
    for (const geokey_t eKey : {PCSCitationGeoKey, GTCitationGeoKey, GeogCitationGeoKey})
    {
        std::string text = CutDefinition(moKeys.GetText(eKey));
        if (text.empty())
            continue;
        moDefinition.emplace(Definition{eKey, text, nullptr, {}});
        try
        {
            const std::string heights = CutHeights(text);
            CRS poSystem = CreateCRSFromWKT(text, moPlace);
            moDefinition->system = heights.empty() ? std::move(poSystem)
                                                   : Compound(*poSystem, *CreateCRSFromWKT(heights, moPlace), moPlace);
        }
        catch (const krv::DataException& oException)
        {
            moDefinition->cause = oException.GetMessage();
        }
        return;
    }
}

// A geographic system in the citation of the base of a projected one.
bool CRSBuilder::IsBaseDefinition() const
{
    return moDefinition && moDefinition->eKey == GeogCitationGeoKey && moDefinition->system &&
           moDefinition->system->IsGeographic() && FindStatedModel() == ModelTypeProjected;
}

CRSBuilder::CRS CRSBuilder::BuildFromText() const
{
    const int nModel = FindStatedModel();
    const bool bCode = moKeys.HasCode(ProjectedCSTypeGeoKey) ||
                       (nModel == ModelTypeGeographic && moKeys.HasCode(GeographicTypeGeoKey));
    if (!moDefinition || bCode || IsBaseDefinition())
        return nullptr;
    const bool bSaidByKeys = moKeys.HasCode(ProjectionGeoKey) || moKeys.HasCode(ProjCoordTransGeoKey);
    if (bSaidByKeys && !(moDefinition->system && CanBeUsed(*moDefinition->system)))
        return nullptr;
    if (moDefinition->system)
        return CRS(moDefinition->system->Clone());
    throw krv::DataException(moDefinition->cause, moPlace);
}

std::string CRSBuilder::FindContradiction() const
{
    const int nModel = FindStatedModel();
    const bool bCode = moKeys.HasCode(ProjectedCSTypeGeoKey);
    if (nModel == ModelTypeGeographic && bCode)
        return "their model is geographic, and they name a projected system";
    const bool bText = moDefinition && moDefinition->system && !bCode && !IsBaseDefinition();
    if (!bText)
    {
        const bool bBase = nModel == 0 && moKeys.HasCode(GeographicTypeGeoKey);
        const std::optional<EPSGUnit> oUnit = FindMapUnit();
        const bool bMap = moKeys.GetCode(ProjectedCSTypeGeoKey) == KvUserDefined || (oUnit && oUnit->isLinear);
        return bBase && bMap ? "they describe a map in a projection that they do not name" : "";
    }
    const bool bProjected = moDefinition->system->IsProjected();
    if (nModel == ModelTypeProjected && !bProjected)
        return "their model is projected, the definition in their text is not";
    if (nModel == ModelTypeGeographic && !moDefinition->system->IsGeographic())
        return "their model is geographic, the definition in their text is not";
    return CompareUnits();
}

// Of the map: the key against the definition. Feet of different countries count as one here, the definition knows
// better.
std::string CRSBuilder::CompareUnits() const
{
    constexpr double ROUNDING = 1e-5;
    const ICRS& oSystem = *moDefinition->system;
    const std::optional<EPSGUnit> oUnit = FindMapUnit();
    const bool bSame = oUnit && std::abs(oUnit->factor / oSystem.GetUnitFactor() - 1.0) < ROUNDING;
    const bool bOther = oSystem.IsProjected()    ? oUnit && !(oUnit->isLinear && bSame)
                        : oSystem.IsGeographic() ? oUnit && oUnit->isLinear && FindStatedModel() == 0
                                                 : false;
    return bOther ? "their unit is the " + oUnit->name + ", that of the definition in their text the " +
                        oSystem.GetUnitName()
                  : std::string();
}

// The unit of the map, where the keys give one that is known.
std::optional<EPSGUnit> CRSBuilder::FindMapUnit() const
{
    try
    {
        if (moKeys.HasCode(ProjLinearUnitsGeoKey))
            return FindEPSGUnit(moKeys.GetCode(ProjLinearUnitsGeoKey), moPlace);
    }
    catch (const krv::DataException&)
    {
        return std::nullopt;
    }
    const std::optional<double> oSize = moKeys.GetNumber(ProjLinearUnitSizeGeoKey);
    return oSize ? std::optional(EPSGUnit{"length of " + Number(*oSize) + " metres", *oSize, false, true})
                 : std::nullopt;
}

CRSBuilder::CRS CRSBuilder::BuildProjected() const
{
    if (!moKeys.HasCode(ProjectedCSTypeGeoKey))
        return BuildProjectedFromParts();
    const int nCode = moKeys.GetCode(ProjectedCSTypeGeoKey);
    if (nCode >= FIRST_PRIVATE_CODE)
        return CreateCRSFromWKT("ESRI:" + std::to_string(nCode), moPlace);
    return CreateCRSFromEPSG(nCode, moPlace);
}

CRSBuilder::CRS CRSBuilder::BuildProjectedFromParts() const
{
    const std::string name = ProjectedName();
    const std::string base = BaseSystem();
    const std::string conversion = Conversion();
    const std::string unit = LengthUnit();
    CRS poSystem = CreateCRSFromWKT(ProjectedText(name, base, conversion, MapAxes("east", "north", unit)), moPlace);
    const std::string axes = AxesFor(*poSystem, unit);
    if (!axes.empty())
        poSystem = CreateCRSFromWKT(ProjectedText(name, base, conversion, axes), moPlace);
    return Shifted(std::move(poSystem));
}

CRSBuilder::CRS CRSBuilder::BuildGeographic() const
{
    if (moKeys.HasCode(GeographicTypeGeoKey))
        return CreateCRSFromEPSG(moKeys.GetCode(GeographicTypeGeoKey), moPlace);
    return Shifted(CreateCRSFromWKT(BaseSystem(), moPlace));
}

CRSBuilder::CRS CRSBuilder::BuildGeocentric() const
{
    if (moKeys.HasCode(GeographicTypeGeoKey))
        return CreateCRSFromEPSG(moKeys.GetCode(GeographicTypeGeoKey), moPlace);
    const std::string unit = Unit(GeogLinearUnitsGeoKey, GeogLinearUnitSizeGeoKey, false);
    const std::string axes = Axis("Geocentric X", "X", "geocentricX", unit) + "," +
                             Axis("Geocentric Y", "Y", "geocentricY", unit) + "," +
                             Axis("Geocentric Z", "Z", "geocentricZ", unit);
    return CreateCRSFromWKT("{\"type\":\"GeodeticCRS\",\"name\":" + Quoted(NamedPart(GeogCitationGeoKey, "GCS Name")) +
                                ",\"datum\":" + Datum() + "," + System("Cartesian", axes) + "}",
                            moPlace);
}

// Binds a user-defined system to WGS 84 by the shift that the keys give.
CRSBuilder::CRS CRSBuilder::Shifted(CRS poSystem) const
{
    const std::vector<double> oShift = moKeys.GetNumbers(GeogTOWGS84GeoKey);
    if ((oShift.size() != 3 && oShift.size() != 7) || moKeys.HasCode(GeographicTypeGeoKey))
        return poSystem;
    for (const double nValue : oShift)
        if (!std::isfinite(nValue))
            Fail("the shift to WGS 84 is not finite");
    return CreateCRSFromWKT("{\"type\":\"BoundCRS\",\"source_crs\":" + poSystem->GetPROJJSON() +
                                ",\"target_crs\":" + DescribeEPSGPart(eEPSG_CRS, EPSG_WGS84, moPlace) +
                                ",\"transformation\":" + ShiftText(oShift) + "}",
                            moPlace);
}

CRSBuilder::CRS CRSBuilder::WithHeights(CRS poSystem) const
{
    const std::string heights = poSystem->HasVertical() ? std::string() : Heights();
    if (heights.empty())
        return poSystem;
    return Compound(*poSystem, *CreateCRSFromWKT(heights, moPlace), moPlace);
}

std::string CRSBuilder::Conversion() const
{
    if (moKeys.HasCode(ProjectionGeoKey))
        return DescribeEPSGPart(eEPSG_Conversion, moKeys.GetCode(ProjectionGeoKey), moPlace);
    const int nMethod = moKeys.GetCode(ProjCoordTransGeoKey);
    const ProjectionRule* poRule =
        IsPseudoMercator() ? &GetPseudoMercatorRule() : FindProjectionRule(nMethod, UsesSecondVariant(nMethod));
    if (poRule == nullptr)
        Fail(nMethod == 0 ? "they name no projection"
                          : "projection method " + std::to_string(nMethod) + " is not known");
    const Units oUnits = FindUnits();
    std::string parameters;
    for (const ParameterRule& oParameter : poRule->parameters)
        if (oParameter.name != nullptr)
            parameters += (parameters.empty() ? "" : ",") + Parameter(oParameter, oUnits);
    return "{\"type\":\"Conversion\",\"name\":\"unnamed\",\"method\":{\"name\":" + Quoted(poRule->name) +
           Identifier(poRule->code) + "},\"parameters\":[" + parameters + "]}";
}

CRSBuilder::Units CRSBuilder::FindUnits() const
{
    const std::string angle = AngleUnit();
    return {angle, moKeys.HasCode(GeogAzimuthUnitsGeoKey) ? Unit(GeogAzimuthUnitsGeoKey, NO_KEY, true) : angle,
            LengthUnit()};
}

std::string CRSBuilder::Parameter(const ParameterRule& oRule, const Units& oUnits) const
{
    const double nValue = ParameterValue(oRule);
    if (!std::isfinite(nValue))
        Fail(std::string("the parameter \"") + oRule.name + "\" is not finite");
    const std::string unit = oRule.kind == eAngle     ? oUnits.angle
                             : oRule.kind == eAzimuth ? oUnits.azimuth
                             : oRule.kind == eLength  ? oUnits.length
                                                      : "\"unity\"";
    return "{\"name\":" + Quoted(oRule.name) + ",\"value\":" + Number(nValue) + ",\"unit\":" + unit +
           Identifier(oRule.code) + "}";
}

double CRSBuilder::ParameterValue(const ParameterRule& oRule) const
{
    for (const geokey_t eKey : oRule.keys)
        if (eKey != NO_KEY)
            if (const std::optional<double> oValue = moKeys.GetNumber(eKey))
                return *oValue;
    return oRule.fallback;
}

bool CRSBuilder::UsesSecondVariant(int nMethod) const
{
    if (nMethod == CT_Mercator)
        return moKeys.GetNumber(ProjStdParallel1GeoKey) && !moKeys.GetNumber(ProjScaleAtNatOriginGeoKey);
    if (nMethod != CT_PolarStereographic)
        return false;
    const ProjectionRule& oPole = *FindProjectionRule(nMethod, false);
    const double nLatitude = std::abs(ParameterValue(oPole.parameters[0]));
    const double nScale = ParameterValue(oPole.parameters[2]);
    constexpr double ROUNDING = 1e-9;
    if (std::abs(nLatitude - 90.0) < ROUNDING)
        return false;
    if (std::abs(nScale - 1.0) > ROUNDING)
        Fail("a polar stereographic projection has both a parallel of true scale and a scale factor");
    return true;
}

std::string CRSBuilder::BaseSystem() const
{
    if (moKeys.HasCode(GeographicTypeGeoKey))
        return DescribeEPSGPart(eEPSG_CRS, moKeys.GetCode(GeographicTypeGeoKey), moPlace);
    if (IsBaseDefinition())
        return moDefinition->system->GetPROJJSON();
    const std::string unit = AngleUnit();
    const std::string axes =
        Axis("Geodetic latitude", "Lat", "north", unit) + "," + Axis("Geodetic longitude", "Lon", "east", unit);
    return "{\"type\":\"GeographicCRS\",\"name\":" + Quoted(NamedPart(GeogCitationGeoKey, "GCS Name")) +
           ",\"datum\":" + Datum() + "," + System("ellipsoidal", axes) + "}";
}

std::string CRSBuilder::Datum() const
{
    if (moKeys.HasCode(GeogGeodeticDatumGeoKey))
        return DescribeEPSGPart(eEPSG_Datum, moKeys.GetCode(GeogGeodeticDatumGeoKey), moPlace);
    return "{\"type\":\"GeodeticReferenceFrame\",\"name\":" + Quoted(NamedPart(GeogCitationGeoKey, "Datum")) +
           ",\"ellipsoid\":" + Ellipsoid() + PrimeMeridian() + "}";
}

std::string CRSBuilder::Ellipsoid() const
{
    if (moKeys.HasCode(GeogEllipsoidGeoKey))
        return DescribeEPSGPart(eEPSG_Ellipsoid, moKeys.GetCode(GeogEllipsoidGeoKey), moPlace);
    const std::optional<double> oMajor = moKeys.GetNumber(GeogSemiMajorAxisGeoKey);
    const std::optional<double> oMinor = moKeys.GetNumber(GeogSemiMinorAxisGeoKey);
    const std::optional<double> oFlattening = moKeys.GetNumber(GeogInvFlatteningGeoKey);
    if (!oMajor)
        Fail("they name neither a geographic system nor a datum nor an ellipsoid");
    const double nUnit = moKeys.HasCode(GeogLinearUnitsGeoKey)
                             ? FindEPSGUnit(moKeys.GetCode(GeogLinearUnitsGeoKey), moPlace).factor
                             : moKeys.GetNumber(GeogLinearUnitSizeGeoKey).value_or(1.0);
    const double nMajor = *oMajor * nUnit;
    const double nMinor = oMinor.value_or(*oMajor) * nUnit;
    const double nFlattening = oFlattening.value_or(0.0);
    if (!std::isfinite(nMajor) || !(nMajor > 0.0) || !std::isfinite(nMinor) || !(nMinor > 0.0) ||
        !std::isfinite(nFlattening) || nFlattening < 0.0)
        Fail("the ellipsoid has no possible size");
    std::string shape = "\"radius\":" + Number(nMajor);
    if (nFlattening > 0.0)
        shape = "\"semi_major_axis\":" + Number(nMajor) + ",\"inverse_flattening\":" + Number(nFlattening);
    else if (nMinor != nMajor)
        shape = "\"semi_major_axis\":" + Number(nMajor) + ",\"semi_minor_axis\":" + Number(nMinor);
    return "{\"name\":" + Quoted(NamedPart(GeogCitationGeoKey, "Ellipsoid")) + "," + shape + "}";
}

// As a member of a datum; "" for Greenwich.
std::string CRSBuilder::PrimeMeridian() const
{
    if (moKeys.HasCode(GeogPrimeMeridianGeoKey))
        return ",\"prime_meridian\":" +
               DescribeEPSGPart(eEPSG_PrimeMeridian, moKeys.GetCode(GeogPrimeMeridianGeoKey), moPlace);
    const double nLongitude = moKeys.GetNumber(GeogPrimeMeridianLongGeoKey).value_or(0.0);
    if (!std::isfinite(nLongitude))
        Fail("the prime meridian is not finite");
    if (nLongitude == 0.0)
        return {};
    return ",\"prime_meridian\":{\"name\":" + Quoted(NamedPart(GeogCitationGeoKey, "Primem")) +
           ",\"longitude\":{\"value\":" + Number(nLongitude) + ",\"unit\":" + AngleUnit() + "}}";
}

// The vertical system as text; "" when the keys name none. Codes of ellipsoids say only that heights are above the
// datum's own ellipsoid, and add no system.
std::string CRSBuilder::Heights() const
{
    const int nCode = moKeys.GetCode(VerticalCSTypeGeoKey);
    if (nCode == 0 || (nCode >= FIRST_OLD_ELLIPSOID && nCode < FIRST_OLD_DATUM))
        return {};
    if (nCode != KvUserDefined && (nCode < FIRST_OLD_DATUM || nCode > LAST_OLD_DATUM))
        return DescribeEPSGPart(eEPSG_CRS, nCode, moPlace);
    const std::string datum = HeightDatum();
    if (datum.empty())
        return {};
    const std::string unit = Unit(VerticalUnitsGeoKey, NO_KEY, false);
    return "{\"type\":\"VerticalCRS\",\"name\":" + Quoted(NamedPart(VerticalCitationGeoKey, "VCS Name")) +
           ",\"datum\":" + datum + "," + System("vertical", Axis("Gravity-related height", "H", "up", unit)) + "}";
}

std::string CRSBuilder::HeightDatum() const
{
    if (moKeys.HasCode(VerticalCSTypeGeoKey))
        return DescribeEPSGPart(eEPSG_Datum, moKeys.GetCode(VerticalCSTypeGeoKey), moPlace);
    if (moKeys.HasCode(VerticalDatumGeoKey))
        return DescribeEPSGPart(eEPSG_Datum, moKeys.GetCode(VerticalDatumGeoKey), moPlace);
    if (moKeys.GetText(VerticalCitationGeoKey).empty())
        return {};
    return "{\"type\":\"VerticalReferenceFrame\",\"name\":" + Quoted(NamedPart(VerticalCitationGeoKey, "Datum")) + "}";
}

// The unit in which the keys give angles: their own, else that of the geographic system.
std::string CRSBuilder::AngleUnit() const
{
    if (moKeys.GetCode(GeogAngularUnitsGeoKey) != 0 || !moKeys.HasCode(GeographicTypeGeoKey))
        return Unit(GeogAngularUnitsGeoKey, GeogAngularUnitSizeGeoKey, true);
    const CRS poBase = CreateCRSFromEPSG(moKeys.GetCode(GeographicTypeGeoKey), moPlace);
    return UnitText("AngularUnit", poBase->GetUnitName(), poBase->GetUnitFactor());
}

std::string CRSBuilder::LengthUnit() const
{
    return Unit(ProjLinearUnitsGeoKey, ProjLinearUnitSizeGeoKey, false);
}

// A unit from its code, else from its size in metres or radians, else metres or degrees.
std::string CRSBuilder::Unit(geokey_t eCode, geokey_t eSize, bool bAngle) const
{
    const int nCode = moKeys.GetCode(eCode);
    const char* poKind = bAngle ? "AngularUnit" : "LinearUnit";
    const std::optional<double> oSize = eSize == NO_KEY ? std::nullopt : moKeys.GetNumber(eSize);
    if (!moKeys.HasCode(eCode) && oSize)
    {
        if (!std::isfinite(*oSize) || !(*oSize > 0.0))
            Fail("a unit has no possible size");
        return UnitText(poKind, "unknown", *oSize);
    }
    if (!moKeys.HasCode(eCode) || nCode == (bAngle ? int{Angular_Degree} : int{Linear_Meter}))
        return bAngle ? "\"degree\"" : "\"metre\"";
    const EPSGUnit oUnit = FindEPSGUnit(nCode, moPlace);
    if (bAngle ? !oUnit.isAngular : !oUnit.isLinear)
        Fail("the unit " + oUnit.name + (bAngle ? " is no unit of angle" : " is no unit of length"));
    return UnitText(poKind, oUnit.name, oUnit.factor);
}

// Citations are a name, or a list such as "GCS Name = a|Datum = b". "unknown" when the part is not in it.
std::string CRSBuilder::NamedPart(geokey_t eCitation, const std::string& part) const
{
    const std::string text = moKeys.GetText(eCitation);
    const auto nStart = text.find(part + " = ");
    if (nStart != std::string::npos)
    {
        const auto nName = nStart + part.size() + 3;
        return text.substr(nName, text.find('|', nName) - nName);
    }
    const bool bPlain = text.find(" = ") == std::string::npos;
    return bPlain && !text.empty() && part.ends_with(" Name") ? text : "unknown";
}

std::string CRSBuilder::ProjectedName() const
{
    const std::string name = NamedPart(PCSCitationGeoKey, "PCS Name");
    return name == "unknown" ? NamedPart(GTCitationGeoKey, "PCS Name") : name;
}

// The keys have no method for the spherical projection of web maps: their writers say a plain Mercator there and mean
// what the name says.
bool CRSBuilder::IsPseudoMercator() const
{
    if (moKeys.GetCode(ProjCoordTransGeoKey) != CT_Mercator)
        return false;
    constexpr geokey_t ZEROS[] = {ProjNatOriginLatGeoKey, ProjNatOriginLongGeoKey, ProjStdParallel1GeoKey,
                                  ProjFalseEastingGeoKey, ProjFalseNorthingGeoKey};
    for (const geokey_t eKey : ZEROS)
        if (moKeys.GetNumber(eKey).value_or(0.0) != 0.0)
            return false;
    const std::string name = ProjectedName();
    const bool bNamed = name.find("Web_Mercator") != std::string::npos ||
                        name.find("Web Mercator") != std::string::npos ||
                        name.find("Pseudo-Mercator") != std::string::npos;
    return bNamed && moKeys.GetNumber(ProjScaleAtNatOriginGeoKey).value_or(1.0) == 1.0;
}

void CRSBuilder::Fail(const std::string& cause) const
{
    throw krv::DataException("The geographic keys cannot be used: " + cause, moPlace);
}

} // namespace krv::plugins::tif
