#if defined(__x86_64__)
#if !defined(__AVX512DQ__)
#error "This file is compiled for AVX-512 alone; the caller asks the processor first."
#endif
#include "gobs/power/detail/powerkernelcode.h"

namespace krv::gobs::detail
{

PowerLoop FindAvx512PowerLoop(NativeDataTypeCode ePart)
{
    return FindFor(ePart);
}

} // namespace krv::gobs::detail
#endif
