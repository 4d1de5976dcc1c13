#include "plugins/support/geotiff/keyproposals.h"

#include "plugins/support/geotiff/keyrules.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/ogc/cs/crsparts.h"

#include <cmath>
#include <optional>
#include <string>

#include <geokeys.h>
#include <geovalues.h>

namespace krv::plugins::support
{

namespace
{

using namespace krv::ogc::cs;

constexpr std::uint16_t USER_DEFINED = 32767;
constexpr std::uint16_t METRE = 9001;
constexpr std::uint16_t DEGREE = 9102;
constexpr double DEGREE_SIZE = M_PI / 180.0;
constexpr double UNIT_ROUNDING = 1e-12;
constexpr std::size_t LONGEST_TEXT = 60000;

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

void SetHeights(GeoKeyList& oKeys, const CRSParts& oParts)
{
    const std::uint16_t nCode = ToCode(oParts.verticalCode);
    if (nCode != 0)
        oKeys.Set(VerticalCSTypeGeoKey, nCode);
}

std::optional<GeoKeyList> ByCode(const ICRS& oCRS, const CRSParts& oParts)
{
    const std::uint16_t nCode = ToCode(oCRS.GetEPSG());
    if (nCode == 0)
        return std::nullopt;
    GeoKeyList oKeys;
    SetModel(oKeys, oCRS);
    oKeys.Set(GTCitationGeoKey, oCRS.GetName());
    oKeys.Set(oCRS.IsProjected() ? ProjectedCSTypeGeoKey : GeographicTypeGeoKey, nCode);
    SetUnits(oKeys, oCRS);
    SetHeights(oKeys, oParts);
    return oKeys;
}

// The geographic system below: by its code, else by datum and ellipsoid. Citations name the parts.
void SetBase(GeoKeyList& oKeys, const GeodeticParts& oParts)
{
    const std::uint16_t nBase = ToCode(oParts.code);
    if (nBase != 0)
        return oKeys.Set(GeographicTypeGeoKey, nBase);
    const DatumParts& oDatum = oParts.datum;
    const EllipsoidParts& oEllipsoid = oDatum.ellipsoid;
    oKeys.Set(GeographicTypeGeoKey, USER_DEFINED);
    oKeys.Set(GeogCitationGeoKey,
              "GCS Name = " + oParts.name + "|Datum = " + oDatum.name + "|Ellipsoid = " + oEllipsoid.name);
    const std::uint16_t nDatum = ToCode(oDatum.code);
    oKeys.Set(GeogGeodeticDatumGeoKey, nDatum != 0 ? nDatum : USER_DEFINED);
    oKeys.Set(GeogAngularUnitsGeoKey, DEGREE);
    if (nDatum != 0)
        return;
    oKeys.Set(GeogEllipsoidGeoKey, USER_DEFINED);
    oKeys.Set(GeogSemiMajorAxisGeoKey, std::vector<double>{oEllipsoid.semiMajorAxis});
    if (oEllipsoid.inverseFlattening != 0.0)
        oKeys.Set(GeogInvFlatteningGeoKey, std::vector<double>{oEllipsoid.inverseFlattening});
    else
        oKeys.Set(GeogSemiMinorAxisGeoKey, std::vector<double>{oEllipsoid.semiMinorAxis});
}

std::optional<GeoKeyList> ByParts(const ICRS& oCRS, const CRSParts& oParts)
{
    if (!oCRS.IsProjected() && !oCRS.IsGeographic())
        return std::nullopt;
    GeoKeyList oKeys;
    SetModel(oKeys, oCRS);
    oKeys.Set(GTCitationGeoKey, oCRS.GetName());
    SetBase(oKeys, oParts.horizontal.base);
    if (!oParts.horizontal.base.shift.empty())
        oKeys.Set(GeogTOWGS84GeoKey, oParts.horizontal.base.shift);
    SetUnits(oKeys, oCRS);
    SetHeights(oKeys, oParts);
    if (!oCRS.IsProjected())
        return oKeys;
    const ProjectedParts& oMap = oParts.horizontal;
    const std::uint16_t nMethod = oMap.method != nullptr ? FindMethodKey(*oMap.method) : std::uint16_t{0};
    if (nMethod == 0)
        return std::nullopt;
    for (std::size_t nAt = 0; nAt < oMap.values.size(); ++nAt)
        oKeys.Set(FindParameterKeys(nMethod, oMap.method->parameters[nAt]->code).keys.front(),
                  std::vector<double>{oMap.values[nAt]});
    oKeys.Set(GeogAngularUnitsGeoKey, DEGREE);
    oKeys.Set(ProjectedCSTypeGeoKey, USER_DEFINED);
    oKeys.Set(PCSCitationGeoKey, oCRS.GetName());
    oKeys.Set(ProjectionGeoKey, USER_DEFINED);
    oKeys.Set(ProjCoordTransGeoKey, nMethod);
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
    oKeys.Set(bProjected ? PCSCitationGeoKey : GTCitationGeoKey, std::string(DEFINITION_PREFIX) + definition);
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
    const CRSParts oParts = DescribeCRS(oCRS);
    Add(ByCode(oCRS, oParts));
    Add(ByParts(oCRS, oParts));
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

} // namespace krv::plugins::support
