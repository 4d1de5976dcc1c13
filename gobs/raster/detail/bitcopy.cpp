#include "gobs/raster/detail/bitcopy.h"

#include <algorithm>

namespace krv::gobs::detail
{

namespace
{

// Up to 8 bits at the top of the result; reads no byte that holds none of them.
unsigned int LoadBits(const unsigned char* pSource, std::uint64_t nSource, unsigned int nCount)
{
    const unsigned int nShift = nSource % 8;
    unsigned int nValue = static_cast<unsigned int>(pSource[nSource / 8]) << 8;
    if (nShift + nCount > 8)
        nValue |= pSource[nSource / 8 + 1];
    return (nValue << nShift >> 8) & 0xFF;
}

void StoreBits(unsigned char* pTarget, std::uint64_t nTarget, unsigned int nCount, unsigned int nValue)
{
    const unsigned int nShift = nTarget % 8;
    const unsigned int nKeep = ~((0xFFu << (8 - nCount) & 0xFF) >> nShift);
    unsigned char& nByte = pTarget[nTarget / 8];
    nByte = static_cast<unsigned char>((nByte & nKeep) | ((nValue >> nShift) & ~nKeep));
}

template <typename FLoad>
void Store(unsigned char* pTarget, std::uint64_t nTarget, std::uint64_t nCount, FLoad Load)
{
    for (std::uint64_t nDone = 0; nDone < nCount;)
    {
        const auto nStep =
            static_cast<unsigned int>(std::min<std::uint64_t>(8 - (nTarget + nDone) % 8, nCount - nDone));
        StoreBits(pTarget, nTarget + nDone, nStep, Load(nDone, nStep));
        nDone += nStep;
    }
}

} // namespace

void CopyBits(const unsigned char* pSource, std::uint64_t nSource, unsigned char* pTarget, std::uint64_t nTarget,
              std::uint64_t nCount)
{
    Store(pTarget, nTarget, nCount,
          [=](std::uint64_t nDone, unsigned int nStep) { return LoadBits(pSource, nSource + nDone, nStep); });
}

void ClearBits(unsigned char* pTarget, std::uint64_t nTarget, std::uint64_t nCount)
{
    Store(pTarget, nTarget, nCount, [](std::uint64_t, unsigned int) { return 0u; });
}

} // namespace krv::gobs::detail
