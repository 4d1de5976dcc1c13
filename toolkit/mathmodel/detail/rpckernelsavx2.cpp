#if defined(__x86_64__)
#if !defined(__AVX2__)
#error "This file is compiled for AVX2 alone; the caller asks the processor first."
#endif
#include "toolkit/mathmodel/detail/rpckernelcode.h"

namespace krv::mathmodel::detail
{

const RpcKernels& GetAvx2RpcKernels()
{
    return RPC_KERNELS;
}

} // namespace krv::mathmodel::detail
#endif
