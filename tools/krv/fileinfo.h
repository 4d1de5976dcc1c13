#pragma once

#include "operations/source/sourcefile.h"

#include "tools/krv/jsontext.h"

namespace krv::tool
{

using namespace krv::operations;

// Everything known of a file, with the field names that `krv info --json` promises. Absent facts are null, absent lists
// empty. A channel's no-data value is text, so that NaN and 64-bit integers stay what they are.
Json GatherInfo(const SourceFile& oFile);

// The same for people.
std::string InfoText(const Json& oInfo);

} // namespace krv::tool
