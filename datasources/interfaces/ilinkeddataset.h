#pragma once

#include "datasources/api.h"

#include <string>
#include <vector>

namespace krv::datasources
{

// A dataset whose channels may lie in other files. The order of the virtual operations is public and fixed.
// IDataset::IsLinked tells whether any pixel lies elsewhere.
class KRV_DATASOURCES_API ILinkedDataset
{
public:
    virtual ~ILinkedDataset();

    // The files that hold linked channels, each once, under names that open them from here; none when all channels are
    // the file's own. What those files link to in turn is not among them. Opens nothing.
    virtual std::vector<std::string> GetLinkedFiles() const = 0;
};

} // namespace krv::datasources
