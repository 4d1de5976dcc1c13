#pragma once

#include "gobs/raster/pixelvalue.h"

#include <cstddef>
#include <cstdint>
#include <cstring>

namespace krv::gobs::detail
{

// Vectors of the compiler, such as every processor has: of samples, of numbers as wide as they are, of as many bytes.
template <typename T>
struct VectorsOf
{
    static constexpr std::size_t BYTES = 16;
    static constexpr std::size_t LANES = BYTES / sizeof(T);
    typedef T Samples __attribute__((vector_size(BYTES)));          // NOLINT: an attribute of the typedef
    typedef BitsOf<T> Bits __attribute__((vector_size(BYTES)));     // NOLINT
    typedef std::uint8_t Valid __attribute__((vector_size(LANES))); // NOLINT
};

template <typename V>
inline V LoadVector(const void* p)
{
    V o;
    std::memcpy(&o, p, sizeof o);
    return o;
}

} // namespace krv::gobs::detail
