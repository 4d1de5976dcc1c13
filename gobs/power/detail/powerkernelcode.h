#pragma once

// The inner loops of power. One source file for each instruction set includes this and is compiled with options of its
// own, so everything here is local to the file and calls nothing that is not. Plain loops, which the compiler turns
// into vectors; where pixels are complex and it takes pairs apart, they are vectors from the beginning.

#include "gobs/power/detail/powerkernels.h"
#include "toolkit/simd/vectors.h"

#include <cstdint>
#include <type_traits>

namespace krv::gobs::detail
{

namespace
{

// What the power is stored as.
template <typename T>
using PowerOf = std::conditional_t<std::is_same_v<T, float> || sizeof(T) <= 2, float, double>;

// The first pixels by whole vectors, of N samples each; returns how many. None where the plain loop is as good.
template <std::size_t N, typename T>
inline std::size_t SquareVectors(const T*, std::size_t, PowerOf<T>*)
{
    return 0;
}

#if defined(__AVX512VBMI__)

// Lanes as they were before neighbours of two vectors were brought together:
//     first, second   a0 A0 a1 A1 ..   b0 B0 b1 B1 ..      low + high   a0+A0 b0+B0 a1+A1 b1+B1 ..      a0+A0 a1+A1 ..
template <typename V>
inline V InOrder(V o)
{
    return simd::Picked<0, 2, 4, 6, 1, 3, 5, 7>(o);
}

// re * re + im * im of 16 values, at most 2^31.
inline auto SquarePairs(const std::int16_t* p)
{
    const auto oPairs = simd::Load<simd::Full<std::int16_t>>(p);
    return simd::As<std::uint32_t>(simd::AddProducts(oPairs, oPairs));
}

template <>
inline std::size_t SquareVectors<2, std::int16_t>(const std::int16_t* p, std::size_t nPixels, float* pPower)
{
    std::size_t n = 0;
    for (; n + 16 <= nPixels; n += 16)
        simd::Store(pPower + n, simd::Convert<float>(SquarePairs(p + 2 * n)));
    return n;
}

// Two neighbours as one of 64 bits.
inline auto AddHalves(simd::Full<std::uint32_t> o)
{
    const auto oPairs = simd::As<std::int64_t>(o);
    return (oPairs & 0xFFFFFFFF) + simd::As<std::int64_t>(simd::As<std::uint64_t>(o) >> 32);
}

template <>
inline std::size_t SquareVectors<8, std::int16_t>(const std::int16_t* p, std::size_t nPixels, float* pPower)
{
    std::size_t n = 0;
    for (; n + 8 <= nPixels; n += 8)
    {
        const auto oFirst = AddHalves(SquarePairs(p + 8 * n)), oSecond = AddHalves(SquarePairs(p + 8 * n + 32));
        const auto oSums = simd::MixLow<std::int64_t>(oFirst, oSecond) + simd::MixHigh<std::int64_t>(oFirst, oSecond);
        simd::Store(pPower + n, simd::Convert<float>(InOrder(oSums)));
    }
    return n;
}

// Squares of 32R are exact as doubles, so that one more multiplication may go with the addition.
template <>
inline std::size_t SquareVectors<2, float>(const float* p, std::size_t nPixels, float* pPower)
{
    std::size_t n = 0;
    for (; n + 8 <= nPixels; n += 8)
    {
        const auto oFirst = simd::LoadWidened<double, 8>(p + 2 * n);
        const auto oSecond = simd::LoadWidened<double, 8>(p + 2 * n + 8);
        const auto oReal = simd::MixLow<double>(oFirst, oSecond), oImaginary = simd::MixHigh<double>(oFirst, oSecond);
        const auto oPower = simd::MultiplyAdd(oReal, oReal, oImaginary * oImaginary);
        simd::Store(pPower + n, InOrder(simd::Convert<float>(oPower)));
    }
    return n;
}

#endif

// One complex value a pixel: the bulk of what there is.
//     samples   re0 im0 re1 im1 re2 im2 ..
//     squares   re0*re0 im0*im0 re1*re1 im1*im1 ..   in lanes twice as wide (of 16 bits)
//     power     re0*re0 + im0*im0, re1*re1 + im1*im1, ..
template <typename T>
inline void SquarePairs(const T* p, std::size_t nPixels, PowerOf<T>* pPower)
{
    const std::size_t nFirst = SquareVectors<2>(p, nPixels, pPower);
    if constexpr (std::is_same_v<T, std::int16_t> || std::is_same_v<T, std::uint16_t>)
    {
        // Squares of 16 bits add up exactly in 32 or 64 and are rounded once, as doubles would be.
        using Wide = std::conditional_t<std::is_signed_v<T>, std::int32_t, std::uint32_t>;
        using Sum = std::conditional_t<std::is_signed_v<T>, std::uint32_t, std::uint64_t>;
        for (std::size_t n = nFirst; n < nPixels; ++n)
        {
            const Wide nReal = p[2 * n], nImaginary = p[2 * n + 1];
            pPower[n] = static_cast<float>(static_cast<Sum>(nReal * nReal) + static_cast<Sum>(nImaginary * nImaginary));
        }
    }
    else
        for (std::size_t n = nFirst; n < nPixels; ++n)
        {
            const double nReal = static_cast<double>(p[2 * n]), nImaginary = static_cast<double>(p[2 * n + 1]);
            pPower[n] = static_cast<PowerOf<T>>(nReal * nReal + nImaginary * nImaginary);
        }
}

// SAMPLES samples a pixel, or as many as the job says for 0. The order of additions is that of the samples.
template <typename T, std::size_t SAMPLES, bool SQUARE>
inline void AddAll(const PowerJob& oJob)
{
    const std::size_t nSamples = SAMPLES != 0 ? SAMPLES : oJob.mnSamples;
    const T* const p = reinterpret_cast<const T*>(oJob.mpPixels);
    auto* const pPower = reinterpret_cast<PowerOf<T>*>(oJob.mpPower);
    const std::size_t nFirst = SQUARE ? SquareVectors<SAMPLES>(p, oJob.mnPixels, pPower) : 0;
    for (std::size_t n = nFirst; n < oJob.mnPixels; ++n)
    {
        double nSum = 0;
        for (std::size_t i = 0; i < nSamples; ++i)
        {
            const auto nSample = static_cast<double>(p[n * nSamples + i]);
            nSum += SQUARE ? nSample * nSample : nSample;
        }
        pPower[n] = static_cast<PowerOf<T>>(nSum);
    }
}

// What weighs nothing is not looked at: its NaN is none of the result's.
template <typename T>
inline void Weigh(const PowerJob& oJob)
{
    const T* p = reinterpret_cast<const T*>(oJob.mpPixels);
    auto* const pPower = reinterpret_cast<PowerOf<T>*>(oJob.mpPower);
    for (std::size_t n = 0; n < oJob.mnPixels; ++n, p += oJob.mnSamples)
    {
        double nSum = 0;
        for (std::size_t i = 0; i < oJob.mnSamples; ++i)
        {
            const auto nSample = static_cast<double>(p[i]);
            if (oJob.mpSquares[i] != 0)
                nSum += oJob.mpSquares[i] * (nSample * nSample);
            if (oJob.mpValues[i] != 0)
                nSum += oJob.mpValues[i] * nSample;
        }
        pPower[n] = static_cast<PowerOf<T>>(nSum);
    }
}

template <typename T, bool SQUARE>
inline void RunPlain(const PowerJob& oJob)
{
    if (oJob.mnSamples == 1)
        AddAll<T, 1, SQUARE>(oJob);
    else if (oJob.mnSamples == 2)
        AddAll<T, 2, SQUARE>(oJob);
    else if (oJob.mnSamples == 3)
        AddAll<T, 3, SQUARE>(oJob);
    else if (oJob.mnSamples == 4)
        AddAll<T, 4, SQUARE>(oJob);
    else if (oJob.mnSamples == 8)
        AddAll<T, 8, SQUARE>(oJob);
    else
        AddAll<T, 0, SQUARE>(oJob);
}

template <typename T>
inline void RunPower(const PowerJob& oJob)
{
    if (oJob.meForm == PowerForm::eWeighted)
        Weigh<T>(oJob);
    else if (oJob.meForm == PowerForm::eValues)
        RunPlain<T, false>(oJob);
    else if (oJob.mnSamples == 2)
        SquarePairs(reinterpret_cast<const T*>(oJob.mpPixels), oJob.mnPixels,
                    reinterpret_cast<PowerOf<T>*>(oJob.mpPower));
    else
        RunPlain<T, true>(oJob);
}

inline PowerLoop FindFor(NativeDataTypeCode ePart)
{
    switch (ePart)
    {
    case eDT_8U:
        return RunPower<std::uint8_t>;
    case eDT_8S:
        return RunPower<std::int8_t>;
    case eDT_16U:
        return RunPower<std::uint16_t>;
    case eDT_16S:
        return RunPower<std::int16_t>;
    case eDT_32U:
        return RunPower<std::uint32_t>;
    case eDT_32S:
        return RunPower<std::int32_t>;
    case eDT_32R:
        return RunPower<float>;
    case eDT_64U:
        return RunPower<std::uint64_t>;
    case eDT_64S:
        return RunPower<std::int64_t>;
    case eDT_64R:
        return RunPower<double>;
    default:
        return nullptr;
    }
}

} // namespace

} // namespace krv::gobs::detail
