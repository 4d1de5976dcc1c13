#include "toolkit/raster/swapbytes.h"

#include "toolkit/exceptions/exceptions.h"
#include "toolkit/raster/detail/kernels.h"

#include <bit>

namespace krv::raster
{

void SwapBytes(const unsigned char* source, unsigned char* destination, std::size_t nCount, std::size_t nValueBytes)
{
    if (nValueBytes != 2 && nValueBytes != 4 && nValueBytes != 8)
        throw ParameterException("Values of this size have no byte order", 1, "nValueBytes");
    detail::GetKernels().moSwappers[std::countr_zero(nValueBytes) - 1](source, destination, nCount);
}

} // namespace krv::raster
