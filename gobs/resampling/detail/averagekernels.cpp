#include "gobs/resampling/detail/averagekernels.h"

#include "gobs/resampling/detail/averagekernelcode.h"
#include "toolkit/simd/processor.h"

namespace krv::gobs::detail
{

ReduceLoop FindBaselineLoop(NativeDataTypeCode eType, unsigned int nSamples, std::size_t nSourceBytes,
                            std::size_t nSumBytes)
{
    return Find(eType, nSamples, nSourceBytes, nSumBytes);
}

ReduceLoop FindReduceLoop(NativeDataTypeCode eType, unsigned int nSamples, std::size_t nSourceBytes,
                          std::size_t nSumBytes)
{
#if defined(__x86_64__)
    if (krv::simd::RunsAvx512())
        return FindAvx512Loop(eType, nSamples, nSourceBytes, nSumBytes);
    if (krv::simd::RunsAvx2())
        return FindAvx2Loop(eType, nSamples, nSourceBytes, nSumBytes);
#endif
    return FindBaselineLoop(eType, nSamples, nSourceBytes, nSumBytes);
}

} // namespace krv::gobs::detail
