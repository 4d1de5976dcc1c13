#pragma once

#include <array>
#include <string>

#include <geotiff.h>
#include <geovalues.h>

namespace krv::plugins::tif
{

enum eParameterKind
{
    eAngle,
    eAzimuth,
    eLength,
    eScale
};

// How one parameter of a projection is found among the geographic keys: the first of the keys that is there, else the
// default.
struct ParameterRule
{
    eParameterKind kind = eAngle;
    const char* name = nullptr; // null ends a list
    int code = 0;               // in the EPSG database
    std::array<geokey_t, 4> keys = {};
    double fallback = 0.0;
};

// A projection method of the geographic keys (the values of key 3075) in the terms of the EPSG database.
struct ProjectionRule
{
    int method = 0; // value of key 3075
    const char* name = nullptr;
    int code = 0; // in the EPSG database, 0 when it has none
    std::array<ParameterRule, 8> parameters = {};
};

// The rule of a method; null for one that cannot be expressed. Methods with variants (Mercator, polar stereographic)
// have one rule for each, told apart by bSecond: Mercator with a standard parallel in place of the scale, polar
// stereographic with a parallel of true scale away from the pole.
const ProjectionRule* FindProjectionRule(int nMethod, bool bSecond);

// The spherical Mercator projection of web maps, which the keys cannot tell from the plain one.
const ProjectionRule& GetPseudoMercatorRule();

// The rule of a method by its name in the EPSG database; null when the keys cannot say it.
const ProjectionRule* FindProjectionRule(const std::string& name);

} // namespace krv::plugins::tif
