#pragma once

#include "gobs/resampling/planereducer.h"
#include "operations/api.h"
#include "operations/job/progress.h"
#include "operations/source/sourcefile.h"

#include <functional>
#include <vector>

namespace krv::datasources
{
class IRasterReader;
}

namespace krv::threading
{
class IExecutor;
}

namespace krv::operations
{

using krv::gobs::Plane;
using krv::gobs::Resampling;

// The channels of a reader at nWidth by nHeight pixels, by average or nearest, see PlaneReducer. Reads each tile once.
// The reader loses its margins.
// One plane for each channel of the reader, in their order. Valid is what the numbers do not exclude, and finite.
// oCounter: told of the bytes of pixels that are done; throws StoppedException when somebody stops the job.
KRV_OPERATIONS_API std::vector<Plane> Reduce(krv::datasources::IRasterReader& oReader,
                                             const krv::gobs::NoDataNumbers& oNumbers, unsigned int nWidth,
                                             unsigned int nHeight, Resampling eMethod, ProgressCounter& oCounter);

// The same of what oRead makes of the file, or of the file opened again, for each thread that takes part.
// Called once for each thread, with the file itself or with its own opening of it, which outlives the reader.
using MakeLevelReader = std::function<LevelReader(const SourceFile& oFile)>;
KRV_OPERATIONS_API std::vector<Plane> Reduce(const SourceFile& oFile, const MakeLevelReader& oRead,
                                             const krv::gobs::NoDataNumbers& oNumbers, unsigned int nWidth,
                                             unsigned int nHeight, Resampling eMethod, ProgressCounter& oCounter,
                                             krv::threading::IExecutor* poExecutor);

} // namespace krv::operations
