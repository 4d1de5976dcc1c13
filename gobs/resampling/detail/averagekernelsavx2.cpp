#if defined(__x86_64__)
#if !defined(__AVX2__)
#error "This file is compiled for AVX2 alone; the caller asks the processor first."
#endif
#include "gobs/resampling/detail/averagekernelcode.h"

namespace krv::gobs::detail
{

ReduceLoop FindAvx2Loop(NativeDataTypeCode eType, unsigned int nSamples, std::size_t nSourceBytes,
                        std::size_t nSumBytes)
{
    return Find(eType, nSamples, nSourceBytes, nSumBytes);
}

} // namespace krv::gobs::detail
#endif
