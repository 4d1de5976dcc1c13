#pragma once

#include "toolkit/simd/memoryaccess.h"

#include <cstddef>
#include <cstdint>
#include <type_traits>
#include <utility>

// Defined where there are the instructions below; without them the plain loops do the same work.
#if defined(__SSE4_1__)
#define KRV_VECTORS 1
#include <immintrin.h>
#endif

// The one vocabulary of vectors, for loops that the compiler does not make vectors of by itself. A vector is a type of
// the compiler, of 16, 32 or 64 bytes; + - * & | ^ << >> and comparisons work lane by lane, and a comparison gives
// integers of all ones or zero. Load and Store of memoryaccess.h take vectors too. What follows is what the compiler
// has no operator for, or makes bad code of: each function is one or two instructions. (GCC 12 widens eight bytes to
// integers one by one, and finds no minimum.) Lanes are drawn from low addresses to high ones; many instructions work
// within groups of 16 bytes:
//     bytes of a vector   0 .. 15 | 16 .. 31 | ..
//     groups              first   | second   | ..
//
// The width is that of the instruction set that a source file is compiled for. So all of it is local to the file: a
// function that the linker shares could be another file's, and use what this processor does not have.

namespace krv::simd
{

namespace
{

template <typename T, std::size_t LANES>
struct VectorType
{
    typedef T Type __attribute__((vector_size(LANES * sizeof(T)))); // NOLINT: an attribute of the typedef
};
template <typename T, std::size_t LANES>
using Vector = typename VectorType<T, LANES>::Type;

#if defined(__AVX512VBMI__)
constexpr std::size_t VECTOR_BYTES = 64;
#elif defined(__AVX2__)
constexpr std::size_t VECTOR_BYTES = 32;
#else
constexpr std::size_t VECTOR_BYTES = 16;
#endif

// The widest vector of such lanes.
template <typename T>
using Full = Vector<T, VECTOR_BYTES / sizeof(T)>;

using Bytes = Vector<std::uint8_t, 16>;
// Sixteen bytes of any lanes, as the compiler's own instructions take them: what moves lanes of several widths about
// has fewer copies of registers so.
using Block = Vector<std::int64_t, 2>;

template <typename V>
using LaneOf = std::remove_cvref_t<decltype(std::declval<V>()[0])>;

// The same bits as lanes of another type.
template <typename T, typename V>
inline auto As(V o)
{
    return reinterpret_cast<Vector<T, sizeof(V) / sizeof(T)>>(o);
}

template <typename V>
inline V Spread(LaneOf<V> n)
{
    return n - V{}; // no instruction, where a sum makes another zero of -0
}

// Each lane as a value of T, as the language converts it.
template <typename T, typename V>
inline auto Convert(V o)
{
    return __builtin_convertvector(o, Vector<T, sizeof(V) / sizeof(LaneOf<V>)>);
}

// The lanes of two vectors that the numbers name, those of the second counted on from the first's; -1 is any.
template <int... LANES, typename V>
inline auto Picked(V a, V b)
{
    return __builtin_shufflevector(a, b, LANES...);
}

template <int... LANES, typename V>
inline auto Picked(V o)
{
    return __builtin_shufflevector(o, o, LANES...);
}

template <std::size_t FIRST, std::size_t BYTES, typename V>
inline auto PartByShuffle(V o)
{
    const auto Take = [o]<std::size_t... I>(std::index_sequence<I...>)
    {
        return __builtin_shufflevector(o, o, (FIRST / sizeof(LaneOf<V>) + I)...);
    };
    return Take(std::make_index_sequence<BYTES / sizeof(LaneOf<V>)>());
}

// Of two vectors the lanes with even or odd numbers, within groups of 16 bytes:
//     a0 a1 a2 a3 | ..   and   b0 b1 b2 b3 | ..   to   a0 a2 b0 b2 | ..   or   a1 a3 b1 b3 | ..
template <typename T, bool ODD, typename V>
inline V EveryOther(V a, V b)
{
    constexpr std::size_t LANES = sizeof(V) / sizeof(T), GROUP = 16 / sizeof(T), HALF = GROUP / 2;
    const auto oFirst = As<T>(a), oSecond = As<T>(b);
    const auto Take = [&]<std::size_t... I>(std::index_sequence<I...>)
    {
        return __builtin_shufflevector(
            oFirst, oSecond, (I / GROUP * GROUP + I % HALF * 2 + (ODD ? 1 : 0) + (I % GROUP < HALF ? 0 : LANES))...);
    };
    return As<LaneOf<V>>(Take(std::make_index_sequence<LANES>()));
}

#if defined(KRV_VECTORS)

// The instruction of a vector's width. Branches for widths that a file is not compiled for are not instantiated.
#define KRV_RETURN_BY_WIDTH(V, RESULT, NAME, ...)                                                                      \
    if constexpr (sizeof(V) == 64)                                                                                     \
        return reinterpret_cast<RESULT>(_mm512_##NAME(__VA_ARGS__));                                                   \
    else if constexpr (sizeof(V) == 32)                                                                                \
        return reinterpret_cast<RESULT>(_mm256_##NAME(__VA_ARGS__));                                                   \
    else                                                                                                               \
        return reinterpret_cast<RESULT>(_mm_##NAME(__VA_ARGS__))

// As instructions for integers take it.
template <typename V>
inline auto Raw(V o)
{
    if constexpr (sizeof(V) == 64)
        return reinterpret_cast<__m512i>(o);
    else if constexpr (sizeof(V) == 32)
        return reinterpret_cast<__m256i>(o);
    else
        return reinterpret_cast<__m128i>(o);
}

// The low or high halves of two vectors with their values of the width of T in turn, within groups of 16 bytes:
//     a0 a1 a2 a3 | ..   and   b0 b1 b2 b3 | ..   to   a0 b0 a1 b1 | ..   or   a2 b2 a3 b3 | ..
template <typename T, typename V>
inline V MixLow(V a, V b)
{
    if constexpr (std::is_same_v<LaneOf<V>, double>)
    {
        KRV_RETURN_BY_WIDTH(V, V, unpacklo_pd, a, b);
    }
    else if constexpr (sizeof(T) == 1)
    {
        KRV_RETURN_BY_WIDTH(V, V, unpacklo_epi8, Raw(a), Raw(b));
    }
    else if constexpr (sizeof(T) == 2)
    {
        KRV_RETURN_BY_WIDTH(V, V, unpacklo_epi16, Raw(a), Raw(b));
    }
    else if constexpr (sizeof(T) == 4)
    {
        KRV_RETURN_BY_WIDTH(V, V, unpacklo_epi32, Raw(a), Raw(b));
    }
    else
    {
        KRV_RETURN_BY_WIDTH(V, V, unpacklo_epi64, Raw(a), Raw(b));
    }
}

template <typename T, typename V>
inline V MixHigh(V a, V b)
{
    if constexpr (std::is_same_v<LaneOf<V>, double>)
    {
        KRV_RETURN_BY_WIDTH(V, V, unpackhi_pd, a, b);
    }
    else if constexpr (sizeof(T) == 1)
    {
        KRV_RETURN_BY_WIDTH(V, V, unpackhi_epi8, Raw(a), Raw(b));
    }
    else if constexpr (sizeof(T) == 2)
    {
        KRV_RETURN_BY_WIDTH(V, V, unpackhi_epi16, Raw(a), Raw(b));
    }
    else if constexpr (sizeof(T) == 4)
    {
        KRV_RETURN_BY_WIDTH(V, V, unpackhi_epi32, Raw(a), Raw(b));
    }
    else
    {
        KRV_RETURN_BY_WIDTH(V, V, unpackhi_epi64, Raw(a), Raw(b));
    }
}

// One vector behind the other, of 16 or 32 bytes. (Of two loads GCC 12 makes one instruction more by a shuffle.)
template <typename V>
inline auto Join(V oLow, V oHigh)
{
    if constexpr (sizeof(V) == 32)
        return As<LaneOf<V>>(_mm512_inserti64x4(_mm512_castsi256_si512(Raw(oLow)), Raw(oHigh), 1));
    else
    {
        static_assert(sizeof(V) == 16);
        return As<LaneOf<V>>(_mm256_set_m128i(Raw(oHigh), Raw(oLow)));
    }
}

// All ones in the lanes that are equal, of 16 or 32 bytes. (The result of the operator on reals GCC 12 puts on the
// stack when it goes on as bytes.)
template <typename V>
inline auto Equal(V a, V b)
{
    using T = LaneOf<V>;
    if constexpr (std::is_same_v<T, float> && sizeof(V) == 32)
        return As<std::int32_t>(static_cast<V>(_mm256_cmp_ps(a, b, _CMP_EQ_OQ)));
    else if constexpr (std::is_same_v<T, float>)
        return As<std::int32_t>(_mm_cmpeq_ps(a, b));
    else if constexpr (std::is_same_v<T, double> && sizeof(V) == 32)
        return As<std::int64_t>(static_cast<V>(_mm256_cmp_pd(a, b, _CMP_EQ_OQ)));
    else if constexpr (std::is_same_v<T, double>)
        return As<std::int64_t>(_mm_cmpeq_pd(a, b));
    else
        return a == b;
}

// All ones in the lanes of reals that are no numbers.
template <typename V>
inline auto NaNs(V o)
{
    using T = LaneOf<V>;
    if constexpr (std::is_same_v<T, float> && sizeof(V) == 32)
        return As<std::int32_t>(static_cast<V>(_mm256_cmp_ps(o, o, _CMP_UNORD_Q)));
    else if constexpr (std::is_same_v<T, float>)
        return As<std::int32_t>(_mm_cmpunord_ps(o, o));
    else if constexpr (sizeof(V) == 32)
        return As<std::int64_t>(static_cast<V>(_mm256_cmp_pd(o, o, _CMP_UNORD_Q)));
    else
        return As<std::int64_t>(_mm_cmpunord_pd(o, o));
}

// The bytes of one vector from byte FIRST on, as many as a shorter vector has. (By shuffles GCC 12 turns upper halves
// of 32 bytes round instead of taking them.)
template <std::size_t FIRST, std::size_t BYTES, typename V>
inline auto Part(V o)
{
    using T = LaneOf<V>;
    if constexpr (sizeof(V) > VECTOR_BYTES || BYTES < 16)
        return PartByShuffle<FIRST, BYTES>(o);
    else if constexpr (BYTES == sizeof(V))
        return o;
    else if constexpr (sizeof(V) == 64 && BYTES == 32)
        return As<T>(FIRST == 0 ? _mm512_castsi512_si256(Raw(o)) : _mm512_extracti64x4_epi64(Raw(o), FIRST / 32));
    else if constexpr (sizeof(V) == 64)
        return As<T>(FIRST == 0 ? _mm512_castsi512_si128(Raw(o)) : _mm512_extracti64x2_epi64(Raw(o), FIRST / 16));
    else
        return As<T>(FIRST == 0 ? _mm256_castsi256_si128(Raw(o)) : _mm256_extracti128_si256(Raw(o), FIRST / 16));
}

// Keeps the values whose lanes of the mask are all ones, and makes the others 0. Reals stay on the side of the
// processor that reals are on: as integers, rounding 16-bit vectors took a fifth longer.
template <typename V, typename M>
inline V Keep(V o, M oMask)
{
    if constexpr (std::is_same_v<LaneOf<V>, float>)
    {
        KRV_RETURN_BY_WIDTH(V, V, and_ps, o, reinterpret_cast<V>(oMask));
    }
    else if constexpr (std::is_same_v<LaneOf<V>, double>)
    {
        KRV_RETURN_BY_WIDTH(V, V, and_pd, o, reinterpret_cast<V>(oMask));
    }
    else
        return As<LaneOf<V>>(As<LaneOf<M>>(o) & oMask);
}

// Of two reals the second where either is NaN. Integers of 64 bits have it in vectors of 64 bytes alone.
template <typename V>
inline V Larger(V a, V b)
{
    using T = LaneOf<V>;
    constexpr bool SIGNED = std::is_signed_v<T>;
    if constexpr (std::is_same_v<T, float>)
    {
        KRV_RETURN_BY_WIDTH(V, V, max_ps, a, b);
    }
    else if constexpr (std::is_same_v<T, double>)
    {
        KRV_RETURN_BY_WIDTH(V, V, max_pd, a, b);
    }
    else if constexpr (sizeof(T) == 1 && SIGNED)
    {
        KRV_RETURN_BY_WIDTH(V, V, max_epi8, Raw(a), Raw(b));
    }
    else if constexpr (sizeof(T) == 1)
    {
        KRV_RETURN_BY_WIDTH(V, V, max_epu8, Raw(a), Raw(b));
    }
    else if constexpr (sizeof(T) == 2 && SIGNED)
    {
        KRV_RETURN_BY_WIDTH(V, V, max_epi16, Raw(a), Raw(b));
    }
    else if constexpr (sizeof(T) == 2)
    {
        KRV_RETURN_BY_WIDTH(V, V, max_epu16, Raw(a), Raw(b));
    }
    else if constexpr (sizeof(T) == 4 && SIGNED)
    {
        KRV_RETURN_BY_WIDTH(V, V, max_epi32, Raw(a), Raw(b));
    }
    else if constexpr (sizeof(T) == 4)
    {
        KRV_RETURN_BY_WIDTH(V, V, max_epu32, Raw(a), Raw(b));
    }
    else
        return reinterpret_cast<V>(SIGNED ? _mm512_max_epi64(Raw(a), Raw(b)) : _mm512_max_epu64(Raw(a), Raw(b)));
}

template <typename V>
inline V Smaller(V a, V b)
{
    using T = LaneOf<V>;
    constexpr bool SIGNED = std::is_signed_v<T>;
    if constexpr (std::is_same_v<T, float>)
    {
        KRV_RETURN_BY_WIDTH(V, V, min_ps, a, b);
    }
    else if constexpr (std::is_same_v<T, double>)
    {
        KRV_RETURN_BY_WIDTH(V, V, min_pd, a, b);
    }
    else if constexpr (sizeof(T) == 1 && SIGNED)
    {
        KRV_RETURN_BY_WIDTH(V, V, min_epi8, Raw(a), Raw(b));
    }
    else if constexpr (sizeof(T) == 1)
    {
        KRV_RETURN_BY_WIDTH(V, V, min_epu8, Raw(a), Raw(b));
    }
    else if constexpr (sizeof(T) == 2 && SIGNED)
    {
        KRV_RETURN_BY_WIDTH(V, V, min_epi16, Raw(a), Raw(b));
    }
    else if constexpr (sizeof(T) == 2)
    {
        KRV_RETURN_BY_WIDTH(V, V, min_epu16, Raw(a), Raw(b));
    }
    else if constexpr (sizeof(T) == 4 && SIGNED)
    {
        KRV_RETURN_BY_WIDTH(V, V, min_epi32, Raw(a), Raw(b));
    }
    else if constexpr (sizeof(T) == 4)
    {
        KRV_RETURN_BY_WIDTH(V, V, min_epu32, Raw(a), Raw(b));
    }
    else
        return reinterpret_cast<V>(SIGNED ? _mm512_min_epi64(Raw(a), Raw(b)) : _mm512_min_epu64(Raw(a), Raw(b)));
}

// a * b + c, rounded once; on processors that have it.
template <typename V>
inline V MultiplyAdd(V a, V b, V c)
{
    static_assert(std::is_same_v<LaneOf<V>, double>);
    KRV_RETURN_BY_WIDTH(V, V, fmadd_pd, a, b, c);
}

// Of each byte the first value where the highest bit of the mask's is set, else the second. Of 16 or 32 bytes.
template <typename V, typename M>
inline V Select(M oMask, V oSet, V oClear)
{
    if constexpr (sizeof(V) == 32)
        return reinterpret_cast<V>(_mm256_blendv_epi8(Raw(oClear), Raw(oSet), Raw(oMask)));
    else
        return reinterpret_cast<V>(_mm_blendv_epi8(Raw(oClear), Raw(oSet), Raw(oMask)));
}

// Whether there is an instruction that makes values wider, of bytes and words to integers or reals, of 32-bit integers
// and reals to reals.
template <typename To, std::size_t LANES, typename From>
constexpr bool CAN_WIDEN = LANES * sizeof(To) >= 16 && LANES * sizeof(To) <= VECTOR_BYTES &&
                           sizeof(To) > sizeof(From) && (sizeof(To) < 8 || std::is_floating_point_v<To>);

// The first LANES values of a vector of at least 16 bytes in lanes of a wider type. Every value is one of the wider
// type.
template <typename To, std::size_t LANES, typename V>
inline Vector<To, LANES> Widen(V o)
{
    using From = LaneOf<V>;
    using Result = Vector<To, LANES>;
    constexpr std::size_t USED = LANES * sizeof(From) < 16 ? 16 : LANES * sizeof(From);
    constexpr bool SIGNED = std::is_signed_v<From>;
    if constexpr (std::is_same_v<From, To>)
        return Part<0, LANES * sizeof(To)>(o);
    else if constexpr (std::is_floating_point_v<To> && sizeof(From) < 4)
        return Widen<To, LANES>(Widen<std::int32_t, (LANES < 4 ? 4 : LANES)>(o));
    else
    {
        const auto oUsed = Part<0, USED>(o);
        if constexpr (std::is_same_v<From, float>)
        {
            KRV_RETURN_BY_WIDTH(Result, Result, cvtps_pd, oUsed);
        }
        else if constexpr (sizeof(From) == 4 && sizeof(To) == 8)
        {
            static_assert(std::is_floating_point_v<To>);
            if constexpr (SIGNED)
            {
                KRV_RETURN_BY_WIDTH(Result, Result, cvtepi32_pd, Raw(oUsed));
            }
            else
            {
                KRV_RETURN_BY_WIDTH(Result, Result, cvtepu32_pd, Raw(oUsed));
            }
        }
        else if constexpr (sizeof(From) == 4)
            return Convert<To>(oUsed);
        else if constexpr (sizeof(From) == 1 && sizeof(To) == 2)
        {
            if constexpr (SIGNED)
            {
                KRV_RETURN_BY_WIDTH(Result, Result, cvtepi8_epi16, Raw(oUsed));
            }
            else
            {
                KRV_RETURN_BY_WIDTH(Result, Result, cvtepu8_epi16, Raw(oUsed));
            }
        }
        else if constexpr (sizeof(From) == 1)
        {
            static_assert(sizeof(To) == 4);
            if constexpr (SIGNED)
            {
                KRV_RETURN_BY_WIDTH(Result, Result, cvtepi8_epi32, Raw(oUsed));
            }
            else
            {
                KRV_RETURN_BY_WIDTH(Result, Result, cvtepu8_epi32, Raw(oUsed));
            }
        }
        else
        {
            static_assert(sizeof(From) == 2 && sizeof(To) == 4);
            if constexpr (SIGNED)
            {
                KRV_RETURN_BY_WIDTH(Result, Result, cvtepi16_epi32, Raw(oUsed));
            }
            else
            {
                KRV_RETURN_BY_WIDTH(Result, Result, cvtepu16_epi32, Raw(oUsed));
            }
        }
    }
}

// As many bytes from memory, of which no more is read, and zeros behind them.
template <std::size_t BYTES>
inline Bytes LoadFirst(const void* p)
{
    if constexpr (BYTES == 2)
        return reinterpret_cast<Bytes>(_mm_cvtsi32_si128(Load<std::uint16_t>(p)));
    else if constexpr (BYTES == 4)
        return reinterpret_cast<Bytes>(_mm_cvtsi32_si128(Load<int>(p)));
    else if constexpr (BYTES == 8)
        return reinterpret_cast<Bytes>(_mm_loadl_epi64(static_cast<const __m128i*>(p)));
    else
    {
        static_assert(BYTES == 12);
        return reinterpret_cast<Bytes>(_mm_insert_epi32(_mm_loadl_epi64(static_cast<const __m128i*>(p)),
                                                        Load<int>(static_cast<const char*>(p) + 8), 2));
    }
}

// The first 4 or 8 bytes of a vector to memory.
template <std::size_t BYTES, typename V>
inline void StoreFirst(void* p, V o)
{
    static_assert(sizeof(V) == 16);
    if constexpr (BYTES == 4)
        Store(p, _mm_cvtsi128_si32(Raw(o)));
    else
    {
        static_assert(BYTES == 8);
        _mm_storel_epi64(static_cast<__m128i*>(p), Raw(o));
    }
}

// Rounded half to even, as the processor does unless told otherwise. NaN and what is out of range give the least
// integer.
template <typename V>
inline auto RoundInts(V o)
{
    constexpr std::size_t LANES = sizeof(V) / sizeof(LaneOf<V>);
    using Ints = Vector<std::int32_t, (LANES < 4 ? 4 : LANES)>;
    if constexpr (std::is_same_v<LaneOf<V>, float>)
    {
        KRV_RETURN_BY_WIDTH(V, Ints, cvtps_epi32, o);
    }
    else
    {
        KRV_RETURN_BY_WIDTH(V, Ints, cvtpd_epi32, o);
    }
}

// The same of two vectors of doubles.
template <typename V>
inline auto RoundInts(V a, V b)
{
    if constexpr (sizeof(V) == 16)
        return As<std::int32_t>(_mm_unpacklo_epi64(_mm_cvtpd_epi32(a), _mm_cvtpd_epi32(b)));
    else
        return Join(RoundInts(a), RoundInts(b));
}

// Two vectors of two doubles without what is behind their points.
inline auto TruncateInts(Vector<double, 2> a, Vector<double, 2> b)
{
    return As<std::int32_t>(_mm_unpacklo_epi64(_mm_cvttpd_epi32(a), _mm_cvttpd_epi32(b)));
}

// Doubles rounded half to even, in 16 or 32 bytes.
template <typename V>
inline V Rounded(V o)
{
    if constexpr (sizeof(V) == 32)
        return _mm256_round_pd(o, _MM_FROUND_CUR_DIRECTION);
    else
        return _mm_round_pd(o, _MM_FROUND_CUR_DIRECTION);
}

// Two vectors of signed integers to one of lanes half as wide, saturated to To, within groups of 16 bytes:
//     a0 a1 | a2 a3   and   b0 b1 | b2 b3   to   a0 a1 b0 b1 | a2 a3 b2 b3
template <typename To, typename V>
inline auto Pack(V a, V b)
{
    static_assert(sizeof(LaneOf<V>) == 2 * sizeof(To));
    using Result = Vector<To, sizeof(V) / sizeof(To)>;
    if constexpr (sizeof(To) == 2 && std::is_signed_v<To>)
    {
        KRV_RETURN_BY_WIDTH(V, Result, packs_epi32, Raw(a), Raw(b));
    }
    else if constexpr (sizeof(To) == 2)
    {
        KRV_RETURN_BY_WIDTH(V, Result, packus_epi32, Raw(a), Raw(b));
    }
    else if constexpr (std::is_signed_v<To>)
    {
        KRV_RETURN_BY_WIDTH(V, Result, packs_epi16, Raw(a), Raw(b));
    }
    else
    {
        KRV_RETURN_BY_WIDTH(V, Result, packus_epi16, Raw(a), Raw(b));
    }
}

// What came out of packing VECTORS vectors to one, 2 or 4, in the order of its sources.
template <std::size_t VECTORS, typename V>
inline V InOrder(V o)
{
    constexpr std::size_t GROUPS = sizeof(V) / 16;
    using Unit = std::conditional_t<VECTORS == 2, std::uint64_t, std::uint32_t>;
    const auto oUnits = As<Unit>(o);
    const auto Order = [oUnits]<std::size_t... I>(std::index_sequence<I...>)
    {
        return __builtin_shufflevector(oUnits, oUnits, (I % GROUPS * VECTORS + I / GROUPS)...);
    };
    return As<LaneOf<V>>(Order(std::make_index_sequence<VECTORS * GROUPS>()));
}

// Byte i of a group of 16 is the byte of that group which index i names, or 0 where the index is negative.
template <typename V, typename I>
inline V PickBytes(V o, I oIndices)
{
    KRV_RETURN_BY_WIDTH(V, V, shuffle_epi8, Raw(o), Raw(oIndices));
}

// The same 16 bytes in every group, of one or two.
template <typename V, typename G>
inline V SpreadGroup(G oGroup)
{
    static_assert(sizeof(G) == 16);
    if constexpr (sizeof(V) == 32)
        return reinterpret_cast<V>(_mm256_broadcastsi128_si256(Raw(oGroup)));
    else
        return reinterpret_cast<V>(oGroup);
}

// The bytes of each group moved up by so many, zeros below them.
template <std::size_t BYTES, typename V>
inline V MoveUp(V o)
{
    static_assert(sizeof(V) == 16);
    return reinterpret_cast<V>(_mm_slli_si128(Raw(o), BYTES));
}

// And moved down, zeros above them.
template <std::size_t BYTES, typename V>
inline V MoveDown(V o)
{
    static_assert(sizeof(V) == 16);
    if constexpr (BYTES == 0)
        return o;
    else
        return reinterpret_cast<V>(_mm_srli_si128(Raw(o), BYTES));
}

// The highest bits of the lanes, the first lane's lowest.
template <typename V>
inline auto TopBits(V o)
{
    constexpr std::size_t BYTES = sizeof(LaneOf<V>);
    if constexpr (sizeof(V) == 64)
    {
        if constexpr (BYTES == 1)
            return std::uint64_t{_mm512_movepi8_mask(Raw(o))};
        else if constexpr (BYTES == 4)
            return static_cast<unsigned int>(_mm512_movepi32_mask(Raw(o)));
        else
        {
            static_assert(BYTES == 8);
            return static_cast<unsigned int>(_mm512_movepi64_mask(Raw(o)));
        }
    }
    else if constexpr (sizeof(V) == 32)
    {
        static_assert(BYTES == 1);
        return static_cast<unsigned int>(_mm256_movemask_epi8(Raw(o)));
    }
    else if constexpr (BYTES == 1)
        return static_cast<unsigned int>(_mm_movemask_epi8(Raw(o)));
    else
    {
        static_assert(BYTES == 4);
        return static_cast<unsigned int>(_mm_movemask_ps(_mm_castsi128_ps(Raw(o))));
    }
}

template <typename V>
inline bool IsZero(V o)
{
    static_assert(sizeof(V) == 16);
    return _mm_testz_si128(Raw(o), Raw(o)) != 0;
}

// Unsigned bytes, added two by two, as words.
template <typename V>
inline auto AddNeighbours(V o)
{
    using Words = Vector<std::uint16_t, sizeof(V) / 2>;
    KRV_RETURN_BY_WIDTH(V, Words, maddubs_epi16, Raw(o), Raw(Spread<V>(1)));
}

// Products of signed words, added two by two, as integers of 32 bits.
template <typename V>
inline auto AddProducts(V a, V b)
{
    using Ints = Vector<std::int32_t, sizeof(V) / 4>;
    KRV_RETURN_BY_WIDTH(V, Ints, madd_epi16, Raw(a), Raw(b));
}

// Unsigned or signed integers shifted down by the number that the low half of a vector holds.
template <typename V>
inline V ShiftDown(V o, Bytes oPlaces)
{
    static_assert(sizeof(V) == 16 && sizeof(LaneOf<V>) == 4);
    if constexpr (std::is_signed_v<LaneOf<V>>)
        return reinterpret_cast<V>(_mm_sra_epi32(Raw(o), Raw(oPlaces)));
    else
        return reinterpret_cast<V>(_mm_srl_epi32(Raw(o), Raw(oPlaces)));
}

// Byte i of a shuffled vector of 16 is byte moIndices[i] of what it was, or 0 for 0x80.
struct alignas(16) Shuffle
{
    unsigned char moIndices[16];

    template <typename Index>
    static constexpr Shuffle Make(Index oIndex)
    {
        Shuffle oShuffle{};
        for (std::size_t i = 0; i < 16; ++i)
            oShuffle.moIndices[i] = static_cast<unsigned char>(oIndex(i));
        return oShuffle;
    }

    template <typename V>
    V operator()(V oValue) const
    {
        return PickBytes(oValue, Load<Bytes>(moIndices));
    }
};

template <typename T>
inline constexpr Shuffle SWAP = Shuffle::Make([](std::size_t i) { return i ^ (sizeof(T) - 1); });

// Turns round the bytes of every T.
template <typename T, typename V>
inline V SwapBytes(V oValue)
{
    return SWAP<T>(oValue);
}

#if defined(__AVX512VBMI__)

// Vectors of 64 bytes, whose comparisons give a bit for each lane, the first lane's lowest, and which are chosen from
// by such bits.

template <typename V>
inline auto EqualBits(V a, V b)
{
    static_assert(sizeof(V) == 64);
    using T = LaneOf<V>;
    if constexpr (std::is_same_v<T, float>)
        return _mm512_cmp_ps_mask(a, b, _CMP_EQ_OQ);
    else if constexpr (std::is_same_v<T, double>)
        return _mm512_cmp_pd_mask(a, b, _CMP_EQ_OQ);
    else if constexpr (sizeof(T) == 1)
        return _mm512_cmpeq_epi8_mask(Raw(a), Raw(b));
    else if constexpr (sizeof(T) == 2)
        return _mm512_cmpeq_epi16_mask(Raw(a), Raw(b));
    else if constexpr (sizeof(T) == 4)
        return _mm512_cmpeq_epi32_mask(Raw(a), Raw(b));
    else
        return _mm512_cmpeq_epi64_mask(Raw(a), Raw(b));
}

// Which reals are numbers.
template <typename V>
inline auto NumberBits(V o)
{
    if constexpr (std::is_same_v<LaneOf<V>, float>)
        return _mm512_cmp_ps_mask(o, o, _CMP_ORD_Q);
    else
        return _mm512_cmp_pd_mask(o, o, _CMP_ORD_Q);
}

// Which of the reals that the bits name are none.
template <typename V>
inline auto NaNBits(unsigned int nOf, V o)
{
    if constexpr (std::is_same_v<LaneOf<V>, float>)
        return _mm512_mask_cmp_ps_mask(static_cast<__mmask16>(nOf), o, o, _CMP_UNORD_Q);
    else
        return _mm512_mask_cmp_pd_mask(static_cast<__mmask8>(nOf), o, o, _CMP_UNORD_Q);
}

inline auto NotBelowBits(Vector<float, 16> a, Vector<float, 16> b)
{
    return _mm512_cmp_ps_mask(a, b, _CMP_GE_OQ);
}

// Which lanes have no bit set.
template <typename V>
inline auto ZeroBits(V o)
{
    if constexpr (sizeof(LaneOf<V>) == 2)
        return _mm512_testn_epi16_mask(Raw(o), Raw(o));
    else if constexpr (sizeof(LaneOf<V>) == 4)
        return _mm512_testn_epi32_mask(Raw(o), Raw(o));
    else
    {
        static_assert(sizeof(LaneOf<V>) == 8);
        return _mm512_testn_epi64_mask(Raw(o), Raw(o));
    }
}

// Bytes of all ones where bits are set.
inline auto BytesOfBits(std::uint64_t nBits)
{
    return As<std::uint8_t>(_mm512_movm_epi8(nBits));
}

// Lanes of the first where bits are set, else of the second.
template <typename Bits, typename V>
inline V SelectByBits(Bits nBits, V oSet, V oClear)
{
    if constexpr (sizeof(LaneOf<V>) == 1)
        return reinterpret_cast<V>(_mm512_mask_blend_epi8(nBits, Raw(oClear), Raw(oSet)));
    else
    {
        static_assert(sizeof(LaneOf<V>) == 4);
        return reinterpret_cast<V>(_mm512_mask_blend_epi32(nBits, Raw(oClear), Raw(oSet)));
    }
}

// Byte i of the result is the byte of the whole vector that index i names, where bit i is set, else what it was.
template <typename V, typename I>
inline V PickInto(V oBefore, std::uint64_t nBits, I oIndices, V o)
{
    return reinterpret_cast<V>(_mm512_mask_permutexvar_epi8(Raw(oBefore), nBits, Raw(oIndices), Raw(o)));
}

// Byte i is the byte of two vectors that the lower seven bits of index i name.
template <typename V, typename I>
inline V PickOfTwo(V a, I oIndices, V b)
{
    return reinterpret_cast<V>(_mm512_permutex2var_epi8(Raw(a), Raw(oIndices), Raw(b)));
}

// Reals rounded as RoundInts does where bits are set, else 0.
template <typename Bits, typename V>
inline auto RoundIntsOf(Bits nBits, V o)
{
    if constexpr (std::is_same_v<LaneOf<V>, float>)
        return As<std::int32_t>(_mm512_maskz_cvtps_epi32(nBits, o));
    else
        return As<std::int32_t>(_mm512_maskz_cvtpd_epi32(nBits, o));
}

// Rounded to unsigned integers, saturated above; what is below 0 is not looked at.
template <typename V>
inline auto RoundUnsigned(V o)
{
    if constexpr (std::is_same_v<LaneOf<V>, float>)
        return As<std::uint32_t>(_mm512_cvtps_epu32(o));
    else
        return As<std::uint32_t>(_mm512_cvtpd_epu32(o));
}

// Integers of 32 bits to the lanes of a narrower type, saturated: unsigned ones to unsigned, signed ones to signed.
template <typename To, typename V>
inline auto Saturate(V o)
{
    static_assert(sizeof(V) == 64 && sizeof(LaneOf<V>) == 4);
    if constexpr (sizeof(To) == 1)
        return As<To>(std::is_signed_v<To> ? _mm512_cvtsepi32_epi8(Raw(o)) : _mm512_cvtusepi32_epi8(Raw(o)));
    else
        return As<To>(std::is_signed_v<To> ? _mm512_cvtsepi32_epi16(Raw(o)) : _mm512_cvtusepi32_epi16(Raw(o)));
}

// Integers of vectors of 32 or 64 bytes as those of a type that is no longer, modulo its size. (Conversions that make
// integers four times shorter GCC 12 takes apart.)
template <typename To, typename V>
inline void StoreTruncated(void* p, V o)
{
    constexpr std::size_t FROM = sizeof(LaneOf<V>), TO = sizeof(To);
    if constexpr (FROM == TO)
        Store(p, o);
    else if constexpr (sizeof(V) == 32)
    {
        static_assert(FROM == 4);
        if constexpr (TO == 2)
            Store(p, As<To>(_mm256_cvtepi32_epi16(Raw(o))));
        else
            StoreFirst<8>(p, As<To>(_mm256_cvtepi32_epi8(Raw(o))));
    }
    else if constexpr (FROM == 2)
        Store(p, As<To>(_mm512_cvtepi16_epi8(Raw(o))));
    else if constexpr (FROM == 4 && TO == 2)
        Store(p, As<To>(_mm512_cvtepi32_epi16(Raw(o))));
    else if constexpr (FROM == 4)
        Store(p, As<To>(_mm512_cvtepi32_epi8(Raw(o))));
    else if constexpr (TO == 4)
        Store(p, As<To>(_mm512_cvtepi64_epi32(Raw(o))));
    else if constexpr (TO == 2)
        Store(p, As<To>(_mm512_cvtepi64_epi16(Raw(o))));
    else
        StoreFirst<8>(p, As<To>(_mm512_cvtepi64_epi8(Raw(o))));
}

#if defined(__BMI2__) && defined(__GFNI__)

// The bits of a word that a mask names, moved together at the low end.
inline std::uint64_t GatherBits(std::uint64_t nWord, std::uint64_t nMask)
{
    return _pext_u64(nWord, nMask);
}

// The bits of each byte turned round: each byte's product with this matrix.
inline std::uint64_t TurnBits(std::uint64_t nWord)
{
    constexpr std::uint64_t MATRIX = 0x8040201008040201;
    const auto oWord = As<std::uint8_t>(_mm_cvtsi64_si128(static_cast<long long>(nWord)));
    const auto oMatrix = Spread<Vector<std::uint64_t, 2>>(MATRIX);
    return As<std::uint64_t>(_mm_gf2p8affine_epi64_epi8(Raw(oWord), Raw(oMatrix), 0))[0];
}

#endif

#endif

#undef KRV_RETURN_BY_WIDTH

#else

template <std::size_t FIRST, std::size_t BYTES, typename V>
inline auto Part(V o)
{
    return PartByShuffle<FIRST, BYTES>(o);
}

#endif

// LANES values from memory, of which no more is read, widened.
template <typename To, std::size_t LANES, typename From>
inline Vector<To, LANES> LoadWidened(const From* p)
{
#if defined(KRV_VECTORS)
    constexpr std::size_t BYTES = LANES * sizeof(From);
    if constexpr (CAN_WIDEN<To, LANES, From> && BYTES >= 16)
        return Widen<To, LANES>(Load<Vector<From, LANES>>(p));
    else if constexpr (CAN_WIDEN<To, LANES, From>)
        return Widen<To, LANES>(As<From>(LoadFirst<BYTES>(p)));
    else
#endif
        return Convert<To>(Load<Vector<From, LANES>>(p));
}

} // namespace

} // namespace krv::simd
