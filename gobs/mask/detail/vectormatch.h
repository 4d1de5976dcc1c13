#pragma once

#include "gobs/mask/detail/vectormark.h"
#include "gobs/mask/detail/vectorops.h"
#include "gobs/raster/complex.h"

#include <cstring>
#include <type_traits>

// The vectors of a group stay in registers only when these short loops are unrolled, at every optimisation level.
#define KRV_UNROLL _Pragma("GCC unroll 16")

// Pixels are compared with the pattern of their values sixteen at a time, so that pattern and vectors end together
// whatever the number of channels N. Here two channels of 8 bits, 16 pixels in two vectors:
//     samples  a0 b0 a1 b1 .. a7 b7 | a8 b8 .. a15 b15
//     values   A  B  A  B  .. A  B  | A  B  .. A   B
//     equal    FF 00 FF FF .. 00 00 | ..                 a byte of all ones for each sample that matches
//     pixels   xor what is expected, and what is used: a pixel whose N bytes are all zero gets its bit
//
// Everything here depends on the kind of vector: a wide instantiation never stands in for a narrow one.
namespace krv::gobs::detail
{

// W vectors of lanes of W bytes, all ones or all zero, to one vector of bytes in the same order.
template <class Ops, unsigned int W>
typename Ops::Vector Narrow(const typename Ops::Vector* pMasks)
{
    using std::int16_t, std::int32_t;
    if constexpr (W == 1)
        return pMasks[0];
    else if constexpr (W == 2)
        return Ops::template Narrow<int16_t>(pMasks[0], pMasks[1]);
    else if constexpr (W == 4)
        return Ops::template Narrow<int16_t>(Ops::template Narrow<int32_t>(pMasks[0], pMasks[1]),
                                             Ops::template Narrow<int32_t>(pMasks[2], pMasks[3]));
    else
    {
        static_assert(W == 8);
        typename Ops::Vector oHalf[4];
        KRV_UNROLL
        for (unsigned int k = 0; k < 4; ++k)
            oHalf[k] = simd::EveryOther<float, false>(pMasks[2 * k], pMasks[2 * k + 1]);
        return Narrow<Ops, 4>(oHalf);
    }
}

template <unsigned int W>
using LaneOfBytes = std::conditional_t<
    W == 1, std::uint8_t,
    std::conditional_t<W == 2, std::uint16_t, std::conditional_t<W == 4, std::uint32_t, std::uint64_t>>>;

// Samples of one part.
template <class Ops, class Sample>
struct Matcher
{
    using Vector = typename Ops::Vector;
    static constexpr unsigned int SIZE = sizeof(Sample);

    static Vector Equal(Vector oPixels, Vector oValues) { return Ops::template Equal<Sample>(oPixels, oValues); }

    static Vector NaN(Vector oPixels)
    {
        if constexpr (std::is_floating_point_v<Sample>)
            return Ops::template NaN<Sample>(oPixels);
        else
            return Vector{};
    }

    // 16 samples of each group against 16 values: a byte of all ones for each that matches.
    template <bool WithNaN>
    static Vector Match(const unsigned char* pPixels, std::size_t nStride, const unsigned char* pValues,
                        const unsigned char* pNaNs)
    {
        Vector oMasks[SIZE];
        KRV_UNROLL
        for (unsigned int k = 0; k < SIZE; ++k)
        {
            const Vector oPixels = Ops::Load(pPixels + 16 * k, nStride);
            oMasks[k] = Equal(oPixels, Ops::Broadcast(pValues + 16 * k));
            if constexpr (WithNaN)
                oMasks[k] |= NaN(oPixels) & Ops::Broadcast(pNaNs + 16 * k);
        }
        return Narrow<Ops, SIZE>(oMasks);
    }
};

// Samples of two parts match when both do.
template <class Ops, class Part>
struct Matcher<Ops, Complex<Part>>
{
    using Vector = typename Ops::Vector;
    using Parts = Matcher<Ops, Part>;
    static constexpr unsigned int SIZE = sizeof(Part);

    // Two vectors of part masks to one of sample masks.
    static Vector Both(Vector oFirst, Vector oSecond)
    {
        using Lane = std::conditional_t<SIZE == 8, std::uint64_t, float>;
        return simd::EveryOther<Lane, false>(oFirst, oSecond) & simd::EveryOther<Lane, true>(oFirst, oSecond);
    }

    template <bool WithNaN>
    static Vector Match(const unsigned char* pPixels, std::size_t nStride, const unsigned char* pValues,
                        const unsigned char* pNaNs)
    {
        Vector oMasks[SIZE];
        KRV_UNROLL
        for (unsigned int k = 0; k < SIZE; ++k)
        {
            const Vector oFirst = Ops::Load(pPixels + 32 * k, nStride);
            const Vector oSecond = Ops::Load(pPixels + 32 * k + 16, nStride);
            oMasks[k] = Both(Parts::Equal(oFirst, Ops::Broadcast(pValues + 32 * k)),
                             Parts::Equal(oSecond, Ops::Broadcast(pValues + 32 * k + 16)));
            if constexpr (WithNaN)
            {
                oMasks[k] |= Both(Parts::NaN(oFirst) & Ops::Broadcast(pNaNs + 32 * k),
                                  Parts::NaN(oSecond) & Ops::Broadcast(pNaNs + 32 * k + 16));
            }
        }
        return Narrow<Ops, SIZE>(oMasks);
    }
};

// Where the bytes of one of three interleaved lanes lie in one of the three vectors that hold 16 pixels; -1: elsewhere.
struct LanePick
{
    constexpr LanePick(int nLane, int nVector)
    {
        for (int nPixel = 0; nPixel < 16; ++nPixel)
        {
            const int nAt = 3 * nPixel + nLane - 16 * nVector;
            mnFrom[nPixel] = static_cast<signed char>(nAt >= 0 && nAt < 16 ? nAt : -1);
        }
    }

    alignas(16) signed char mnFrom[16] = {};
};

// Three vectors of three bytes a pixel: those of a pixel combined by or.
template <class Ops>
typename Ops::Vector OrOfThree(const typename Ops::Vector* pBytes)
{
    static constexpr LanePick PICKS[3][3] = {
        {{0, 0}, {0, 1}, {0, 2}}, {{1, 0}, {1, 1}, {1, 2}}, {{2, 0}, {2, 1}, {2, 2}}};
    typename Ops::Vector oAny{};
    KRV_UNROLL
    for (unsigned int nLane = 0; nLane < 3; ++nLane)
    {
        KRV_UNROLL
        for (unsigned int nVector = 0; nVector < 3; ++nVector)
            oAny |= simd::PickBytes(pBytes[nVector], Ops::Broadcast(PICKS[nLane][nVector].mnFrom));
    }
    return oAny;
}

// N vectors that hold N bytes for each of 16 pixels: a byte of all ones for each pixel whose bytes are all zero.
template <class Ops, unsigned int N>
typename Ops::Vector AllZero(const typename Ops::Vector* pBytes)
{
    if constexpr (N == 3)
        return Ops::template Equal<std::uint8_t>(OrOfThree<Ops>(pBytes), typename Ops::Vector{});
    else
    {
        typename Ops::Vector oMasks[N];
        KRV_UNROLL
        for (unsigned int k = 0; k < N; ++k)
            oMasks[k] = Ops::template Equal<LaneOfBytes<N>>(pBytes[k], typename Ops::Vector{});
        return Narrow<Ops, N>(oMasks);
    }
}

// Bytes of all ones or zero to bits, the first byte to the highest bit of the first byte of bits.
template <class Ops>
void StoreBits(typename Ops::Vector oMask, bool bInvert, unsigned char* pBits)
{
    alignas(16) static constexpr signed char REVERSED[16] = {7, 6, 5, 4, 3, 2, 1, 0, 15, 14, 13, 12, 11, 10, 9, 8};
    const unsigned int nBits =
        simd::TopBits(simd::As<std::uint8_t>(simd::PickBytes(oMask, Ops::Broadcast(REVERSED)))) ^ (bInvert ? ~0u : 0u);
    std::memcpy(pBits, &nBits, 2 * Ops::GROUPS);
}

// Vector nVector of the comparison of a group, a byte a sample: zero where the rule may go on.
template <class Ops, class Sample, bool WithNaN>
typename Ops::Vector Compare(const unsigned char* pPixels, std::size_t nStride, std::size_t nVector,
                             const MarkPattern& oPattern)
{
    const std::size_t nAt = nVector * 16 * sizeof(Sample);
    const auto oMatch = Matcher<Ops, Sample>::template Match<WithNaN>(pPixels + nAt, nStride, oPattern.mpValues + nAt,
                                                                      oPattern.mpNaNs + (WithNaN ? nAt : 0));
    return (oMatch & Ops::Broadcast(oPattern.mpUsed + 16 * nVector)) ^
           Ops::Broadcast(oPattern.mpExpected + 16 * nVector);
}

template <class Ops, class Sample, bool WithNaN, unsigned int N>
std::size_t MarkFew(const unsigned char* pPixels, std::size_t nPixels, const MarkPattern& oPattern,
                    unsigned char* pBits)
{
    constexpr std::size_t STRIDE = 16 * N * sizeof(Sample);
    constexpr std::size_t TAKEN = 16 * Ops::GROUPS;
    // A copy that nothing else can change keeps the pattern's addresses out of the loop.
    const MarkPattern oLocal = oPattern;
    for (std::size_t nPixel = 0; nPixel + TAKEN <= nPixels; nPixel += TAKEN)
    {
        typename Ops::Vector oBytes[N];
        KRV_UNROLL
        for (unsigned int k = 0; k < N; ++k)
            oBytes[k] = Compare<Ops, Sample, WithNaN>(pPixels, STRIDE, k, oLocal);
        StoreBits<Ops>(AllZero<Ops, N>(oBytes), oLocal.mbInvert, pBits);
        pPixels += STRIDE * Ops::GROUPS;
        pBits += 2 * Ops::GROUPS;
    }
    return nPixels / TAKEN * TAKEN;
}

// One channel needs no combining: what matches is background.
template <class Ops, class Sample, bool WithNaN>
std::size_t MarkSingle(const unsigned char* pPixels, std::size_t nPixels, const MarkPattern& oPattern,
                       unsigned char* pBits)
{
    constexpr std::size_t STRIDE = 16 * sizeof(Sample);
    constexpr std::size_t TAKEN = 16 * Ops::GROUPS;
    const MarkPattern oLocal = oPattern;
    for (std::size_t nPixel = 0; nPixel + TAKEN <= nPixels; nPixel += TAKEN)
    {
        StoreBits<Ops>(Matcher<Ops, Sample>::template Match<WithNaN>(pPixels, STRIDE, oLocal.mpValues, oLocal.mpNaNs),
                       false, pBits);
        pPixels += STRIDE * Ops::GROUPS;
        pBits += 2 * Ops::GROUPS;
    }
    return nPixels / TAKEN * TAKEN;
}

template <class Ops, class Sample, bool WithNaN>
std::size_t MarkVectors(const unsigned char* pPixels, std::size_t nPixels, const MarkPattern& oPattern,
                        unsigned char* pBits)
{
    switch (oPattern.mnChannels)
    {
    case 1:
        return MarkSingle<Ops, Sample, WithNaN>(pPixels, nPixels, oPattern, pBits);
    case 2:
        return MarkFew<Ops, Sample, WithNaN, 2>(pPixels, nPixels, oPattern, pBits);
    case 3:
        return MarkFew<Ops, Sample, WithNaN, 3>(pPixels, nPixels, oPattern, pBits);
    case 4:
        return MarkFew<Ops, Sample, WithNaN, 4>(pPixels, nPixels, oPattern, pBits);
    case 8:
        return MarkFew<Ops, Sample, WithNaN, 8>(pPixels, nPixels, oPattern, pBits);
    default:
        return 0;
    }
}

// Only samples with a real part know NaN.
template <class Ops, class Sample>
std::size_t MarkAnyNaN(const unsigned char* pPixels, std::size_t nPixels, const MarkPattern& oPattern,
                       unsigned char* pBits)
{
    if constexpr (!std::is_integral_v<Sample>)
    {
        if (oPattern.mpNaNs != nullptr)
            return MarkVectors<Ops, Sample, true>(pPixels, nPixels, oPattern, pBits);
    }
    return MarkVectors<Ops, Sample, false>(pPixels, nPixels, oPattern, pBits);
}

} // namespace krv::gobs::detail
