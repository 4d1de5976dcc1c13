#if defined(__x86_64__)
#if !defined(__AVX512VBMI__)
#error "This file is compiled for AVX-512 alone; the caller asks the processor first."
#endif
#include "toolkit/raster/detail/kernelcode.h"

namespace krv::raster::detail
{

const Kernels& GetAvx512Kernels()
{
    return KERNELS;
}

} // namespace krv::raster::detail
#endif
