#pragma once

#include "operations/job/progress.h"
#include "operations/source/sourcefile.h"

#include <vector>

namespace krv::datasources
{
class IRasterReader;
}

namespace krv::operations
{

// One channel at the size of a quick look.
struct Plane
{
    unsigned int width = 0;
    unsigned int height = 0;
    std::vector<float> values;   // magnitude for complex channels; 0 where nothing is valid
    std::vector<float> coverage; // share of the pixel's source pixels that are valid, 0 to 1
};

enum class Reduction
{
    eAverage, // mean of the valid source pixels that fall into the pixel
    eNearest  // the source pixel at the centre: for class numbers and colour indices
};

// The channels of a reader at nWidth by nHeight pixels, which are not more than the reader's. Reads each tile once, in
// order; holds sums for the rows of one row of tiles only. oNoData: one per channel.
// Values that are no-data, not a number or infinite are not valid.
KRV_OPERATIONS_API std::vector<Plane> Reduce(krv::datasources::IRasterReader& oReader,
                                             const std::vector<OptionalNoData>& oNoData, unsigned int nWidth,
                                             unsigned int nHeight, Reduction eReduction, ProgressCounter& oCounter);

// Where pixel i of nTarget pixels starts among nSource pixels.
inline unsigned int SourceStart(unsigned int i, unsigned int nSource, unsigned int nTarget)
{
    return static_cast<unsigned int>(static_cast<unsigned long long>(i) * nSource / nTarget);
}

} // namespace krv::operations
