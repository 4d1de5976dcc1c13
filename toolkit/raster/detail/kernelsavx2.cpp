#if defined(__x86_64__)
#if !defined(__AVX2__)
#error "This file is compiled for AVX2 alone; the caller asks the processor first."
#endif
#include "toolkit/raster/detail/kernelcode.h"

namespace krv::raster::detail
{

const Kernels& GetAvx2Kernels()
{
    return KERNELS;
}

} // namespace krv::raster::detail
#endif
