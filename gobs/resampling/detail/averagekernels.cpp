#include "gobs/resampling/detail/averagekernels.h"

#include "gobs/resampling/detail/averagekernelcode.h"

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
    if (__builtin_cpu_supports("avx512vbmi") && __builtin_cpu_supports("avx512vl") &&
        __builtin_cpu_supports("avx512bw") && __builtin_cpu_supports("avx512dq"))
        return FindAvx512Loop(eType, nSamples, nSourceBytes, nSumBytes);
    if (__builtin_cpu_supports("avx2"))
        return FindAvx2Loop(eType, nSamples, nSourceBytes, nSumBytes);
#endif
    return FindBaselineLoop(eType, nSamples, nSourceBytes, nSumBytes);
}

} // namespace krv::gobs::detail
