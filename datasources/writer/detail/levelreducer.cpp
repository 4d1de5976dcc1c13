#include "datasources/writer/detail/levelreducer.h"

#include <algorithm>

namespace krv::datasources::detail
{

ILevelReducer::~ILevelReducer() = default;

unsigned int GetKernelRadius(Resampling eMethod)
{
    switch (eMethod)
    {
    case Resampling::eBilinear:
        return 1;
    case Resampling::eCubic:
        return 2;
    case Resampling::eLanczos:
        return 3;
    default:
        return 0;
    }
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

} // namespace krv::datasources::detail
