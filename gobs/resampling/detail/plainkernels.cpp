#include "gobs/resampling/detail/plainkernels.h"

#include "gobs/resampling/detail/plainkernelcode.h"

namespace krv::gobs::detail
{

PlainLoop FindBaselinePlainLoop(Resampling eMethod, NativeDataTypeCode ePart, std::size_t nSamples)
{
    return FindFor(eMethod, ePart, nSamples);
}

RowLoops FindBaselineRowLoops(NativeDataTypeCode ePart)
{
    return FindRowLoopsFor(ePart);
}

namespace
{

enum class Instructions
{
    eBaseline,
    eAvx2,
    eAvx512
};

Instructions FindInstructions()
{
#if defined(__x86_64__)
    if (__builtin_cpu_supports("avx512vbmi") && __builtin_cpu_supports("avx512vl") &&
        __builtin_cpu_supports("avx512bw") && __builtin_cpu_supports("avx512dq"))
        return Instructions::eAvx512;
    if (__builtin_cpu_supports("avx2"))
        return Instructions::eAvx2;
#endif
    return Instructions::eBaseline;
}

} // namespace

PlainLoop FindPlainLoop(Resampling eMethod, NativeDataTypeCode ePart, std::size_t nSamples)
{
    switch (FindInstructions())
    {
#if defined(__x86_64__)
    case Instructions::eAvx512:
        return FindAvx512PlainLoop(eMethod, ePart, nSamples);
    case Instructions::eAvx2:
        return FindAvx2PlainLoop(eMethod, ePart, nSamples);
#endif
    default:
        return FindBaselinePlainLoop(eMethod, ePart, nSamples);
    }
}

RowLoops FindRowLoops(NativeDataTypeCode ePart)
{
    switch (FindInstructions())
    {
#if defined(__x86_64__)
    case Instructions::eAvx512:
        return FindAvx512RowLoops(ePart);
    case Instructions::eAvx2:
        return FindAvx2RowLoops(ePart);
#endif
    default:
        return FindBaselineRowLoops(ePart);
    }
}

} // namespace krv::gobs::detail
