#pragma once

#include <cstddef>
#include <cstdint>

// Defined where sixteen bytes can be worked on at once; without it the plain loops do the same work.
#if defined(__SSE4_1__)
#define KRV_VECTOR16 1

#include <smmintrin.h>

namespace krv::simd
{

// Sixteen bytes of values of any one width, the first value in the lowest lane: lane i of a width w is bytes i * w to
// i * w + w - 1 of memory. Signed and unsigned integers share these operations.
using Vector = __m128i;

// 16 bytes from any address, aligned or not. A whole vector is read: the caller sees to it that 16 bytes are there.
inline Vector LoadVector(const unsigned char* source)
{
    return _mm_loadu_si128(reinterpret_cast<const __m128i*>(source));
}

// 16 bytes to any address.
inline void StoreVector(unsigned char* destination, Vector oValue)
{
    _mm_storeu_si128(reinterpret_cast<__m128i*>(destination), oValue);
}

// Sums and differences of unsigned integers of the width of T, modulo their size.
// Lane by lane; T has 1, 2, 4 or 8 bytes and only its width counts. Overflow wraps round.
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

// The counterpart: oLeft - oRight in each lane.
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
// With lanes a0 a1 a2 ... and b0 b1 b2 ...: MixLow gives a0 b0 a1 b1 ... of the lower 8 bytes of both, MixHigh the same
// of
// the upper 8. Two planes become one interleaved row by storing MixLow and then MixHigh.
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
// One instruction whatever the order, so that four bytes and sixteen cost the same.
// Example: Shuffle::Make([](std::size_t i) { return 15 - i; }) turns a vector round.
struct alignas(16) Shuffle
{
    unsigned char moIndices[16];

    // oIndex(i): the byte, 0 to 15, that byte i is taken from, or 0x80 for a zero. Worked out by the compiler.
    template <typename Index>
    static constexpr Shuffle Make(Index oIndex)
    {
        Shuffle oShuffle{};
        for (std::size_t i = 0; i < 16; ++i)
            oShuffle.moIndices[i] = static_cast<unsigned char>(oIndex(i));
        return oShuffle;
    }

    // Never reads memory but its own list.
    Vector operator()(Vector oValue) const
    {
        return _mm_shuffle_epi8(oValue, _mm_load_si128(reinterpret_cast<const __m128i*>(moIndices)));
    }
};

// The order of bytes turned round within every value of the width of T.
template <typename T>
inline constexpr Shuffle SWAP = Shuffle::Make([](std::size_t i) { return i ^ (sizeof(T) - 1); });

// Turns round the bytes of every T.
// From the file's byte order to the processor's, or back; a width of 1 changes nothing.
template <typename T>
inline Vector SwapVector(Vector oValue)
{
    return SWAP<T>(oValue);
}

} // namespace krv::simd
#endif
