#include "toolkit/ogc/cs/projectionmethod.h"

namespace krv::ogc::cs
{
namespace
{

using Parameter = MethodParameter;
using enum ParameterKind;

constexpr Parameter LATITUDE = {8801, "Latitude of natural origin", eAngle};
constexpr Parameter LONGITUDE = {8802, "Longitude of natural origin", eAngle};
constexpr Parameter SCALE = {8805, "Scale factor at natural origin", eScale};
constexpr Parameter EASTING = {8806, "False easting", eLength};
constexpr Parameter NORTHING = {8807, "False northing", eLength};
constexpr Parameter CENTRE_LATITUDE = {8811, "Latitude of projection centre", eAngle};
constexpr Parameter CENTRE_LONGITUDE = {8812, "Longitude of projection centre", eAngle};
constexpr Parameter AZIMUTH = {8813, "Azimuth of initial line", eAzimuth};
constexpr Parameter GRID_ANGLE = {8814, "Angle from Rectified to Skew Grid", eAzimuth};
constexpr Parameter CENTRE_SCALE = {8815, "Scale factor on initial line", eScale};
constexpr Parameter CENTRE_EASTING = {8816, "Easting at projection centre", eLength};
constexpr Parameter CENTRE_NORTHING = {8817, "Northing at projection centre", eLength};
constexpr Parameter FALSE_LATITUDE = {8821, "Latitude of false origin", eAngle};
constexpr Parameter FALSE_LONGITUDE = {8822, "Longitude of false origin", eAngle};
constexpr Parameter PARALLEL1 = {8823, "Latitude of 1st standard parallel", eAngle};
constexpr Parameter PARALLEL2 = {8824, "Latitude of 2nd standard parallel", eAngle};
constexpr Parameter FALSE_EASTING = {8826, "Easting at false origin", eLength};
constexpr Parameter FALSE_NORTHING = {8827, "Northing at false origin", eLength};
constexpr Parameter POLE_PARALLEL = {8832, "Latitude of standard parallel", eAngle};
constexpr Parameter POLE_LONGITUDE = {8833, "Longitude of origin", eAngle};

constexpr const Parameter* SIMPLE[] = {&LONGITUDE, &EASTING, &NORTHING};
constexpr const Parameter* NATURAL[] = {&LATITUDE, &LONGITUDE, &EASTING, &NORTHING};
constexpr const Parameter* NATURAL_SCALED[] = {&LATITUDE, &LONGITUDE, &SCALE, &EASTING, &NORTHING};
constexpr const Parameter* TWO_PARALLELS[] = {&LATITUDE, &LONGITUDE, &PARALLEL1, &PARALLEL2, &EASTING, &NORTHING};
constexpr const Parameter* FALSE_ORIGIN[] = {&FALSE_LATITUDE, &FALSE_LONGITUDE, &PARALLEL1,
                                             &PARALLEL2,      &FALSE_EASTING,   &FALSE_NORTHING};
constexpr const Parameter* OBLIQUE[] = {&CENTRE_LATITUDE, &CENTRE_LONGITUDE, &AZIMUTH, &GRID_ANGLE,
                                        &CENTRE_SCALE,    &EASTING,          &NORTHING};
constexpr const Parameter* OBLIQUE_CENTRE[] = {&CENTRE_LATITUDE, &CENTRE_LONGITUDE, &AZIMUTH,        &GRID_ANGLE,
                                               &CENTRE_SCALE,    &CENTRE_EASTING,   &CENTRE_NORTHING};
constexpr const Parameter* LABORDE[] = {&CENTRE_LATITUDE, &CENTRE_LONGITUDE, &AZIMUTH,
                                        &CENTRE_SCALE,    &EASTING,          &NORTHING};
constexpr const Parameter* CYLINDER[] = {&PARALLEL1, &LATITUDE, &LONGITUDE, &EASTING, &NORTHING};
constexpr const Parameter* ONE_PARALLEL[] = {&PARALLEL1, &LONGITUDE, &EASTING, &NORTHING};
constexpr const Parameter* POLE[] = {&POLE_PARALLEL, &POLE_LONGITUDE, &EASTING, &NORTHING};

constexpr ProjectionMethod METHODS[] = {
    {"Transverse Mercator", 9807, NATURAL_SCALED},
    {"Transverse Mercator (South Orientated)", 9808, NATURAL_SCALED},
    {"Mercator (variant A)", 9804, NATURAL_SCALED},
    {"Mercator (variant B)", 9805, ONE_PARALLEL},
    {"Popular Visualisation Pseudo Mercator", 1024, NATURAL},
    {"Hotine Oblique Mercator (variant A)", 9812, OBLIQUE},
    {"Hotine Oblique Mercator (variant B)", 9815, OBLIQUE_CENTRE},
    {"Laborde Oblique Mercator", 9813, LABORDE},
    {"Lambert Conic Conformal (2SP)", 9802, FALSE_ORIGIN},
    {"Lambert Conic Conformal (1SP)", 9801, NATURAL_SCALED},
    {"Lambert Azimuthal Equal Area", 9820, NATURAL},
    {"Lambert Cylindrical Equal Area", 9835, ONE_PARALLEL},
    {"Albers Equal Area", 9822, FALSE_ORIGIN},
    {"Modified Azimuthal Equidistant", 9832, NATURAL},
    {"Equidistant Conic", 0, TWO_PARALLELS},
    {"Equidistant Cylindrical", 1028, CYLINDER},
    {"Stereographic", 0, NATURAL_SCALED},
    {"Polar Stereographic (variant A)", 9810, NATURAL_SCALED},
    {"Polar Stereographic (variant B)", 9829, POLE},
    {"Oblique Stereographic", 9809, NATURAL_SCALED},
    {"Cassini-Soldner", 9806, NATURAL},
    {"Gnomonic", 0, NATURAL},
    {"Miller Cylindrical", 0, SIMPLE},
    {"Orthographic", 9840, NATURAL},
    {"American Polyconic", 9818, NATURAL},
    {"Robinson", 0, SIMPLE},
    {"Sinusoidal", 0, SIMPLE},
    {"Van Der Grinten", 0, SIMPLE},
    {"New Zealand Map Grid", 9811, NATURAL},
};

} // namespace

const ProjectionMethod* FindProjectionMethod(std::string_view name)
{
    for (const ProjectionMethod& oMethod : METHODS)
        if (name == oMethod.name)
            return &oMethod;
    return nullptr;
}

} // namespace krv::ogc::cs
