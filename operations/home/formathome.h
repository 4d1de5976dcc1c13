#pragma once

#include "operations/api.h"

#include <string>
#include <vector>

namespace krv::operations
{

// A home of one's own: a folder with a registry, descriptions and plug-ins, that KRVHOME may name.
// Example: {"formats", {"build/myformat.so"}}; programs then run with KRVHOME naming that folder.
struct HomeRequest
{
    std::string folder; // made when it is not there
    // Libraries of plug-ins, each with its description (.xml) beside it under the same name; they are copied.
    std::vector<std::string> plugins;
};

struct HomeResult
{
    std::vector<std::string> formats; // short names of all that the registry lists now, in its order
    std::vector<std::string> added;   // those of the request's plug-ins
};

// Makes the folder a home that has all installed formats, by links to their plug-ins, and adds plug-ins to it; one that
// is a home already keeps what it has. Every plug-in that the registry is to list is loaded before, and the registry is
// replaced as a whole or not at all. Throws RequestException for a plug-in that is none, lacks its description, or
// offers a format that another one has; IOException for what cannot be written.
// The installation itself is not touched.
KRV_OPERATIONS_API HomeResult MakeFormatHome(const HomeRequest& oRequest);

} // namespace krv::operations
