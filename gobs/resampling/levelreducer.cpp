#include "gobs/resampling/levelreducer.h"

#include "gobs/resampling/detail/reducers.h"

#include <algorithm>
#include <bit>

namespace krv::gobs
{

ILevelReducer::~ILevelReducer() = default;

bool IsInCascade(const SourceForm& oForm, const ReductionRule& oRule, unsigned int nFactor)
{
    constexpr unsigned int MOST_FACTOR = 32768;
    return oRule.meMethod == Resampling::eAverage && std::has_single_bit(nFactor) && nFactor <= MOST_FACTOR &&
           !(oForm.moType.IsComplex() && oRule.mbPower);
}

std::unique_ptr<ILevelReducer> MakeLevelReducer(const SourceForm& oForm, const LevelTask& oTask,
                                                const ReductionRule& oRule)
{
    return GetKernelRadius(oRule.meMethod) != 0 ? detail::MakeKernelReducer(oForm, oTask, oRule.meMethod)
                                                : detail::MakeBoxReducer(oForm, oTask, oRule);
}

// A kernel reaches radius * factor from the centre of a box, of which half a
// box lies within it.
PixelBounds GetSourceBounds(const SourceForm& oForm, const LevelTask& oTask, Resampling eMethod)
{
    const std::uint64_t nFactor = oTask.mnFactor;
    const std::uint64_t nReach = GetKernelRadius(eMethod) * nFactor;
    const auto First = [&](unsigned int nPixel)
    {
        const std::uint64_t nFirst = nPixel * nFactor;
        return static_cast<unsigned int>(nFirst - std::min(nFirst, nReach));
    };
    const auto End = [&](unsigned int nPixel, unsigned int nSize)
    {
        return static_cast<unsigned int>(std::min<std::uint64_t>(nPixel * nFactor + nReach, nSize));
    };
    const PixelBounds& oPart = oTask.moBounds;
    return {First(oPart.mnLeft), First(oPart.mnTop), End(oPart.mnRight, oForm.mnWidth),
            End(oPart.mnBottom, oForm.mnHeight)};
}

} // namespace krv::gobs
