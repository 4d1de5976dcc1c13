#pragma once

#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>

namespace krv::simd
{

// Words and vectors from and to memory of any alignment. Load and Store are never calls: of a vector they are code for
// the instruction set of the file that uses them, which the linker must not share with another.

// Files keep their numbers at any address; a cast of the pointer would be undefined. Compiles to one instruction.
// T: a type that can be copied by its bytes. sizeof(T) bytes are read; whether they are there is the caller's to check.
template <typename T>
[[gnu::always_inline]] inline T Load(const void* source)
{
    T nValue;
    std::memcpy(&nValue, source, sizeof(T));
    return nValue;
}

// The counterpart: sizeof(T) bytes are written.
template <typename T>
[[gnu::always_inline]] inline void Store(void* destination, T nValue)
{
    std::memcpy(destination, &nValue, sizeof(T));
}

// The bytes of a number in the other order. One byte stays as it is, so that templates need no case for it.
inline std::uint8_t Swap(std::uint8_t nValue)
{
    return nValue;
}
inline std::uint16_t Swap(std::uint16_t nValue)
{
    return __builtin_bswap16(nValue);
}
inline std::uint32_t Swap(std::uint32_t nValue)
{
    return __builtin_bswap32(nValue);
}
inline std::uint64_t Swap(std::uint64_t nValue)
{
    return __builtin_bswap64(nValue);
}

// Known when compiling, so that the branches below cost nothing.
constexpr bool LITTLE = std::endian::native == std::endian::little;

// A number as a big-endian file holds it ("MM" of TIFF, the boxes of JPEG 2000). T: an unsigned integer of 1 to 8
// bytes.
template <typename T>
inline T LoadBigEndian(const unsigned char* source)
{
    return LITTLE ? Swap(Load<T>(source)) : Load<T>(source);
}

// The same of little-endian files ("II" of TIFF, native files).
template <typename T>
inline T LoadLittleEndian(const unsigned char* source)
{
    return LITTLE ? Load<T>(source) : Swap(Load<T>(source));
}

// Signed numbers and reals are taken as the unsigned integer of their bits (std::bit_cast) by the caller.
template <typename T>
inline void StoreBigEndian(unsigned char* destination, T nValue)
{
    Store(destination, LITTLE ? Swap(nValue) : nValue);
}

template <typename T>
inline void StoreLittleEndian(unsigned char* destination, T nValue)
{
    Store(destination, LITTLE ? nValue : Swap(nValue));
}

// Sixteen bytes at once. The two places may overlap: all are read before any is written.
// Faster than memcpy of fewer bytes where 16 may be touched: rows with that much room behind them.
inline void Copy16(unsigned char* destination, const unsigned char* source)
{
    unsigned char aBytes[16];
    std::memcpy(aBytes, source, 16);
    std::memcpy(destination, aBytes, 16);
}

} // namespace krv::simd
