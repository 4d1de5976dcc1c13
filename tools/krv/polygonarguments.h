#pragma once

#include "operations/masking/polygontext.h"

#include <string>

namespace krv::tool
{

// Reads what ParsePolygons reads, or a GeoJSON object: polygons by themselves, in features and in collections; other
// geometries are left out with a warning. `text` is the text itself or the name of a file that holds it. Throws
// UsageError that says what is wrong and where; for a text without polygons too.
operations::PolygonText ReadPolygons(const std::string& text);

} // namespace krv::tool
