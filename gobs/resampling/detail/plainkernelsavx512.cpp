#if defined(__x86_64__)
#if !defined(__AVX512DQ__)
#error "This file is compiled for AVX-512 alone; the caller asks the processor first."
#endif
#include "gobs/resampling/detail/plainkernelcode.h"

namespace krv::gobs::detail
{

PlainLoop FindAvx512PlainLoop(Resampling eMethod, NativeDataTypeCode ePart, std::size_t nSamples)
{
    return FindFor(eMethod, ePart, nSamples);
}

RowLoops FindAvx512RowLoops(NativeDataTypeCode ePart)
{
    return FindRowLoopsFor(ePart);
}

} // namespace krv::gobs::detail
#endif
