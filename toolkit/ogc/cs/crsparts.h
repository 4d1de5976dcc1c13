#pragma once

#include "toolkit/api.h"
#include "toolkit/exceptions/place.h"
#include "toolkit/ogc/cs/icrs.h"
#include "toolkit/ogc/cs/projectionmethod.h"

#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace krv::ogc::cs
{

// Reference systems as their parts, for formats that store them so. Wherever a code is not 0 it names a part in the
// EPSG database, and the values beside it do not count.

// A unit by its code, else by its size in metres or radians, else the usual one: metre or degree.
struct UnitParts
{
    int code = 0;
    std::optional<double> size;

    bool IsGiven() const { return code != 0 || size.has_value(); }
};

struct EllipsoidParts
{
    int code = 0;
    std::string name = "unknown";
    double semiMajorAxis = 0.0;     // metres
    double semiMinorAxis = 0.0;     // metres; counts where there is no flattening, and is the major one of a sphere
    double inverseFlattening = 0.0; // 0: as the axes say
};

struct PrimeMeridianParts
{
    int code = 0;
    std::string name = "unknown";
    double longitude = 0.0; // from Greenwich, in the unit of angle of the system
};

struct DatumParts
{
    int code = 0;
    std::string name = "unknown";
    EllipsoidParts ellipsoid;
    PrimeMeridianParts meridian;
};

// A geographic system, or a geocentric one.
struct GeodeticParts
{
    int code = 0;
    const ICRS* system = nullptr; // borrowed: it itself, in place of all else but the unit
    std::string name = "unknown";
    DatumParts datum;
    bool geocentric = false; // X, Y and Z in place of latitude and longitude
    UnitParts angle;         // not given: that of the system with the code, else the degree
    UnitParts length;        // of geocentric axes
    // Of a geographic system, to WGS 84 where there is no code, of 3 or 7 numbers, nothing otherwise: metres along X, Y
    // and Z, then arc seconds about them (position vector) and parts per million.
    std::vector<double> shift;
};

struct ProjectedParts
{
    std::string name = "unknown";
    GeodeticParts base;
    int conversion = 0; // a method with its parameters, such as 16032 for UTM zone 32N
    const ProjectionMethod* method = nullptr;
    std::vector<double> values; // of the method's parameters, in their order
    UnitParts azimuth;          // not given: that of angles
    UnitParts length;           // of the map
};

struct VerticalParts
{
    int code = 0;
    std::string name = "unknown";
    int datumCode = 0;
    std::string datumName = "unknown";
    UnitParts length;
};

// Makers of systems from their parts. They throw krv::ParameterException, which says what is impossible about a value,
// and krv::DataException like the functions of crsfactory.h.

KRV_TOOLKIT_API std::unique_ptr<ICRS> CreateGeodeticCRS(const GeodeticParts& oParts,
                                                        const Place& oPlace = Place::Current());

// The axes are easting and northing, but those that are usual for views of a pole and for southern grids.
KRV_TOOLKIT_API std::unique_ptr<ICRS> CreateProjectedCRS(const ProjectedParts& oParts,
                                                         const Place& oPlace = Place::Current());
KRV_TOOLKIT_API std::unique_ptr<ICRS> CreateVerticalCRS(const VerticalParts& oParts,
                                                        const Place& oPlace = Place::Current());
KRV_TOOLKIT_API std::unique_ptr<ICRS> CreateCompoundCRS(const ICRS& oHorizontal, const ICRS& oVertical,
                                                        const Place& oPlace = Place::Current());

// What a system consists of; of compound and bound ones, what their horizontal part does.
struct CRSParts
{
    // Angles are in degrees, lengths in the unit of the map. A geographic system is its own base, and has neither name
    // nor method beside. No method either where its name is not known or one of its parameters missing.
    ProjectedParts horizontal;
    int verticalCode = 0; // of its heights, unless a code of the whole says them
};

KRV_TOOLKIT_API CRSParts DescribeCRS(const ICRS& oCRS, const Place& oPlace = Place::Current());

} // namespace krv::ogc::cs
