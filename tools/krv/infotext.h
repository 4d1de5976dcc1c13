#pragma once

#include "operations/source/fileinfo.h"
#include "tools/krv/jsontext.h"

namespace krv::tool
{

// "transform", "sensor model", "control points"
const char* PlacedByText(operations::PlacedBy eKind);

// With the field names that `krv info --json` promises. Absent facts are null, absent lists empty. A channel's no-data
// value is text.
Json InfoToJson(const operations::FileInfo& oInfo);

// The same for people.
std::string InfoText(const Json& oInfo);

} // namespace krv::tool
