#pragma once

#include "datasources/api.h"

namespace krv::datasources
{

// A dataset whose file may hold several images of full size; the dataset hands out the first. The order of the virtual
// operations is public and fixed.
// Further images are opened by a name that formats document, such as "a.gif[page=3]".
class KRV_DATASOURCES_API IPagedDataset
{
public:
    virtual ~IPagedDataset();

    // The images behind the first one that are neither its levels nor its bitmaps.
    virtual unsigned int CountFurtherImages() const = 0;
};

} // namespace krv::datasources
