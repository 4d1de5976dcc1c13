#include "datasources/writer/detail/averagekernels.h"

#if defined(KRV_VECTOR_AVERAGES)
#if !defined(__AVX2__)
#error "This file is compiled for AVX2 alone; the caller asks the processor first."
#endif

#include <immintrin.h>

namespace krv::datasources::detail
{

namespace
{

__m256i Load(const std::uint8_t* pSource)
{
    return _mm256_loadu_si256(reinterpret_cast<const __m256i*>(pSource));
}

__m256i Load(const std::uint8_t* pLow, const std::uint8_t* pHigh)
{
    const __m128i oLow = _mm_loadu_si128(reinterpret_cast<const __m128i*>(pLow));
    return _mm256_inserti128_si256(_mm256_castsi128_si256(oLow),
                                   _mm_loadu_si128(reinterpret_cast<const __m128i*>(pHigh)), 1);
}

__m256i Both(__m128i oHalf)
{
    return _mm256_broadcastsi128_si256(oHalf);
}

// Sums of bytes beside each other of two rows, in the order that brings the pixels together.
__m256i SumsOf(__m256i oFirst, __m256i oSecond, __m256i oOrder)
{
    const __m256i oOnes = _mm256_set1_epi8(1);
    return _mm256_add_epi16(_mm256_maddubs_epi16(_mm256_shuffle_epi8(oFirst, oOrder), oOnes),
                            _mm256_maddubs_epi16(_mm256_shuffle_epi8(oSecond, oOrder), oOnes));
}

// Means of four, half to even.
__m256i Round(__m256i oSums)
{
    const __m256i oOne = _mm256_set1_epi16(1);
    const __m256i oOdd = _mm256_and_si256(_mm256_srli_epi16(oSums, 2), oOne);
    return _mm256_srli_epi16(_mm256_add_epi16(_mm256_add_epi16(oSums, oOne), oOdd), 2);
}

void Store(std::uint16_t* pTarget, __m256i oValue)
{
    _mm256_storeu_si256(reinterpret_cast<__m256i*>(pTarget), oValue);
}

void Store(std::uint16_t* pTarget, __m128i oValue)
{
    _mm_storeu_si128(reinterpret_cast<__m128i*>(pTarget), oValue);
}

void StoreHalf(std::uint8_t* pTarget, __m128i oValue)
{
    _mm_storel_epi64(reinterpret_cast<__m128i*>(pTarget), oValue);
}

// Four times twelve bytes, each to six sums; a store is put right by the one after it where it reaches too far.
std::size_t SumThrees(const std::uint8_t* pFirst, const std::uint8_t* pSecond, std::size_t nInput, std::uint16_t* pSums,
                      std::uint8_t* pMeans)
{
    const __m128i oOrder = _mm_setr_epi8(0, 3, 1, 4, 2, 5, 6, 9, 7, 10, 8, 11, -1, -1, -1, -1);
    const __m256i oLater = _mm256_inserti128_si256(
        _mm256_castsi128_si256(oOrder), _mm_setr_epi8(4, 7, 5, 8, 6, 9, 10, 13, 11, 14, 12, 15, -1, -1, -1, -1), 1);
    std::size_t nAt = 0;
    for (; nAt + 52 <= nInput; nAt += 48)
    {
        const std::uint8_t* const pAbove = pFirst + nAt;
        const std::uint8_t* const pBelow = pSecond + nAt;
        const __m256i oLow = SumsOf(Load(pAbove, pAbove + 12), Load(pBelow, pBelow + 12), Both(oOrder));
        const __m256i oHigh = SumsOf(Load(pAbove + 24, pAbove + 32), Load(pBelow + 24, pBelow + 32), oLater);
        std::uint16_t* const pTo = pSums + nAt / 2;
        Store(pTo, _mm256_castsi256_si128(oLow));
        Store(pTo + 6, _mm256_extracti128_si256(oLow, 1));
        Store(pTo + 12, _mm256_castsi256_si128(oHigh));
        Store(pTo + 18, _mm256_extracti128_si256(oHigh, 1));
        if (pMeans == nullptr)
            continue;
        const __m256i oMeans = _mm256_packus_epi16(Round(oLow), Round(oHigh));
        const __m128i oEven = _mm256_castsi256_si128(oMeans);
        const __m128i oOdd = _mm256_extracti128_si256(oMeans, 1);
        std::uint8_t* const pMean = pMeans + nAt / 2;
        StoreHalf(pMean, oEven);
        StoreHalf(pMean + 6, oOdd);
        StoreHalf(pMean + 12, _mm_unpackhi_epi64(oEven, oEven));
        StoreHalf(pMean + 18, _mm_unpackhi_epi64(oOdd, oOdd));
    }
    return nAt / 2;
}

std::size_t SumOnesOrFours(const std::uint8_t* pFirst, const std::uint8_t* pSecond, std::size_t nInput, bool bFours,
                           std::uint16_t* pSums, std::uint8_t* pMeans)
{
    const __m256i oOrder = Both(bFours ? _mm_setr_epi8(0, 4, 1, 5, 2, 6, 3, 7, 8, 12, 9, 13, 10, 14, 11, 15)
                                       : _mm_setr_epi8(0, 1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14, 15));
    std::size_t nAt = 0;
    for (; nAt + 64 <= nInput; nAt += 64)
    {
        const __m256i oLow = SumsOf(Load(pFirst + nAt), Load(pSecond + nAt), oOrder);
        const __m256i oHigh = SumsOf(Load(pFirst + nAt + 32), Load(pSecond + nAt + 32), oOrder);
        Store(pSums + nAt / 2, oLow);
        Store(pSums + nAt / 2 + 16, oHigh);
        if (pMeans != nullptr)
            _mm256_storeu_si256(
                reinterpret_cast<__m256i*>(pMeans + nAt / 2),
                _mm256_permute4x64_epi64(_mm256_packus_epi16(Round(oLow), Round(oHigh)), 0b11'01'10'00));
    }
    return nAt / 2;
}

} // namespace

std::size_t SumAndRoundByAvx2(const std::uint8_t* pFirst, const std::uint8_t* pSecond, std::size_t nInput,
                              unsigned int nSamples, std::uint16_t* pSums, std::uint8_t* pMeans)
{
    return nSamples == 3 ? SumThrees(pFirst, pSecond, nInput, pSums, pMeans)
                         : SumOnesOrFours(pFirst, pSecond, nInput, nSamples == 4, pSums, pMeans);
}

} // namespace krv::datasources::detail
#endif
