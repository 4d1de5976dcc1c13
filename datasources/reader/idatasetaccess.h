#pragma once

#include "datasources/api.h"

#include <vector>

namespace krv::datasources
{

class IDataset;

// A facet of readers and writers that stand on a dataset: what they read or write. Found by dynamic_cast; by it others
// reach what a reader itself has no word for, such as bitmaps and channels beside its own. The order of the virtual
// operations is public and fixed.
// The dataset belongs to the reader or to whoever made that: nobody deletes it by this.
class KRV_DATASOURCES_API IDatasetAccess
{
public:
    virtual ~IDatasetAccess();

    // The dataset, null before there is one, which stays where it is.
    virtual IDataset* GetDataset() const = 0;
    // The numbers of its channels, or of its bitmaps, in the order of the rasters.
    virtual const std::vector<unsigned int>& GetChannels() const = 0;
};

} // namespace krv::datasources
