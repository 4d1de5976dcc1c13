#include "toolkit/raster/detail/kernels.h"

#include "toolkit/simd/processor.h"

namespace krv::raster::detail
{

namespace
{

const Kernels& ChooseKernels()
{
#if defined(__x86_64__)
    if (simd::RunsAvx512())
        return GetAvx512Kernels();
    if (simd::RunsAvx2())
        return GetAvx2Kernels();
#endif
    return GetBaselineKernels();
}

} // namespace

const Kernels& GetKernels()
{
    static const Kernels& oKernels = ChooseKernels();
    return oKernels;
}

} // namespace krv::raster::detail
