#pragma once

// The inner loops of averages. One source file for each instruction set includes this and is compiled with options of
// its own, so everything here is local to the file and calls nothing that is not: a function that the linker shares
// could be the other file's.

#include "gobs/resampling/detail/averagekernels.h"
#include "toolkit/simd/vectors.h"

#include <cstdint>
#include <cstring>
#include <type_traits>
#include <utility>

namespace krv::gobs::detail
{

namespace
{

// Bytes. Rows of 1536 bytes in memory, AVX2: 6.5 GB/s without fetching, 18.5 at 1024 bytes ahead, 23 at 4096, 25 at
// 8192, 24 at 16384, 22 at 32768.
constexpr std::size_t FETCHED_AHEAD = 8192;
constexpr std::size_t FETCHED_LINE = 64;

using simd::Vector;

// All lanes, or the first three quarters.
template <std::size_t COUNT, std::size_t LANES, typename T>
inline void Store(T* p, Vector<T, LANES> oValues)
{
    if constexpr (COUNT == LANES)
        simd::Store(p, oValues);
    else
    {
        constexpr std::size_t HALF = sizeof oValues / 2;
        simd::Store(p, simd::Part<0, HALF>(oValues));
        simd::Store(p + LANES / 2, simd::Part<HALF, HALF / 2>(oValues));
    }
}

// Sums of pixels two by two of two rows of bytes by one instruction that adds neighbours; up to 32 bytes of vector,
// what is wider has the better way of its own. Pixels of three bytes fill three quarters of the lanes:
//     bytes of a row     r0 g0 b0 r1 g1 b1 r2 g2 b2 r3 g3 b3  .  .  .  .
//     beside each other  r0 r1 g0 g1 b0 b1 r2 r3 g2 g3 b2 b3  -  -  -  -
//     words              r0+r1 g0+g1 b0+b1 r2+r3 g2+g3 b2+b3  0     0        plus those of the second row
template <unsigned int N, std::size_t LANES>
constexpr bool HAS_BYTE_SUMS = false;
#if defined(KRV_VECTORS)
template <unsigned int N>
constexpr bool HAS_BYTE_SUMS<N, 8> = true;

template <unsigned int N, std::uint8_t K = 0>
inline simd::Bytes BesideEachOther()
{
    if constexpr (N == 2)
        return simd::Bytes{0, 2, 1, 3, 4, 6, 5, 7, 8, 10, 9, 11, 12, 14, 13, 15};
    else if constexpr (N == 3)
        return simd::Bytes{K,     K + 3,  K + 1, K + 4,  K + 2, K + 5, K + 6, K + 9,
                           K + 7, K + 10, K + 8, K + 11, 0xFF,  0xFF,  0xFF,  0xFF};
    else
        return simd::Bytes{0, 4, 1, 5, 2, 6, 3, 7, 8, 12, 9, 13, 10, 14, 11, 15};
}

template <unsigned int N>
inline auto AddNeighbours(const std::uint8_t* p, std::integral_constant<std::size_t, 8>)
{
    simd::Bytes oBytes;
    if constexpr (N == 3)
        oBytes = simd::LoadFirst<12>(p);
    else
        oBytes = simd::Load<simd::Bytes>(p);
    if constexpr (N != 1)
        oBytes = simd::PickBytes(oBytes, BesideEachOther<N>());
    return simd::AddNeighbours(oBytes);
}

template <unsigned int N>
inline auto SumBytes(const std::uint8_t* pFirst, const std::uint8_t* pSecond, std::integral_constant<std::size_t, 8> n)
{
    return AddNeighbours<N>(pFirst, n) + AddNeighbours<N>(pSecond, n);
}
#endif
#if defined(__AVX2__)
template <unsigned int N>
constexpr bool HAS_BYTE_SUMS<N, 16> = true;

template <unsigned int N>
inline auto AddNeighbours(const std::uint8_t* p, std::integral_constant<std::size_t, 16>)
{
    Vector<std::uint8_t, 32> oBytes;
    if constexpr (N == 3)
        oBytes = simd::PickBytes(simd::Join(simd::Load<simd::Bytes>(p), simd::Load<simd::Bytes>(p + 8)),
                                 simd::Join(BesideEachOther<3>(), BesideEachOther<3, 4>()));
    else
        oBytes = simd::Load<Vector<std::uint8_t, 32>>(p);
    if constexpr (N == 2 || N == 4)
        oBytes = simd::PickBytes(oBytes, simd::SpreadGroup<Vector<std::uint8_t, 32>>(BesideEachOther<N>()));
    return simd::AddNeighbours(oBytes);
}

template <unsigned int N>
inline auto SumBytes(const std::uint8_t* pFirst, const std::uint8_t* pSecond, std::integral_constant<std::size_t, 16> n)
{
    const auto oSums = AddNeighbours<N>(pFirst, n) + AddNeighbours<N>(pSecond, n);
    if constexpr (N == 3)
        return simd::As<std::uint16_t>(simd::Picked<0, 1, 2, 4, 5, 6, 3, 7>(simd::As<std::uint32_t>(oSums)));
    else
        return oSums;
}
#endif

template <typename In, typename Sum, typename Mean, unsigned int N>
struct Reduction
{
    static constexpr bool FIRST = std::is_same_v<In, Mean>;
    static constexpr std::size_t MOST_LANES =
        simd::VECTOR_BYTES / sizeof(Sum) < 4 ? 4 : simd::VECTOR_BYTES / sizeof(Sum);

    // Of types without such an instruction both rows are added first, then left and right samples are picked out of
    // the two vectors (here of two samples a pixel):
    //     both rows  x0 y0 x1 y1 | x2 y2 x3 y3
    //     left       x0 y0 x2 y2     right  x1 y1 x3 y3     sums  x0+x1 y0+y1 x2+x3 y2+y3
    // One vector of sums at a time, of which pixels of three samples fill three quarters. Nothing is read or written
    // beyond what is named.
    template <std::size_t LANES>
    struct Step
    {
        static constexpr std::size_t OUTPUT = N == 3 ? LANES / 4 * 3 : LANES;
        static constexpr std::size_t INPUT = 2 * OUTPUT;

        // Where the left sample of a sum lies in two vectors, the second of which ends with the input, or the right
        // one.
        static constexpr int Find(std::size_t nSum, bool bRight)
        {
            const std::size_t nAt = nSum / N * 2 * N + nSum % N + (bRight ? N : 0);
            return nSum >= OUTPUT ? -1 : static_cast<int>(nAt < LANES ? nAt : nAt + 2 * LANES - INPUT);
        }

        template <std::size_t... I>
        static auto AddPairs(const Vector<Sum, LANES>& oLow, const Vector<Sum, LANES>& oHigh, std::index_sequence<I...>)
        {
            return simd::Picked<Find(I, false)...>(oLow, oHigh) + simd::Picked<Find(I, true)...>(oLow, oHigh);
        }

        static auto GetSums(const In* pFirst, const In* pSecond)
        {
            if constexpr (std::is_same_v<In, std::uint8_t> && HAS_BYTE_SUMS<N, LANES>)
                return SumBytes<N>(pFirst, pSecond, std::integral_constant<std::size_t, LANES>());
            else
                return AddPairs(simd::LoadWidened<Sum, LANES>(pFirst) + simd::LoadWidened<Sum, LANES>(pSecond),
                                simd::LoadWidened<Sum, LANES>(pFirst + INPUT - LANES) +
                                    simd::LoadWidened<Sum, LANES>(pSecond + INPUT - LANES),
                                std::make_index_sequence<LANES>());
        }

        static void Run(const In* pFirst, const In* pSecond, Sum* pSums, Mean* pMeans, unsigned int nShift)
        {
            const auto oSums = GetSums(pFirst, pSecond);
            if (pSums != nullptr)
                Store<OUTPUT, LANES>(pSums, oSums);
            if (pMeans != nullptr)
                Store<OUTPUT, LANES>(pMeans, simd::Convert<Mean>(Divide(oSums, nShift)));
        }
    };

    // Half to even: one more where what the shift drops is above the half, or is the half and the mean is odd.
    template <typename V>
    static auto Divide(const V& oSums, unsigned int nShift)
    {
        if constexpr (std::is_floating_point_v<Sum>)
            return oSums * (Sum(1) / static_cast<Sum>(std::uint64_t{1} << nShift));
        else
        {
            const auto nBits = static_cast<Sum>(nShift);
            const auto nBelowHalf = static_cast<Sum>((std::uint64_t{1} << (nShift - 1)) - 1);
            return (oSums + nBelowHalf + (oSums >> nBits & Sum(1))) >> nBits;
        }
    }

    // As many of nInput samples as vectors take, the rest by vectors half as long.
    template <std::size_t LANES>
    static void AddRow(const In* pFirst, const In* pSecond, std::size_t nAt, std::size_t nInput, Sum* pSums,
                       Mean* pMeans, unsigned int nShift, bool bFetch)
    {
        using Step = Step<LANES>;
        for (; nAt + Step::INPUT <= nInput; nAt += Step::INPUT)
        {
            if (FIRST && LANES == MOST_LANES && bFetch)
                for (std::size_t n = 0; n < 2 * Step::INPUT * sizeof(In); n += FETCHED_LINE)
                    __builtin_prefetch(reinterpret_cast<const char*>(pFirst + 2 * nAt) + FETCHED_AHEAD + n);
            Step::Run(pFirst + nAt, pSecond + nAt, pSums != nullptr ? pSums + nAt / 2 : nullptr,
                      pMeans != nullptr ? pMeans + nAt / 2 : nullptr, nShift);
        }
        if constexpr (LANES > 4)
            AddRow<LANES / 2>(pFirst, pSecond, nAt, nInput, pSums, pMeans, nShift, bFetch);
        else
            for (std::size_t n = nAt / 2; n < nInput / 2; ++n)
            {
                const std::size_t nLeft = n / N * 2 * N + n % N;
                const auto nSum = static_cast<Sum>((Sum(pFirst[nLeft]) + Sum(pSecond[nLeft])) +
                                                   (Sum(pFirst[nLeft + N]) + Sum(pSecond[nLeft + N])));
                if (pSums != nullptr)
                    pSums[n] = nSum;
                if (pMeans != nullptr)
                    pMeans[n] = static_cast<Mean>(Divide(nSum, nShift));
            }
    }

    static void Run(const ReduceJob& oJob)
    {
        for (std::size_t nRow = 0; nRow < oJob.mnHeight; ++nRow)
        {
            const std::size_t nSource = nRow * oJob.mnPairPitch;
            unsigned char* const pSums = oJob.mpSums != nullptr ? oJob.mpSums + nRow * oJob.mnSumPitch : nullptr;
            unsigned char* const pMeans = oJob.mpMeans != nullptr ? oJob.mpMeans + nRow * oJob.mnMeanPitch : nullptr;
            AddRow<MOST_LANES>(reinterpret_cast<const In*>(oJob.mpFirst + nSource),
                               reinterpret_cast<const In*>(oJob.mpSecond + nSource), 0, 2 * N * oJob.mnWidth,
                               reinterpret_cast<Sum*>(pSums), reinterpret_cast<Mean*>(pMeans), FIRST ? 2 : oJob.mnShift,
                               oJob.mbFetch);
        }
    }
};

template <typename In, typename Sum, typename Mean>
inline ReduceLoop FindFor(unsigned int nSamples)
{
    constexpr ReduceLoop LOOPS[] = {Reduction<In, Sum, Mean, 1>::Run, Reduction<In, Sum, Mean, 2>::Run,
                                    Reduction<In, Sum, Mean, 3>::Run, Reduction<In, Sum, Mean, 4>::Run};
    return nSamples >= 1 && nSamples <= 4 ? LOOPS[nSamples - 1] : nullptr;
}

inline ReduceLoop Find(NativeDataTypeCode eType, unsigned int nSamples, std::size_t nSourceBytes, std::size_t nSumBytes)
{
    using std::uint16_t, std::uint32_t, std::uint64_t, std::uint8_t;
    const std::size_t nStep = nSourceBytes * 10 + nSumBytes;
    switch (eType)
    {
    case eDT_8U:
        return nStep == 12   ? FindFor<uint8_t, uint16_t, uint8_t>(nSamples)
               : nStep == 22 ? FindFor<uint16_t, uint16_t, uint8_t>(nSamples)
               : nStep == 24 ? FindFor<uint16_t, uint32_t, uint8_t>(nSamples)
               : nStep == 44 ? FindFor<uint32_t, uint32_t, uint8_t>(nSamples)
               : nStep == 48 ? FindFor<uint32_t, uint64_t, uint8_t>(nSamples)
               : nStep == 88 ? FindFor<uint64_t, uint64_t, uint8_t>(nSamples)
                             : nullptr;
    case eDT_16U:
        return nStep == 24   ? FindFor<uint16_t, uint32_t, uint16_t>(nSamples)
               : nStep == 44 ? FindFor<uint32_t, uint32_t, uint16_t>(nSamples)
               : nStep == 48 ? FindFor<uint32_t, uint64_t, uint16_t>(nSamples)
               : nStep == 88 ? FindFor<uint64_t, uint64_t, uint16_t>(nSamples)
                             : nullptr;
    case eDT_32R:
        return nStep == 48   ? FindFor<float, double, float>(nSamples)
               : nStep == 88 ? FindFor<double, double, float>(nSamples)
                             : nullptr;
    default:
        return nullptr;
    }
}

} // namespace

} // namespace krv::gobs::detail
