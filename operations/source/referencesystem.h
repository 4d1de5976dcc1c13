#pragma once

#include "operations/api.h"
#include "toolkit/ogc/cs/icrs.h"

#include <memory>
#include <string>

namespace krv::operations
{

// The reference system that a user names: a code such as EPSG:32633, its number alone, WKT or PROJJSON, or the name of
// a file that holds one of these, such as a .prj file. Throws RequestException for any other text.
// The result is the caller's. Examples: "EPSG:4326", "32633", "scene.prj".
KRV_OPERATIONS_API std::unique_ptr<krv::ogc::cs::ICRS> ParseReferenceSystem(const std::string& text);

} // namespace krv::operations
