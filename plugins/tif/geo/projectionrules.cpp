#include "plugins/tif/geo/projectionrules.h"

namespace krv::plugins::tif
{
namespace
{

constexpr ParameterRule LATITUDE = {eAngle,
                                    "Latitude of natural origin",
                                    8801,
                                    {ProjNatOriginLatGeoKey, ProjFalseOriginLatGeoKey, ProjCenterLatGeoKey}};
constexpr ParameterRule LONGITUDE = {
    eAngle,
    "Longitude of natural origin",
    8802,
    {ProjNatOriginLongGeoKey, ProjFalseOriginLongGeoKey, ProjCenterLongGeoKey, ProjStraightVertPoleLongGeoKey}};
constexpr ParameterRule SCALE = {
    eScale, "Scale factor at natural origin", 8805, {ProjScaleAtNatOriginGeoKey, ProjScaleAtCenterGeoKey}, 1.0};
constexpr ParameterRule EASTING = {
    eLength, "False easting", 8806, {ProjFalseEastingGeoKey, ProjFalseOriginEastingGeoKey, ProjCenterEastingGeoKey}};
constexpr ParameterRule NORTHING = {eLength,
                                    "False northing",
                                    8807,
                                    {ProjFalseNorthingGeoKey, ProjFalseOriginNorthingGeoKey, ProjCenterNorthingGeoKey}};
constexpr ParameterRule PARALLEL1 = {eAngle, "Latitude of 1st standard parallel", 8823, {ProjStdParallel1GeoKey}};
constexpr ParameterRule PARALLEL2 = {eAngle, "Latitude of 2nd standard parallel", 8824, {ProjStdParallel2GeoKey}};

constexpr ParameterRule FALSE_LATITUDE = {
    eAngle, "Latitude of false origin", 8821, {ProjFalseOriginLatGeoKey, ProjNatOriginLatGeoKey, ProjCenterLatGeoKey}};
constexpr ParameterRule FALSE_LONGITUDE = {eAngle,
                                           "Longitude of false origin",
                                           8822,
                                           {ProjFalseOriginLongGeoKey, ProjNatOriginLongGeoKey, ProjCenterLongGeoKey}};
constexpr ParameterRule FALSE_EASTING = {
    eLength,
    "Easting at false origin",
    8826,
    {ProjFalseOriginEastingGeoKey, ProjFalseEastingGeoKey, ProjCenterEastingGeoKey}};
constexpr ParameterRule FALSE_NORTHING = {
    eLength,
    "Northing at false origin",
    8827,
    {ProjFalseOriginNorthingGeoKey, ProjFalseNorthingGeoKey, ProjCenterNorthingGeoKey}};

constexpr ParameterRule CENTRE_LATITUDE = {eAngle,
                                           "Latitude of projection centre",
                                           8811,
                                           {ProjCenterLatGeoKey, ProjNatOriginLatGeoKey, ProjFalseOriginLatGeoKey}};
constexpr ParameterRule CENTRE_LONGITUDE = {eAngle,
                                            "Longitude of projection centre",
                                            8812,
                                            {ProjCenterLongGeoKey, ProjNatOriginLongGeoKey, ProjFalseOriginLongGeoKey}};
constexpr ParameterRule CENTRE_EASTING = {
    eLength,
    "Easting at projection centre",
    8816,
    {ProjCenterEastingGeoKey, ProjFalseEastingGeoKey, ProjFalseOriginEastingGeoKey}};
constexpr ParameterRule CENTRE_NORTHING = {
    eLength,
    "Northing at projection centre",
    8817,
    {ProjCenterNorthingGeoKey, ProjFalseNorthingGeoKey, ProjFalseOriginNorthingGeoKey}};
constexpr ParameterRule AZIMUTH = {eAzimuth, "Azimuth of initial line", 8813, {ProjAzimuthAngleGeoKey}};
// Without an angle of its own the grid is turned back by the azimuth, so that it points north at the centre.
constexpr ParameterRule GRID_ANGLE = {
    eAzimuth, "Angle from Rectified to Skew Grid", 8814, {ProjRectifiedGridAngleGeoKey, ProjAzimuthAngleGeoKey}};
constexpr ParameterRule CENTRE_SCALE = {
    eScale, "Scale factor on initial line", 8815, {ProjScaleAtCenterGeoKey, ProjScaleAtNatOriginGeoKey}, 1.0};
constexpr ParameterRule SWISS_AZIMUTH = {eAzimuth, "Azimuth of initial line", 8813, {ProjAzimuthAngleGeoKey}, 90.0};
constexpr ParameterRule SWISS_GRID_ANGLE = {
    eAzimuth, "Angle from Rectified to Skew Grid", 8814, {ProjRectifiedGridAngleGeoKey}, 90.0};

constexpr ParameterRule POLE_LATITUDE = {eAngle,
                                         "Latitude of natural origin",
                                         8801,
                                         {ProjNatOriginLatGeoKey, ProjStdParallel1GeoKey, ProjCenterLatGeoKey},
                                         90.0};
constexpr ParameterRule POLE_PARALLEL = {eAngle,
                                         "Latitude of standard parallel",
                                         8832,
                                         {ProjNatOriginLatGeoKey, ProjStdParallel1GeoKey, ProjCenterLatGeoKey}};
constexpr ParameterRule POLE_NATURAL_LONGITUDE = {
    eAngle,
    "Longitude of natural origin",
    8802,
    {ProjStraightVertPoleLongGeoKey, ProjNatOriginLongGeoKey, ProjFalseOriginLongGeoKey, ProjCenterLongGeoKey}};
constexpr ParameterRule POLE_LONGITUDE = {
    eAngle,
    "Longitude of origin",
    8833,
    {ProjStraightVertPoleLongGeoKey, ProjNatOriginLongGeoKey, ProjFalseOriginLongGeoKey, ProjCenterLongGeoKey}};
constexpr ParameterRule CYLINDER_LATITUDE = {eAngle,
                                             "Latitude of natural origin",
                                             8801,
                                             {ProjCenterLatGeoKey, ProjNatOriginLatGeoKey, ProjFalseOriginLatGeoKey}};

constexpr ProjectionRule RULES[] = {
    {CT_TransverseMercator, "Transverse Mercator", 9807, {LATITUDE, LONGITUDE, SCALE, EASTING, NORTHING}},
    {CT_ObliqueMercator,
     "Hotine Oblique Mercator (variant A)",
     9812,
     {CENTRE_LATITUDE, CENTRE_LONGITUDE, AZIMUTH, GRID_ANGLE, CENTRE_SCALE, EASTING, NORTHING}},
    {CT_HotineObliqueMercatorAzimuthCenter,
     "Hotine Oblique Mercator (variant B)",
     9815,
     {CENTRE_LATITUDE, CENTRE_LONGITUDE, AZIMUTH, GRID_ANGLE, CENTRE_SCALE, CENTRE_EASTING, CENTRE_NORTHING}},
    {CT_ObliqueMercator_Laborde,
     "Laborde Oblique Mercator",
     9813,
     {CENTRE_LATITUDE, CENTRE_LONGITUDE, AZIMUTH, CENTRE_SCALE, EASTING, NORTHING}},
    {CT_ObliqueMercator_Rosenmund,
     "Hotine Oblique Mercator (variant B)",
     9815,
     {CENTRE_LATITUDE, CENTRE_LONGITUDE, SWISS_AZIMUTH, SWISS_GRID_ANGLE, CENTRE_SCALE, CENTRE_EASTING,
      CENTRE_NORTHING}},
    {CT_Mercator, "Mercator (variant A)", 9804, {LATITUDE, LONGITUDE, SCALE, EASTING, NORTHING}},
    {CT_LambertConfConic_2SP,
     "Lambert Conic Conformal (2SP)",
     9802,
     {FALSE_LATITUDE, FALSE_LONGITUDE, PARALLEL1, PARALLEL2, FALSE_EASTING, FALSE_NORTHING}},
    {CT_LambertConfConic_1SP, "Lambert Conic Conformal (1SP)", 9801, {LATITUDE, LONGITUDE, SCALE, EASTING, NORTHING}},
    {CT_LambertAzimEqualArea, "Lambert Azimuthal Equal Area", 9820, {LATITUDE, LONGITUDE, EASTING, NORTHING}},
    {CT_AlbersEqualArea,
     "Albers Equal Area",
     9822,
     {FALSE_LATITUDE, FALSE_LONGITUDE, PARALLEL1, PARALLEL2, FALSE_EASTING, FALSE_NORTHING}},
    {CT_AzimuthalEquidistant, "Modified Azimuthal Equidistant", 9832, {LATITUDE, LONGITUDE, EASTING, NORTHING}},
    {CT_EquidistantConic, "Equidistant Conic", 0, {LATITUDE, LONGITUDE, PARALLEL1, PARALLEL2, EASTING, NORTHING}},
    {CT_Stereographic, "Stereographic", 0, {LATITUDE, LONGITUDE, SCALE, EASTING, NORTHING}},
    {CT_PolarStereographic,
     "Polar Stereographic (variant A)",
     9810,
     {POLE_LATITUDE, POLE_NATURAL_LONGITUDE, SCALE, EASTING, NORTHING}},
    {CT_ObliqueStereographic, "Oblique Stereographic", 9809, {LATITUDE, LONGITUDE, SCALE, EASTING, NORTHING}},
    {CT_Equirectangular, "Equidistant Cylindrical", 1028, {PARALLEL1, CYLINDER_LATITUDE, LONGITUDE, EASTING, NORTHING}},
    {CT_CassiniSoldner, "Cassini-Soldner", 9806, {LATITUDE, LONGITUDE, EASTING, NORTHING}},
    {CT_Gnomonic, "Gnomonic", 0, {LATITUDE, LONGITUDE, EASTING, NORTHING}},
    {CT_MillerCylindrical, "Miller Cylindrical", 0, {LONGITUDE, EASTING, NORTHING}},
    {CT_Orthographic, "Orthographic", 9840, {LATITUDE, LONGITUDE, EASTING, NORTHING}},
    {CT_Polyconic, "American Polyconic", 9818, {LATITUDE, LONGITUDE, EASTING, NORTHING}},
    {CT_Robinson, "Robinson", 0, {LONGITUDE, EASTING, NORTHING}},
    {CT_Sinusoidal, "Sinusoidal", 0, {LONGITUDE, EASTING, NORTHING}},
    {CT_VanDerGrinten, "Van Der Grinten", 0, {LONGITUDE, EASTING, NORTHING}},
    {CT_NewZealandMapGrid, "New Zealand Map Grid", 9811, {LATITUDE, LONGITUDE, EASTING, NORTHING}},
    {CT_TransvMercator_SouthOriented,
     "Transverse Mercator (South Orientated)",
     9808,
     {LATITUDE, LONGITUDE, SCALE, EASTING, NORTHING}},
    {CT_CylindricalEqualArea, "Lambert Cylindrical Equal Area", 9835, {PARALLEL1, LONGITUDE, EASTING, NORTHING}},
};

constexpr ProjectionRule SECOND_RULES[] = {
    {CT_Mercator, "Mercator (variant B)", 9805, {PARALLEL1, LONGITUDE, EASTING, NORTHING}},
    {CT_PolarStereographic,
     "Polar Stereographic (variant B)",
     9829,
     {POLE_PARALLEL, POLE_LONGITUDE, EASTING, NORTHING}},
};

constexpr ProjectionRule PSEUDO_MERCATOR = {
    CT_Mercator, "Popular Visualisation Pseudo Mercator", 1024, {LATITUDE, LONGITUDE, EASTING, NORTHING}};

template <std::size_t N>
const ProjectionRule* Find(const ProjectionRule (&oRules)[N], int nMethod)
{
    for (const ProjectionRule& oRule : oRules)
        if (oRule.method == nMethod)
            return &oRule;
    return nullptr;
}

} // namespace

const ProjectionRule* FindProjectionRule(int nMethod, bool bSecond)
{
    return bSecond ? Find(SECOND_RULES, nMethod) : Find(RULES, nMethod);
}

const ProjectionRule& GetPseudoMercatorRule()
{
    return PSEUDO_MERCATOR;
}

const ProjectionRule* FindProjectionRule(const std::string& name)
{
    for (const ProjectionRule& oRule : RULES)
        if (name == oRule.name)
            return &oRule;
    for (const ProjectionRule& oRule : SECOND_RULES)
        if (name == oRule.name)
            return &oRule;
    return nullptr;
}

} // namespace krv::plugins::tif
