#pragma once

#include <cstdint>
#include <cstring>

namespace krv::benchmarks
{

// Sets bits nFrom to nTo, both included, the most significant of each byte first.
inline void SetBitRun(unsigned char* pBits, std::uint64_t nFrom, std::uint64_t nTo)
{
    const std::uint64_t nFirst = nFrom / 8, nLast = nTo / 8;
    const unsigned int nHead = 0xFFu >> (nFrom % 8), nTail = 0xFF00u >> (nTo % 8 + 1) & 0xFFu;
    if (nFirst == nLast)
    {
        pBits[nFirst] |= static_cast<unsigned char>(nHead & nTail);
        return;
    }
    pBits[nFirst] |= static_cast<unsigned char>(nHead);
    if (nFirst + 1 < nLast)
        std::memset(pBits + nFirst + 1, 0xFF, nLast - nFirst - 1);
    pBits[nLast] |= static_cast<unsigned char>(nTail);
}

} // namespace krv::benchmarks
