#include "toolkit/mathmodel/detail/rpckernelcode.h"

namespace krv::mathmodel::detail
{

const RpcKernels& GetBaselineRpcKernels()
{
    return RPC_KERNELS;
}

} // namespace krv::mathmodel::detail
