#pragma once

#include "toolkit/api.h"

#include <span>
#include <string_view>

namespace krv::ogc::cs
{

// What the value of a parameter measures, and so the unit it is in.
// Units are not part of a method: the maker of a system is told them (crsparts.h).
enum class ParameterKind
{
    eAngle,
    eAzimuth, // an angle, too, that some formats give in a unit of its own
    eLength,
    eScale // a ratio without unit, near 1
};

// A parameter of projections, as the EPSG database has it.
// Entries are constants of the library: pointers to them stay valid, names end with a zero byte.
struct MethodParameter
{
    int code = 0;               // such as 8801; 0 for a parameter that the database lacks
    const char* name = nullptr; // such as "Latitude of natural origin"
    ParameterKind kind = ParameterKind::eAngle;
};

// A way to project. Names and codes are those of the EPSG database; methods that it lacks have their usual name and 0.
// Values of a system stand in the order of `parameters`, one for each (ProjectedParts::values).
struct ProjectionMethod
{
    const char* name = nullptr; // such as "Transverse Mercator"
    int code = 0;               // such as 9807 for Transverse Mercator; 0 for a method that the database lacks
    std::span<const MethodParameter* const> parameters; // in the usual order
};

// The method of a name; null when it is not known.
// Names as ICRS::GetProjectionMethod gives them, such as "Transverse Mercator". The result is never to be freed.
KRV_TOOLKIT_API const ProjectionMethod* FindProjectionMethod(std::string_view name);

} // namespace krv::ogc::cs
