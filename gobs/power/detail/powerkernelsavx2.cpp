#if defined(__x86_64__)
#if !defined(__AVX2__)
#error "This file is compiled for AVX2 alone; the caller asks the processor first."
#endif
#include "gobs/power/detail/powerkernelcode.h"

namespace krv::gobs::detail
{

PowerLoop FindAvx2PowerLoop(NativeDataTypeCode ePart)
{
    return FindFor(ePart);
}

} // namespace krv::gobs::detail
#endif
