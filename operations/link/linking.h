#pragma once

#include "operations/api.h"

#include <string>

namespace krv::operations
{

// Makes a native file that refers to the pixels of another file by a relative path, in place of a copy of them; it has
// the geocoding, the reference system and the metadata of that file, and place for channels of its own. A file named
// `target` is replaced; on a failure nothing changes. Throws RequestException for a file without channels to link to,
// DataException for a link that leads to itself or is one of too many, and what formats throw.
// Takes milliseconds, whatever the size. The new file is of use as long as the source stays where it is beside it.
KRV_OPERATIONS_API void Link(const std::string& target, const std::string& source);

} // namespace krv::operations
