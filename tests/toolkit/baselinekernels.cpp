#include "toolkit/raster/detail/kernels.h"

namespace krv::raster::detail
{

const Kernels& GetKernels()
{
    return GetBaselineKernels();
}

} // namespace krv::raster::detail
