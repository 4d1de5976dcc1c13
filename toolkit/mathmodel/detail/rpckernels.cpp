#include "toolkit/mathmodel/detail/rpckernels.h"

#include "toolkit/simd/processor.h"

namespace krv::mathmodel::detail
{

namespace
{

const RpcKernels& ChooseKernels()
{
#if defined(__x86_64__)
    if (simd::RunsAvx512())
        return GetAvx512RpcKernels();
    if (simd::RunsAvx2())
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
