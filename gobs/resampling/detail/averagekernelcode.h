#pragma once

// The inner loops of averages. One source file for each instruction set includes this and is compiled with options of
// its own, so everything here is local to the file and calls nothing that is not: a function that the linker shares
// could be the other file's. Vectors are those of the compiler; intrinsics stand where it does not find the way.

#include "gobs/resampling/detail/averagekernels.h"

#include <cstdint>
#include <cstring>
#include <type_traits>
#include <utility>

#ifdef __SSE4_1__
#include <immintrin.h>
#endif

namespace krv::gobs::detail
{

namespace
{

#if defined(__AVX512VBMI__)
constexpr std::size_t VECTOR_BYTES = 64;
#elif defined(__AVX2__)
constexpr std::size_t VECTOR_BYTES = 32;
#else
constexpr std::size_t VECTOR_BYTES = 16;
#endif
// Bytes. Rows of 1536 bytes in memory, AVX2: 6.5 GB/s without fetching, 18.5 at 1024 bytes ahead, 23 at 4096, 25 at
// 8192, 24 at 16384, 22 at 32768.
constexpr std::size_t FETCHED_AHEAD = 8192;
constexpr std::size_t FETCHED_LINE = 64;

template <typename T, std::size_t LANES>
struct VectorOf
{
    typedef T Type __attribute__((vector_size(LANES * sizeof(T)))); // NOLINT: an attribute of the typedef
};
template <typename T, std::size_t LANES>
using Vector = typename VectorOf<T, LANES>::Type;

template <typename V, typename T>
inline V LoadAs(const T* p)
{
    V o;
    std::memcpy(&o, p, sizeof o);
    return o;
}

template <typename Sum, std::size_t LANES, typename In>
inline Vector<Sum, LANES> Load(const In* p)
{
    [[maybe_unused]] constexpr std::size_t BYTES = LANES * sizeof(Sum);
    [[maybe_unused]] constexpr bool WORDS = std::is_same_v<In, std::uint8_t> && sizeof(Sum) == 2;
    [[maybe_unused]] constexpr bool DOUBLE_WORDS = std::is_same_v<In, std::uint16_t> && sizeof(Sum) == 4;
    [[maybe_unused]] constexpr bool REALS = std::is_same_v<In, float>;
    using Result = Vector<Sum, LANES>;
    if constexpr (std::is_same_v<In, Sum>)
        return LoadAs<Result>(p);
#if defined(__AVX512VBMI__)
    else if constexpr (BYTES == 64 && WORDS)
        return reinterpret_cast<Result>(_mm512_maskz_cvtepu8_epi16(~__mmask32{0}, LoadAs<__m256i>(p)));
    else if constexpr (BYTES == 64 && DOUBLE_WORDS)
        return reinterpret_cast<Result>(_mm512_maskz_cvtepu16_epi32(0xFFFF, LoadAs<__m256i>(p)));
    else if constexpr (BYTES == 64 && REALS)
        return _mm512_maskz_cvtps_pd(0xFF, LoadAs<__m256>(p));
#endif
#if defined(__AVX2__)
    else if constexpr (BYTES == 32 && WORDS)
        return reinterpret_cast<Result>(_mm256_cvtepu8_epi16(LoadAs<__m128i>(p)));
    else if constexpr (BYTES == 32 && DOUBLE_WORDS)
        return reinterpret_cast<Result>(_mm256_cvtepu16_epi32(LoadAs<__m128i>(p)));
    else if constexpr (BYTES == 32 && REALS)
        return _mm256_cvtps_pd(LoadAs<__m128>(p));
#endif
#if defined(__SSE4_1__)
    else if constexpr (BYTES == 16 && WORDS)
        return reinterpret_cast<Result>(_mm_cvtepu8_epi16(_mm_loadl_epi64(reinterpret_cast<const __m128i*>(p))));
    else if constexpr (BYTES == 16 && DOUBLE_WORDS)
        return reinterpret_cast<Result>(_mm_cvtepu16_epi32(_mm_loadl_epi64(reinterpret_cast<const __m128i*>(p))));
#endif
    else
        return __builtin_convertvector(LoadAs<Vector<In, LANES>>(p), Result);
}

template <std::size_t FIRST, typename T, typename V, std::size_t... I>
inline void StoreFrom(T* p, V oValues, std::index_sequence<I...>)
{
    const auto oPart = __builtin_shufflevector(oValues, oValues, (FIRST + I)...);
    std::memcpy(p + FIRST, &oPart, sizeof oPart);
}

// All lanes, or the first three quarters.
template <std::size_t COUNT, std::size_t LANES, typename T>
inline void Store(T* p, Vector<T, LANES> oValues)
{
    if constexpr (COUNT == LANES)
        std::memcpy(p, &oValues, sizeof oValues);
    else
    {
        StoreFrom<0>(p, oValues, std::make_index_sequence<LANES / 2>());
        StoreFrom<LANES / 2>(p, oValues, std::make_index_sequence<LANES / 4>());
    }
}

// Sums of pixels two by two of two rows of bytes by one instruction that adds neighbours; up to 32 bytes of vector,
// what is wider has the better way of its own. Pixels of three bytes fill three quarters of the lanes:
//     bytes of a row     r0 g0 b0 r1 g1 b1 r2 g2 b2 r3 g3 b3  .  .  .  .
//     beside each other  r0 r1 g0 g1 b0 b1 r2 r3 g2 g3 b2 b3  -  -  -  -
//     words              r0+r1 g0+g1 b0+b1 r2+r3 g2+g3 b2+b3  0     0        plus those of the second row
template <unsigned int N, std::size_t LANES>
constexpr bool HAS_BYTE_SUMS = false;
#if defined(__SSE4_1__)
template <unsigned int N>
constexpr bool HAS_BYTE_SUMS<N, 8> = true;

template <unsigned int N, char FIRST = 0>
inline __m128i BesideEachOther()
{
    constexpr char K = FIRST;
    if constexpr (N == 2)
        return _mm_setr_epi8(0, 2, 1, 3, 4, 6, 5, 7, 8, 10, 9, 11, 12, 14, 13, 15);
    else if constexpr (N == 3)
        return _mm_setr_epi8(K, K + 3, K + 1, K + 4, K + 2, K + 5, K + 6, K + 9, K + 7, K + 10, K + 8, K + 11, -1, -1,
                             -1, -1);
    else
        return _mm_setr_epi8(0, 4, 1, 5, 2, 6, 3, 7, 8, 12, 9, 13, 10, 14, 11, 15);
}

template <unsigned int N>
inline __m128i AddNeighbours(const std::uint8_t* p, std::integral_constant<std::size_t, 8>)
{
    __m128i oBytes;
    if constexpr (N == 3)
        oBytes = _mm_insert_epi32(_mm_loadl_epi64(reinterpret_cast<const __m128i*>(p)), LoadAs<int>(p + 8), 2);
    else
        oBytes = LoadAs<__m128i>(p);
    if constexpr (N != 1)
        oBytes = _mm_shuffle_epi8(oBytes, BesideEachOther<N>());
    return _mm_maddubs_epi16(oBytes, _mm_set1_epi8(1));
}

template <unsigned int N>
inline auto SumBytes(const std::uint8_t* pFirst, const std::uint8_t* pSecond, std::integral_constant<std::size_t, 8> n)
{
    return reinterpret_cast<Vector<std::uint16_t, 8>>(
        _mm_add_epi16(AddNeighbours<N>(pFirst, n), AddNeighbours<N>(pSecond, n)));
}
#endif
#if defined(__AVX2__)
template <unsigned int N>
constexpr bool HAS_BYTE_SUMS<N, 16> = true;

template <unsigned int N>
inline __m256i AddNeighbours(const std::uint8_t* p, std::integral_constant<std::size_t, 16>)
{
    __m256i oBytes;
    if constexpr (N == 3)
        oBytes = _mm256_shuffle_epi8(_mm256_set_m128i(LoadAs<__m128i>(p + 8), LoadAs<__m128i>(p)),
                                     _mm256_set_m128i(BesideEachOther<3, 4>(), BesideEachOther<3>()));
    else
        oBytes = LoadAs<__m256i>(p);
    if constexpr (N == 2 || N == 4)
        oBytes = _mm256_shuffle_epi8(oBytes, _mm256_broadcastsi128_si256(BesideEachOther<N>()));
    return _mm256_maddubs_epi16(oBytes, _mm256_set1_epi8(1));
}

template <unsigned int N>
inline auto SumBytes(const std::uint8_t* pFirst, const std::uint8_t* pSecond, std::integral_constant<std::size_t, 16> n)
{
    __m256i oSums = _mm256_add_epi16(AddNeighbours<N>(pFirst, n), AddNeighbours<N>(pSecond, n));
    if constexpr (N == 3)
        oSums = _mm256_permutevar8x32_epi32(oSums, _mm256_setr_epi32(0, 1, 2, 4, 5, 6, 3, 7));
    return reinterpret_cast<Vector<std::uint16_t, 16>>(oSums);
}
#endif

template <typename In, typename Sum, typename Mean, unsigned int N>
struct Reduction
{
    static constexpr bool FIRST = std::is_same_v<In, Mean>;
    static constexpr std::size_t MOST_LANES = VECTOR_BYTES / sizeof(Sum) < 4 ? 4 : VECTOR_BYTES / sizeof(Sum);

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
            return __builtin_shufflevector(oLow, oHigh, Find(I, false)...) +
                   __builtin_shufflevector(oLow, oHigh, Find(I, true)...);
        }

        static auto GetSums(const In* pFirst, const In* pSecond)
        {
            if constexpr (std::is_same_v<In, std::uint8_t> && HAS_BYTE_SUMS<N, LANES>)
                return SumBytes<N>(pFirst, pSecond, std::integral_constant<std::size_t, LANES>());
            else
                return AddPairs(Load<Sum, LANES>(pFirst) + Load<Sum, LANES>(pSecond),
                                Load<Sum, LANES>(pFirst + INPUT - LANES) + Load<Sum, LANES>(pSecond + INPUT - LANES),
                                std::make_index_sequence<LANES>());
        }

        static void Run(const In* pFirst, const In* pSecond, Sum* pSums, Mean* pMeans, unsigned int nShift)
        {
            const auto oSums = GetSums(pFirst, pSecond);
            if (pSums != nullptr)
                Store<OUTPUT, LANES>(pSums, oSums);
            if (pMeans != nullptr)
                Store<OUTPUT, LANES>(pMeans, __builtin_convertvector(Divide(oSums, nShift), Vector<Mean, LANES>));
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
