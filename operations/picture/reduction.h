#pragma once

#include "gobs/resampling/planereducer.h"
#include "operations/api.h"
#include "operations/job/progress.h"

#include <vector>

namespace krv::datasources
{
class IRasterReader;
}

namespace krv::operations
{

using krv::gobs::Plane;
using krv::gobs::Resampling;

// The channels of a reader at nWidth by nHeight pixels, by average or nearest, see PlaneReducer. Reads each tile once.
// The reader loses its margins.
KRV_OPERATIONS_API std::vector<Plane> Reduce(krv::datasources::IRasterReader& oReader,
                                             const krv::gobs::NoDataNumbers& oNumbers, unsigned int nWidth,
                                             unsigned int nHeight, Resampling eMethod, ProgressCounter& oCounter);

} // namespace krv::operations
