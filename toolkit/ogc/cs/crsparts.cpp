#include "toolkit/ogc/cs/crsparts.h"

#include "toolkit/core/numbertext.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/ogc/cs/crsfactory.h"
#include "toolkit/ogc/cs/detail/projcrs.h"

#include <cmath>
#include <initializer_list>
#include <utility>

namespace krv::ogc::cs
{
namespace
{

constexpr double DEGREE = M_PI / 180.0;
constexpr int EPSG_WGS84 = 4326;
constexpr int EPSG_METRE = 9001;
constexpr int EPSG_DEGREE = 9102;
constexpr std::size_t FULL_SHIFT = 7;

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

// Members without a value are left out.
std::string Object(std::initializer_list<std::pair<const char*, std::string>> oMembers)
{
    std::string text;
    for (const auto& [pName, value] : oMembers)
        if (!value.empty())
            text += std::string(text.empty() ? "{\"" : ",\"") + pName + "\":" + value;
    return text + "}";
}

std::string UnitObject(const char* pKind, const std::string& name, double nFactor)
{
    return Object({{"type", Quoted(pKind)}, {"name", Quoted(name)}, {"conversion_factor", NumberText(nFactor)}});
}

std::string Identifier(int nCode)
{
    return nCode == 0 ? std::string() : Object({{"authority", "\"EPSG\""}, {"code", std::to_string(nCode)}});
}

std::string Method(const char* pName, int nCode)
{
    return Object({{"name", Quoted(pName)}, {"id", Identifier(nCode)}});
}

std::string Value(const char* pName, double nValue, const std::string& unit, int nCode)
{
    return Object({{"name", Quoted(pName)}, {"value", NumberText(nValue)}, {"unit", unit}, {"id", Identifier(nCode)}});
}

std::string Axis(const char* pName, const char* pAbbreviation, const char* pDirection, const std::string& unit)
{
    return Object({{"name", Quoted(pName)},
                   {"abbreviation", Quoted(pAbbreviation)},
                   {"direction", Quoted(pDirection)},
                   {"unit", unit}});
}

std::string Axes(const char* pKind, const std::string& axes)
{
    return Object({{"subtype", Quoted(pKind)}, {"axis", "[" + axes + "]"}});
}

std::string MapAxes(const char* pEasting, const char* pNorthing, const std::string& unit)
{
    return Axes("Cartesian", Axis("Easting", "E", pEasting, unit) + "," + Axis("Northing", "N", pNorthing, unit));
}

// Projections seen from a pole, and those of the southern grids, count along other directions; a definition that
// ignores it would not be the same system as the one with a code.
std::string UnusualAxes(const ICRS& oPlain, const std::string& unit)
{
    const std::string method = oPlain.GetProjectionMethod();
    if (method == "Transverse Mercator (South Orientated)")
        return Axes("Cartesian", Axis("Westing", "Y", "west", unit) + "," + Axis("Southing", "X", "south", unit));
    const auto oParameters = oPlain.GetProjectionParameters();
    if (!method.starts_with("Polar Stereographic") || oParameters.empty())
        return {};
    const char* pDirection = oParameters.front().value > 0.0 ? "south" : "north";
    return MapAxes(pDirection, pDirection, unit);
}

std::string ShiftObject(const std::vector<double>& oShift)
{
    constexpr const char* NAMES[FULL_SHIFT] = {"X-axis translation", "Y-axis translation", "Z-axis translation",
                                               "X-axis rotation",    "Y-axis rotation",    "Z-axis rotation",
                                               "Scale difference"};
    constexpr int FIRST_CODE = 8605;
    const std::string arcSecond = UnitObject("AngularUnit", "arc-second", DEGREE / 3600.0);
    const std::string million = UnitObject("ScaleUnit", "parts per million", 1e-6);
    std::string parameters;
    for (std::size_t nAt = 0; nAt < oShift.size(); ++nAt)
        parameters += (nAt == 0 ? "" : ",") + Value(NAMES[nAt], oShift[nAt],
                                                    nAt < 3   ? "\"metre\""
                                                    : nAt < 6 ? arcSecond
                                                              : million,
                                                    FIRST_CODE + static_cast<int>(nAt));
    return Object(
        {{"name", "\"Transformation to WGS84\""},
         {"method", oShift.size() == FULL_SHIFT ? Method("Position Vector transformation (geog2D domain)", 9606)
                                                : Method("Geocentric translations (geog2D domain)", 9603)},
         {"parameters", "[" + parameters + "]"}});
}

// Parts as PROJJSON.
class PartsText
{
public:
    explicit PartsText(const Place& oPlace) : moPlace(oPlace) {}

    std::string Angle(const GeodeticParts& oParts) const;
    std::string Length(const UnitParts& oParts) const { return Unit(oParts, false); }
    std::string Datum(const GeodeticParts& oParts) const;
    std::string Geodetic(const GeodeticParts& oParts) const;
    std::string Conversion(const ProjectedParts& oParts) const;
    std::unique_ptr<ICRS> Shifted(std::unique_ptr<ICRS> poSystem, const GeodeticParts& oParts) const;

private:
    std::string Unit(const UnitParts& oParts, bool bAngle) const;
    std::string Ellipsoid(const EllipsoidParts& oParts) const;
    std::string PrimeMeridian(const GeodeticParts& oParts) const;
    std::string Known(eEPSGPart ePart, int nCode) const { return DescribeEPSGPart(ePart, nCode, moPlace); }
    void Expect(bool bPossible, const std::string& trouble, const char* pParameter) const
    {
        if (!bPossible)
            throw ParameterException(trouble, ParameterException::eInvalidValue, pParameter, moPlace);
    }

    const Place& moPlace;
};

std::string PartsText::Unit(const UnitParts& oParts, bool bAngle) const
{
    const char* const pKind = bAngle ? "AngularUnit" : "LinearUnit";
    if (oParts.code == 0 && oParts.size)
    {
        Expect(std::isfinite(*oParts.size) && *oParts.size > 0.0, "a unit has no possible size", "size");
        return UnitObject(pKind, "unknown", *oParts.size);
    }
    if (oParts.code == 0 || oParts.code == (bAngle ? EPSG_DEGREE : EPSG_METRE))
        return bAngle ? "\"degree\"" : "\"metre\"";
    const EPSGUnit oUnit = FindEPSGUnit(oParts.code, moPlace);
    Expect(bAngle ? oUnit.isAngular : oUnit.isLinear,
           "the unit " + oUnit.name + (bAngle ? " is no unit of angle" : " is no unit of length"), "code");
    return UnitObject(pKind, oUnit.name, oUnit.factor);
}

std::string PartsText::Angle(const GeodeticParts& oParts) const
{
    if (oParts.angle.IsGiven() || oParts.code == 0)
        return Unit(oParts.angle, true);
    const auto poBase = CreateCRSFromEPSG(oParts.code, moPlace);
    return UnitObject("AngularUnit", poBase->GetUnitName(), poBase->GetUnitFactor());
}

std::string PartsText::Ellipsoid(const EllipsoidParts& oParts) const
{
    if (oParts.code != 0)
        return Known(eEPSG_Ellipsoid, oParts.code);
    const double nMajor = oParts.semiMajorAxis;
    const double nMinor = oParts.semiMinorAxis;
    const double nFlattening = oParts.inverseFlattening;
    Expect(std::isfinite(nMajor) && nMajor > 0.0 && std::isfinite(nMinor) && nMinor > 0.0 &&
               std::isfinite(nFlattening) && nFlattening >= 0.0,
           "the ellipsoid has no possible size", "ellipsoid");
    const bool bFlattening = nFlattening > 0.0;
    const bool bSphere = !bFlattening && nMinor == nMajor;
    return Object({{"name", Quoted(oParts.name)},
                   {bSphere ? "radius" : "semi_major_axis", NumberText(nMajor)},
                   {bFlattening ? "inverse_flattening" : "semi_minor_axis",
                    bSphere ? std::string() : NumberText(bFlattening ? nFlattening : nMinor)}});
}

// Empty for Greenwich.
std::string PartsText::PrimeMeridian(const GeodeticParts& oParts) const
{
    const PrimeMeridianParts& oMeridian = oParts.datum.meridian;
    if (oMeridian.code != 0)
        return Known(eEPSG_PrimeMeridian, oMeridian.code);
    Expect(std::isfinite(oMeridian.longitude), "the prime meridian is not finite", "longitude");
    if (oMeridian.longitude == 0.0)
        return {};
    return Object({{"name", Quoted(oMeridian.name)},
                   {"longitude", Object({{"value", NumberText(oMeridian.longitude)}, {"unit", Angle(oParts)}})}});
}

std::string PartsText::Datum(const GeodeticParts& oParts) const
{
    const DatumParts& oDatum = oParts.datum;
    if (oDatum.code != 0)
        return Known(eEPSG_Datum, oDatum.code);
    return Object({{"type", "\"GeodeticReferenceFrame\""},
                   {"name", Quoted(oDatum.name)},
                   {"ellipsoid", Ellipsoid(oDatum.ellipsoid)},
                   {"prime_meridian", PrimeMeridian(oParts)}});
}

std::string PartsText::Geodetic(const GeodeticParts& oParts) const
{
    if (oParts.code != 0)
        return Known(eEPSG_CRS, oParts.code);
    if (oParts.system != nullptr)
        return oParts.system->GetPROJJSON();
    const std::string unit = oParts.geocentric ? Length(oParts.length) : Angle(oParts);
    const std::string axes = oParts.geocentric
                                 ? Axes("Cartesian", Axis("Geocentric X", "X", "geocentricX", unit) + "," +
                                                         Axis("Geocentric Y", "Y", "geocentricY", unit) + "," +
                                                         Axis("Geocentric Z", "Z", "geocentricZ", unit))
                                 : Axes("ellipsoidal", Axis("Geodetic latitude", "Lat", "north", unit) + "," +
                                                           Axis("Geodetic longitude", "Lon", "east", unit));
    return Object({{"type", oParts.geocentric ? "\"GeodeticCRS\"" : "\"GeographicCRS\""},
                   {"name", Quoted(oParts.name)},
                   {"datum", Datum(oParts)},
                   {"coordinate_system", axes}});
}

std::string PartsText::Conversion(const ProjectedParts& oParts) const
{
    if (oParts.conversion != 0)
        return Known(eEPSG_Conversion, oParts.conversion);
    Expect(oParts.method != nullptr, "the projection has no method", "method");
    const auto oParameters = oParts.method->parameters;
    Expect(oParts.values.size() == oParameters.size(), "the projection has another number of parameters", "values");
    const std::string angle = Angle(oParts.base);
    const std::string azimuth = oParts.azimuth.IsGiven() ? Unit(oParts.azimuth, true) : angle;
    const std::string units[] = {angle, azimuth, Length(oParts.length), "\"unity\""};
    std::string parameters;
    for (std::size_t nAt = 0; nAt < oParameters.size(); ++nAt)
    {
        const MethodParameter& oParameter = *oParameters[nAt];
        Expect(std::isfinite(oParts.values[nAt]),
               "the parameter \"" + std::string(oParameter.name) + "\" is not finite", "values");
        parameters += (nAt == 0 ? "" : ",") + Value(oParameter.name, oParts.values[nAt],
                                                    units[static_cast<int>(oParameter.kind)], oParameter.code);
    }
    return Object({{"type", "\"Conversion\""},
                   {"name", "\"unnamed\""},
                   {"method", Method(oParts.method->name, oParts.method->code)},
                   {"parameters", "[" + parameters + "]"}});
}

// Bound to WGS 84.
std::unique_ptr<ICRS> PartsText::Shifted(std::unique_ptr<ICRS> poSystem, const GeodeticParts& oParts) const
{
    const std::size_t nCount = oParts.shift.size();
    if (oParts.code != 0 || oParts.geocentric || nCount == 0)
        return poSystem;
    Expect(nCount == 3 || nCount == FULL_SHIFT, "the shift to WGS 84 has neither three nor seven numbers", "shift");
    for (const double nValue : oParts.shift)
        Expect(std::isfinite(nValue), "the shift to WGS 84 is not finite", "shift");
    return CreateCRSFromWKT(Object({{"type", "\"BoundCRS\""},
                                    {"source_crs", poSystem->GetPROJJSON()},
                                    {"target_crs", Known(eEPSG_CRS, EPSG_WGS84)},
                                    {"transformation", ShiftObject(oParts.shift)}}),
                            moPlace);
}

// In the unit that the parts of systems are told in.
double ToUnit(const ProjectionParameter& oParameter, double nUnit)
{
    constexpr double ROUNDING = 1e-12;
    const bool bSame = std::abs(oParameter.unitFactor / nUnit - 1.0) < ROUNDING;
    return bSame ? oParameter.value : oParameter.value * oParameter.unitFactor / nUnit;
}

void DescribeMethod(const ICRS& oCRS, ProjectedParts& oParts)
{
    const ProjectionMethod* const pMethod = FindProjectionMethod(oCRS.GetProjectionMethod());
    if (pMethod == nullptr)
        return;
    const double units[] = {DEGREE, DEGREE, oCRS.GetUnitFactor(), 1.0};
    const std::vector<ProjectionParameter> oParameters = oCRS.GetProjectionParameters();
    std::vector<double> oValues;
    for (const MethodParameter* pWanted : pMethod->parameters)
        for (const ProjectionParameter& oParameter : oParameters)
            if (oParameter.name == pWanted->name)
            {
                oValues.push_back(ToUnit(oParameter, units[static_cast<int>(pWanted->kind)]));
                break;
            }
    if (oValues.size() != pMethod->parameters.size())
        return;
    oParts.method = pMethod;
    oParts.values = std::move(oValues);
}

} // namespace

std::unique_ptr<ICRS> CreateGeodeticCRS(const GeodeticParts& oParts, const Place& oPlace)
{
    if (oParts.code != 0)
        return CreateCRSFromEPSG(oParts.code, oPlace);
    const PartsText oText(oPlace);
    return oText.Shifted(CreateCRSFromWKT(oText.Geodetic(oParts), oPlace), oParts);
}

std::unique_ptr<ICRS> CreateProjectedCRS(const ProjectedParts& oParts, const Place& oPlace)
{
    const PartsText oText(oPlace);
    const std::string base = oText.Geodetic(oParts.base);
    const std::string conversion = oText.Conversion(oParts);
    const std::string unit = oText.Length(oParts.length);
    const auto Create = [&](const std::string& axes)
    {
        return CreateCRSFromWKT(Object({{"type", "\"ProjectedCRS\""},
                                        {"name", Quoted(oParts.name)},
                                        {"base_crs", base},
                                        {"conversion", conversion},
                                        {"coordinate_system", axes}}),
                                oPlace);
    };
    std::unique_ptr<ICRS> poSystem = Create(MapAxes("east", "north", unit));
    const std::string axes = UnusualAxes(*poSystem, unit);
    return oText.Shifted(axes.empty() ? std::move(poSystem) : Create(axes), oParts.base);
}

std::unique_ptr<ICRS> CreateVerticalCRS(const VerticalParts& oParts, const Place& oPlace)
{
    if (oParts.code != 0)
        return CreateCRSFromWKT(DescribeEPSGPart(eEPSG_CRS, oParts.code, oPlace), oPlace);
    const std::string datum =
        oParts.datumCode != 0 ? DescribeEPSGPart(eEPSG_Datum, oParts.datumCode, oPlace)
                              : Object({{"type", "\"VerticalReferenceFrame\""}, {"name", Quoted(oParts.datumName)}});
    const std::string unit = PartsText(oPlace).Length(oParts.length);
    return CreateCRSFromWKT(
        Object({{"type", "\"VerticalCRS\""},
                {"name", Quoted(oParts.name)},
                {"datum", datum},
                {"coordinate_system", Axes("vertical", Axis("Gravity-related height", "H", "up", unit))}}),
        oPlace);
}

std::unique_ptr<ICRS> CreateCompoundCRS(const ICRS& oHorizontal, const ICRS& oVertical, const Place& oPlace)
{
    return CreateCRSFromWKT(
        Object({{"type", "\"CompoundCRS\""},
                {"name", Quoted(oHorizontal.GetName() + " + " + oVertical.GetName())},
                {"components", "[" + oHorizontal.GetPROJJSON() + "," + oVertical.GetPROJJSON() + "]"}}),
        oPlace);
}

CRSParts DescribeCRS(const ICRS& oCRS, const Place& oPlace)
{
    auto poContext = std::make_unique<detail::ProjContext>();
    detail::ProjObject poObject = detail::MakeObject(*poContext, oCRS, oPlace);
    const detail::ProjCRS oOwn(std::move(poContext), std::move(poObject));
    CRSParts oParts;
    oParts.verticalCode = oOwn.GetVerticalEPSG();
    GeodeticParts& oBase = oParts.horizontal.base;
    oBase = oOwn.GetBase();
    oBase.datum.name = oCRS.GetDatumName();
    EllipsoidParts& oEllipsoid = oBase.datum.ellipsoid;
    oEllipsoid.name = oCRS.GetEllipsoidName();
    oEllipsoid.semiMajorAxis = oEllipsoid.semiMinorAxis = oCRS.GetSemiMajorAxis();
    oEllipsoid.inverseFlattening = oCRS.GetInverseFlattening();
    oBase.angle.code = EPSG_DEGREE;
    if (!oCRS.IsProjected())
        return oParts;
    oParts.horizontal.name = oCRS.GetName();
    oParts.horizontal.length.size = oCRS.GetUnitFactor();
    DescribeMethod(oCRS, oParts.horizontal);
    return oParts;
}

} // namespace krv::ogc::cs
