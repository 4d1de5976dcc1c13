#include "toolkit/raster/detail/kernels.h"

namespace krv::raster::detail
{

const Kernels& GetKernels()
{
#if defined(__x86_64__)
    static const Kernels& oKernels = __builtin_cpu_supports("avx2") ? GetAvx2Kernels() : GetBaselineKernels();
    return oKernels;
#else
    return GetBaselineKernels();
#endif
}

} // namespace krv::raster::detail
