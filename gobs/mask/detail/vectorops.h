#pragma once

// What the mask kernels do with vectors, for a width. All work within groups of 16 bytes: the wider kind is two groups
// of pixels side by side. The kinds share no function: the wide one's code must not stand in for the narrow one's.
#if defined(__SSE4_2__)
#include "toolkit/simd/vectors.h"

namespace krv::gobs::detail
{

template <std::size_t BYTES>
struct MaskOps
{
    using Vector = simd::Vector<std::int64_t, BYTES / 8>;
    using Half = simd::Vector<std::int64_t, BYTES / 16>;
    static constexpr unsigned int GROUPS = BYTES / 16;

    // nStride: the distance to the second group.
    static Vector Load(const unsigned char* p, [[maybe_unused]] unsigned long nStride)
    {
        if constexpr (BYTES == 32)
            return simd::Join(simd::Load<Half>(p), simd::Load<Half>(p + nStride));
        else
            return simd::Load<Vector>(p);
    }

    // The same 16 bytes for each group.
    static Vector Broadcast(const void* p) { return simd::SpreadGroup<Vector>(simd::Load<simd::Block>(p)); }

    // Lanes of T that are equal: all ones. NaN equals nothing.
    template <typename T>
    static Vector Equal(Vector a, Vector b)
    {
        return reinterpret_cast<Vector>(simd::Equal(simd::As<T>(a), simd::As<T>(b)));
    }

    template <typename T>
    static Vector NaN(Vector a)
    {
        return reinterpret_cast<Vector>(simd::NaNs(simd::As<T>(a)));
    }

    // Lanes of all ones or zero become half as wide.
    template <typename T>
    static Vector Narrow(Vector a, Vector b)
    {
        using Half = std::conditional_t<sizeof(T) == 2, std::int8_t, std::int16_t>;
        return reinterpret_cast<Vector>(simd::Pack<Half>(simd::As<T>(a), simd::As<T>(b)));
    }
};

using SseOps = MaskOps<16>;
using Avx2Ops = MaskOps<32>;

} // namespace krv::gobs::detail
#endif
