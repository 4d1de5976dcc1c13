#pragma once

#include "toolkit/exceptions/place.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/ogc/cs/icrs.h"

#include <memory>
#include <string>
#include <vector>

#include <tiffio.h>

namespace krv::plugins::tif
{

// The geographic part of a TIFF directory. All functions look at the current directory, never move it, and print
// nothing.

// Makes libtiff know the geographic tags, for the whole process and for every file opened afterwards. May be called
// often and from any thread. The functions below work without it too, but libtiff then warns of unknown tags.
void RegisterGeoTags();

// Whether the file says that raster positions are pixel centres. False when it says nothing, or nothing sensible.
bool IsPixelPoint(TIFF* poFile);

// A raster position and the map position that belongs to it. Raster coordinates are continuous, (0, 0) being the outer
// corner of the first pixel, whatever the file's own convention is.
struct TiePoint
{
    double column = 0.0;
    double row = 0.0;
    double x = 0.0;
    double y = 0.0;
    double z = 0.0;
};

// The affine transform of the image: from the transformation matrix, else from the pixel scale and the first tie point.
// The result is for the outer corner of the first pixel; where the file says that its positions are pixel centres
// (GeoKey 1025 is 2) half a pixel is taken off. False, with the result untouched, when the file holds none: no tags,
// tie points without a scale (those are control points), tags that are too short, or values that are not finite or
// without an inverse.
bool ReadGeocoding(TIFF* poFile, krv::ogc::cs::GeocodingInfo& oInfo);

// All tie points of the file, in its order; those with a value that is not finite are left out. Empty when there are
// none.
std::vector<TiePoint> ReadTiePoints(TIFF* poFile);

// The reference system that the geographic keys define. A code of the EPSG database wins over whatever other keys say
// of the same thing; everything user-defined is built from its parts. Null when there are no keys, or none that name a
// system, and when they contradict each other; what contradicts what goes to pTrouble then. Throws krv::DataException
// with the file's name and the cause for damaged keys, for codes that are not known, and for definitions that are
// incomplete or cannot be expressed.
std::unique_ptr<krv::ogc::cs::ICRS> ReadCRS(TIFF* poFile, std::string* pTrouble = nullptr,
                                            const krv::Place& oPlace = krv::Place::Current());

} // namespace krv::plugins::tif
