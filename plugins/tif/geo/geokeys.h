#pragma once

#include "plugins/support/geotiff/geotags.h"
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

using support::TiePoint;

// The geographic tags of a directory.
support::GeoTags ReadGeoTags(TIFF* poFile);

// What they say (plugins/support/geotiff/geotags.h has the rules).
bool ReadGeocoding(TIFF* poFile, krv::ogc::cs::GeocodingInfo& oInfo);
std::vector<TiePoint> ReadTiePoints(TIFF* poFile);
std::unique_ptr<krv::ogc::cs::ICRS> ReadCRS(TIFF* poFile, std::string* pTrouble = nullptr,
                                            const krv::Place& oPlace = krv::Place::Current());

} // namespace krv::plugins::tif
