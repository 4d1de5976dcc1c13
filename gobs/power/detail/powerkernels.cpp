#include "gobs/power/detail/powerkernels.h"

#include "gobs/power/detail/powerkernelcode.h"
#include "toolkit/simd/processor.h"

namespace krv::gobs::detail
{

PowerLoop FindBaselinePowerLoop(NativeDataTypeCode ePart)
{
    return FindFor(ePart);
}

PowerLoop FindPowerLoop(NativeDataTypeCode ePart)
{
#if defined(__x86_64__)
    if (krv::simd::RunsAvx512())
        return FindAvx512PowerLoop(ePart);
    if (krv::simd::RunsAvx2())
        return FindAvx2PowerLoop(ePart);
#endif
    return FindBaselinePowerLoop(ePart);
}

} // namespace krv::gobs::detail
