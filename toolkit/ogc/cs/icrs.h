#pragma once

#include "toolkit/api.h"

#include <string>
#include <vector>

namespace krv::ogc::cs
{

// A parameter of a projection: its name, such as "Latitude of natural origin", its value in its own unit, that unit's
// name and its size in radians, metres or ones.
// Example: {"False easting", 500000, "metre", 1}.
struct ProjectionParameter
{
    std::string name;
    double value = 0.0;      // in its own unit
    std::string unitName;    // such as "degree"
    double unitFactor = 1.0; // radians, metres or ones in one unit
};

// A coordinate reference system. Made by the functions of crsfactory.h. Objects are immutable; one is used by one
// thread at a time, a clone may go to another thread. Every operation throws krv::DataException when the reference
// system library cannot answer.
// Axes of coordinates are x = easting or longitude and y = northing or latitude everywhere, whatever the definition
// says.
class KRV_TOOLKIT_API ICRS
{
public:
    virtual ~ICRS();

    // A new, independent object that the caller owns.
    virtual ICRS* Clone() const = 0;

    // The name, such as "WGS 84 / UTM zone 32N"; never empty ("unknown" when the definition has none).
    virtual std::string GetName() const = 0;

    // The EPSG code; 0 when the definition carries none. A bound system (one with a fixed shift to WGS 84) has that of
    // its base, a compound without a code of its own that of its horizontal part: the one that places pixels.
    virtual int GetEPSG() const = 0;

    // The definition as WKT2:2019 on one line; as WKT1 (the dialect that older packages and .prj files use); as
    // PROJJSON. GetWKT1 throws for a system that WKT1 cannot express.
    virtual std::string GetWKT() const = 0;
    // WKT1 on one line. Throws krv::DataException for a system that it cannot express.
    virtual std::string GetWKT1() const = 0;
    // PROJJSON on one line.
    virtual std::string GetPROJJSON() const = 0;

    // Whether both describe the same system: same datum, ellipsoid, projection and parameters. Names, and the order in
    // which the authority lists the axes, do not matter.
    // Costs up to some milliseconds: to be asked once for a file, not for each point.
    virtual bool IsEquivalent(const ICRS& oOther) const = 0;

    // Kind of the horizontal part (that of the base system for a bound, of the first part for a compound one).
    virtual bool IsGeographic() const = 0;
    // Whether the horizontal axes are eastings and northings.
    virtual bool IsProjected() const = 0;

    // Whether heights belong to the system: a compound with a vertical part, or a three-dimensional system.
    virtual bool HasVertical() const = 0;

    // Unit of the horizontal axes: its name, such as "metre" or "degree", and its size in metres, or in radians for a
    // geographic system.
    virtual std::string GetUnitName() const = 0;
    // Metres, or radians for a geographic system, in one unit.
    virtual double GetUnitFactor() const = 0;

    // Names such as "World Geodetic System 1984 ensemble", "WGS 84", "Transverse Mercator"; empty when there is no such
    // part (engineering systems have no datum of this kind, geographic ones no projection).
    virtual std::string GetDatumName() const = 0;
    // Such as "WGS 84"; empty when there is none.
    virtual std::string GetEllipsoidName() const = 0;
    // Such as "Transverse Mercator"; empty for a system that is not projected.
    virtual std::string GetProjectionMethod() const = 0;

    // Ellipsoid: semi-major axis in metres and inverse flattening (0 for a sphere). 0 and 0 when there is none.
    virtual double GetSemiMajorAxis() const = 0;
    // The inverse flattening has no unit.
    virtual double GetInverseFlattening() const = 0;

    // The parameters of the projection in the order of its definition; empty for systems that are not projected.
    virtual std::vector<ProjectionParameter> GetProjectionParameters() const = 0;
};

} // namespace krv::ogc::cs
