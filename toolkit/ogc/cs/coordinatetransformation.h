#pragma once

#include "toolkit/api.h"
#include "toolkit/exceptions/place.h"
#include "toolkit/ogc/cs/icrs.h"

#include <cstddef>
#include <memory>
#include <optional>

namespace krv::ogc::cs
{

// Takes map coordinates from one reference system to another.
// Map coordinates are x = easting or longitude, y = northing or latitude, in the unit of their system, whatever order
// of axes an authority gives it: the order that GeocodingInfo delivers. Heights are metres or the unit of the vertical
// axis. The best operation that needs no network is chosen, for each point anew where several cover different areas.
// One thread at a time.
// Example: UTM to degrees:
//   CoordinateTransformation oToDegrees(*CreateCRSFromEPSG(32633), *CreateCRSFromEPSG(4326));
//   double nX = 500000, nY = 5200000;
//   oToDegrees.Transform(nX, nY);
class KRV_TOOLKIT_API CoordinateTransformation
{
public:
    // The systems are not kept. Throws krv::DataException when no operation leads from one to the other.
    CoordinateTransformation(const ICRS& oSource, const ICRS& oTarget, const Place& oPlace = Place::Current());
    CoordinateTransformation(CoordinateTransformation&& oOther) noexcept;
    CoordinateTransformation& operator=(CoordinateTransformation&& oOther) noexcept;
    ~CoordinateTransformation();

    // Replace coordinates from source to target, or back. poZ may be null: heights count as 0 and are not returned.
    // A point that cannot be transformed becomes infinite in every coordinate; the result is the number of the others.
    // poX, poY: nCount numbers each. Arrays are quicker than single points.
    std::size_t Transform(std::size_t nCount, double* poX, double* poY, double* poZ = nullptr) const;
    std::size_t TransformBack(std::size_t nCount, double* poX, double* poY, double* poZ = nullptr) const;

    // One point; false when it cannot be transformed, with the coordinates infinite.
    bool Transform(double& nX, double& nY) const;
    bool TransformBack(double& nX, double& nY) const;

private:
    struct Parts;
    std::unique_ptr<Parts> mpoParts;
};

// The way from positions of a system to longitude and latitude in degrees of WGS 84, or none. Definitions of
// projections that nobody knows are taken as they stand; nothing can be computed by them, not even where the false
// origin lies.
// Throws nothing for a system without a way: the answer is none.
KRV_TOOLKIT_API std::optional<CoordinateTransformation> FindWayToDegrees(const ICRS& oCRS);

} // namespace krv::ogc::cs
