#include "gobs/pct/detail/colourkernels.h"

#include "toolkit/simd/processor.h"

#include <cstring>

namespace krv::gobs::detail
{

namespace
{

template <class Value>
std::size_t At(const unsigned char* pValues, std::size_t n)
{
    Value nValue;
    std::memcpy(&nValue, pValues + n * sizeof(Value), sizeof(Value));
    return nValue;
}

template <class Value>
void WithAlpha(const Colour* pList, const unsigned char* pValues, std::size_t nValues, unsigned char* pColours)
{
    for (std::size_t n = 0; n < nValues; ++n)
        std::memcpy(pColours + 4 * n, pList + At<Value>(pValues, n), 4);
}

// Each colour is stored with its alpha, which the next one covers; the last one without.
template <class Value>
void WithoutAlpha(const Colour* pList, const unsigned char* pValues, std::size_t nValues, unsigned char* pColours)
{
    if (nValues == 0)
        return;
    for (std::size_t n = 0; n + 1 < nValues; ++n)
        std::memcpy(pColours + 3 * n, pList + At<Value>(pValues, n), 4);
    std::memcpy(pColours + 3 * (nValues - 1), pList + At<Value>(pValues, nValues - 1), 3);
}

} // namespace

ColourLoop FindColourLoop(std::size_t nValueBytes, bool bAlpha)
{
#if defined(__x86_64__)
    if (nValueBytes == 1 && krv::simd::RunsAvx512())
        return FindAvx512ColourLoop(bAlpha);
#endif
    if (nValueBytes == 1)
        return bAlpha ? WithAlpha<std::uint8_t> : WithoutAlpha<std::uint8_t>;
    return bAlpha ? WithAlpha<std::uint16_t> : WithoutAlpha<std::uint16_t>;
}

} // namespace krv::gobs::detail
