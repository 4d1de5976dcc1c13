#include "datasources/writer/detail/averagekernels.h"

#if defined(KRV_VECTOR_AVERAGES)
#include <cmath>
#include <type_traits>

#include <immintrin.h>

namespace krv::datasources::detail
{

namespace
{

__m128i Load(const void* pSource)
{
    return _mm_loadu_si128(static_cast<const __m128i*>(pSource));
}

void Store(void* pTarget, __m128i oValue)
{
    _mm_storeu_si128(static_cast<__m128i*>(pTarget), oValue);
}

// A step takes INPUT samples of each row and makes half as many sums. It may
// read and write somewhat more: as far as SPAN samples and half as many sums.
// What it writes too much the next step, or the rest one by one, puts right.

// The bytes of neighbouring pixels beside each other, to be added in pairs.
template <unsigned int N>
__m128i BesideEachOther(__m128i oPixels)
{
    if constexpr (N == 3)
        return _mm_shuffle_epi8(oPixels, _mm_setr_epi8(0, 3, 1, 4, 2, 5, 6, 9, 7, 10, 8, 11, -1, -1, -1, -1));
    else if constexpr (N == 4)
        return _mm_shuffle_epi8(oPixels, _mm_setr_epi8(0, 4, 1, 5, 2, 6, 3, 7, 8, 12, 9, 13, 10, 14, 11, 15));
    else
        return oPixels;
}

template <unsigned int N>
struct WordsToWords
{
    static constexpr std::size_t INPUT = N == 3 ? 12 : 16;
    static constexpr std::size_t SPAN = 16;

    static void Step(const std::uint16_t* pFirst, const std::uint16_t* pSecond, std::uint16_t* pSums)
    {
        constexpr std::size_t NEXT = N == 3 ? 6 : 8;
        const __m128i oLow = _mm_add_epi16(Load(pFirst), Load(pSecond));
        const __m128i oHigh = _mm_add_epi16(Load(pFirst + NEXT), Load(pSecond + NEXT));
        if constexpr (N == 1)
            Store(pSums, _mm_hadd_epi16(oLow, oHigh));
        else if constexpr (N == 4)
            Store(pSums, _mm_add_epi16(_mm_unpacklo_epi64(oLow, oHigh), _mm_unpackhi_epi64(oLow, oHigh)));
        else
        {
            const __m128i oFirstPixel = _mm_add_epi16(oLow, _mm_srli_si128(oLow, 6));
            const __m128i oSecondPixel = _mm_add_epi16(oHigh, _mm_srli_si128(oHigh, 6));
            Store(pSums, _mm_blend_epi16(oFirstPixel, _mm_slli_si128(oSecondPixel, 6), 0xF8));
        }
    }
};

template <unsigned int N>
struct WordsToDoubleWords
{
    static constexpr std::size_t INPUT = N == 3 ? 6 : 8;
    static constexpr std::size_t SPAN = 8;

    static __m128i Row(const std::uint16_t* pRow)
    {
        const __m128i oRow = Load(pRow);
        if constexpr (N == 1)
            return _mm_add_epi32(_mm_and_si128(oRow, _mm_set1_epi32(0xFFFF)), _mm_srli_epi32(oRow, 16));
        else
            return _mm_add_epi32(_mm_cvtepu16_epi32(oRow), _mm_cvtepu16_epi32(_mm_srli_si128(oRow, 2 * N)));
    }

    static void Step(const std::uint16_t* pFirst, const std::uint16_t* pSecond, std::uint32_t* pSums)
    {
        Store(pSums, _mm_add_epi32(Row(pFirst), Row(pSecond)));
    }
};

template <unsigned int N>
struct DoubleWords
{
    static constexpr std::size_t INPUT = N == 3 ? 6 : 8;
    static constexpr std::size_t SPAN = 8;

    static void Step(const std::uint32_t* pFirst, const std::uint32_t* pSecond, std::uint32_t* pSums)
    {
        constexpr std::size_t NEXT = N == 3 ? 3 : 4;
        const __m128i oLow = _mm_add_epi32(Load(pFirst), Load(pSecond));
        const __m128i oHigh = _mm_add_epi32(Load(pFirst + NEXT), Load(pSecond + NEXT));
        Store(pSums, N == 1 ? _mm_hadd_epi32(oLow, oHigh) : _mm_add_epi32(oLow, oHigh));
    }
};

__m128d LoadReals(const float* pRow)
{
    return _mm_cvtps_pd(_mm_castsi128_ps(_mm_loadl_epi64(reinterpret_cast<const __m128i*>(pRow))));
}

__m128d LoadReals(const double* pRow)
{
    return _mm_loadu_pd(pRow);
}

template <unsigned int N, typename T>
struct RealsToReals
{
    static constexpr std::size_t INPUT = N == 3 ? 6 : N == 1 ? 4 : 8;
    static constexpr std::size_t SPAN = N == 1 ? 4 : 8;

    static __m128d Both(const T* pFirst, const T* pSecond) { return _mm_add_pd(LoadReals(pFirst), LoadReals(pSecond)); }

    static void Step(const T* pFirst, const T* pSecond, double* pSums)
    {
        if constexpr (N == 1)
            return _mm_storeu_pd(pSums, _mm_hadd_pd(Both(pFirst, pSecond), Both(pFirst + 2, pSecond + 2)));
        for (unsigned int n = 0; n < N; n += 2)
            _mm_storeu_pd(pSums + n, _mm_add_pd(Both(pFirst + n, pSecond + n), Both(pFirst + N + n, pSecond + N + n)));
    }
};

template <typename Kernel, unsigned int N, typename T, typename Sum>
void Run(const T* pFirst, const T* pSecond, std::size_t nPairs, Sum* pSums)
{
    const std::size_t nInput = 2 * N * nPairs;
    std::size_t nAt = 0;
    for (; nAt + Kernel::SPAN <= nInput; nAt += Kernel::INPUT)
        Kernel::Step(pFirst + nAt, pSecond + nAt, pSums + nAt / 2);
    for (std::size_t nPair = nAt / (2 * N); nPair < nPairs; ++nPair)
        for (unsigned int n = 0; n < N; ++n)
        {
            const std::size_t nLeft = 2 * N * nPair + n;
            pSums[N * nPair + n] = static_cast<Sum>((Sum(pFirst[nLeft]) + Sum(pSecond[nLeft])) +
                                                    (Sum(pFirst[nLeft + N]) + Sum(pSecond[nLeft + N])));
        }
}

template <unsigned int N>
using FloatsToReals = RealsToReals<N, float>;
template <unsigned int N>
using DoublesToReals = RealsToReals<N, double>;

template <template <unsigned int> class Kernel, typename T, typename Sum>
void RunFor(const T* pFirst, const T* pSecond, std::size_t nPairs, unsigned int nSamples, Sum* pSums)
{
    if (nSamples == 1)
        Run<Kernel<1>, 1>(pFirst, pSecond, nPairs, pSums);
    else if (nSamples == 3)
        Run<Kernel<3>, 3>(pFirst, pSecond, nPairs, pSums);
    else
        Run<Kernel<4>, 4>(pFirst, pSecond, nPairs, pSums);
}

// The mean rounded down, one more where the rest is above the half, or is the
// half and the mean is odd.
__m128i RoundWords(__m128i oSums, __m128i oShift, __m128i oBelowHalf)
{
    const __m128i oOdd = _mm_and_si128(_mm_srl_epi16(oSums, oShift), _mm_set1_epi16(1));
    return _mm_srl_epi16(_mm_add_epi16(_mm_add_epi16(oSums, oBelowHalf), oOdd), oShift);
}

__m128i RoundDoubleWords(__m128i oSums, __m128i oShift, __m128i oBelowHalf)
{
    const __m128i oOdd = _mm_and_si128(_mm_srl_epi32(oSums, oShift), _mm_set1_epi32(1));
    return _mm_srl_epi32(_mm_add_epi32(_mm_add_epi32(oSums, oBelowHalf), oOdd), oShift);
}

// Sums of pairs of pixels of two rows; of pixels of three bytes the first
// twelve bytes count.
template <unsigned int N>
__m128i SumsOf(__m128i oFirst, __m128i oSecond)
{
    const __m128i oOnes = _mm_set1_epi8(1);
    return _mm_add_epi16(_mm_maddubs_epi16(BesideEachOther<N>(oFirst), oOnes),
                         _mm_maddubs_epi16(BesideEachOther<N>(oSecond), oOnes));
}

template <unsigned int N>
void SumBytes(const std::uint8_t* pFirst, const std::uint8_t* pSecond, std::size_t nPairs, std::uint16_t* pSums,
              std::uint8_t* pMeans)
{
    constexpr std::size_t INPUT = N == 3 ? 48 : 32;
    const __m128i oShift = _mm_cvtsi32_si128(2);
    const __m128i oBelowHalf = _mm_set1_epi16(1);
    const std::size_t nInput = 2 * N * nPairs;
    std::size_t nAt =
        __builtin_cpu_supports("avx2") ? 2 * SumAndRoundByAvx2(pFirst, pSecond, nInput, N, pSums, pMeans) : 0;
    for (; nAt + INPUT <= nInput; nAt += INPUT)
    {
        const std::uint8_t* const pAbove = pFirst + nAt;
        const std::uint8_t* const pBelow = pSecond + nAt;
        __m128i aSums[INPUT / 16];
        if constexpr (N == 3)
        {
            // Four times six sums, moved together. The last twelve bytes come by a
            // load that ends with them.
            const __m128i oFirst = SumsOf<3>(Load(pAbove), Load(pBelow));
            const __m128i oSecond = SumsOf<3>(Load(pAbove + 12), Load(pBelow + 12));
            const __m128i oThird = SumsOf<3>(Load(pAbove + 24), Load(pBelow + 24));
            const __m128i oFourth =
                SumsOf<3>(_mm_srli_si128(Load(pAbove + 32), 4), _mm_srli_si128(Load(pBelow + 32), 4));
            aSums[0] = _mm_or_si128(oFirst, _mm_slli_si128(oSecond, 12));
            aSums[1] = _mm_or_si128(_mm_srli_si128(oSecond, 4), _mm_slli_si128(oThird, 8));
            aSums[2] = _mm_or_si128(_mm_srli_si128(oThird, 8), _mm_slli_si128(oFourth, 4));
            Store(pSums + nAt / 2 + 16, aSums[2]);
        }
        else
        {
            aSums[0] = SumsOf<N>(Load(pAbove), Load(pBelow));
            aSums[1] = SumsOf<N>(Load(pAbove + 16), Load(pBelow + 16));
        }
        Store(pSums + nAt / 2, aSums[0]);
        Store(pSums + nAt / 2 + 8, aSums[1]);
        if (pMeans == nullptr)
            continue;
        Store(pMeans + nAt / 2,
              _mm_packus_epi16(RoundWords(aSums[0], oShift, oBelowHalf), RoundWords(aSums[1], oShift, oBelowHalf)));
        if constexpr (N == 3)
        {
            const __m128i oMeans = RoundWords(aSums[2], oShift, oBelowHalf);
            _mm_storel_epi64(reinterpret_cast<__m128i*>(pMeans + nAt / 2 + 16), _mm_packus_epi16(oMeans, oMeans));
        }
    }
    for (std::size_t n = nAt / 2; n < N * nPairs; ++n)
    {
        const std::size_t nLeft = 2 * N * (n / N) + n % N;
        const unsigned int nSum = pFirst[nLeft] + pFirst[nLeft + N] + pSecond[nLeft] + pSecond[nLeft + N];
        pSums[n] = static_cast<std::uint16_t>(nSum);
        if (pMeans != nullptr)
            pMeans[n] = static_cast<std::uint8_t>((nSum + 1 + (nSum >> 2 & 1)) >> 2);
    }
}

template <typename Sum, typename T>
void RoundRest(const Sum* pSums, std::size_t nFirst, std::size_t nSums, unsigned int nShift, T* pMeans)
{
    const std::uint32_t nBelowHalf = (1u << (nShift - 1)) - 1;
    for (std::size_t n = nFirst; n < nSums; ++n)
        pMeans[n] = static_cast<T>((pSums[n] + nBelowHalf + (pSums[n] >> nShift & 1u)) >> nShift);
}

} // namespace

void SumAndRoundPairs(const std::uint8_t* pFirst, const std::uint8_t* pSecond, std::size_t nPairs,
                      unsigned int nSamples, std::uint16_t* pSums, std::uint8_t* pMeans)
{
    if (nSamples == 1)
        SumBytes<1>(pFirst, pSecond, nPairs, pSums, pMeans);
    else if (nSamples == 3)
        SumBytes<3>(pFirst, pSecond, nPairs, pSums, pMeans);
    else
        SumBytes<4>(pFirst, pSecond, nPairs, pSums, pMeans);
}

void SumPairs(const std::uint16_t* pFirst, const std::uint16_t* pSecond, std::size_t nPairs, unsigned int nSamples,
              std::uint16_t* pSums)
{
    RunFor<WordsToWords>(pFirst, pSecond, nPairs, nSamples, pSums);
}

void SumPairs(const std::uint16_t* pFirst, const std::uint16_t* pSecond, std::size_t nPairs, unsigned int nSamples,
              std::uint32_t* pSums)
{
    RunFor<WordsToDoubleWords>(pFirst, pSecond, nPairs, nSamples, pSums);
}

void SumPairs(const std::uint32_t* pFirst, const std::uint32_t* pSecond, std::size_t nPairs, unsigned int nSamples,
              std::uint32_t* pSums)
{
    RunFor<DoubleWords>(pFirst, pSecond, nPairs, nSamples, pSums);
}

void SumPairs(const float* pFirst, const float* pSecond, std::size_t nPairs, unsigned int nSamples, double* pSums)
{
    RunFor<FloatsToReals>(pFirst, pSecond, nPairs, nSamples, pSums);
}

void SumPairs(const double* pFirst, const double* pSecond, std::size_t nPairs, unsigned int nSamples, double* pSums)
{
    RunFor<DoublesToReals>(pFirst, pSecond, nPairs, nSamples, pSums);
}

void RoundSums(const std::uint16_t* pSums, std::size_t nSums, unsigned int nShift, std::uint8_t* pMeans)
{
    const __m128i oShift = _mm_cvtsi32_si128(static_cast<int>(nShift));
    const __m128i oBelowHalf = _mm_set1_epi16(static_cast<short>((1u << (nShift - 1)) - 1));
    std::size_t n = 0;
    for (; n + 16 <= nSums; n += 16)
        Store(pMeans + n, _mm_packus_epi16(RoundWords(Load(pSums + n), oShift, oBelowHalf),
                                           RoundWords(Load(pSums + n + 8), oShift, oBelowHalf)));
    RoundRest(pSums, n, nSums, nShift, pMeans);
}

void RoundSums(const std::uint32_t* pSums, std::size_t nSums, unsigned int nShift, std::uint8_t* pMeans)
{
    RoundRest(pSums, 0, nSums, nShift, pMeans);
}

void RoundSums(const std::uint32_t* pSums, std::size_t nSums, unsigned int nShift, std::uint16_t* pMeans)
{
    const __m128i oShift = _mm_cvtsi32_si128(static_cast<int>(nShift));
    const __m128i oBelowHalf = _mm_set1_epi32(static_cast<int>((1u << (nShift - 1)) - 1));
    std::size_t n = 0;
    for (; n + 8 <= nSums; n += 8)
        Store(pMeans + n, _mm_packus_epi32(RoundDoubleWords(Load(pSums + n), oShift, oBelowHalf),
                                           RoundDoubleWords(Load(pSums + n + 4), oShift, oBelowHalf)));
    RoundRest(pSums, n, nSums, nShift, pMeans);
}

void RoundSums(const double* pSums, std::size_t nSums, unsigned int nShift, float* pMeans)
{
    const double nFactor = std::ldexp(1.0, -static_cast<int>(nShift));
    const __m128d oFactor = _mm_set1_pd(nFactor);
    std::size_t n = 0;
    for (; n + 4 <= nSums; n += 4)
        _mm_storeu_ps(pMeans + n, _mm_movelh_ps(_mm_cvtpd_ps(_mm_mul_pd(_mm_loadu_pd(pSums + n), oFactor)),
                                                _mm_cvtpd_ps(_mm_mul_pd(_mm_loadu_pd(pSums + n + 2), oFactor))));
    for (; n < nSums; ++n)
        pMeans[n] = static_cast<float>(pSums[n] * nFactor);
}

} // namespace krv::datasources::detail
#endif
