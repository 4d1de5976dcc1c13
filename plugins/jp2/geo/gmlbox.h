#pragma once

#include "toolkit/ogc/cs/geocodinginfo.h"

#include <optional>
#include <string>

namespace krv::plugins::jp2
{

// What a text in GML says of an image: a grid with an origin, the centre of the first pixel, and two vectors, from
// column to column and from row to row (OGC 05-047r3, GML in JPEG 2000).
struct GmlGrid
{
    int mnEPSG = 0; // 0 when no system is named by such a code
    // For the outer corner of the first pixel, x to the east; nothing when the grid is not whole.
    std::optional<krv::ogc::cs::GeocodingInfo> moGeocoding;
};

// The first grid of the text. Many writers name a system whose first axis is latitude and give longitude first. Where
// the vectors run along the axes they tell which is which, since columns run along the east; otherwise the system's
// own order counts. Throws krv::DataException for what is no XML.
GmlGrid ParseGml(const std::string& text, const std::string& name);

} // namespace krv::plugins::jp2
