#if defined(__x86_64__)
#if !defined(__AVX2__)
#error "This file is compiled for AVX2 alone; the caller asks the processor first."
#endif
#include "datasources/writer/detail/averagekernelcode.h"

namespace krv::datasources::detail
{

ReduceLoop FindAvx2Loop(krv::gobs::NativeDataTypeCode eType, unsigned int nSamples, std::size_t nSourceBytes,
                        std::size_t nSumBytes)
{
    return Find(eType, nSamples, nSourceBytes, nSumBytes);
}

} // namespace krv::datasources::detail
#endif
