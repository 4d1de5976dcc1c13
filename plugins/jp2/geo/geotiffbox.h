#pragma once

#include "plugins/support/geotiff/geotags.h"

#include <vector>

namespace krv::plugins::jp2
{

// The box that holds the geographic tags of an image as a TIFF file of one pixel. Tags are found in classic TIFF of
// both byte orders; bytes that are none give no tags, and so does what points outside them.
support::GeoTags ParseGeoTiff(const std::vector<unsigned char>& oBytes);

// The counterpart, little-endian.
std::vector<unsigned char> MakeGeoTiff(const support::GeoTags& oTags);

} // namespace krv::plugins::jp2
