#if defined(__x86_64__)
#if !defined(__AVX512F__)
#error "This file is compiled for AVX-512 alone; the caller asks the processor first."
#endif
#include "toolkit/mathmodel/detail/rpckernelcode.h"

namespace krv::mathmodel::detail
{

const RpcKernels& GetAvx512RpcKernels()
{
    return RPC_KERNELS;
}

} // namespace krv::mathmodel::detail
#endif
