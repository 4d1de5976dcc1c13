#pragma once

#include "datasources/api.h"

#include <string>
#include <vector>

namespace krv::datasources
{

// A file beside a dataset's own that says more of the image.
struct Sidecar
{
    std::string moFile;
    std::string moSays;    // what of: "geocoding", "reference system", "metadata", "mask", "sensor model", "levels"
    bool mbUsed = false;   // whether the dataset answers by it
    std::string moTrouble; // why it is not used, though it would be; or that it is older than the file
};

// A dataset that looks for files beside its own. The order of the virtual operations is public and fixed.
class KRV_DATASOURCES_API ISidecarDataset
{
public:
    virtual ~ISidecarDataset();

    // Looks for all of them, those that nobody asked for included. One that the file itself makes superfluous is there
    // without a trouble and is not used.
    virtual std::vector<Sidecar> ListSidecars() = 0;
};

} // namespace krv::datasources
