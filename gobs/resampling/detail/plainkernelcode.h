#pragma once

// The inner loops of interpolation. One source file for each instruction set includes this and is compiled with options
// of its own, so everything here is local to the file and calls nothing that is not. The samples of a pixel, or the
// four pixels of a row, lie in the lanes of a vector of four:
//     lane              0    1    2    3
//     pixel of 4        r    g    b    a
//     pixel of 3        r    g    b    -     the next pixel is written over the last lane
//     cubic, pixel of 1 p-1  p0   p1   p2    times four weights, then summed across

#include "gobs/resampling/detail/plainkernels.h"
#include "toolkit/simd/vectors.h"

#include <cstdint>
#include <cstring>
#include <type_traits>

namespace krv::gobs::detail
{

namespace
{

using Floats = simd::Vector<float, 4>;

// Places that are split into pixels and fractions at a time, on the stack. Measured with AVX2: blocks of 16 cost up to
// a sixth more, all from 64 to 1024 the same.
constexpr std::size_t BLOCK = 128;

inline Floats Spread(float n)
{
    return Floats{n, n, n, n};
}
inline Floats SmallerOf(const Floats& a, const Floats& b)
{
    return a < b ? a : b;
}
inline Floats LargerOf(const Floats& a, const Floats& b)
{
    return a > b ? a : b;
}

// N samples as floats; what is in the other lanes does not matter. Reads four.
template <typename T>
inline Floats LoadSamples(const T* p)
{
    return simd::LoadWidened<float, 4>(p);
}

template <typename T>
inline T RoundSample(float n)
{
    if constexpr (std::is_same_v<T, float>)
        return n;
    else
    {
        constexpr float LOWEST = std::is_signed_v<T> ? -32768.0F : 0.0F;
        constexpr float MOST = sizeof(T) == 1 ? 255.0F : (std::is_signed_v<T> ? 32767.0F : 65535.0F);
        const float nRounded = __builtin_rintf(n);
        return static_cast<T>(nRounded < LOWEST ? LOWEST : (nRounded > MOST ? MOST : nRounded));
    }
}

// Four samples rounded half to even and saturated.
template <typename T>
inline void StoreFour(T* p, const Floats& oValues)
{
    if constexpr (std::is_same_v<T, float>)
        simd::Store(p, oValues);
#if defined(KRV_VECTORS)
    else
    {
        using Word = std::conditional_t<std::is_signed_v<T>, std::int16_t, std::uint16_t>;
        const auto oInts = simd::RoundInts(oValues);
        const auto oWords = simd::Pack<Word>(oInts, oInts);
        if constexpr (sizeof(T) == 1)
            simd::StoreFirst<4>(p, simd::Pack<T>(oWords, oWords));
        else
            simd::StoreFirst<8>(p, oWords);
    }
#else
    else
        for (int n = 0; n < 4; ++n)
            p[n] = RoundSample<T>(oValues[n]);
#endif
}

// What is behind N samples is overwritten by the next pixel, unless this is the last one.
template <typename T, std::size_t N>
inline void StorePixel(T* p, const Floats& oValues, bool bLast)
{
    if (N == 4 || (N > 1 && !bLast))
        return StoreFour(p, oValues);
    T aValues[4];
    StoreFour(aValues, oValues);
    std::memcpy(p, aValues, N * sizeof(T));
}

// Whole pixels and fractions of a block of places along one axis.
struct Places
{
    void Find(const double* p, double nFirst, std::size_t nCount)
    {
        for (std::size_t n = 0; n < nCount; ++n)
        {
            const double nPlace = p[n] - nFirst;
            moPixels[n] = static_cast<std::int32_t>(nPlace);
            moFractions[n] = nPlace - moPixels[n];
        }
    }

    // Places that rounding alone keeps from the middle of a pixel are there.
    void Snap(std::size_t nCount)
    {
        constexpr double ROUNDING = 1e-9;
        for (std::size_t n = 0; n < nCount; ++n)
        {
            const bool bNext = moFractions[n] > 1 - ROUNDING;
            moPixels[n] += bNext ? 1 : 0;
            moFractions[n] = bNext || moFractions[n] < ROUNDING ? 0 : moFractions[n];
        }
    }

    std::int32_t moPixels[BLOCK];
    double moFractions[BLOCK];
};

struct CubicWeights
{
    void Find(const double* pFractions, std::size_t nCount)
    {
        for (std::size_t n = 0; n < nCount; ++n)
        {
            const double f = pFractions[n];
            moWeights[n][0] = static_cast<float>(((-0.5 * f + 1) * f - 0.5) * f);
            moWeights[n][1] = static_cast<float>((1.5 * f - 2.5) * f * f + 1);
            moWeights[n][2] = static_cast<float>(((-1.5 * f + 2) * f + 0.5) * f);
            moWeights[n][3] = static_cast<float>((0.5 * f - 0.5) * f * f);
        }
    }

    alignas(16) float moWeights[BLOCK][4];
};

template <typename T, std::size_t N>
struct Bilinear
{
    static void RunBlock(const PlainJob& oJob, std::size_t nFrom, std::size_t nCount)
    {
        Places oX, oY;
        oX.Find(oJob.mpX + nFrom, oJob.mnLeft, nCount);
        oY.Find(oJob.mpY + nFrom, oJob.mnTop, nCount);
        const T* const pPixels = reinterpret_cast<const T*>(oJob.mpPixels);
        T* const pResult = reinterpret_cast<T*>(oJob.mpResult) + nFrom * N;
        for (std::size_t n = 0; n < nCount; ++n)
        {
            const T* const p = pPixels + static_cast<std::size_t>(oY.moPixels[n]) * oJob.mnRowSamples +
                               static_cast<std::size_t>(oX.moPixels[n]) * N;
            const T* const q = p + oJob.mnRowSamples;
            const auto fx = static_cast<float>(oX.moFractions[n]), fy = static_cast<float>(oY.moFractions[n]);
            if constexpr (N == 1)
            {
                const auto nAbove =
                    static_cast<float>(p[0]) + fx * (static_cast<float>(p[1]) - static_cast<float>(p[0]));
                const auto nBelow =
                    static_cast<float>(q[0]) + fx * (static_cast<float>(q[1]) - static_cast<float>(q[0]));
                pResult[n] = RoundSample<T>(nAbove + fy * (nBelow - nAbove));
            }
            else
            {
                const Floats oFx = Spread(fx), oFy = Spread(fy);
                const Floats a = LoadSamples(p), b = LoadSamples(p + N), c = LoadSamples(q), d = LoadSamples(q + N);
                const Floats oAbove = a + oFx * (b - a), oBelow = c + oFx * (d - c);
                StorePixel<T, N>(pResult + n * N, oAbove + oFy * (oBelow - oAbove), n + 1 == nCount);
            }
        }
    }
};

template <typename T, std::size_t N>
struct Cubic
{
    static void RunBlock(const PlainJob& oJob, std::size_t nFrom, std::size_t nCount)
    {
        Places oX, oY;
        CubicWeights oXWeights, oYWeights;
        oX.Find(oJob.mpX + nFrom, oJob.mnLeft, nCount);
        oY.Find(oJob.mpY + nFrom, oJob.mnTop, nCount);
        oX.Snap(nCount);
        oY.Snap(nCount);
        oXWeights.Find(oX.moFractions, nCount);
        oYWeights.Find(oY.moFractions, nCount);
        const T* const pPixels = reinterpret_cast<const T*>(oJob.mpPixels);
        T* const pResult = reinterpret_cast<T*>(oJob.mpResult) + nFrom * N;
        for (std::size_t n = 0; n < nCount; ++n)
        {
            const T* const p = pPixels + static_cast<std::size_t>(oY.moPixels[n] - 1) * oJob.mnRowSamples +
                               static_cast<std::size_t>(oX.moPixels[n] - 1) * N;
            const float *const pXWeights = oXWeights.moWeights[n], *const pYWeights = oYWeights.moWeights[n];
            if (pXWeights[2] == 0 || pYWeights[2] == 0)
                StorePixel<T, N>(pResult + n * N, AddOnGrid(p, oJob.mnRowSamples, pXWeights, pYWeights, oJob.mbClamp),
                                 true);
            else if constexpr (N == 1)
                pResult[n] = RoundSample<T>(AddTaps(p, oJob.mnRowSamples, pXWeights, pYWeights, oJob.mbClamp));
            else
                StorePixel<T, N>(pResult + n * N, AddPixels(p, oJob.mnRowSamples, pXWeights, pYWeights, oJob.mbClamp),
                                 n + 1 == nCount);
        }
    }

    // Places in the middle of a row or column of pixels: its neighbours weigh nothing, the last one is out of reach.
    static Floats AddOnGrid(const T* p, std::size_t nRow, const float* pX, const float* pY, bool bClamp)
    {
        Floats oSum{}, oLow = LoadSamples(p + nRow + N), oHigh = oLow;
        for (std::size_t y = 0; y < 4; ++y)
        {
            for (std::size_t x = 0; x < 4; ++x)
            {
                if ((x == 3 && pX[2] == 0) || (y == 3 && pY[2] == 0))
                    continue;
                const Floats oPixel = LoadSamples(p + y * nRow + x * N);
                if (pX[x] != 0 && pY[y] != 0)
                    oSum += Spread(pX[x] * pY[y]) * oPixel;
                oLow = SmallerOf(oLow, oPixel);
                oHigh = LargerOf(oHigh, oPixel);
            }
        }
        return bClamp ? LargerOf(SmallerOf(oSum, oHigh), oLow) : oSum;
    }

    // The pixels of a row in the lanes.
    static float AddTaps(const T* p, std::size_t nRow, const float* pX, const float* pY, bool bClamp)
    {
        Floats oSum{}, oLow = LoadSamples(p), oHigh = oLow;
        for (std::size_t n = 0; n < 4; ++n)
        {
            const Floats oTaps = LoadSamples(p + n * nRow);
            oSum += Spread(pY[n]) * oTaps;
            oLow = SmallerOf(oTaps, oLow);
            oHigh = LargerOf(oTaps, oHigh);
        }
        Floats oWeights;
        std::memcpy(&oWeights, pX, sizeof oWeights);
        oSum *= oWeights;
        const float nSum = (oSum[0] + oSum[2]) + (oSum[1] + oSum[3]);
        if (!bClamp)
            return nSum;
        oLow = SmallerOf(oLow, simd::Picked<2, 3, 0, 1>(oLow));
        oHigh = LargerOf(oHigh, simd::Picked<2, 3, 0, 1>(oHigh));
        const float nLow = oLow[0] < oLow[1] ? oLow[0] : oLow[1], nHigh = oHigh[0] > oHigh[1] ? oHigh[0] : oHigh[1];
        return nSum < nLow ? nLow : (nSum > nHigh ? nHigh : nSum);
    }

    // The samples of a pixel in the lanes.
    static Floats AddPixels(const T* p, std::size_t nRow, const float* pX, const float* pY, bool bClamp)
    {
        Floats oSum{}, oLow = LoadSamples(p), oHigh = oLow;
        for (std::size_t y = 0; y < 4; ++y, p += nRow)
        {
            const Floats a = LoadSamples(p), b = LoadSamples(p + N), c = LoadSamples(p + 2 * N),
                         d = LoadSamples(p + 3 * N);
            oSum += Spread(pY[y]) * ((Spread(pX[0]) * a + Spread(pX[1]) * b) + (Spread(pX[2]) * c + Spread(pX[3]) * d));
            oLow = SmallerOf(SmallerOf(oLow, SmallerOf(a, b)), SmallerOf(c, d));
            oHigh = LargerOf(LargerOf(oHigh, LargerOf(a, b)), LargerOf(c, d));
        }
        return bClamp ? LargerOf(SmallerOf(oSum, oHigh), oLow) : oSum;
    }
};

template <typename Block>
inline void RunBlocks(const PlainJob& oJob)
{
    for (std::size_t n = 0; n < oJob.mnCount; n += BLOCK)
        Block::RunBlock(oJob, n, oJob.mnCount - n < BLOCK ? oJob.mnCount - n : BLOCK);
}

template <template <typename, std::size_t> class Kernel, typename T>
inline PlainLoop FindForSamples(std::size_t nSamples)
{
    constexpr PlainLoop LOOPS[] = {RunBlocks<Kernel<T, 1>>, RunBlocks<Kernel<T, 2>>, RunBlocks<Kernel<T, 3>>,
                                   RunBlocks<Kernel<T, 4>>};
    return nSamples >= 1 && nSamples <= MOST_PLAIN_SAMPLES ? LOOPS[nSamples - 1] : nullptr;
}

template <template <typename, std::size_t> class Kernel>
inline PlainLoop FindForType(NativeDataTypeCode ePart, std::size_t nSamples)
{
    switch (ePart)
    {
    case eDT_8U:
        return FindForSamples<Kernel, std::uint8_t>(nSamples);
    case eDT_16U:
        return FindForSamples<Kernel, std::uint16_t>(nSamples);
    case eDT_16S:
        return FindForSamples<Kernel, std::int16_t>(nSamples);
    case eDT_32R:
        return FindForSamples<Kernel, float>(nSamples);
    default:
        return nullptr;
    }
}

// All rows of a block of samples, whose sums stay in the nearest cache.
template <typename T>
inline void AddRows(const RowJob& oJob)
{
    constexpr std::size_t SAMPLES = 1024;
    for (std::size_t nFrom = 0; nFrom < oJob.mnSums; nFrom += SAMPLES)
    {
        const std::size_t nSums = oJob.mnSums - nFrom < SAMPLES ? oJob.mnSums - nFrom : SAMPLES;
        const T* p = reinterpret_cast<const T*>(oJob.mpPixels) + nFrom;
        float* const __restrict pSums = oJob.mpSums + nFrom;
        bool bFirst = true;
        for (std::size_t nRow = 0; nRow < oJob.mnRows; ++nRow, p += oJob.mnRowSamples)
        {
            const float nWeight = oJob.mpRowWeights[nRow];
            if (nWeight == 0)
                continue;
            for (std::size_t n = 0; bFirst && n < nSums; ++n)
                pSums[n] = nWeight * static_cast<float>(p[n]);
            for (std::size_t n = 0; !bFirst && n < nSums; ++n)
                pSums[n] += nWeight * static_cast<float>(p[n]);
            bFirst = false;
        }
        if (oJob.mpLowest == nullptr)
            continue;
        p = reinterpret_cast<const T*>(oJob.mpPixels) + nFrom;
        float* const __restrict pLowest = oJob.mpLowest + nFrom, * const __restrict pHighest = oJob.mpHighest + nFrom;
        for (std::size_t n = 0; n < nSums; ++n)
            pLowest[n] = pHighest[n] = static_cast<float>(p[n]);
        for (std::size_t nRow = 1; nRow < oJob.mnRows; ++nRow)
        {
            p += oJob.mnRowSamples;
            for (std::size_t n = 0; n < nSums; ++n)
            {
                const auto nValue = static_cast<float>(p[n]);
                pLowest[n] = nValue < pLowest[n] ? nValue : pLowest[n];
                pHighest[n] = nValue > pHighest[n] ? nValue : pHighest[n];
            }
        }
    }
}

// What is no number stays so.
inline Floats KeepTo(const Floats& oValue, const Floats& oLow, const Floats& oHigh)
{
    return LargerOf(oLow, SmallerOf(oHigh, oValue));
}

// What a weight of nothing makes of a sum: nothing, of infinite ones too.
template <typename T>
inline Floats Weigh(const Floats& oWeight, const Floats& oSum)
{
    if constexpr (std::is_same_v<T, float>)
        return oWeight * (oWeight != Floats{} ? oSum : Floats{});
    else
        return oWeight * oSum;
}

// Four samples of one pixel in the lanes.
template <typename T, std::size_t N>
inline Floats AddPixel(const RowJob& oJob, const Taps& oTaps, std::size_t nAt, std::size_t nTaps)
{
    const std::size_t nStep = N != 0 ? N : oJob.mnSamples;
    const float* const pWeights = oJob.mpWeights + oTaps.mnWeights;
    Floats oSum = Weigh<T>(Spread(pWeights[0]), LoadSamples(oJob.mpSums + nAt));
    for (std::size_t k = 1; k < nTaps; ++k)
        oSum += Weigh<T>(Spread(pWeights[k]), LoadSamples(oJob.mpSums + nAt + k * nStep));
    if (oJob.mpLowest == nullptr)
        return oSum;
    Floats oLow = LoadSamples(oJob.mpLowest + nAt), oHigh = LoadSamples(oJob.mpHighest + nAt);
    for (std::size_t k = 1; k < nTaps; ++k)
    {
        oLow = SmallerOf(oLow, LoadSamples(oJob.mpLowest + nAt + k * nStep));
        oHigh = LargerOf(oHigh, LoadSamples(oJob.mpHighest + nAt + k * nStep));
    }
    return KeepTo(oSum, oLow, oHigh);
}

// Single samples of four pixels in the lanes.
template <typename T>
inline Floats AddFour(const RowJob& oJob, const Taps* pTaps, std::size_t nTaps)
{
    const auto Gather = [&](const float* p, std::size_t k)
    {
        return Floats{p[static_cast<std::size_t>(pTaps[0].mnFirst - oJob.mnFirst) + k],
                      p[static_cast<std::size_t>(pTaps[1].mnFirst - oJob.mnFirst) + k],
                      p[static_cast<std::size_t>(pTaps[2].mnFirst - oJob.mnFirst) + k],
                      p[static_cast<std::size_t>(pTaps[3].mnFirst - oJob.mnFirst) + k]};
    };
    const auto Weights = [&](std::size_t k)
    {
        return Floats{oJob.mpWeights[pTaps[0].mnWeights + k], oJob.mpWeights[pTaps[1].mnWeights + k],
                      oJob.mpWeights[pTaps[2].mnWeights + k], oJob.mpWeights[pTaps[3].mnWeights + k]};
    };
    Floats oSum = Weigh<T>(Weights(0), Gather(oJob.mpSums, 0));
    for (std::size_t k = 1; k < nTaps; ++k)
        oSum += Weigh<T>(Weights(k), Gather(oJob.mpSums, k));
    if (oJob.mpLowest == nullptr)
        return oSum;
    Floats oLow = Gather(oJob.mpLowest, 0), oHigh = Gather(oJob.mpHighest, 0);
    for (std::size_t k = 1; k < nTaps; ++k)
    {
        oLow = SmallerOf(oLow, Gather(oJob.mpLowest, k));
        oHigh = LargerOf(oHigh, Gather(oJob.mpHighest, k));
    }
    return KeepTo(oSum, oLow, oHigh);
}

template <typename T, std::size_t N>
inline void MakePixelsOf(const RowJob& oJob)
{
    T* pResult = reinterpret_cast<T*>(oJob.mpResult);
    for (std::size_t n = 0; n < oJob.mnCount;)
    {
        const Taps* const pTaps = oJob.mpTaps + n;
        const auto nTaps = static_cast<std::size_t>(pTaps[0].mnEnd - pTaps[0].mnFirst);
        const auto HasAsMany = [&](std::size_t nOther)
        {
            return static_cast<std::size_t>(pTaps[nOther].mnEnd - pTaps[nOther].mnFirst) == nTaps;
        };
        if (N == 1 && n + 4 <= oJob.mnCount && HasAsMany(1) && HasAsMany(2) && HasAsMany(3))
        {
            StoreFour(pResult + n, AddFour<T>(oJob, pTaps, nTaps));
            n += 4;
            continue;
        }
        const std::size_t nSamples = N != 0 ? N : oJob.mnSamples;
        const std::size_t nAt = static_cast<std::size_t>(pTaps->mnFirst - oJob.mnFirst) * nSamples;
        if constexpr (N != 0)
            StorePixel<T, N>(pResult + n * N, AddPixel<T, N>(oJob, *pTaps, nAt, nTaps), n + 1 == oJob.mnCount);
        else
        {
            for (std::size_t c = 0; c < nSamples; c += 4)
            {
                T aValues[4];
                StoreFour(aValues, AddPixel<T, N>(oJob, *pTaps, nAt + c, nTaps));
                std::memcpy(pResult + n * nSamples + c, aValues, (nSamples - c < 4 ? nSamples - c : 4) * sizeof(T));
            }
        }
        ++n;
    }
}

template <typename T>
inline void MakePixels(const RowJob& oJob)
{
    switch (oJob.mnSamples)
    {
    case 1:
        return MakePixelsOf<T, 1>(oJob);
    case 2:
        return MakePixelsOf<T, 2>(oJob);
    case 3:
        return MakePixelsOf<T, 3>(oJob);
    case 4:
        return MakePixelsOf<T, 4>(oJob);
    default:
        return MakePixelsOf<T, 0>(oJob);
    }
}

inline RowLoops FindRowLoopsFor(NativeDataTypeCode ePart)
{
    switch (ePart)
    {
    case eDT_8U:
        return {AddRows<std::uint8_t>, MakePixels<std::uint8_t>};
    case eDT_16U:
        return {AddRows<std::uint16_t>, MakePixels<std::uint16_t>};
    case eDT_16S:
        return {AddRows<std::int16_t>, MakePixels<std::int16_t>};
    case eDT_32R:
        return {AddRows<float>, MakePixels<float>};
    default:
        return {};
    }
}

inline PlainLoop FindFor(Resampling eMethod, NativeDataTypeCode ePart, std::size_t nSamples)
{
    if (eMethod == Resampling::eBilinear)
        return FindForType<Bilinear>(ePart, nSamples);
    return eMethod == Resampling::eCubic ? FindForType<Cubic>(ePart, nSamples) : nullptr;
}

} // namespace

} // namespace krv::gobs::detail
