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
#if defined(KRV_VECTORS)
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

#if defined(KRV_VECTORS)

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

// As wide a vector as there is, of which each source gives some bytes.
using MergeVector = simd::Full<std::uint8_t>;

#if defined(__AVX512VBMI__)
constexpr std::size_t LOAD_BYTES = 64;

struct MergeShuffle
{
    MergeVector moFrom;
    std::uint64_t mnPlaced;
};

inline MergeVector LoadTerm(const unsigned char* p)
{
    return simd::Load<MergeVector>(p);
}
inline MergeShuffle LoadShuffle(const unsigned char* p)
{
    const auto oFrom = simd::Load<MergeVector>(p);
    return {oFrom, ~simd::TopBits(oFrom)};
}
inline MergeVector AddTerm(MergeVector oResult, MergeVector oLoad, const MergeShuffle& oShuffle)
{
    return simd::PickInto(oResult, oShuffle.mnPlaced, oShuffle.moFrom, oLoad);
}
#else
constexpr std::size_t LOAD_BYTES = 16;
using MergeShuffle = MergeVector;

// The same 16 bytes for all groups.
inline MergeVector LoadTerm(const unsigned char* p)
{
    return simd::SpreadGroup<MergeVector>(simd::Load<simd::Bytes>(p));
}
inline MergeShuffle LoadShuffle(const unsigned char* p)
{
    return simd::Load<MergeShuffle>(p);
}
inline MergeVector AddTerm(MergeVector oResult, MergeVector oLoad, const MergeShuffle& oShuffle)
{
    return oResult | simd::PickBytes(oLoad, oShuffle);
}
#endif

// The values of a vector that fill vector number N of a wider type.
template <typename TTarget, std::size_t N, typename V>
inline auto WidenPart(V o)
{
    constexpr std::size_t LANES = simd::VECTOR_BYTES / sizeof(TTarget), BYTES = LANES * sizeof(simd::LaneOf<V>);
    if constexpr (BYTES >= 16)
        return simd::Widen<TTarget, LANES>(simd::Part<N * BYTES, BYTES>(o));
    else
        return simd::Widen<TTarget, LANES>(simd::MoveDown<N * BYTES % 16>(simd::Part<N * BYTES / 16 * 16, 16>(o)));
}

// All values of a vector; the shorter vectors make integers of 32 bits first where they become doubles:
//     bytes   b0 .. b15      integers   i0 .. i3 | i4 .. i7 | ..      doubles   d0 d1 | d2 d3 | ..
template <typename TTarget, typename V>
inline void StoreWide(unsigned char* pTarget, V o)
{
    using TSource = simd::LaneOf<V>;
    constexpr bool BY_INTS = simd::VECTOR_BYTES < 64 && sizeof(TSource) < 4 && sizeof(TTarget) == 8;
    using TStep = std::conditional_t<BY_INTS, std::int32_t, TTarget>;
    if constexpr (std::is_same_v<TSource, TTarget>)
        simd::Store(pTarget, o);
    else
        [=]<std::size_t... N>(std::index_sequence<N...>)
        {
            constexpr std::size_t STEP_BYTES = simd::VECTOR_BYTES * sizeof(TTarget) / sizeof(TStep);
            (StoreWide<TTarget>(pTarget + N * STEP_BYTES, WidenPart<TStep, N>(o)), ...);
        }
    (std::make_index_sequence<sizeof(TStep) / sizeof(TSource)>());
}

#if defined(__AVX512VBMI__)
// And the pairs of mixed files that are written, whose values may change: from longer types to shorter ones.
template <typename TSource, typename TTarget>
inline constexpr bool CAN_NARROW = !std::is_same_v<TSource, TTarget> && sizeof(TSource) > 1 &&
                                   sizeof(TTarget) <= sizeof(TSource) &&
                                   (std::is_integral_v<TSource> ? std::is_integral_v<TTarget> : sizeof(TTarget) <= 4);

// Stores values as those of a type that is no longer. Returns -1 in the lane of each that changed, 0 in the others.
template <typename TSource, typename TTarget>
inline auto StoreNarrow(unsigned char* pTarget, MergeVector o)
{
    using Limits = std::numeric_limits<TTarget>;
    using Source = simd::Full<TSource>;
    constexpr std::size_t N = sizeof(MergeVector) / sizeof(TSource);
    const Source oFrom = simd::As<TSource>(o);
    decltype(oFrom != oFrom) oChanged;
    if constexpr (std::is_integral_v<TSource>)
    {
        Source oKept = oFrom;
        if constexpr (std::is_signed_v<TSource>)
        {
            const auto nLowest = ConvertValue<TSource>(Limits::min());
            oKept = simd::Larger(oKept, simd::Spread<Source>(nLowest));
        }
        const auto nMost = ConvertValue<TSource>(Limits::max());
        oKept = simd::Smaller(oKept, simd::Spread<Source>(nMost));
        oChanged = oKept != oFrom;
        simd::StoreTruncated<TTarget>(pTarget, oKept);
    }
    else if constexpr (std::is_integral_v<TTarget>)
    {
        using Whole = std::conditional_t<std::is_signed_v<TTarget>, std::int32_t, std::uint32_t>;
        using Wholes = simd::Vector<Whole, N>;
        Wholes oKept = simd::As<Whole>(IntsOf<TTarget>(oFrom));
        constexpr Whole LOWEST = Limits::min(), MOST = Limits::max();
        if constexpr (sizeof(TTarget) < 4 && LOWEST != 0)
            oKept = simd::Larger(oKept, simd::Spread<Wholes>(LOWEST));
        if constexpr (sizeof(TTarget) < 4)
            oKept = simd::Smaller(oKept, simd::Spread<Wholes>(MOST));
        Source oBack;
        if constexpr (sizeof(TSource) == 4)
            oBack = simd::Convert<TSource>(oKept);
        else
            oBack = simd::Widen<TSource, N>(oKept);
        oChanged = oBack != oFrom;
        if constexpr (sizeof(TTarget) == sizeof(TSource)) // the last whole number is no real, see IsChanged
            oChanged |= oFrom >= static_cast<TSource>(Limits::max() / 2 + 1) * 2;
        simd::StoreTruncated<TTarget>(pTarget, oKept);
    }
    else
    {
        const auto oTo = simd::Convert<TTarget>(oFrom);
        simd::Store(pTarget, oTo);
        const auto oBack = simd::Widen<TSource, N>(oTo);
        oChanged = (oBack < oFrom) | (oBack > oFrom);
    }
    return oChanged;
}

#endif

// Stores vectors one after the other and counts the values that changed.
template <typename TSource, typename TTarget>
class VectorStore
{
public:
    void Put(unsigned char* pTarget, MergeVector o)
    {
        if constexpr (std::is_same_v<TSource, TTarget>)
            simd::Store(pTarget, o);
        else
            StoreWide<TTarget>(pTarget, simd::As<TSource>(o));
    }
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

#else
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
#if defined(KRV_VECTORS)
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
            simd::VECTOR_BYTES,
            LOAD_BYTES,
            {SwapWords<std::uint16_t>, SwapWords<std::uint32_t>, SwapWords<std::uint64_t>}};
}

constexpr Kernels KERNELS = MakeKernels(std::make_index_sequence<PART_COUNT * PART_COUNT>());

} // namespace

} // namespace krv::raster::detail
