#include "toolkit/raster/detail/kernelcode.h"

namespace krv::raster::detail
{

const Kernels& GetBaselineKernels()
{
    return KERNELS;
}

} // namespace krv::raster::detail
