#include "toolkit/raster/detail/kernels.h"

namespace krv::raster::detail
{

bool RunsAvx2()
{
#if defined(__x86_64__)
    return __builtin_cpu_supports("avx2");
#else
    return false;
#endif
}

// Shuffles across a whole vector (VBMI) came with the second generation of these processors; the first slows down on
// long vectors and stays with the shorter ones.
bool RunsAvx512()
{
#if defined(__x86_64__)
    return __builtin_cpu_supports("avx512f") && __builtin_cpu_supports("avx512bw") &&
           __builtin_cpu_supports("avx512dq") && __builtin_cpu_supports("avx512vl") &&
           __builtin_cpu_supports("avx512vbmi");
#else
    return false;
#endif
}

} // namespace krv::raster::detail
