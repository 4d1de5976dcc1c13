#pragma once

#include "datasources/api.h"

#include <cstdint>
#include <optional>

namespace krv::datasources
{

// What a dataset tells of the file that it lies in. The order of the virtual operations is public and fixed.
// A new file with the same contents has none of these bytes: writing one is how they are got rid of.
class KRV_DATASOURCES_API IStorageDataset
{
public:
    virtual ~IStorageDataset();

    // Bytes of the file that hold nothing any more and that later changes take again. No value when that is not known:
    // in files of other programs, whatever seems unused may be somebody's.
    virtual std::optional<std::uint64_t> GetUnusedBytes() = 0;
};

} // namespace krv::datasources
