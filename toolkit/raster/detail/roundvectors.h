#pragma once

// Vectors of reals rounded to integers of at most 32 bits, which compilers do not find because of NaN. Part of
// kernelcode.h, whose rules hold here too.

#include <cstddef>
#include <limits>
#include <type_traits>

#ifdef __SSE4_1__
#include <immintrin.h>

namespace krv::raster::detail
{

namespace
{

#if defined(__AVX512VBMI__)

// These processors saturate by themselves, to unsigned integers on both sides once NaN and what lies below are 0.
template <typename TTarget>
inline __m512i IntsOf(__m512 o)
{
    if constexpr (!std::is_signed_v<TTarget>)
        return _mm512_cvtps_epu32(_mm512_max_ps(o, _mm512_setzero_ps()));
    constexpr auto MOST = static_cast<float>(std::numeric_limits<TTarget>::max());
    const __mmask16 nNumbers = _mm512_cmp_ps_mask(o, o, _CMP_ORD_Q);
    if constexpr (sizeof(TTarget) < 4)
        return _mm512_maskz_cvtps_epi32(nNumbers, _mm512_min_ps(o, _mm512_set1_ps(MOST)));
    const __mmask16 nAbove = _mm512_cmp_ps_mask(o, _mm512_set1_ps(MOST), _CMP_GE_OQ);
    return _mm512_mask_mov_epi32(_mm512_maskz_cvtps_epi32(nNumbers, o), nAbove,
                                 _mm512_set1_epi32(std::numeric_limits<int>::max()));
}

template <typename TTarget>
inline __m256i IntsOf(__m512d o)
{
    if constexpr (!std::is_signed_v<TTarget>)
        return _mm512_cvtpd_epu32(_mm512_max_pd(o, _mm512_setzero_pd()));
    constexpr auto MOST = static_cast<double>(std::numeric_limits<TTarget>::max());
    return _mm512_maskz_cvtpd_epi32(_mm512_cmp_pd_mask(o, o, _CMP_ORD_Q), _mm512_min_pd(o, _mm512_set1_pd(MOST)));
}

template <typename TTarget>
inline __m512i LoadInts(const float* p)
{
    return IntsOf<TTarget>(_mm512_loadu_ps(p));
}
template <typename TTarget>
inline __m512i LoadInts(const double* p)
{
    return _mm512_inserti64x4(_mm512_castsi256_si512(IntsOf<TTarget>(_mm512_loadu_pd(p))),
                              IntsOf<TTarget>(_mm512_loadu_pd(p + 8)), 1);
}

inline __m128i Saturated(__m512i o, std::uint8_t)
{
    return _mm512_cvtusepi32_epi8(o);
}
inline __m128i Saturated(__m512i o, std::int8_t)
{
    return _mm512_cvtsepi32_epi8(o);
}
inline __m256i Saturated(__m512i o, std::uint16_t)
{
    return _mm512_cvtusepi32_epi16(o);
}
inline __m256i Saturated(__m512i o, std::int16_t)
{
    return _mm512_cvtsepi32_epi16(o);
}

template <typename TTarget>
constexpr std::size_t ROUNDED_VALUES = 16;

template <typename TTarget, typename TSource>
inline void StoreRounded(unsigned char* pTarget, const TSource* pSource)
{
    const __m512i oInts = LoadInts<TTarget>(pSource);
    if constexpr (sizeof(TTarget) == 4)
        _mm512_storeu_si512(pTarget, oInts);
    else if constexpr (sizeof(TTarget) == 2)
        _mm256_storeu_si256(reinterpret_cast<__m256i*>(pTarget), Saturated(oInts, TTarget()));
    else
        _mm_storeu_si128(reinterpret_cast<__m128i*>(pTarget), Saturated(oInts, TTarget()));
}

#else

#ifdef __AVX2__
using Ints = __m256i;
using Floats = __m256;
using Doubles = __m256d;

inline Floats LoadReals(const float* p)
{
    return _mm256_loadu_ps(p);
}
inline Doubles LoadReals(const double* p)
{
    return _mm256_loadu_pd(p);
}
inline void StoreInts(unsigned char* p, Ints o)
{
    _mm256_storeu_si256(reinterpret_cast<Ints*>(p), o);
}
inline Floats All(float n)
{
    return _mm256_set1_ps(n);
}
inline Doubles All(double n)
{
    return _mm256_set1_pd(n);
}
inline Ints All(int n)
{
    return _mm256_set1_epi32(n);
}
inline Floats Max(Floats a, Floats b)
{
    return _mm256_max_ps(a, b);
}
inline Floats Min(Floats a, Floats b)
{
    return _mm256_min_ps(a, b);
}
inline Floats And(Floats a, Floats b)
{
    return _mm256_and_ps(a, b);
}
inline Floats Minus(Floats a, Floats b)
{
    return _mm256_sub_ps(a, b);
}
inline Floats NotBelow(Floats a, Floats b)
{
    return _mm256_cmp_ps(a, b, _CMP_GE_OS);
}
inline Floats Ordered(Floats a)
{
    return _mm256_cmp_ps(a, a, _CMP_ORD_Q);
}
inline Doubles Max(Doubles a, Doubles b)
{
    return _mm256_max_pd(a, b);
}
inline Doubles Min(Doubles a, Doubles b)
{
    return _mm256_min_pd(a, b);
}
inline Doubles And(Doubles a, Doubles b)
{
    return _mm256_and_pd(a, b);
}
inline Doubles Minus(Doubles a, Doubles b)
{
    return _mm256_sub_pd(a, b);
}
inline Doubles Ordered(Doubles a)
{
    return _mm256_cmp_pd(a, a, _CMP_ORD_Q);
}
inline Doubles Rounded(Doubles a)
{
    return _mm256_round_pd(a, _MM_FROUND_CUR_DIRECTION);
}
inline Ints Bits(Floats a)
{
    return _mm256_castps_si256(a);
}
inline Ints Or(Ints a, Ints b)
{
    return _mm256_or_si256(a, b);
}
inline Ints Xor(Ints a, Ints b)
{
    return _mm256_xor_si256(a, b);
}
inline Ints TopBits(Ints a)
{
    return _mm256_slli_epi32(a, 31);
}
inline Ints ToInts(Floats a)
{
    return _mm256_cvtps_epi32(a);
}
inline Ints ToInts(Doubles a, Doubles b)
{
    return _mm256_inserti128_si256(_mm256_castsi128_si256(_mm256_cvtpd_epi32(a)), _mm256_cvtpd_epi32(b), 1);
}
// Packing works within the halves of a vector and leaves the order of InOrder to be mended.
inline Ints Pack(Ints a, Ints b, std::uint16_t)
{
    return _mm256_packus_epi32(a, b);
}
inline Ints Pack(Ints a, Ints b, std::int16_t)
{
    return _mm256_packs_epi32(a, b);
}
inline Ints Pack(Ints a, Ints b, std::uint8_t)
{
    return _mm256_packus_epi16(a, b);
}
inline Ints Pack(Ints a, Ints b, std::int8_t)
{
    return _mm256_packs_epi16(a, b);
}
inline Ints InOrder2(Ints a)
{
    return _mm256_permute4x64_epi64(a, 0xD8);
}
inline Ints InOrder4(Ints a)
{
    return _mm256_permutevar8x32_epi32(a, _mm256_setr_epi32(0, 4, 1, 5, 2, 6, 3, 7));
}
#else
using Ints = __m128i;
using Floats = __m128;
using Doubles = __m128d;

inline Floats LoadReals(const float* p)
{
    return _mm_loadu_ps(p);
}
inline Doubles LoadReals(const double* p)
{
    return _mm_loadu_pd(p);
}
inline void StoreInts(unsigned char* p, Ints o)
{
    _mm_storeu_si128(reinterpret_cast<Ints*>(p), o);
}
inline Floats All(float n)
{
    return _mm_set1_ps(n);
}
inline Doubles All(double n)
{
    return _mm_set1_pd(n);
}
inline Ints All(int n)
{
    return _mm_set1_epi32(n);
}
inline Floats Max(Floats a, Floats b)
{
    return _mm_max_ps(a, b);
}
inline Floats Min(Floats a, Floats b)
{
    return _mm_min_ps(a, b);
}
inline Floats And(Floats a, Floats b)
{
    return _mm_and_ps(a, b);
}
inline Floats Minus(Floats a, Floats b)
{
    return _mm_sub_ps(a, b);
}
inline Floats NotBelow(Floats a, Floats b)
{
    return _mm_cmpge_ps(a, b);
}
inline Floats Ordered(Floats a)
{
    return _mm_cmpord_ps(a, a);
}
inline Doubles Max(Doubles a, Doubles b)
{
    return _mm_max_pd(a, b);
}
inline Doubles Min(Doubles a, Doubles b)
{
    return _mm_min_pd(a, b);
}
inline Doubles And(Doubles a, Doubles b)
{
    return _mm_and_pd(a, b);
}
inline Doubles Minus(Doubles a, Doubles b)
{
    return _mm_sub_pd(a, b);
}
inline Doubles Ordered(Doubles a)
{
    return _mm_cmpord_pd(a, a);
}
inline Doubles Rounded(Doubles a)
{
    return _mm_round_pd(a, _MM_FROUND_CUR_DIRECTION);
}
inline Ints Bits(Floats a)
{
    return _mm_castps_si128(a);
}
inline Ints Or(Ints a, Ints b)
{
    return _mm_or_si128(a, b);
}
inline Ints Xor(Ints a, Ints b)
{
    return _mm_xor_si128(a, b);
}
inline Ints TopBits(Ints a)
{
    return _mm_slli_epi32(a, 31);
}
inline Ints ToInts(Floats a)
{
    return _mm_cvtps_epi32(a);
}
inline Ints ToInts(Doubles a, Doubles b)
{
    return _mm_unpacklo_epi64(_mm_cvtpd_epi32(a), _mm_cvtpd_epi32(b));
}
inline Ints Pack(Ints a, Ints b, std::uint16_t)
{
    return _mm_packus_epi32(a, b);
}
inline Ints Pack(Ints a, Ints b, std::int16_t)
{
    return _mm_packs_epi32(a, b);
}
inline Ints Pack(Ints a, Ints b, std::uint8_t)
{
    return _mm_packus_epi16(a, b);
}
inline Ints Pack(Ints a, Ints b, std::int8_t)
{
    return _mm_packs_epi16(a, b);
}
inline Ints InOrder2(Ints a)
{
    return a;
}
inline Ints InOrder4(Ints a)
{
    return a;
}
#endif

// Out of range, and for NaN, the processor's conversion gives the lowest integer. That is right below the range; above
// it values are limited beforehand, and NaN is made 0. A limit from below makes NaN 0 by itself, since of two operands
// it gives the second when one is NaN. Conversions round to nearest even, as the processor does unless told otherwise.
template <typename TTarget, typename TReals>
inline TReals Limited(TReals oValue)
{
    if constexpr (!std::is_signed_v<TTarget>)
        return Max(oValue, TReals{});
    else
        return And(oValue, Ordered(oValue));
}

// 32-bit integers from which packing saturates to the target.
template <typename TTarget>
inline Ints IntsOf(const float* pSource)
{
    constexpr float MOST = static_cast<float>(std::numeric_limits<TTarget>::max());
    const Floats oValue = Limited<TTarget>(LoadReals(pSource));
    if constexpr (sizeof(TTarget) < 4)
        return ToInts(Min(oValue, All(MOST)));
    const Ints oAbove = Bits(NotBelow(oValue, All(MOST)));
    if constexpr (std::is_signed_v<TTarget>)
        return Xor(ToInts(oValue), oAbove);
    const Floats oHalf = All(2147483648.0F);
    const Floats oUpper = NotBelow(oValue, oHalf);
    const Ints oRest = ToInts(Minus(oValue, And(oUpper, oHalf)));
    return Or(Xor(oRest, TopBits(Bits(oUpper))), oAbove);
}

template <typename TTarget>
inline Ints IntsOf(const double* pSource)
{
    constexpr double MOST = static_cast<double>(std::numeric_limits<TTarget>::max());
    Doubles oFirst = Min(Limited<TTarget>(LoadReals(pSource)), All(MOST));
    Doubles oSecond = Min(Limited<TTarget>(LoadReals(pSource + sizeof(Doubles) / 8)), All(MOST));
    if constexpr (sizeof(TTarget) < 4 || std::is_signed_v<TTarget>)
        return ToInts(oFirst, oSecond);
    const Doubles oHalf = All(2147483648.0);
    return Xor(ToInts(Minus(Rounded(oFirst), oHalf), Minus(Rounded(oSecond), oHalf)),
               All(std::numeric_limits<int>::min()));
}

template <typename TTarget>
constexpr std::size_t ROUNDED_VALUES = sizeof(Ints) / sizeof(TTarget);

template <typename TTarget, typename TSource>
inline Ints RoundedVector(const TSource* pSource)
{
    constexpr std::size_t STEP = sizeof(Ints) / 4;
    const auto oPair = [pSource](std::size_t nFirst)
    {
        using Half = std::conditional_t<std::is_signed_v<TTarget>, std::int16_t, std::uint16_t>;
        return Pack(IntsOf<TTarget>(pSource + nFirst), IntsOf<TTarget>(pSource + nFirst + STEP), Half());
    };
    if constexpr (sizeof(TTarget) == 4)
        return IntsOf<TTarget>(pSource);
    else if constexpr (sizeof(TTarget) == 2)
        return InOrder2(oPair(0));
    else
        return InOrder4(Pack(oPair(0), oPair(2 * STEP), TTarget()));
}

template <typename TTarget, typename TSource>
inline void StoreRounded(unsigned char* pTarget, const TSource* pSource)
{
    StoreInts(pTarget, RoundedVector<TTarget>(pSource));
}

#endif

} // namespace

} // namespace krv::raster::detail

#endif
