#include "gobs/resampling/detail/plainkernels.h"

#include "gobs/resampling/detail/plainkernelcode.h"

namespace krv::gobs::detail
{

PlainLoop FindBaselinePlainLoop(Resampling eMethod, NativeDataTypeCode ePart, std::size_t nSamples)
{
    return FindFor(eMethod, ePart, nSamples);
}

PlainLoop FindPlainLoop(Resampling eMethod, NativeDataTypeCode ePart, std::size_t nSamples)
{
#if defined(__x86_64__)
    if (__builtin_cpu_supports("avx512vbmi") && __builtin_cpu_supports("avx512vl") &&
        __builtin_cpu_supports("avx512bw") && __builtin_cpu_supports("avx512dq"))
        return FindAvx512PlainLoop(eMethod, ePart, nSamples);
    if (__builtin_cpu_supports("avx2"))
        return FindAvx2PlainLoop(eMethod, ePart, nSamples);
#endif
    return FindBaselinePlainLoop(eMethod, ePart, nSamples);
}

} // namespace krv::gobs::detail
