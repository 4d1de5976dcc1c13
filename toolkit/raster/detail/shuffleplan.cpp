#include "toolkit/raster/detail/shuffleplan.h"

#include "toolkit/simd/vectors.h"

#include <algorithm>

namespace krv::raster::detail
{

namespace
{

constexpr unsigned char NOTHING = 0x80; // in a table: this byte comes out as 0

#if defined(KRV_VECTORS)
constexpr bool SHUFFLES = true;
#else
constexpr bool SHUFFLES = false;
#endif

} // namespace

ShufflePlan::ShufflePlan(std::size_t nInputs, const std::size_t* channels, std::size_t nOutputs,
                         std::size_t nSampleBytes)
    : mnInputs(nInputs), mnOutputs(nOutputs), mnSampleBytes(nSampleBytes),
      mbUsable(SHUFFLES && nOutputs > 0 && nOutputs <= MAX_OUTPUTS && nSampleBytes <= 4 && Build(channels))
{
}

bool ShufflePlan::Build(const std::size_t* channels)
{
    for (auto& oSteps : moSteps)
        for (Step& oStep : oSteps)
            oStep.moTable.fill(NOTHING);
    for (std::size_t i = 0; i < mnOutputs * 16; ++i)
    {
        const std::size_t nSample = i / mnSampleBytes;
        const std::size_t nFrom =
            (nSample / mnOutputs * mnInputs + channels[nSample % mnOutputs]) * mnSampleBytes + i % mnSampleBytes;
        Step* step = FindStep(i / 16, nFrom / 16 * 16);
        if (step == nullptr)
            return false;
        step->moTable[i % 16] = static_cast<unsigned char>(nFrom % 16);
    }
    mnSteps = *std::max_element(moCounts.begin(), moCounts.end());
    return true;
}

ShufflePlan::Step* ShufflePlan::FindStep(std::size_t nOutput, std::size_t nOffset)
{
    auto& oSteps = moSteps[nOutput];
    std::size_t& nCount = moCounts[nOutput];
    for (std::size_t i = 0; i < nCount; ++i)
        if (oSteps[i].mnOffset == nOffset)
            return &oSteps[i];
    if (nCount == MAX_STEPS)
        return nullptr;
    oSteps[nCount].mnOffset = nOffset;
    return &oSteps[nCount++];
}

#if defined(KRV_VECTORS)
template <std::size_t nSteps>
void ShufflePlan::RunSteps(const unsigned char* source, unsigned char* destination, std::size_t nTurns) const
{
    for (std::size_t i = 0; i < nTurns; ++i, source += mnInputs * 16)
        for (std::size_t k = 0; k < mnOutputs; ++k, destination += 16)
        {
            simd::Block oResult{};
            for (std::size_t n = 0; n < nSteps; ++n)
            {
                const Step& oStep = moSteps[k][n];
                oResult |= simd::PickBytes(simd::Load<simd::Block>(source + oStep.mnOffset),
                                           simd::Load<simd::Block>(oStep.moTable.data()));
            }
            simd::Store(destination, oResult);
        }
}

void ShufflePlan::Run(const unsigned char* source, unsigned char* destination, std::size_t nTurns) const
{
    switch (mnSteps)
    {
    case 1:
        return RunSteps<1>(source, destination, nTurns);
    case 2:
        return RunSteps<2>(source, destination, nTurns);
    case 3:
        return RunSteps<3>(source, destination, nTurns);
    case 4:
        return RunSteps<4>(source, destination, nTurns);
    case 5:
        return RunSteps<5>(source, destination, nTurns);
    case 6:
        return RunSteps<6>(source, destination, nTurns);
    case 7:
        return RunSteps<7>(source, destination, nTurns);
    default:
        return RunSteps<MAX_STEPS>(source, destination, nTurns);
    }
}
#else
void ShufflePlan::Run(const unsigned char*, unsigned char*, std::size_t) const {}
#endif

} // namespace krv::raster::detail
