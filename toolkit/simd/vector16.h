#pragma once

#include <cstddef>
#include <cstdint>

// Defined where sixteen bytes can be worked on at once; without it the plain loops do the same work.
#if defined(__SSE4_1__)
#define KRV_VECTOR16 1

#include <smmintrin.h>

namespace krv::simd
{

using Vector = __m128i;

inline Vector LoadVector(const unsigned char* source)
{
    return _mm_loadu_si128(reinterpret_cast<const __m128i*>(source));
}

inline void StoreVector(unsigned char* destination, Vector oValue)
{
    _mm_storeu_si128(reinterpret_cast<__m128i*>(destination), oValue);
}

// Sums and differences of unsigned integers of the width of T, modulo their size.
template <typename T>
inline Vector Add(Vector oLeft, Vector oRight)
{
    if constexpr (sizeof(T) == 1)
        return _mm_add_epi8(oLeft, oRight);
    else if constexpr (sizeof(T) == 2)
        return _mm_add_epi16(oLeft, oRight);
    else if constexpr (sizeof(T) == 4)
        return _mm_add_epi32(oLeft, oRight);
    else
        return _mm_add_epi64(oLeft, oRight);
}

template <typename T>
inline Vector Subtract(Vector oLeft, Vector oRight)
{
    if constexpr (sizeof(T) == 1)
        return _mm_sub_epi8(oLeft, oRight);
    else if constexpr (sizeof(T) == 2)
        return _mm_sub_epi16(oLeft, oRight);
    else if constexpr (sizeof(T) == 4)
        return _mm_sub_epi32(oLeft, oRight);
    else
        return _mm_sub_epi64(oLeft, oRight);
}

// The low or high halves of two vectors with their values of the width of T in turn.
template <typename T>
inline Vector MixLow(Vector oFirst, Vector oSecond)
{
    if constexpr (sizeof(T) == 1)
        return _mm_unpacklo_epi8(oFirst, oSecond);
    else if constexpr (sizeof(T) == 2)
        return _mm_unpacklo_epi16(oFirst, oSecond);
    else if constexpr (sizeof(T) == 4)
        return _mm_unpacklo_epi32(oFirst, oSecond);
    else
        return _mm_unpacklo_epi64(oFirst, oSecond);
}

template <typename T>
inline Vector MixHigh(Vector oFirst, Vector oSecond)
{
    if constexpr (sizeof(T) == 1)
        return _mm_unpackhi_epi8(oFirst, oSecond);
    else if constexpr (sizeof(T) == 2)
        return _mm_unpackhi_epi16(oFirst, oSecond);
    else if constexpr (sizeof(T) == 4)
        return _mm_unpackhi_epi32(oFirst, oSecond);
    else
        return _mm_unpackhi_epi64(oFirst, oSecond);
}

// Byte i of a shuffled vector is byte moIndices[i] of what it was, or 0 for 0x80.
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

    Vector operator()(Vector oValue) const
    {
        return _mm_shuffle_epi8(oValue, _mm_load_si128(reinterpret_cast<const __m128i*>(moIndices)));
    }
};

template <typename T>
inline constexpr Shuffle SWAP = Shuffle::Make([](std::size_t i) { return i ^ (sizeof(T) - 1); });

// Turns round the bytes of every T.
template <typename T>
inline Vector SwapVector(Vector oValue)
{
    return SWAP<T>(oValue);
}

} // namespace krv::simd
#endif
