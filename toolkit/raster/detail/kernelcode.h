#pragma once

// The inner loops. One source file for each instruction set includes this and is compiled with options of its own, so
// everything here is local to the file and calls nothing that is not: a function that the linker shares could be the
// other file's. Loops are plain and free of branches; the compiler makes vectors of them.

#include "toolkit/raster/convertvalue.h"
#include "toolkit/raster/detail/kernels.h"
#include "toolkit/raster/detail/roundvectors.h"

#include <cstring>
#include <limits>
#include <type_traits>
#include <utility>

#ifdef __SSE4_1__
#include <immintrin.h>
#endif

namespace krv::raster::detail
{

namespace
{

template <typename TSource, typename TTarget>
inline void ConvertPlain(const unsigned char* __restrict pSource, unsigned char* __restrict pTarget, std::size_t nFirst,
                         std::size_t nCount)
{
    for (std::size_t i = nFirst; i < nCount; ++i)
    {
        TSource nFrom;
        std::memcpy(&nFrom, pSource + i * sizeof(TSource), sizeof(TSource));
        const TTarget nTo = ConvertValue<TTarget>(nFrom);
        std::memcpy(pTarget + i * sizeof(TTarget), &nTo, sizeof(TTarget));
    }
}

template <typename TSource, typename TTarget>
inline std::size_t ConvertRounded([[maybe_unused]] const unsigned char* pSource,
                                  [[maybe_unused]] unsigned char* pTarget, [[maybe_unused]] std::size_t nCount)
{
    std::size_t i = 0;
#ifdef __SSE4_1__
    if constexpr (std::is_floating_point_v<TSource> && std::is_integral_v<TTarget> && sizeof(TTarget) <= 4)
    {
        constexpr std::size_t LANES = ROUNDED_VALUES<TTarget>;
        for (; i + LANES <= nCount; i += LANES)
            StoreRounded<TTarget>(pTarget + i * sizeof(TTarget), reinterpret_cast<const TSource*>(pSource) + i);
    }
#endif
    return i;
}

template <std::size_t NSource, std::size_t NTarget>
void Convert(const unsigned char* pSource, unsigned char* pTarget, std::size_t nCount)
{
    using TSource = std::tuple_element_t<NSource, PartTypes>;
    using TTarget = std::tuple_element_t<NTarget, PartTypes>;
    if constexpr (NSource == NTarget)
        std::memcpy(pTarget, pSource, nCount * sizeof(TSource));
    else
    {
        const std::size_t nDone = ConvertRounded<TSource, TTarget>(pSource, pTarget, nCount);
        ConvertPlain<TSource, TTarget>(pSource, pTarget, nDone, nCount);
    }
}

// Exact for all pairs, and free of conversions that are undefined: where a value may have come out as the first whole
// number above its type, or was beyond the other type's last one, that is asked for too.
template <typename TSource, typename TTarget>
[[gnu::always_inline]] inline bool IsChanged(TSource nFrom, TTarget nTo)
{
    if constexpr (std::is_integral_v<TSource> && std::is_integral_v<TTarget>)
        return ConvertValue<TSource>(nTo) != nFrom;
    else if constexpr (std::is_integral_v<TSource> && sizeof(TSource) <= 4)
        return static_cast<double>(nFrom) != static_cast<double>(nTo);
    else if constexpr (std::is_integral_v<TSource>)
    {
        constexpr TTarget END = static_cast<TTarget>(std::numeric_limits<TSource>::max() / 2 + 1) * 2;
        return static_cast<TSource>(nTo < END ? nTo : TTarget(0)) != nFrom;
    }
    else if constexpr (std::is_integral_v<TTarget>)
    {
        constexpr TSource END = static_cast<TSource>(std::numeric_limits<TTarget>::max() / 2 + 1) * 2;
        return !((nFrom == static_cast<TSource>(nTo)) & (nFrom < END));
    }
    else
        return !((nFrom == static_cast<TSource>(nTo)) | ((nFrom != nFrom) & (nTo != nTo)));
}

template <std::size_t NSource, std::size_t NTarget>
std::size_t CountChanges(const unsigned char* pSource, const unsigned char* pTarget, std::size_t nCount,
                         std::size_t nStride)
{
    using TSource = std::tuple_element_t<NSource, PartTypes>;
    using TTarget = std::tuple_element_t<NTarget, PartTypes>;
    const auto Changed = [&](std::size_t nAt)
    {
        TSource nFrom;
        TTarget nTo;
        std::memcpy(&nFrom, pSource + nAt * sizeof(TSource), sizeof(TSource));
        std::memcpy(&nTo, pTarget + nAt * sizeof(TTarget), sizeof(TTarget));
        return IsChanged(nFrom, nTo);
    };
    std::size_t nChanged = 0;
    if (nStride == 1)
    {
        // Counters as wide as the values.
        constexpr std::size_t FEW = std::size_t{1} << 16;
        using Counter = std::conditional_t<sizeof(TSource) == 8 || sizeof(TTarget) == 8, std::uint64_t, std::uint32_t>;
        for (std::size_t nFirst = 0; nFirst < nCount; nFirst += FEW)
        {
            Counter nFew = 0;
            const std::size_t nEnd = nCount - nFirst < FEW ? nCount : nFirst + FEW;
            for (std::size_t i = nFirst; i < nEnd; ++i)
                nFew += Changed(i) ? 1 : 0;
            nChanged += nFew;
        }
        return nChanged;
    }
    for (std::size_t i = 0; i < nCount; ++i)
        nChanged += Changed(i * nStride) ? 1 : 0;
    return nChanged;
}

#ifdef __SSE4_1__

// Whether a vector's values are converted as they are written; the pairs that mixed files meet in.
template <typename TSource, typename TTarget>
inline constexpr bool CAN_STORE = std::is_same_v<TSource, TTarget>;
template <>
inline constexpr bool CAN_STORE<std::uint8_t, float> = true;
template <>
inline constexpr bool CAN_STORE<std::uint8_t, double> = true;
template <>
inline constexpr bool CAN_STORE<std::uint16_t, float> = true;
template <>
inline constexpr bool CAN_STORE<std::int16_t, float> = true;
template <>
inline constexpr bool CAN_STORE<std::uint16_t, double> = true;
template <>
inline constexpr bool CAN_STORE<std::int16_t, double> = true;
template <>
inline constexpr bool CAN_STORE<float, double> = true;

#if defined(__AVX512VBMI__)
// And the pairs of mixed files that are written, whose values may change: from longer types to shorter ones.
template <typename TSource, typename TTarget>
inline constexpr bool CAN_NARROW = !std::is_same_v<TSource, TTarget> && sizeof(TSource) > 1 &&
                                   sizeof(TTarget) <= sizeof(TSource) &&
                                   (std::is_integral_v<TSource> ? std::is_integral_v<TTarget> : sizeof(TTarget) <= 4);
using MergeVector = __m512i;
constexpr std::size_t LOAD_BYTES = 64;

struct MergeShuffle
{
    __m512i moFrom;
    __mmask64 mnPlaced;
};

inline MergeVector LoadTerm(const unsigned char* p)
{
    return _mm512_loadu_si512(p);
}
inline MergeShuffle LoadShuffle(const unsigned char* p)
{
    const __m512i oFrom = _mm512_loadu_si512(p);
    return {oFrom, ~_mm512_movepi8_mask(oFrom)};
}
inline MergeVector AddTerm(MergeVector oResult, MergeVector oLoad, const MergeShuffle& oShuffle)
{
    return _mm512_mask_permutexvar_epi8(oResult, oShuffle.mnPlaced, oShuffle.moFrom, oLoad);
}

// The first values of a vector that fill one of the target.
inline __m512i WideInts(__m512i o, std::uint8_t, float)
{
    return _mm512_cvtepu8_epi32(_mm512_castsi512_si128(o));
}
inline __m512i WideInts(__m512i o, std::uint16_t, float)
{
    return _mm512_cvtepu16_epi32(_mm512_castsi512_si256(o));
}
inline __m512i WideInts(__m512i o, std::int16_t, float)
{
    return _mm512_cvtepi16_epi32(_mm512_castsi512_si256(o));
}
inline __m256i WideInts(__m512i o, std::uint8_t, double)
{
    return _mm256_cvtepu8_epi32(_mm512_castsi512_si128(o));
}
inline __m256i WideInts(__m512i o, std::uint16_t, double)
{
    return _mm256_cvtepu16_epi32(_mm512_castsi512_si128(o));
}
inline __m256i WideInts(__m512i o, std::int16_t, double)
{
    return _mm256_cvtepi16_epi32(_mm512_castsi512_si128(o));
}

template <typename TSource>
inline void StorePart(float* p, __m512i o)
{
    _mm512_storeu_ps(p, _mm512_cvtepi32_ps(WideInts(o, TSource(), float())));
}
template <typename TSource>
inline void StorePart(double* p, __m512i o)
{
    if constexpr (std::is_same_v<TSource, float>)
        _mm512_storeu_pd(p, _mm512_cvtps_pd(_mm256_castsi256_ps(_mm512_castsi512_si256(o))));
    else
        _mm512_storeu_pd(p, _mm512_cvtepi32_pd(WideInts(o, TSource(), double())));
}

template <typename T, std::size_t N>
struct Lanes
{
    typedef T Type __attribute__((vector_size(N * sizeof(T))));
};

// Stores values as those of a type that is no longer. Returns -1 in the lane of each that changed, 0 in the others.
template <typename TSource, typename TTarget>
inline auto StoreNarrow(unsigned char* pTarget, MergeVector o)
{
    using Limits = std::numeric_limits<TTarget>;
    constexpr std::size_t N = sizeof(MergeVector) / sizeof(TSource);
    using Source = typename Lanes<TSource, N>::Type;
    using Target = typename Lanes<TTarget, N>::Type;
    const Source oFrom = __builtin_bit_cast(Source, o);
    Target oTo;
    decltype(oFrom != oFrom) oChanged;
    if constexpr (std::is_integral_v<TSource>)
    {
        Source oKept = oFrom;
        if constexpr (std::is_signed_v<TSource>)
        {
            const auto nLowest = ConvertValue<TSource>(Limits::min());
            oKept = oKept < nLowest ? Source{} + nLowest : oKept;
        }
        const auto nMost = ConvertValue<TSource>(Limits::max());
        oKept = oKept > nMost ? Source{} + nMost : oKept;
        oChanged = oKept != oFrom;
        oTo = __builtin_convertvector(oKept, Target);
    }
    else if constexpr (std::is_integral_v<TTarget>)
    {
        using Whole = std::conditional_t<std::is_signed_v<TTarget>, std::int32_t, std::uint32_t>;
        using Wholes = typename Lanes<Whole, N>::Type;
        Wholes oKept;
        if constexpr (sizeof(TSource) == 4)
            oKept = __builtin_bit_cast(Wholes, IntsOf<TTarget>(_mm512_castsi512_ps(o)));
        else
            oKept = __builtin_bit_cast(Wholes, IntsOf<TTarget>(_mm512_castsi512_pd(o)));
        constexpr Whole LOWEST = Limits::min(), MOST = Limits::max();
        if constexpr (sizeof(TTarget) < 4 && LOWEST != 0)
            oKept = oKept < LOWEST ? Wholes{} + LOWEST : oKept;
        if constexpr (sizeof(TTarget) < 4)
            oKept = oKept > MOST ? Wholes{} + MOST : oKept;
        Source oBack;
        if constexpr (sizeof(TSource) == 4)
            oBack = __builtin_convertvector(oKept, Source);
        else if constexpr (LOWEST != 0) // GCC takes these apart
            oBack = __builtin_bit_cast(Source, _mm512_cvtepi32_pd(__builtin_bit_cast(__m256i, oKept)));
        else
            oBack = __builtin_bit_cast(Source, _mm512_cvtepu32_pd(__builtin_bit_cast(__m256i, oKept)));
        oChanged = oBack != oFrom;
        if constexpr (sizeof(TTarget) == sizeof(TSource)) // the last whole number is no real, see IsChanged
            oChanged |= oFrom >= static_cast<TSource>(Limits::max() / 2 + 1) * 2;
        oTo = __builtin_convertvector(oKept, Target);
    }
    else
    {
        oTo = __builtin_convertvector(oFrom, Target);
        const auto oBack = __builtin_bit_cast(Source, _mm512_cvtps_pd(__builtin_bit_cast(__m256, oTo)));
        oChanged = (oBack < oFrom) | (oBack > oFrom);
    }
    std::memcpy(pTarget, &oTo, sizeof oTo);
    return oChanged;
}

template <typename TSource, typename TTarget>
inline void StoreVector(unsigned char* pBytes, MergeVector o)
{
    auto* const pTarget = reinterpret_cast<TTarget*>(pBytes);
    constexpr std::size_t VALUES = 64 / sizeof(TTarget);
    constexpr std::size_t PARTS = sizeof(TTarget) / sizeof(TSource);
    if constexpr (PARTS == 1)
        _mm512_storeu_si512(pTarget, o);
    else if constexpr (PARTS == 2)
    {
        StorePart<TSource>(pTarget, o);
        StorePart<TSource>(pTarget + VALUES, _mm512_shuffle_i64x2(o, o, 0x0E));
    }
    else
    {
        // Eighths lie within the quarters of a vector.
        constexpr std::size_t QUARTER = PARTS / 4;
        const __m512i oQuarters[4] = {o, _mm512_shuffle_i64x2(o, o, 1), _mm512_shuffle_i64x2(o, o, 2),
                                      _mm512_shuffle_i64x2(o, o, 3)};
        for (std::size_t n = 0; n < 4; ++n)
        {
            StorePart<TSource>(pTarget + n * QUARTER * VALUES, oQuarters[n]);
            if constexpr (QUARTER == 2)
                StorePart<TSource>(pTarget + (n * QUARTER + 1) * VALUES, _mm512_bsrli_epi128(oQuarters[n], 8));
        }
    }
}
#elif defined(__AVX2__)
using MergeVector = __m256i;
using MergeShuffle = __m256i;
constexpr std::size_t LOAD_BYTES = 16;

// The same 16 bytes for both halves.
inline MergeVector LoadTerm(const unsigned char* p)
{
    return _mm256_broadcastsi128_si256(_mm_loadu_si128(reinterpret_cast<const __m128i*>(p)));
}
inline MergeShuffle LoadShuffle(const unsigned char* p)
{
    return _mm256_loadu_si256(reinterpret_cast<const __m256i*>(p));
}
inline MergeVector AddTerm(MergeVector oResult, MergeVector oLoad, const MergeShuffle& oShuffle)
{
    return _mm256_or_si256(oResult, _mm256_shuffle_epi8(oLoad, oShuffle));
}

inline void StoreEight(float* p, __m256i o)
{
    _mm256_storeu_ps(p, _mm256_cvtepi32_ps(o));
}
inline void StoreEight(double* p, __m256i o)
{
    _mm256_storeu_pd(p, _mm256_cvtepi32_pd(_mm256_castsi256_si128(o)));
    _mm256_storeu_pd(p + 4, _mm256_cvtepi32_pd(_mm256_extracti128_si256(o, 1)));
}

template <typename TSource, typename TTarget>
inline void StoreHalf(TTarget* pTarget, __m128i o)
{
    if constexpr (std::is_same_v<TSource, std::uint8_t>)
    {
        StoreEight(pTarget, _mm256_cvtepu8_epi32(o));
        StoreEight(pTarget + 8, _mm256_cvtepu8_epi32(_mm_srli_si128(o, 8)));
    }
    else if constexpr (std::is_same_v<TSource, std::uint16_t>)
        StoreEight(pTarget, _mm256_cvtepu16_epi32(o));
    else if constexpr (std::is_same_v<TSource, std::int16_t>)
        StoreEight(pTarget, _mm256_cvtepi16_epi32(o));
    else
        _mm256_storeu_pd(pTarget, _mm256_cvtps_pd(_mm_castsi128_ps(o)));
}

template <typename TSource, typename TTarget>
inline void StoreVector(unsigned char* pBytes, MergeVector o)
{
    if constexpr (std::is_same_v<TSource, TTarget>)
        _mm256_storeu_si256(reinterpret_cast<__m256i*>(pBytes), o);
    else
    {
        auto* const pTarget = reinterpret_cast<TTarget*>(pBytes);
        StoreHalf<TSource>(pTarget, _mm256_castsi256_si128(o));
        StoreHalf<TSource>(pTarget + 16 / sizeof(TSource), _mm256_extracti128_si256(o, 1));
    }
}
#else
using MergeVector = __m128i;
using MergeShuffle = __m128i;
constexpr std::size_t LOAD_BYTES = 16;

inline MergeVector LoadTerm(const unsigned char* p)
{
    return _mm_loadu_si128(reinterpret_cast<const __m128i*>(p));
}
inline MergeShuffle LoadShuffle(const unsigned char* p)
{
    return LoadTerm(p);
}
inline MergeVector AddTerm(MergeVector oResult, MergeVector oLoad, const MergeShuffle& oShuffle)
{
    return _mm_or_si128(oResult, _mm_shuffle_epi8(oLoad, oShuffle));
}

inline void StoreFour(float* p, __m128i o)
{
    _mm_storeu_ps(p, _mm_cvtepi32_ps(o));
}
inline void StoreFour(double* p, __m128i o)
{
    _mm_storeu_pd(p, _mm_cvtepi32_pd(o));
    _mm_storeu_pd(p + 2, _mm_cvtepi32_pd(_mm_unpackhi_epi64(o, o)));
}

template <typename TSource, typename TTarget>
inline void StoreVector(unsigned char* pBytes, MergeVector o)
{
    auto* const pTarget = reinterpret_cast<TTarget*>(pBytes);
    const __m128i oUpper = _mm_unpackhi_epi64(o, o);
    if constexpr (std::is_same_v<TSource, TTarget>)
        _mm_storeu_si128(reinterpret_cast<__m128i*>(pBytes), o);
    else if constexpr (std::is_same_v<TSource, std::uint8_t>)
    {
        StoreFour(pTarget, _mm_cvtepu8_epi32(o));
        StoreFour(pTarget + 4, _mm_cvtepu8_epi32(_mm_srli_si128(o, 4)));
        StoreFour(pTarget + 8, _mm_cvtepu8_epi32(oUpper));
        StoreFour(pTarget + 12, _mm_cvtepu8_epi32(_mm_srli_si128(o, 12)));
    }
    else if constexpr (std::is_same_v<TSource, std::uint16_t>)
    {
        StoreFour(pTarget, _mm_cvtepu16_epi32(o));
        StoreFour(pTarget + 4, _mm_cvtepu16_epi32(oUpper));
    }
    else if constexpr (std::is_same_v<TSource, std::int16_t>)
    {
        StoreFour(pTarget, _mm_cvtepi16_epi32(o));
        StoreFour(pTarget + 4, _mm_cvtepi16_epi32(oUpper));
    }
    else
    {
        _mm_storeu_pd(pTarget, _mm_cvtps_pd(_mm_castsi128_ps(o)));
        _mm_storeu_pd(pTarget + 2, _mm_cvtps_pd(_mm_castsi128_ps(oUpper)));
    }
}
#endif

// Stores vectors one after the other and counts the values that changed.
template <typename TSource, typename TTarget>
class VectorStore
{
public:
    void Put(unsigned char* pTarget, MergeVector o) { StoreVector<TSource, TTarget>(pTarget, o); }
    std::size_t Count() const { return 0; }
};

#if defined(__AVX512VBMI__)
template <typename TSource, typename TTarget>
requires(CAN_NARROW<TSource, TTarget>) class VectorStore<TSource, TTarget>
{
public:
    void Put(unsigned char* pTarget, MergeVector o) { moChanged -= StoreNarrow<TSource, TTarget>(pTarget, o); }
    std::size_t Count() const
    {
        std::size_t nCount = 0;
        for (std::size_t n = 0; n < sizeof(MergeVector) / sizeof(TSource); ++n)
            nCount += static_cast<std::size_t>(moChanged[n]);
        return nCount;
    }

private:
    decltype(StoreNarrow<TSource, TTarget>(nullptr, MergeVector())) moChanged = {};
};
#endif

// As many terms as stay in registers.
template <std::size_t N, typename TSource, typename TTarget>
inline std::size_t MergeFew(const MergeTerm* pTerms, unsigned char* pTarget, std::size_t nPeriodBytes,
                            std::size_t nPeriods)
{
    VectorStore<TSource, TTarget> oStore;
    const unsigned char* pSources[N];
    std::size_t nSteps[N];
    MergeShuffle oShuffles[N];
    for (std::size_t n = 0; n < N; ++n)
    {
        pSources[n] = pTerms[n].mpSource;
        nSteps[n] = pTerms[n].mnPeriodBytes;
        oShuffles[n] = LoadShuffle(pTerms[n].mpShuffle);
    }
    for (std::size_t i = 0; i < nPeriods; ++i)
    {
        MergeVector oResult = {};
        for (std::size_t n = 0; n < N; ++n)
        {
            oResult = AddTerm(oResult, LoadTerm(pSources[n]), oShuffles[n]);
            pSources[n] += nSteps[n];
        }
        oStore.Put(pTarget, oResult);
        pTarget += nPeriodBytes;
    }
    return oStore.Count();
}

// Brings channels of several sources together: each vector of the result is put together from one load of each source
// that has a part in it, whose shuffle leaves zeros where the others come. Here 8-bit a and b of two sources, and of a
// third one c:
//     a   a0 .  .  a1 .  .  ..
//     b   .  b0 .  .  b1 .  ..     or    a0 b0 c0 a1 b1 c1 ..    converted to the target's type as it is stored
//     c   .  .  c0 .  .  c1 ..
template <typename TSource, typename TTarget>
std::size_t Merge(const MergeTerm* pTerms, std::size_t nTerms, unsigned char* pTarget, std::size_t nPeriodBytes,
                  std::size_t nPeriods)
{
    switch (nTerms)
    {
    case 1:
        return MergeFew<1, TSource, TTarget>(pTerms, pTarget, nPeriodBytes, nPeriods);
    case 2:
        return MergeFew<2, TSource, TTarget>(pTerms, pTarget, nPeriodBytes, nPeriods);
    case 3:
        return MergeFew<3, TSource, TTarget>(pTerms, pTarget, nPeriodBytes, nPeriods);
    case 4:
        return MergeFew<4, TSource, TTarget>(pTerms, pTarget, nPeriodBytes, nPeriods);
#if defined(__AVX512VBMI__)
    case 6:
        return MergeFew<6, TSource, TTarget>(pTerms, pTarget, nPeriodBytes, nPeriods);
    case 8:
        return MergeFew<8, TSource, TTarget>(pTerms, pTarget, nPeriodBytes, nPeriods);
#endif
    default:
        break;
    }
    VectorStore<TSource, TTarget> oStore;
    for (std::size_t i = 0; i < nPeriods; ++i)
    {
        MergeVector oResult = {};
        for (std::size_t n = 0; n < nTerms; ++n)
        {
            const MergeVector oLoad = LoadTerm(pTerms[n].mpSource + i * pTerms[n].mnPeriodBytes);
            oResult = AddTerm(oResult, oLoad, LoadShuffle(pTerms[n].mpShuffle));
        }
        oStore.Put(pTarget + i * nPeriodBytes, oResult);
    }
    return oStore.Count();
}

constexpr std::size_t VECTOR_BYTES = sizeof(MergeVector);
#else
constexpr std::size_t VECTOR_BYTES = 16;
constexpr std::size_t LOAD_BYTES = 16;
#endif

template <typename TWord>
inline TWord TurnRound(TWord nWord)
{
    if constexpr (sizeof(TWord) == 2)
        return __builtin_bswap16(nWord);
    else if constexpr (sizeof(TWord) == 4)
        return __builtin_bswap32(nWord);
    else
        return __builtin_bswap64(nWord);
}

template <typename TWord, std::size_t NCount>
inline void SwapSome(const unsigned char* pSource, unsigned char* pTarget)
{
    TWord aWords[NCount];
    std::memcpy(aWords, pSource, sizeof(aWords));
    for (TWord& nWord : aWords)
        nWord = TurnRound(nWord);
    std::memcpy(pTarget, aWords, sizeof(aWords));
}

// In pieces that are loaded whole before they are stored: so the compiler makes vectors of them, in place too. Those of
// long runs begin at lines of the cache, since one that lies across two of them costs twice.
template <typename TWord>
void SwapWords(const unsigned char* pSource, unsigned char* pTarget, std::size_t nCount)
{
    constexpr std::size_t PIECE = 128 / sizeof(TWord);
    constexpr std::size_t LONG = 8192 / sizeof(TWord);
    const std::size_t nAhead = nCount < LONG ? 0 : -reinterpret_cast<std::uintptr_t>(pTarget) % 64 / sizeof(TWord);
    std::size_t i = 0;
    for (; i < nAhead && i < nCount; ++i)
        SwapSome<TWord, 1>(pSource + i * sizeof(TWord), pTarget + i * sizeof(TWord));
    for (; i + PIECE <= nCount; i += PIECE)
        SwapSome<TWord, PIECE>(pSource + i * sizeof(TWord), pTarget + i * sizeof(TWord));
    for (; i < nCount; ++i)
        SwapSome<TWord, 1>(pSource + i * sizeof(TWord), pTarget + i * sizeof(TWord));
}

template <std::size_t NSource, std::size_t NTarget>
constexpr MergeLoop FindMerge()
{
#ifdef __SSE4_1__
    using TSource = std::tuple_element_t<NSource, PartTypes>;
    using TTarget = std::tuple_element_t<NTarget, PartTypes>;
    if constexpr (CAN_STORE<TSource, TTarget>)
        return Merge<TSource, TTarget>;
#if defined(__AVX512VBMI__)
    else if constexpr (CAN_NARROW<TSource, TTarget>)
        return Merge<TSource, TTarget>;
#endif
#endif
    return nullptr;
}

template <std::size_t... N>
constexpr Kernels MakeKernels(std::index_sequence<N...>)
{
    return {{Convert<N / PART_COUNT, N % PART_COUNT>...},
            {CountChanges<N / PART_COUNT, N % PART_COUNT>...},
            {FindMerge<N / PART_COUNT, N % PART_COUNT>()...},
            VECTOR_BYTES,
            LOAD_BYTES,
            {SwapWords<std::uint16_t>, SwapWords<std::uint32_t>, SwapWords<std::uint64_t>}};
}

constexpr Kernels KERNELS = MakeKernels(std::make_index_sequence<PART_COUNT * PART_COUNT>());

} // namespace

} // namespace krv::raster::detail
