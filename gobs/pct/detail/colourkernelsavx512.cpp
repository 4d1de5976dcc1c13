#if defined(__x86_64__)
#if !defined(__AVX512VBMI__)
#error "This file is compiled for AVX-512 with byte shuffles alone; the caller asks the processor first."
#endif
#include "gobs/pct/detail/colourkernels.h"
#include "toolkit/simd/vectors.h"

#include <cstring>

namespace krv::gobs::detail
{

namespace
{

using Bytes = simd::Full<std::uint8_t>;

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
            moQuarters[n] = simd::Load<Bytes>(aBytes + 64 * n);
    }

    Bytes Find(Bytes oValues) const
    {
        const Bytes oLow = simd::PickOfTwo(moQuarters[0], oValues, moQuarters[1]);
        const Bytes oHigh = simd::PickOfTwo(moQuarters[2], oValues, moQuarters[3]);
        return simd::SelectByBits(simd::TopBits(oValues), oHigh, oLow);
    }

    Bytes moQuarters[4];
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
            moIsLater |= std::uint64_t{nPart >= 2} << n;
        }
        moIndices = simd::Load<Bytes>(aIndices);
    }

    Bytes Take(const Bytes* pParts) const
    {
        const Bytes oFirst = simd::PickOfTwo(pParts[0], moIndices, pParts[1]);
        if constexpr (PARTS == 3)
            return simd::PickInto(oFirst, moIsLater, moIndices, pParts[2]);
        const Bytes oLater = simd::PickOfTwo(pParts[2], moIndices, pParts[PARTS - 1]);
        return simd::SelectByBits(moIsLater, oLater, oFirst);
    }

    Bytes moIndices;
    std::uint64_t moIsLater = 0;
};

template <unsigned int PARTS>
void Run(const Colour* pList, const unsigned char* pValues, std::size_t nValues, unsigned char* pColours)
{
    const PartList aLists[] = {PartList(pList, 0), PartList(pList, 1), PartList(pList, 2), PartList(pList, 3)};
    const Interleaving<PARTS> aVectors[] = {Interleaving<PARTS>(0), Interleaving<PARTS>(1), Interleaving<PARTS>(2),
                                            Interleaving<PARTS>(3)};
    const auto Make = [&](const unsigned char* pFrom, unsigned char* pTo)
    {
        const Bytes oValues = simd::Load<Bytes>(pFrom);
        Bytes aParts[PARTS];
        for (unsigned int n = 0; n < PARTS; ++n)
            aParts[n] = aLists[n].Find(oValues);
        for (unsigned int n = 0; n < PARTS; ++n)
            simd::Store(pTo + 64 * n, aVectors[n].Take(aParts));
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
