#pragma once

#include "datasources/api.h"

#include <cstdint>
#include <functional>
#include <string>
#include <vector>

namespace krv::datasources
{

// A dataset whose file carries checksums. The order of the virtual operations is public and fixed.
// Pixels that are read are checked as well, each block by its own sum; this looks at all of the file at once.
class KRV_DATASOURCES_API IVerifiedDataset
{
public:
    // Told bytes that were read and all of them, between pieces; stops by an exception.
    using Progress = std::function<void(std::uint64_t nDone, std::uint64_t nAll)>;

    virtual ~IVerifiedDataset();

    // Reads every byte of the state that is open and compares all checksums, whatever was read before. What is wrong,
    // a line for each place in the file; empty when everything is right. Throws what reading the file throws when it
    // cannot be read at all.
    // Takes as long as reading the file.
    virtual std::vector<std::string> Verify(const Progress& oProgress) = 0;
};

} // namespace krv::datasources
