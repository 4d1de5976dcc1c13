#if defined(__x86_64__)
#if !defined(__AVX512VBMI__)
#error "This file is compiled for AVX-512 with byte shuffles alone; the caller asks the processor first."
#endif
#include "gobs/pct/detail/colourkernels.h"

#include <immintrin.h>

#include <cstring>

namespace krv::gobs::detail
{

namespace
{

// The 256 values of one part of the colours, in four registers, found for 64 indices at once. An instruction picks from
// two of them by the lower seven bits of an index; the eighth bit chooses between two such results.
//     index       00..3F      40..7F      80..BF      C0..FF
//     found in    quarters 0 and 1: low   quarters 2 and 3: high
//     result      low where the highest bit of the index is clear, else high
struct PartList
{
    PartList(const Colour* pList, std::size_t nPart)
    {
        alignas(64) std::uint8_t aBytes[256];
        for (std::size_t n = 0; n < 256; ++n)
            aBytes[n] = reinterpret_cast<const std::uint8_t*>(pList + n)[nPart];
        for (std::size_t n = 0; n < 4; ++n)
            moQuarters[n] = _mm512_load_si512(aBytes + 64 * n);
    }

    __m512i Find(__m512i oValues) const
    {
        const __m512i oLow = _mm512_permutex2var_epi8(moQuarters[0], oValues, moQuarters[1]);
        const __m512i oHigh = _mm512_permutex2var_epi8(moQuarters[2], oValues, moQuarters[3]);
        return _mm512_mask_blend_epi8(_mm512_movepi8_mask(oValues), oLow, oHigh);
    }

    __m512i moQuarters[4];
};

// Where the bytes of a vector of interleaved parts come from, two parts at a time: of the first and the second, and
// which bytes are of the third and fourth.
template <unsigned int PARTS>
struct Interleaving
{
    explicit Interleaving(unsigned int nVector)
    {
        alignas(64) std::uint8_t aIndices[64];
        for (unsigned int n = 0; n < 64; ++n)
        {
            const unsigned int nByte = 64 * nVector + n, nPart = nByte % PARTS;
            aIndices[n] = static_cast<std::uint8_t>(nByte / PARTS + (nPart % 2 == 1 ? 64 : 0));
            moIsLater |= __mmask64{nPart >= 2} << n;
        }
        moIndices = _mm512_load_si512(aIndices);
    }

    __m512i Take(const __m512i* pParts) const
    {
        const __m512i oFirst = _mm512_permutex2var_epi8(pParts[0], moIndices, pParts[1]);
        if constexpr (PARTS == 3)
            return _mm512_mask_permutexvar_epi8(oFirst, moIsLater, moIndices, pParts[2]);
        const __m512i oLater = _mm512_permutex2var_epi8(pParts[2], moIndices, pParts[PARTS - 1]);
        return _mm512_mask_blend_epi8(moIsLater, oFirst, oLater);
    }

    __m512i moIndices;
    __mmask64 moIsLater = 0;
};

template <unsigned int PARTS>
void Run(const Colour* pList, const unsigned char* pValues, std::size_t nValues, unsigned char* pColours)
{
    const PartList aLists[] = {PartList(pList, 0), PartList(pList, 1), PartList(pList, 2), PartList(pList, 3)};
    const Interleaving<PARTS> aVectors[] = {Interleaving<PARTS>(0), Interleaving<PARTS>(1), Interleaving<PARTS>(2),
                                            Interleaving<PARTS>(3)};
    const auto Make = [&](const unsigned char* pFrom, unsigned char* pTo)
    {
        const __m512i oValues = _mm512_loadu_si512(pFrom);
        __m512i aParts[PARTS];
        for (unsigned int n = 0; n < PARTS; ++n)
            aParts[n] = aLists[n].Find(oValues);
        for (unsigned int n = 0; n < PARTS; ++n)
            _mm512_storeu_si512(pTo + 64 * n, aVectors[n].Take(aParts));
    };
    std::size_t n = 0;
    for (; n + 64 <= nValues; n += 64)
        Make(pValues + n, pColours + PARTS * n);
    if (n == nValues)
        return;
    unsigned char aValues[64] = {}, aColours[64 * PARTS];
    std::memcpy(aValues, pValues + n, nValues - n);
    Make(aValues, aColours);
    std::memcpy(pColours + PARTS * n, aColours, PARTS * (nValues - n));
}

} // namespace

ColourLoop FindAvx512ColourLoop(bool bAlpha)
{
    return bAlpha ? Run<4> : Run<3>;
}

} // namespace krv::gobs::detail
#endif
