#if defined(__x86_64__)
#if !defined(__AVX512VBMI__)
#error "This file is compiled for AVX-512 with byte shuffles alone; the caller asks the processor first."
#endif
#include "gobs/pct/detail/colourkernels.h"

#include <immintrin.h>

namespace krv::gobs::detail
{

namespace
{

// The 256 values of one part of the colours.
struct PartList
{
    PartList(const Colour* pList, std::size_t nPart)
    {
        alignas(64) std::uint8_t aBytes[256];
        for (std::size_t n = 0; n < 256; ++n)
            aBytes[n] = reinterpret_cast<const std::uint8_t*>(pList + n)[nPart];
        for (std::size_t n = 0; n < 4; ++n)
            maQuarters[n] = _mm512_load_si512(aBytes + 64 * n);
    }

    __m512i Find(__m512i oValues) const
    {
        const __m512i oLow = _mm512_permutex2var_epi8(maQuarters[0], oValues, maQuarters[1]);
        const __m512i oHigh = _mm512_permutex2var_epi8(maQuarters[2], oValues, maQuarters[3]);
        return _mm512_mask_blend_epi8(_mm512_movepi8_mask(oValues), oLow, oHigh);
    }

    __m512i maQuarters[4];
};

// Where the bytes of vector nVector of 192 interleaved ones come from: of red and green as one list of 128 bytes, and
// which of them are blue.
struct Interleaving
{
    explicit Interleaving(unsigned int nVector)
    {
        alignas(64) std::uint8_t aFirst[64], aBlue[64];
        for (unsigned int n = 0; n < 64; ++n)
        {
            const unsigned int nByte = 64 * nVector + n;
            const unsigned int nPixel = nByte / 3;
            aFirst[n] = static_cast<std::uint8_t>(nPixel + (nByte % 3 == 1 ? 64 : 0));
            aBlue[n] = static_cast<std::uint8_t>(nPixel);
            moIsBlue |= __mmask64{nByte % 3 == 2} << n;
        }
        moFirst = _mm512_load_si512(aFirst);
        moBlue = _mm512_load_si512(aBlue);
    }

    __m512i Take(__m512i oRed, __m512i oGreen, __m512i oBlue) const
    {
        const __m512i oBoth = _mm512_permutex2var_epi8(oRed, moFirst, oGreen);
        return _mm512_mask_permutexvar_epi8(oBoth, moIsBlue, moBlue, oBlue);
    }

    __m512i moFirst;
    __m512i moBlue;
    __mmask64 moIsBlue = 0;
};

__mmask64 FirstBytes(std::size_t nBytes)
{
    return nBytes >= 64 ? ~__mmask64{0} : (__mmask64{1} << nBytes) - 1;
}

void StoreBytes(unsigned char* p, __m512i oBytes, std::size_t nFrom, std::size_t nEnd)
{
    if (nFrom < nEnd)
        _mm512_mask_storeu_epi8(p + nFrom, FirstBytes(nEnd - nFrom), oBytes);
}

void WithoutAlpha(const Colour* pList, const unsigned char* pValues, std::size_t nValues, unsigned char* pColours)
{
    const PartList oRed(pList, 0), oGreen(pList, 1), oBlue(pList, 2);
    const Interleaving aVectors[] = {Interleaving(0), Interleaving(1), Interleaving(2)};
    for (std::size_t n = 0; n < nValues; n += 64)
    {
        const std::size_t nCount = nValues - n < 64 ? nValues - n : 64;
        const __m512i oValues = _mm512_maskz_loadu_epi8(FirstBytes(nCount), pValues + n);
        const __m512i r = oRed.Find(oValues), g = oGreen.Find(oValues), b = oBlue.Find(oValues);
        unsigned char* const p = pColours + 3 * n;
        for (unsigned int nVector = 0; nVector < 3; ++nVector)
            StoreBytes(p, aVectors[nVector].Take(r, g, b), std::size_t{64} * nVector, 3 * nCount);
    }
}

void WithAlpha(const Colour* pList, const unsigned char* pValues, std::size_t nValues, unsigned char* pColours)
{
    for (std::size_t n = 0; n < nValues; n += 16)
    {
        const auto oMask = static_cast<__mmask16>(FirstBytes(nValues - n));
        const __m512i oIndices = _mm512_cvtepu8_epi32(_mm_maskz_loadu_epi8(oMask, pValues + n));
        const __m512i oColours = _mm512_mask_i32gather_epi32(_mm512_setzero_si512(), oMask, oIndices, pList, 4);
        _mm512_mask_storeu_epi32(pColours + 4 * n, oMask, oColours);
    }
}

} // namespace

ColourLoop FindAvx512ColourLoop(bool bAlpha)
{
    return bAlpha ? WithAlpha : WithoutAlpha;
}

} // namespace krv::gobs::detail
#endif
