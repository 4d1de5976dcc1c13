#include "toolkit/mathmodel/detail/rpckernels.h"

#include "toolkit/raster/detail/kernels.h"

namespace krv::mathmodel::detail
{

namespace
{

const RpcKernels& ChooseKernels()
{
#if defined(__x86_64__)
    if (raster::detail::RunsAvx512())
        return GetAvx512RpcKernels();
    if (raster::detail::RunsAvx2() && __builtin_cpu_supports("fma"))
        return GetAvx2RpcKernels();
#endif
    return GetBaselineRpcKernels();
}

} // namespace

const RpcKernels& GetRpcKernels()
{
    static const RpcKernels& oKernels = ChooseKernels();
    return oKernels;
}

} // namespace krv::mathmodel::detail
