#pragma once

#include "toolkit/api.h"

#include <span>
#include <string_view>

namespace krv::ogc::cs
{

// What the value of a parameter measures, and so the unit it is in.
enum class ParameterKind
{
    eAngle,
    eAzimuth, // an angle, too, that some formats give in a unit of its own
    eLength,
    eScale
};

// A parameter of projections, as the EPSG database has it.
struct MethodParameter
{
    int code = 0;
    const char* name = nullptr; // such as "Latitude of natural origin"
    ParameterKind kind = ParameterKind::eAngle;
};

// A way to project. Names and codes are those of the EPSG database; methods that it lacks have their usual name and 0.
struct ProjectionMethod
{
    const char* name = nullptr;
    int code = 0;
    std::span<const MethodParameter* const> parameters; // in the usual order
};

// The method of a name; null when it is not known.
KRV_TOOLKIT_API const ProjectionMethod* FindProjectionMethod(std::string_view name);

} // namespace krv::ogc::cs
