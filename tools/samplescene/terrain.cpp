#include "tools/samplescene/terrain.h"

#include <algorithm>
#include <cmath>

namespace krv::samplescene
{

namespace
{

constexpr double LACUNARITY = 1.93; // not 2: the lattices of neighbouring scales must not line up
constexpr unsigned int BROAD_SCALES = 3;

} // namespace

Terrain::Terrain(unsigned int nSize, std::uint32_t nSeed)
    : mnSize(nSize), moField(nSize), moWeight(nSize), moRidge(nSize)
{
    double nCell = nSize / 3.3;
    for (unsigned int i = 0; i < BROAD_SCALES; ++i, nCell /= LACUNARITY)
        moBroad.emplace_back(nSize, nCell, nSeed + i);
    nCell = nSize / 6.1;
    for (unsigned int i = 0; nCell >= 3.0; ++i, nCell /= LACUNARITY)
        moRidges.emplace_back(nSize, nCell, nSeed + 100 + i);
}

void Terrain::Row(unsigned int nY, float* pHeights) const
{
    std::fill_n(pHeights, mnSize, 0.50F);
    float nAmplitude = 0.27F;
    for (const LatticeNoise& oNoise : moBroad)
    {
        oNoise.Row(nY, moField.data());
        for (unsigned int x = 0; x < mnSize; ++x)
            pHeights[x] += nAmplitude * moField[x];
        nAmplitude *= 0.5F;
    }
    std::fill(moWeight.begin(), moWeight.end(), 1.0F);
    std::fill(moRidge.begin(), moRidge.end(), 0.0F);
    nAmplitude = 0.5F;
    for (const LatticeNoise& oNoise : moRidges)
    {
        oNoise.Row(nY, moField.data());
        for (unsigned int x = 0; x < mnSize; ++x)
        {
            const float nCrest = std::max(1.0F - 1.4F * std::fabs(moField[x]), 0.0F);
            const float nSignal = nCrest * nCrest * moWeight[x];
            moRidge[x] += nAmplitude * nSignal;
            moWeight[x] = std::min(0.15F + nSignal * 1.7F, 1.0F);
        }
        nAmplitude *= 0.53F;
    }
    for (unsigned int x = 0; x < mnSize; ++x)
    {
        const float nBroad = std::max(pHeights[x], 0.0F);
        const float nRough = std::min(std::max((nBroad - 0.22F) * 1.9F, 0.035F), 1.0F);
        pHeights[x] = 1250.0F * nBroad + 2300.0F * nRough * moRidge[x];
    }
}

} // namespace krv::samplescene
