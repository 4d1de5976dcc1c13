#pragma once

#include "toolkit/api.h"

#include <filesystem>
#include <string>

namespace krv::core
{

// Where the library lies that pOwn is in, a function that it does not export; symbolic links followed.
// Absolute. Example: OwnLibraryPath(reinterpret_cast<const void*>(&MyFunction)).
KRV_TOOLKIT_API std::filesystem::path OwnLibraryPath(const void* pOwn);

// A function of a library that lies beside that one and is loaded when it is needed; it stays loaded.
// Throws krv::LibraryException, which begins with `what`.
// library: a file name without folder. So an installation may be moved as a whole. Any thread.
KRV_TOOLKIT_API void* LoadBesideOwn(const void* pOwn, const std::string& library, const std::string& symbol,
                                    const std::string& what);

} // namespace krv::core
