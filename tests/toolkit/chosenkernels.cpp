#include "toolkit/raster/detail/kernels.h"
#include "toolkit/simd/processor.h"

namespace krv::raster::detail
{

const Kernels& GetKernels()
{
#if defined(KRV_TESTS_Avx2) && defined(__x86_64__)
    if (simd::RunsAvx2())
        return GetAvx2Kernels();
#endif
    return GetBaselineKernels();
}

} // namespace krv::raster::detail
