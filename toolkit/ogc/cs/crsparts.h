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
// Neither code nor size: nothing was said, and the maker takes the usual unit of the part in question.
struct UnitParts
{
    int code = 0;
    std::optional<double> size; // metres or radians in one unit, above 0

    bool IsGiven() const { return code != 0 || size.has_value(); }
};

// One that nothing is said of (code 0, axis 0) is refused by the makers with its cause.
struct EllipsoidParts
{
    int code = 0;                   // such as 7030 for WGS 84
    std::string name = "unknown";   // of the ellipsoid; counts where there is no code
    double semiMajorAxis = 0.0;     // metres
    double semiMinorAxis = 0.0;     // metres; counts where there is no flattening, and is the major one of a sphere
    double inverseFlattening = 0.0; // 0: as the axes say
};

// Code 0 and longitude 0 is Greenwich.
struct PrimeMeridianParts
{
    int code = 0;
    std::string name = "unknown";
    double longitude = 0.0; // from Greenwich, in the unit of angle of the system
};

// The ellipsoid and meridian count where there is no code; a code brings both with it.
struct DatumParts
{
    int code = 0;                 // such as 6326 for WGS 84
    std::string name = "unknown"; // of the meridian
    EllipsoidParts ellipsoid;
    PrimeMeridianParts meridian;
};

// A geographic system, or a geocentric one.
// Example: GeodeticParts oParts; oParts.code = 4326; CreateGeodeticCRS(oParts) gives WGS 84.
struct GeodeticParts
{
    int code = 0;                 // of the whole system, such as 4326
    const ICRS* system = nullptr; // borrowed: it itself, in place of all else but the unit
    std::string name = "unknown"; // of the system
    DatumParts datum;
    bool geocentric = false; // X, Y and Z in place of latitude and longitude
    UnitParts angle;         // not given: that of the system with the code, else the degree
    UnitParts length;        // of geocentric axes
    // Of a geographic system, to WGS 84 where there is no code, of 3 or 7 numbers, nothing otherwise: metres along X, Y
    // and Z, then arc seconds about them (position vector) and parts per million.
    std::vector<double> shift;
};

// Either a conversion by its code or a method with its values: the code wins.
// Example: base.code = 4326 and conversion = 16032 make "WGS 84 / UTM zone 32N" but for its name.
struct ProjectedParts
{
    std::string name = "unknown"; // of the datum
    GeodeticParts base;           // that is projected; the geographic system of the ellipsoid
    int conversion = 0;           // a method with its parameters, such as 16032 for UTM zone 32N

    // Borrowed, of the table that FindProjectionMethod searches; it lives as long as the program.
    const ProjectionMethod* method = nullptr;
    std::vector<double> values; // of the method's parameters, in their order
    UnitParts azimuth;          // not given: that of angles
    UnitParts length;           // of the map
};

// Heights above a surface of gravity; the axis points upwards.
struct VerticalParts
{
    int code = 0;
    std::string name = "unknown";
    int datumCode = 0;                 // such as 5773 for EGM96
    std::string datumName = "unknown"; // counts where there is no code
    UnitParts length;
};

// Makers of systems from their parts. They throw krv::ParameterException, which says what is impossible about a value,
// and krv::DataException like the functions of crsfactory.h.

// oParts.system is not kept: the new system has all it needs of its own. The caller owns it.
KRV_TOOLKIT_API std::unique_ptr<ICRS> CreateGeodeticCRS(const GeodeticParts& oParts,
                                                        const Place& oPlace = Place::Current());

// The axes are easting and northing, but those that are usual for views of a pole and for southern grids.
KRV_TOOLKIT_API std::unique_ptr<ICRS> CreateProjectedCRS(const ProjectedParts& oParts,
                                                         const Place& oPlace = Place::Current());

// Of use in a compound alone: images are placed by horizontal systems.
KRV_TOOLKIT_API std::unique_ptr<ICRS> CreateVerticalCRS(const VerticalParts& oParts,
                                                        const Place& oPlace = Place::Current());

// oHorizontal: geographic or projected. oVertical: made by CreateVerticalCRS or of a vertical definition.
KRV_TOOLKIT_API std::unique_ptr<ICRS> CreateCompoundCRS(const ICRS& oHorizontal, const ICRS& oVertical,
                                                        const Place& oPlace = Place::Current());

// What a system consists of; of compound and bound ones, what their horizontal part does.
struct CRSParts
{
    // Angles are in degrees, lengths in the unit of the map. A geographic system is its own base, and has neither name
    // nor method beside. No method either where its name is not known or one of its parameters missing.
    ProjectedParts horizontal; // with the base system
    int verticalCode = 0;      // of its heights, unless a code of the whole says them
};

// The way back of the makers: what comes out, made anew, is equivalent where every part has a name that formats know.
// Engineering systems and such without a datum come out with their names and no more.
KRV_TOOLKIT_API CRSParts DescribeCRS(const ICRS& oCRS, const Place& oPlace = Place::Current());

} // namespace krv::ogc::cs
