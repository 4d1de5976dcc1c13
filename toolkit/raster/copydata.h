#pragma once

#include "toolkit/api.h"

#include <cstdint>

namespace krv::raster
{

// The value types that CopyData converts between.
// Unsigned and signed integers, reals (R) and complex values (C) of two such parts, real part first; the number is the
// bits of one part. Values are in the processor's byte order. The numbers of the enumerators are fixed.
enum BufferType
{
    eBT_8U, // one byte, 0 to 255
    eBT_8S,
    eBT_16U,
    eBT_16S,
    eBT_32U,
    eBT_32S,
    eBT_32R, // IEEE 754 of four bytes
    eBT_64U,
    eBT_64S,
    eBT_64R,  // IEEE 754 of eight bytes
    eBT_C16U, // four bytes: two of 16U
    eBT_C16S,
    eBT_C32S,
    eBT_C32R,
    eBT_C64R // sixteen bytes
};

// Bytes of `nValues` values of a type. Throws ParameterException for an unknown type, DataException on overflow.
// eBT_C16U and eBT_C16S have 4 bytes, eBT_C64R 16: both parts count.
KRV_TOOLKIT_API std::uint64_t BufferDataSize(BufferType eType, std::uint64_t nValues);

// Copies values with conversion between strided buffers. Strides count values from one copied value to the next of the
// same channel (3 walks one channel of a three-channel pixel-interleaved buffer); `nPixels` runs of `nChannels`
// adjacent values are copied. Buffers do not overlap. Integers saturate; reals go to integers rounded half to even and
// saturated, NaN to 0; integers go to reals rounded to nearest; 64R beyond 32R becomes infinity; complex to real keeps
// the real part; real to complex sets imaginary 0; 64-bit integers never pass through double on the way to each other.
// Throws ParameterException for an unknown type. Any thread, and nothing is allocated. Nothing need be aligned.
// Example: the second channel of 3 in 16U as reals: CopyData(p + 2, eBT_16U, 3, poReals, eBT_32R, 1, nPixels);
KRV_TOOLKIT_API void CopyData(const void* pSource, BufferType eSource, std::uint64_t nSourceStride, void* pTarget,
                              BufferType eTarget, std::uint64_t nTargetStride, std::uint64_t nPixels,
                              unsigned int nChannels = 1);

} // namespace krv::raster
