#pragma once

#include "toolkit/mathmodel/detail/rpckernels.h"
#include "toolkit/mathmodel/rpcmodel.h"

#include <cmath>
#include <cstdint>
#include <limits>

// The arithmetic of rational polynomials as plain loops over blocks of points, which the compiler makes vectors of.
// Every source file that includes this is compiled for another instruction set, so nothing here is shared between them:
// it all lies in an unnamed namespace. A block is filled up to whole vectors, so that a point is computed in the same
// way wherever it stands:
//     longitudes  l0 l1 l2 l3 | l4 l5 l0 l0     six points in lanes of four; the last two say again what the first is
//     latitudes   p0 p1 p2 p3 | p4 p5 p0 p0
//     columns     c0 c1 c2 c3 | c4 c5 -  -      all 80 coefficients are the same for every lane

namespace krv::mathmodel::detail
{

namespace
{

#if defined(__AVX512F__)
constexpr std::size_t LANES = 8;
#elif defined(__AVX2__)
constexpr std::size_t LANES = 4;
#else
constexpr std::size_t LANES = 2;
#endif

using Lanes = double[RPC_BLOCK];

constexpr double NONE = std::numeric_limits<double>::quiet_NaN();
constexpr double REACH = RpcModel::FITTED_RANGE;
constexpr int STEPS = 20;
constexpr double CLOSE_ENOUGH = 1e-9; // pixels, for Newton's method to end
constexpr double CLOSE = 1e-6;        // pixels, for its result to be one

// Nested, so that each coefficient takes one multiplication and one addition.
inline double Value(const double* pC, double nL, double nP, double nH)
{
    const double nOfL = pC[1] + nL * (pC[7] + nL * pC[11] + nP * pC[14] + nH * pC[17]) +
                        nP * (pC[4] + nP * pC[12] + nH * pC[10]) + nH * (pC[5] + nH * pC[13]);
    const double nOfP = pC[2] + nP * (pC[8] + nP * pC[15] + nH * pC[18]) + nH * (pC[6] + nH * pC[16]);
    return pC[0] + nL * nOfL + nP * nOfP + nH * (pC[3] + nH * (pC[9] + nH * pC[19]));
}

inline double Limit(double nValue)
{
    const double nAbove = nValue < -REACH ? -REACH : nValue;
    return nAbove > REACH ? REACH : nAbove;
}

std::size_t FillLanes(std::size_t nCount, const double* pSource, double* pLanes)
{
    const std::size_t nLanes = (nCount + LANES - 1) / LANES * LANES;
    for (std::size_t i = 0; i < nLanes; ++i)
        pLanes[i] = pSource[i < nCount ? i : 0];
    return nLanes;
}

// A zero denominator where the model is to reach is told by the result.
bool ToImage(const RpcCoefficients& oModel, std::size_t nCount, const double* pLongitudes, const double* pLatitudes,
             const double* pHeights, double* pColumns, double* pRows)
{
    const RpcCoefficients oM = oModel; // no result can lie in it
    const double nPerLatitude = 1 / oM.latitudeScale;
    const double nPerLongitude = 1 / oM.longitudeScale;
    const double nPerHeight = 1 / oM.heightScale;
    alignas(64) Lanes aLongitude, aLatitude, aHeight, aColumn, aRow;
    const std::size_t nLanes = FillLanes(nCount, pLongitudes, aLongitude);
    FillLanes(nCount, pLatitudes, aLatitude);
    FillLanes(nCount, pHeights, aHeight);
    std::uint64_t nZero = 0;
    for (std::size_t i = 0; i < nLanes; ++i)
    {
        const double nTurned = aLongitude[i] - oM.longitudeOffset;
        const double nL = (nTurned - 360 * std::nearbyint(nTurned * (1.0 / 360))) * nPerLongitude;
        const double nP = (aLatitude[i] - oM.latitudeOffset) * nPerLatitude;
        const double nH = (aHeight[i] - oM.heightOffset) * nPerHeight;
        const double nLineBelow = Value(oM.lineDenominator.data(), nL, nP, nH);
        const double nSampleBelow = Value(oM.sampleDenominator.data(), nL, nP, nH);
        const double nLine = Value(oM.lineNumerator.data(), nL, nP, nH) / nLineBelow;
        const double nSample = Value(oM.sampleNumerator.data(), nL, nP, nH) / nSampleBelow;
        const double nColumn = oM.sampleOffset + 0.5 + oM.sampleScale * nSample;
        const double nRow = oM.lineOffset + 0.5 + oM.lineScale * nLine;
        const double nSum = nColumn + nRow;
        const double nFarL = std::fabs(nL);
        const double nFarP = std::fabs(nP);
        // Without branches, which would keep the compiler from making vectors of the loop.
        const bool bInside = (nFarL <= REACH) & (nFarP <= REACH);
        const bool bLine = nLineBelow * oM.lineDenominator[0] > 0;
        const bool bSample = nSampleBelow * oM.sampleDenominator[0] > 0;
        const bool bReached = bInside & bLine & bSample & (nSum - nSum == 0);
        const bool bZero = bInside & ((nLineBelow == 0) | (nSampleBelow == 0));
        nZero |= bZero ? std::uint64_t{1} : std::uint64_t{0};
        aColumn[i] = bReached ? nColumn : NONE;
        aRow[i] = bReached ? nRow : NONE;
    }
    for (std::size_t i = 0; i < nCount; ++i)
    {
        pColumns[i] = aColumn[i];
        pRows[i] = aRow[i];
    }
    return nZero != 0;
}

// A polynomial of longitude and latitude at the height of each point: 1, L, P, LL, LP, PP, LLL, LLP, LPP, PPP.
struct AtHeight
{
    alignas(64) Lanes moTerms[10];

    void Set(const double* pC, const double* pH, std::size_t nLanes)
    {
        for (std::size_t i = 0; i < nLanes; ++i)
        {
            const double nH = pH[i];
            moTerms[0][i] = pC[0] + nH * (pC[3] + nH * (pC[9] + nH * pC[19]));
            moTerms[1][i] = pC[1] + nH * (pC[5] + nH * pC[13]);
            moTerms[2][i] = pC[2] + nH * (pC[6] + nH * pC[16]);
            moTerms[3][i] = pC[7] + nH * pC[17];
            moTerms[4][i] = pC[4] + nH * pC[10];
            moTerms[5][i] = pC[8] + nH * pC[18];
            moTerms[6][i] = pC[11];
            moTerms[7][i] = pC[14];
            moTerms[8][i] = pC[12];
            moTerms[9][i] = pC[15];
        }
    }

    double Value(std::size_t i, double nL, double nP) const
    {
        return moTerms[0][i] +
               nL * (moTerms[1][i] + nL * (moTerms[3][i] + nL * moTerms[6][i] + nP * moTerms[7][i]) +
                     nP * (moTerms[4][i] + nP * moTerms[8][i])) +
               nP * (moTerms[2][i] + nP * (moTerms[5][i] + nP * moTerms[9][i]));
    }
    double ByLongitude(std::size_t i, double nL, double nP) const
    {
        return moTerms[1][i] + nL * (2 * moTerms[3][i] + 3 * nL * moTerms[6][i] + 2 * nP * moTerms[7][i]) +
               nP * (moTerms[4][i] + nP * moTerms[8][i]);
    }
    double ByLatitude(std::size_t i, double nL, double nP) const
    {
        return moTerms[2][i] + nP * (2 * moTerms[5][i] + 3 * nP * moTerms[9][i] + 2 * nL * moTerms[8][i]) +
               nL * (moTerms[4][i] + nL * moTerms[7][i]);
    }
};

// One image coordinate at a point: how far it is from the one that is looked for, and its derivatives.
struct Quotient
{
    double value;
    double byLongitude;
    double byLatitude;
    double below;
};

inline Quotient Divide(const AtHeight& oAbove, const AtHeight& oBelow, std::size_t i, double nL, double nP)
{
    const double nBelow = oBelow.Value(i, nL, nP);
    const double nPerBelow = 1 / nBelow;
    const double nValue = oAbove.Value(i, nL, nP) * nPerBelow;
    return {nValue, (oAbove.ByLongitude(i, nL, nP) - nValue * oBelow.ByLongitude(i, nL, nP)) * nPerBelow,
            (oAbove.ByLatitude(i, nL, nP) - nValue * oBelow.ByLatitude(i, nL, nP)) * nPerBelow, nBelow};
}

bool ToGround(const RpcCoefficients& oModel, std::size_t nCount, const double* pColumns, const double* pRows,
              const double* pHeights, double* pLongitudes, double* pLatitudes)
{
    const RpcCoefficients oM = oModel;
    AtHeight oLineAbove, oLineBelow, oSampleAbove, oSampleBelow;
    alignas(64) Lanes aLine, aSample, aHeight, aL, aP, aError;
    const std::size_t nLanes = FillLanes(nCount, pRows, aLine);
    FillLanes(nCount, pColumns, aSample);
    FillLanes(nCount, pHeights, aHeight);
    const double nPerLine = 1 / oM.lineScale;
    const double nPerSample = 1 / oM.sampleScale;
    const double nPerHeight = 1 / oM.heightScale;
    for (std::size_t i = 0; i < nLanes; ++i)
    {
        aLine[i] = (aLine[i] - 0.5 - oM.lineOffset) * nPerLine;
        aSample[i] = (aSample[i] - 0.5 - oM.sampleOffset) * nPerSample;
        aHeight[i] = (aHeight[i] - oM.heightOffset) * nPerHeight;
        aL[i] = 0;
        aP[i] = 0;
    }
    oLineAbove.Set(oM.lineNumerator.data(), aHeight, nLanes);
    oLineBelow.Set(oM.lineDenominator.data(), aHeight, nLanes);
    oSampleAbove.Set(oM.sampleNumerator.data(), aHeight, nLanes);
    oSampleBelow.Set(oM.sampleDenominator.data(), aHeight, nLanes);

    // A point that is close enough stays where it is while the others of its block go on.
    std::uint64_t nOpen = 1;
    std::uint64_t nZero = 0;
    for (int nStep = 0; nStep <= STEPS && nOpen != 0; ++nStep)
    {
        nOpen = 0;
        const double nMove = nStep < STEPS ? 1 : 0;
        for (std::size_t i = 0; i < nLanes; ++i)
        {
            const Quotient oLine = Divide(oLineAbove, oLineBelow, i, aL[i], aP[i]);
            const Quotient oSample = Divide(oSampleAbove, oSampleBelow, i, aL[i], aP[i]);
            const double nLine = oLine.value - aLine[i];
            const double nSample = oSample.value - aSample[i];
            const double nError = std::fabs(nLine * oM.lineScale) + std::fabs(nSample * oM.sampleScale);
            const bool bOpen = !(nError <= CLOSE_ENOUGH);
            const bool bLine = oLine.below * oM.lineDenominator[0] > 0;
            const bool bSample = oSample.below * oM.sampleDenominator[0] > 0;
            const bool bReached = bLine & bSample;
            aError[i] = bReached ? nError : NONE;
            const double nPerDeterminant =
                nMove / (oLine.byLongitude * oSample.byLatitude - oLine.byLatitude * oSample.byLongitude);
            const double nL = (nLine * oSample.byLatitude - nSample * oLine.byLatitude) * nPerDeterminant;
            const double nP = (nSample * oLine.byLongitude - nLine * oSample.byLongitude) * nPerDeterminant;
            aL[i] = bOpen ? Limit(aL[i] - nL) : aL[i];
            aP[i] = bOpen ? Limit(aP[i] - nP) : aP[i];
            nOpen |= bOpen ? std::uint64_t{1} : std::uint64_t{0};
            const bool bZero = (oLine.below == 0) | (oSample.below == 0);
            nZero |= bZero ? std::uint64_t{1} : std::uint64_t{0};
        }
    }
    for (std::size_t i = 0; i < nCount; ++i)
    {
        const bool bReached = aError[i] <= CLOSE;
        pLongitudes[i] = bReached ? oM.longitudeOffset + oM.longitudeScale * aL[i] : NONE;
        pLatitudes[i] = bReached ? oM.latitudeOffset + oM.latitudeScale * aP[i] : NONE;
    }
    return nZero != 0;
}

constexpr RpcKernels RPC_KERNELS = {&ToImage, &ToGround};

} // namespace

} // namespace krv::mathmodel::detail
