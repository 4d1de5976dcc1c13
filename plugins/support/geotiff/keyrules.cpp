#include "plugins/support/geotiff/keyrules.h"

#include <algorithm>
#include <iterator>

#include <geotiff.h>
#include <geovalues.h>

namespace krv::plugins::support
{
namespace
{

using krv::ogc::cs::ProjectionMethod;

struct MethodKey
{
    std::uint16_t key;
    const char* name; // of the method in the EPSG database
    bool second = false;
};

// Where a method has two keys the first one is written.
constexpr MethodKey METHODS[] = {
    {CT_TransverseMercator, "Transverse Mercator"},
    {CT_ObliqueMercator, "Hotine Oblique Mercator (variant A)"},
    {CT_HotineObliqueMercatorAzimuthCenter, "Hotine Oblique Mercator (variant B)"},
    {CT_ObliqueMercator_Laborde, "Laborde Oblique Mercator"},
    {CT_ObliqueMercator_Rosenmund, "Hotine Oblique Mercator (variant B)"},
    {CT_Mercator, "Mercator (variant A)"},
    {CT_Mercator, "Mercator (variant B)", true},
    {CT_LambertConfConic_2SP, "Lambert Conic Conformal (2SP)"},
    {CT_LambertConfConic_1SP, "Lambert Conic Conformal (1SP)"},
    {CT_LambertAzimEqualArea, "Lambert Azimuthal Equal Area"},
    {CT_AlbersEqualArea, "Albers Equal Area"},
    {CT_AzimuthalEquidistant, "Modified Azimuthal Equidistant"},
    {CT_EquidistantConic, "Equidistant Conic"},
    {CT_Stereographic, "Stereographic"},
    {CT_PolarStereographic, "Polar Stereographic (variant A)"},
    {CT_PolarStereographic, "Polar Stereographic (variant B)", true},
    {CT_ObliqueStereographic, "Oblique Stereographic"},
    {CT_Equirectangular, "Equidistant Cylindrical"},
    {CT_CassiniSoldner, "Cassini-Soldner"},
    {CT_Gnomonic, "Gnomonic"},
    {CT_MillerCylindrical, "Miller Cylindrical"},
    {CT_Orthographic, "Orthographic"},
    {CT_Polyconic, "American Polyconic"},
    {CT_Robinson, "Robinson"},
    {CT_Sinusoidal, "Sinusoidal"},
    {CT_VanDerGrinten, "Van Der Grinten"},
    {CT_NewZealandMapGrid, "New Zealand Map Grid"},
    {CT_TransvMercator_SouthOriented, "Transverse Mercator (South Orientated)"},
    {CT_CylindricalEqualArea, "Lambert Cylindrical Equal Area"},
};

// Those of one method stand before those of all.
constexpr ParameterKeys PARAMETERS[] = {
    {8801, {ProjNatOriginLatGeoKey, ProjStdParallel1GeoKey, ProjCenterLatGeoKey}, 90.0, CT_PolarStereographic},
    {8801, {ProjCenterLatGeoKey, ProjNatOriginLatGeoKey, ProjFalseOriginLatGeoKey}, 0.0, CT_Equirectangular},
    {8801, {ProjNatOriginLatGeoKey, ProjFalseOriginLatGeoKey, ProjCenterLatGeoKey}},
    {8802,
     {ProjStraightVertPoleLongGeoKey, ProjNatOriginLongGeoKey, ProjFalseOriginLongGeoKey, ProjCenterLongGeoKey},
     0.0,
     CT_PolarStereographic},
    {8802, {ProjNatOriginLongGeoKey, ProjFalseOriginLongGeoKey, ProjCenterLongGeoKey, ProjStraightVertPoleLongGeoKey}},
    {8805, {ProjScaleAtNatOriginGeoKey, ProjScaleAtCenterGeoKey}, 1.0},
    {8806, {ProjFalseEastingGeoKey, ProjFalseOriginEastingGeoKey, ProjCenterEastingGeoKey}},
    {8807, {ProjFalseNorthingGeoKey, ProjFalseOriginNorthingGeoKey, ProjCenterNorthingGeoKey}},
    {8811, {ProjCenterLatGeoKey, ProjNatOriginLatGeoKey, ProjFalseOriginLatGeoKey}},
    {8812, {ProjCenterLongGeoKey, ProjNatOriginLongGeoKey, ProjFalseOriginLongGeoKey}},
    {8813, {ProjAzimuthAngleGeoKey}, 90.0, CT_ObliqueMercator_Rosenmund},
    {8813, {ProjAzimuthAngleGeoKey}},
    {8814, {ProjRectifiedGridAngleGeoKey}, 90.0, CT_ObliqueMercator_Rosenmund},
    // The grid is turned back by the azimuth where it has no angle of its own, so that it points north at the centre.
    {8814, {ProjRectifiedGridAngleGeoKey, ProjAzimuthAngleGeoKey}},
    {8815, {ProjScaleAtCenterGeoKey, ProjScaleAtNatOriginGeoKey}, 1.0},
    {8816, {ProjCenterEastingGeoKey, ProjFalseEastingGeoKey, ProjFalseOriginEastingGeoKey}},
    {8817, {ProjCenterNorthingGeoKey, ProjFalseNorthingGeoKey, ProjFalseOriginNorthingGeoKey}},
    {8821, {ProjFalseOriginLatGeoKey, ProjNatOriginLatGeoKey, ProjCenterLatGeoKey}},
    {8822, {ProjFalseOriginLongGeoKey, ProjNatOriginLongGeoKey, ProjCenterLongGeoKey}},
    {8823, {ProjStdParallel1GeoKey}},
    {8824, {ProjStdParallel2GeoKey}},
    {8826, {ProjFalseOriginEastingGeoKey, ProjFalseEastingGeoKey, ProjCenterEastingGeoKey}},
    {8827, {ProjFalseOriginNorthingGeoKey, ProjFalseNorthingGeoKey, ProjCenterNorthingGeoKey}},
    {8832, {ProjNatOriginLatGeoKey, ProjStdParallel1GeoKey, ProjCenterLatGeoKey}},
    {8833, {ProjStraightVertPoleLongGeoKey, ProjNatOriginLongGeoKey, ProjFalseOriginLongGeoKey, ProjCenterLongGeoKey}},
};

} // namespace

const ParameterKeys& FindParameterKeys(std::uint16_t nMethod, int nParameter)
{
    static constexpr ParameterKeys NONE;
    for (const ParameterKeys& oKeys : PARAMETERS)
        if (oKeys.parameter == nParameter && (oKeys.method == 0 || oKeys.method == nMethod))
            return oKeys;
    return NONE;
}

const ProjectionMethod* FindMethod(std::uint16_t nMethod, bool bSecond)
{
    for (const MethodKey& oMethod : METHODS)
        if (oMethod.key == nMethod && oMethod.second == bSecond)
            return krv::ogc::cs::FindProjectionMethod(oMethod.name);
    return nullptr;
}

std::uint16_t FindMethodKey(const ProjectionMethod& oMethod)
{
    const auto pFound =
        std::find_if(std::begin(METHODS), std::end(METHODS),
                     [&oMethod](const MethodKey& oKey) { return std::string_view(oKey.name) == oMethod.name; });
    return pFound == std::end(METHODS) ? std::uint16_t{0} : pFound->key;
}

} // namespace krv::plugins::support
