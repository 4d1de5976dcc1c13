#pragma once

#include "operations/api.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/ogc/cs/icrs.h"

#include <array>
#include <memory>
#include <optional>
#include <string>

namespace krv::operations
{

class SourceFile;

// What places an image.
enum class PlacedBy
{
    eTransform, // an affine transform
    eModel,     // a sensor model, at a height
    ePoints     // a polynomial through ground control points
};

// A rectangle in degrees; one across the date line has its west above its east.
// Longitude -180 to 180, latitude -90 to 90, on WGS 84.
struct GeographicBounds
{
    double west = 0;
    double south = 0;
    double east = 0;
    double north = 0;
};

// Where an image lies on the ground: by its transform, else by its sensor model, else by a polynomial through its
// ground control points. One thread at a time. A plain value as long as the file is open.
// Example: if (auto oPlace = ImagePlace::Find(oFile)) oPlace->ToRaster(nEasting, nNorthing, nColumn, nRow);
class KRV_OPERATIONS_API ImagePlace
{
public:
    // None for a file that says nothing of it. nHeight: for a sensor model, in metres above the ellipsoid. bMap: with
    // map coordinates, which a sensor model has not.
    static std::optional<ImagePlace> Find(const SourceFile& oFile, double nHeight = 0, bool bMap = false);

    // What the other operations go by.
    PlacedBy GetKind() const { return meKind; }
    // The system of the coordinates; null for a file that names none.
    const krv::ogc::cs::ICRS* GetCRS() const { return mpoCrs.get(); }

    // Between continuous pixel coordinates, (0, 0) the outer corner of the first pixel, and the system's x (easting or
    // longitude) and y. False for what is nowhere there, with the results untouched.
    bool ToMap(double nColumn, double nRow, double& nX, double& nY) const;

    // The pixel's numbers are the whole parts; whether they lie inside the image is not looked at.
    bool ToRaster(double nX, double nY, double& nColumn, double& nRow) const;

    // The smallest rectangle of longitude and latitude on WGS 84 that holds the edges of the image; none when part of
    // them has no such place, or the file names no system.
    // Points along all four edges are transformed for it, some milliseconds' work.
    std::optional<GeographicBounds> FindGeographicBounds() const;

private:
    struct Means;

    PlacedBy meKind = PlacedBy::eTransform;
    double mnWidth = 0; // pixels of the image
    double mnHeight = 0;
    std::shared_ptr<const krv::ogc::cs::ICRS> mpoCrs;
    std::shared_ptr<const Means> mpoMeans; // the transform, model or polynomial
};

} // namespace krv::operations
