#pragma once

#include "toolkit/raster/detail/convert.h"

#include <cstdint>

#ifdef __SSE4_1__
#include <immintrin.h>
#endif

namespace krv::raster::detail
{

// Whether ConvertSaturated has vector code: for real to integer, where compilers keep the loop scalar because of NaN
// and rounding, and for integer to a narrower integer, where they do not find the saturating instructions.
#ifdef __SSE4_1__
template <typename TSource, typename TTarget>
inline constexpr bool HAS_SATURATING_KERNEL = std::integral<TTarget> && sizeof(TTarget) <= 4 &&
                                              (std::floating_point<TSource> ||
                                               (sizeof(TTarget) < sizeof(TSource) && sizeof(TSource) <= 4));
#else
template <typename TSource, typename TTarget>
inline constexpr bool HAS_SATURATING_KERNEL = false;
#endif

#ifdef __SSE4_1__

// Out of range, and for NaN, the processor's conversion gives the lowest integer. That is right below the range; above
// it values are limited beforehand, and NaN is made 0. A limit from below makes NaN 0 by itself, since of two operands
// it gives the second when one is NaN. Conversions round to nearest even, as the processor does unless told otherwise.
// The functions give four 32-bit integers from which packing saturates to the target.
template <typename TTarget>
inline __m128i FourOf(const float* pSource)
{
    constexpr float MOST = static_cast<float>(std::numeric_limits<TTarget>::max());
    __m128 oValue = _mm_loadu_ps(pSource);
    if constexpr (!std::is_signed_v<TTarget>)
        oValue = _mm_max_ps(oValue, _mm_setzero_ps());
    else
        oValue = _mm_and_ps(oValue, _mm_cmpord_ps(oValue, oValue));
    if constexpr (sizeof(TTarget) < 4)
        return _mm_cvtps_epi32(_mm_min_ps(oValue, _mm_set1_ps(MOST)));
    const __m128i oAbove = _mm_castps_si128(_mm_cmpge_ps(oValue, _mm_set1_ps(MOST)));
    if constexpr (std::is_signed_v<TTarget>)
        return _mm_xor_si128(_mm_cvtps_epi32(oValue), oAbove);
    const __m128 oHalf = _mm_set1_ps(2147483648.0f);
    const __m128 oUpper = _mm_cmpge_ps(oValue, oHalf);
    const __m128i oRest = _mm_cvtps_epi32(_mm_sub_ps(oValue, _mm_and_ps(oUpper, oHalf)));
    return _mm_or_si128(_mm_xor_si128(oRest, _mm_slli_epi32(_mm_castps_si128(oUpper), 31)), oAbove);
}

template <typename TTarget>
inline __m128i TwoOf(const double* pSource)
{
    constexpr double MOST = static_cast<double>(std::numeric_limits<TTarget>::max());
    __m128d oValue = _mm_loadu_pd(pSource);
    if constexpr (!std::is_signed_v<TTarget>)
        oValue = _mm_max_pd(oValue, _mm_setzero_pd());
    else
        oValue = _mm_and_pd(oValue, _mm_cmpord_pd(oValue, oValue));
    oValue = _mm_min_pd(oValue, _mm_set1_pd(MOST));
    if constexpr (sizeof(TTarget) < 4 || std::is_signed_v<TTarget>)
        return _mm_cvtpd_epi32(oValue);
    const __m128d oRounded = _mm_round_pd(oValue, _MM_FROUND_CUR_DIRECTION);
    const __m128d oShifted = _mm_sub_pd(oRounded, _mm_set1_pd(2147483648.0));
    return _mm_xor_si128(_mm_cvtpd_epi32(oShifted), _mm_set1_epi32(INT32_MIN));
}

template <typename TTarget>
inline __m128i FourOf(const double* pSource)
{
    return _mm_unpacklo_epi64(TwoOf<TTarget>(pSource), TwoOf<TTarget>(pSource + 2));
}

inline __m128i LoadVector(const void* pSource)
{
    return _mm_loadu_si128(static_cast<const __m128i*>(pSource));
}

// Integers are brought only so far that the packing that follows saturates the rest.
template <typename TTarget>
inline __m128i FourOf(const std::int32_t* pSource)
{
    return LoadVector(pSource);
}

template <typename TTarget>
inline __m128i FourOf(const std::uint32_t* pSource)
{
    return _mm_min_epu32(LoadVector(pSource), _mm_set1_epi32(std::numeric_limits<TTarget>::max()));
}

template <typename TTarget, typename TSource>
inline __m128i EightOf(const TSource* pSource)
{
    const __m128i oLow = FourOf<TTarget>(pSource);
    const __m128i oHigh = FourOf<TTarget>(pSource + 4);
    if constexpr (std::is_same_v<TTarget, std::uint16_t>)
        return _mm_packus_epi32(oLow, oHigh);
    else
        return _mm_packs_epi32(oLow, oHigh);
}

template <typename TTarget>
inline __m128i EightOf(const std::int16_t* pSource)
{
    return LoadVector(pSource);
}

template <typename TTarget>
inline __m128i EightOf(const std::uint16_t* pSource)
{
    return _mm_min_epu16(LoadVector(pSource), _mm_set1_epi16(std::numeric_limits<TTarget>::max()));
}

// Sixteen bytes of the target.
template <typename TTarget, typename TSource>
inline __m128i VectorOf(const TSource* pSource)
{
    if constexpr (sizeof(TTarget) == 4)
        return FourOf<TTarget>(pSource);
    else if constexpr (sizeof(TTarget) == 2)
        return EightOf<TTarget>(pSource);
    else if constexpr (std::is_signed_v<TTarget>)
        return _mm_packs_epi16(EightOf<TTarget>(pSource), EightOf<TTarget>(pSource + 8));
    else
        return _mm_packus_epi16(EightOf<TTarget>(pSource), EightOf<TTarget>(pSource + 8));
}

template <typename TSource, typename TTarget>
inline void ConvertSaturated(const unsigned char* pSource, unsigned char* pTarget, std::size_t nCount)
{
    constexpr std::size_t LANES = 16 / sizeof(TTarget);
    std::size_t i = 0;
    for (; i + LANES <= nCount; i += LANES)
    {
        const __m128i oResult = VectorOf<TTarget>(reinterpret_cast<const TSource*>(pSource) + i);
        _mm_storeu_si128(reinterpret_cast<__m128i*>(pTarget + i * sizeof(TTarget)), oResult);
    }
    ConvertPlain<TSource, TTarget>(pSource, pTarget, i, nCount);
}

#endif

} // namespace krv::raster::detail
