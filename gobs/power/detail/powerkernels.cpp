#include "gobs/power/detail/powerkernels.h"

#include "gobs/power/detail/powerkernelcode.h"

namespace krv::gobs::detail
{

PowerLoop FindBaselinePowerLoop(NativeDataTypeCode ePart)
{
    return FindFor(ePart);
}

PowerLoop FindPowerLoop(NativeDataTypeCode ePart)
{
#if defined(__x86_64__)
    if (__builtin_cpu_supports("avx512vbmi") && __builtin_cpu_supports("avx512vl") &&
        __builtin_cpu_supports("avx512bw") && __builtin_cpu_supports("avx512dq"))
        return FindAvx512PowerLoop(ePart);
    if (__builtin_cpu_supports("avx2"))
        return FindAvx2PowerLoop(ePart);
#endif
    return FindBaselinePowerLoop(ePart);
}

} // namespace krv::gobs::detail
