#pragma once

#include "datasources/api.h"

#include <memory>

namespace krv::gobs
{
class PCT;
}

namespace krv::datasources
{

class IDataset;

// The pseudocolour table of a channel (from 1): the one that its tag "DEFAULT_PCT_REF" names, in the dataset itself or
// in another file, which is looked for as named and beside the dataset's; else the one that belongs to it by the
// dataset's own word. A reference that leads nowhere is a warning. Null when there is none. Passes what the dataset
// throws.
// The table is the caller's and stands on nothing: the dataset may go.
KRV_DATASOURCES_API std::unique_ptr<krv::gobs::PCT> FindPCT(IDataset& oDataset, unsigned int nChannel);

} // namespace krv::datasources
