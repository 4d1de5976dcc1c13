#pragma once

#include "toolkit/api.h"
#include "toolkit/exceptions/place.h"
#include "toolkit/ogc/cs/icrs.h"

#include <memory>
#include <string>

namespace krv::ogc::cs
{

// Makers of reference systems. All of them throw krv::DataException with what was asked for and the cause; a missing
// database (proj.db) is such a cause. Nothing is printed, the network is not used. Callable from any thread.

// The system of an EPSG code.
// Example: CreateCRSFromEPSG(32633)->GetName() is "WGS 84 / UTM zone 33N". The first call of a process opens the
// database and takes some milliseconds, others much less.
KRV_TOOLKIT_API std::unique_ptr<ICRS> CreateCRSFromEPSG(int nCode, const Place& oPlace = Place::Current());

// The system of a definition: WKT1 (both common dialects), WKT2, PROJJSON or "EPSG:n"; white space around it is
// ignored. Safe for texts from files: at most 1 MiB, bounded nesting, and nothing in them makes a file be opened.
KRV_TOOLKIT_API std::unique_ptr<ICRS> CreateCRSFromWKT(const std::string& definition,
                                                       const Place& oPlace = Place::Current());

// Parts of systems in the EPSG database.
enum eEPSGPart
{
    eEPSG_CRS,
    eEPSG_Datum, // an ensemble counts as one datum
    eEPSG_Ellipsoid,
    eEPSG_PrimeMeridian,
    eEPSG_Conversion // a projection with its parameters, such as 16032 for UTM zone 32N
};

// The definition of a part as PROJJSON, ready to be put into the definition of a larger one. Throws when there is none.
// One line of text, which the makers of other systems take in place of the part's numbers.
KRV_TOOLKIT_API std::string DescribeEPSGPart(eEPSGPart ePart, int nCode, const Place& oPlace = Place::Current());

// A unit of measure in the EPSG database: its name and its size in metres, radians or ones.
// Neither angular nor linear: a ratio.
struct EPSGUnit
{
    std::string name;
    double factor = 1.0;
    bool isAngular = false;
    bool isLinear = false;
};

// Throws when there is no such unit.
KRV_TOOLKIT_API EPSGUnit FindEPSGUnit(int nCode, const Place& oPlace = Place::Current());

} // namespace krv::ogc::cs
