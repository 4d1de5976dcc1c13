#pragma once

#include "toolkit/core/gdbvertex.h"

#include <string>
#include <vector>

namespace krv::tool
{

// Polygons as somebody wrote them down: rings of vertices in whatever coordinates they are.
struct PolygonText
{
    std::vector<std::vector<std::vector<GDBVertex>>> polygons;
    bool geoJson = false;
    std::string crs; // the reference system that the text itself names, as "EPSG:n"; mostly empty
};

// Reads POLYGON and MULTIPOLYGON texts, one or several, with or without heights, or a GeoJSON object: polygons by
// themselves, in features and in collections; other geometries are left out with a warning. `text` is the text itself
// or the name of a file that holds it. Throws UsageError that says what is wrong and where; for a text without polygons
// too.
PolygonText ReadPolygons(const std::string& text);

} // namespace krv::tool
