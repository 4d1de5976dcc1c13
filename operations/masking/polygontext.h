#pragma once

#include "operations/api.h"
#include "toolkit/core/gdbvertex.h"

#include <string>
#include <string_view>
#include <vector>

namespace krv::operations
{

// Polygons as somebody wrote them down: rings of vertices in whatever coordinates they are.
// polygons[p][r] is ring r of polygon p: the first ring its outline, the others holes. Coordinates stand as written.
struct PolygonText
{
    std::vector<std::vector<std::vector<GDBVertex>>> polygons;
    bool geographic = false; // longitude and latitude unless something else is said, as in GeoJSON
    std::string crs;         // the reference system that the text itself names, as "EPSG:n"; mostly empty
};

// Reads POLYGON and MULTIPOLYGON texts, one or several, with or without heights. Throws RequestException that says what
// is wrong and where.
// Example: "POLYGON ((0 0, 10 0, 10 10, 0 0))"; with "SRID=32633;" before it the text names its system.
KRV_OPERATIONS_API PolygonText ParsePolygons(std::string_view text);

} // namespace krv::operations
