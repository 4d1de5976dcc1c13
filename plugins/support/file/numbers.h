#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

namespace krv::plugins::support
{

// Whole numbers of 1 to 8 bytes in the byte order of a file.
// pBytes: nBytes bytes, 1 to 8, at any address. The number is not negative: signs are the caller's.
inline std::uint64_t ReadNumber(const unsigned char* pBytes, std::size_t nBytes, bool bBigEndian)
{
    std::uint64_t nValue = 0;
    for (std::size_t nAt = 0; nAt < nBytes; ++nAt)
        nValue = nValue << 8 | pBytes[bBigEndian ? nAt : nBytes - 1 - nAt];
    return nValue;
}

// Adds nBytes bytes behind the others; what of nValue does not fit is cut off.
inline void AppendNumber(std::vector<unsigned char>& oBytes, std::uint64_t nValue, std::size_t nBytes, bool bBigEndian)
{
    for (std::size_t nAt = 0; nAt < nBytes; ++nAt)
        oBytes.push_back(static_cast<unsigned char>(nValue >> 8 * (bBigEndian ? nBytes - 1 - nAt : nAt)));
}

} // namespace krv::plugins::support
