#include "tools/samplescene/latticenoise.h"

#include <algorithm>
#include <cmath>

namespace krv::samplescene
{

namespace
{

constexpr float SPREAD = 2.2F; // brings the smoothed field back to about -1 to 1

void SplineWeights(double nFraction, float* pWeights)
{
    const double t = nFraction;
    pWeights[0] = static_cast<float>((1 - t) * (1 - t) * (1 - t) / 6);
    pWeights[1] = static_cast<float>((3 * t * t * t - 6 * t * t + 4) / 6);
    pWeights[2] = static_cast<float>((-3 * t * t * t + 3 * t * t + 3 * t + 1) / 6);
    pWeights[3] = static_cast<float>(t * t * t / 6);
}

} // namespace

std::uint32_t Hash(int nX, int nY, std::uint32_t nSeed)
{
    std::uint32_t n =
        static_cast<std::uint32_t>(nX) * 0x9E3779B1U ^ static_cast<std::uint32_t>(nY) * 0x85EBCA77U ^ nSeed;
    n = (n ^ (n >> 16U)) * 0x7FEB352DU;
    n = (n ^ (n >> 15U)) * 0x846CA68BU;
    return n ^ (n >> 16U);
}

float HashUnit(int nX, int nY, std::uint32_t nSeed)
{
    return static_cast<float>(Hash(nX, nY, nSeed) >> 8U) * (1.0F / 16777216.0F);
}

LatticeNoise::LatticeNoise(unsigned int nWidth, double nCell, std::uint32_t nSeed)
    : mnCell(std::max(nCell, 2.0)), mnSeed(nSeed), moWeight0(nWidth), moWeight1(nWidth), moWeight2(nWidth),
      moWeight3(nWidth)
{
    int nLast = -1;
    for (unsigned int x = 0; x < nWidth; ++x)
    {
        const double nAt = x / mnCell;
        const int nColumn = static_cast<int>(nAt);
        for (; nLast < nColumn; ++nLast)
            moStart.push_back(x);
        float aWeights[4];
        SplineWeights(nAt - nColumn, aWeights);
        moWeight0[x] = aWeights[0];
        moWeight1[x] = aWeights[1];
        moWeight2[x] = aWeights[2];
        moWeight3[x] = aWeights[3];
    }
    moStart.push_back(nWidth);
    moColumns.resize(moStart.size() + 3);
}

void LatticeNoise::Row(unsigned int nY, float* pValues) const
{
    const double nAt = nY / mnCell;
    const int nRow = static_cast<int>(nAt);
    float aWeights[4];
    SplineWeights(nAt - nRow, aWeights);
    for (int i = 0; i < static_cast<int>(moColumns.size()); ++i)
    {
        float nSum = 0;
        for (int k = 0; k < 4; ++k)
            nSum += aWeights[k] * (HashUnit(i, nRow + k, mnSeed) - 0.5F);
        moColumns[static_cast<std::size_t>(i)] = nSum * 2 * SPREAD;
    }
    for (std::size_t nCell = 0; nCell + 1 < moStart.size(); ++nCell)
    {
        const float a = moColumns[nCell], b = moColumns[nCell + 1], c = moColumns[nCell + 2], d = moColumns[nCell + 3];
        for (unsigned int x = moStart[nCell]; x < moStart[nCell + 1]; ++x)
            pValues[x] = a * moWeight0[x] + b * moWeight1[x] + c * moWeight2[x] + d * moWeight3[x];
    }
}

} // namespace krv::samplescene
