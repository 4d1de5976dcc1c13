#pragma once

#include "gobs/raster/pixelvalue.h"
#include "toolkit/simd/vectors.h"

namespace krv::gobs::detail
{

// Vectors such as every processor has: of samples, of numbers as wide as they are, of as many bytes.
template <typename T>
struct VectorsOf
{
    static constexpr std::size_t BYTES = 16;
    static constexpr std::size_t LANES = BYTES / sizeof(T);
    using Samples = simd::Vector<T, LANES>;
    using Bits = simd::Vector<BitsOf<T>, LANES>;
    using Valid = simd::Vector<std::uint8_t, LANES>;
};

} // namespace krv::gobs::detail
