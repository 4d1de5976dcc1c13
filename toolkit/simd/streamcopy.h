#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>

#if defined(__SSE2__)
#include <emmintrin.h>
#endif

namespace krv::simd
{

// Copies to memory past the caches, which would otherwise read every line before it is overwritten: for results that
// are too large to be found there again. FinishStreams comes before another thread may look.
inline void StreamCopy(unsigned char* destination, const unsigned char* source, std::size_t nBytes)
{
#if defined(__SSE2__)
    constexpr std::size_t LINE = 64;
    std::size_t i = (LINE - reinterpret_cast<std::uintptr_t>(destination) % LINE) % LINE;
    if (i + LINE <= nBytes)
    {
        std::memcpy(destination, source, i);
        for (; i + LINE <= nBytes; i += LINE)
            for (std::size_t n = i; n < i + LINE; n += sizeof(__m128i))
                _mm_stream_si128(reinterpret_cast<__m128i*>(destination + n),
                                 _mm_loadu_si128(reinterpret_cast<const __m128i*>(source + n)));
        destination += i;
        source += i;
        nBytes -= i;
    }
#endif
    std::memcpy(destination, source, nBytes);
}

// Asks for bytes that are read soon; they need not exist.
inline void Fetch(const unsigned char* source, std::size_t nBytes)
{
    for (std::size_t n = 0; n < nBytes; n += 64)
        __builtin_prefetch(source + n);
}

inline void FinishStreams()
{
#if defined(__SSE2__)
    _mm_sfence();
#endif
}

} // namespace krv::simd
