#pragma once

#include <cstddef>
#include <cstdint>

namespace krv::plugins::codec
{

// CRC-32 as zlib and PNG have it, of bytes that follow those whose checksum is nBefore; 0 for none.
// Example, two pieces: Checksum(Checksum(0, pFirst, nFirst), pSecond, nSecond).
std::uint32_t Checksum(std::uint32_t nBefore, const void* pBytes, std::size_t nBytes);
// The same of rows that lie nPitch bytes apart.
// What lies between the rows takes no part.
std::uint32_t Checksum(const unsigned char* pRows, std::size_t nPitch, std::size_t nRowBytes, std::size_t nRows);

} // namespace krv::plugins::codec
