#include "gobs/mask/detail/vectormark.h"

#if defined(KRV_VECTOR_MASKS)
#if !defined(__AVX512VBMI__)
#error "This file is compiled for AVX-512 alone; the caller asks the processor first."
#endif
#include "gobs/raster/complex.h"

#include <cstdint>
#include <cstring>
#include <immintrin.h>
#include <type_traits>

// Words stay in registers only when these short loops are unrolled.
#define KRV_UNROLL _Pragma("GCC unroll 8")

// A comparison gives a bit for each sample here, so 64 samples make a word. Of two channels:
//     bits    a0 b0 a1 b1 ..   which samples equal their values
//     bytes   FF 00 FF FF ..   xor what is expected, and what is used: 0 where the rule is kept
//     pixels  0     1     ..   a bit for each pixel whose two bytes are all zero
namespace krv::gobs::detail
{

namespace
{

constexpr std::size_t TAKEN = 64; // pixels

// The pattern of 16 pixels repeated, whole vectors of it.
template <std::size_t BYTES>
struct Repeated
{
    alignas(64) unsigned char moBytes[4 * BYTES];

    explicit Repeated(const unsigned char* pPattern)
    {
        for (std::size_t n = 0; n < 4; ++n)
            std::memcpy(moBytes + n * BYTES, pPattern, BYTES);
    }

    __m512i Get(std::size_t nVector) const { return _mm512_load_si512(moBytes + 64 * nVector); }
};

template <class Sample>
std::uint64_t EqualBits(__m512i a, __m512i b)
{
    if constexpr (std::is_same_v<Sample, float>)
        return _mm512_cmp_ps_mask(_mm512_castsi512_ps(a), _mm512_castsi512_ps(b), _CMP_EQ_OQ);
    else if constexpr (std::is_same_v<Sample, double>)
        return _mm512_cmp_pd_mask(_mm512_castsi512_pd(a), _mm512_castsi512_pd(b), _CMP_EQ_OQ);
    else if constexpr (sizeof(Sample) == 1)
        return _mm512_cmpeq_epi8_mask(a, b);
    else if constexpr (sizeof(Sample) == 2)
        return _mm512_cmpeq_epi16_mask(a, b);
    else if constexpr (sizeof(Sample) == 4)
        return _mm512_cmpeq_epi32_mask(a, b);
    else
        return _mm512_cmpeq_epi64_mask(a, b);
}

// Of the samples whose lanes are all ones in oNaNs.
template <class Sample>
std::uint64_t NaNBits(__m512i a, __m512i oNaNs)
{
    if constexpr (std::is_same_v<Sample, float>)
        return _mm512_mask_cmp_ps_mask(_mm512_movepi32_mask(oNaNs), _mm512_castsi512_ps(a), _mm512_castsi512_ps(a),
                                       _CMP_UNORD_Q);
    else
        return _mm512_mask_cmp_pd_mask(_mm512_movepi64_mask(oNaNs), _mm512_castsi512_pd(a), _mm512_castsi512_pd(a),
                                       _CMP_UNORD_Q);
}

// A bit for each of 64 / N pixels whose N bytes are all zero.
template <unsigned int N>
std::uint64_t ZeroPixels(__m512i oBytes)
{
    if constexpr (N == 2)
        return _mm512_testn_epi16_mask(oBytes, oBytes);
    else if constexpr (N == 4)
        return _mm512_testn_epi32_mask(oBytes, oBytes);
    else
        return _mm512_testn_epi64_mask(oBytes, oBytes);
}

// The same of three words, a bit a sample, that hold 64 pixels of three samples.
std::uint64_t ZeroTriples(const std::uint64_t* pWords)
{
    constexpr std::uint64_t THIRDS = 0x9249249249249249ull;
    const std::uint64_t nNext[3] = {pWords[1], pWords[2], 0};
    std::uint64_t nAny[3];
    KRV_UNROLL
    for (int n = 0; n < 3; ++n)
        nAny[n] = pWords[n] | pWords[n] >> 1 | pWords[n] >> 2 | nNext[n] << 63 | nNext[n] << 62;
    return ~(_pext_u64(nAny[0], THIRDS) | _pext_u64(nAny[1], THIRDS << 2) << 22 |
             _pext_u64(nAny[2], THIRDS << 1 & ~(1ull << 63)) << 43);
}

template <class Sample, bool WithNaN, unsigned int N>
std::size_t MarkFew(const unsigned char* pPixels, std::size_t nPixels, const MarkPattern& oPattern,
                    unsigned char* pBits)
{
    constexpr std::size_t SIZE = sizeof(Sample);
    const Repeated<16 * N * SIZE> oValues(oPattern.mpValues);
    const Repeated<16 * N * SIZE> oNaNs(WithNaN ? oPattern.mpNaNs : oPattern.mpValues);
    const Repeated<16 * N> oUsed(oPattern.mpUsed);
    const Repeated<16 * N> oExpected(oPattern.mpExpected);
    const std::uint64_t nInvert = oPattern.mbInvert ? ~0ull : 0;
    for (std::size_t nPixel = 0; nPixel + TAKEN <= nPixels; nPixel += TAKEN)
    {
        std::uint64_t nWords[N] = {};
        std::uint64_t nMarked = 0;
        KRV_UNROLL
        for (std::size_t n = 0; n < N; ++n)
        {
            KRV_UNROLL
            for (std::size_t k = 0; k < SIZE; ++k)
            {
                const std::size_t nAt = n * SIZE + k;
                const __m512i oPixels = _mm512_loadu_si512(pPixels + 64 * nAt);
                std::uint64_t nEqual = EqualBits<Sample>(oPixels, oValues.Get(nAt));
                if constexpr (WithNaN)
                    nEqual |= NaNBits<Sample>(oPixels, oNaNs.Get(nAt));
                nWords[n] |= nEqual << (64 / SIZE * k);
            }
            if constexpr (N == 1)
                nMarked = nWords[0];
            else
            {
                const __m512i oBytes =
                    _mm512_and_si512(_mm512_xor_si512(_mm512_movm_epi8(nWords[n]), oExpected.Get(n)), oUsed.Get(n));
                if constexpr (N == 3)
                    nWords[n] = _mm512_movepi8_mask(oBytes);
                else
                    nMarked |= ZeroPixels<N>(oBytes) << (64 / N * n);
            }
        }
        if constexpr (N == 3)
            nMarked = ZeroTriples(nWords);
        if constexpr (N != 1)
            nMarked ^= nInvert;
        // The product with this matrix turns the bits of each byte round.
        const __m128i oTurned =
            _mm_gf2p8affine_epi64_epi8(_mm_cvtsi64_si128(static_cast<long long>(nMarked)),
                                       _mm_set1_epi64x(static_cast<long long>(0x8040201008040201ull)), 0);
        _mm_storel_epi64(reinterpret_cast<__m128i*>(pBits), oTurned);
        pPixels += TAKEN * N * SIZE;
        pBits += TAKEN / 8;
    }
    return nPixels / TAKEN * TAKEN;
}

template <class Sample, bool WithNaN>
std::size_t MarkChannels(const unsigned char* pPixels, std::size_t nPixels, const MarkPattern& oPattern,
                         unsigned char* pBits)
{
    switch (oPattern.mnChannels)
    {
    case 1:
        return MarkFew<Sample, WithNaN, 1>(pPixels, nPixels, oPattern, pBits);
    case 2:
        return MarkFew<Sample, WithNaN, 2>(pPixels, nPixels, oPattern, pBits);
    case 3:
        return MarkFew<Sample, WithNaN, 3>(pPixels, nPixels, oPattern, pBits);
    case 4:
        return MarkFew<Sample, WithNaN, 4>(pPixels, nPixels, oPattern, pBits);
    case 8:
        return MarkFew<Sample, WithNaN, 8>(pPixels, nPixels, oPattern, pBits);
    default:
        return 0;
    }
}

} // namespace

template <class Sample>
std::size_t MarkByAvx512(const unsigned char* pPixels, std::size_t nPixels, const MarkPattern& oPattern,
                         unsigned char* pBits)
{
    if constexpr (!std::is_arithmetic_v<Sample>)
        return 0;
    else
    {
        if constexpr (std::is_floating_point_v<Sample>)
        {
            if (oPattern.mpNaNs != nullptr)
                return MarkChannels<Sample, true>(pPixels, nPixels, oPattern, pBits);
        }
        return MarkChannels<Sample, false>(pPixels, nPixels, oPattern, pBits);
    }
}

template std::size_t MarkByAvx512<std::uint8_t>(const unsigned char*, std::size_t, const MarkPattern&, unsigned char*);
template std::size_t MarkByAvx512<std::uint16_t>(const unsigned char*, std::size_t, const MarkPattern&, unsigned char*);
template std::size_t MarkByAvx512<std::uint32_t>(const unsigned char*, std::size_t, const MarkPattern&, unsigned char*);
template std::size_t MarkByAvx512<std::uint64_t>(const unsigned char*, std::size_t, const MarkPattern&, unsigned char*);
template std::size_t MarkByAvx512<float>(const unsigned char*, std::size_t, const MarkPattern&, unsigned char*);
template std::size_t MarkByAvx512<double>(const unsigned char*, std::size_t, const MarkPattern&, unsigned char*);
template std::size_t MarkByAvx512<Complex<float>>(const unsigned char*, std::size_t, const MarkPattern&,
                                                  unsigned char*);
template std::size_t MarkByAvx512<Complex<double>>(const unsigned char*, std::size_t, const MarkPattern&,
                                                   unsigned char*);

} // namespace krv::gobs::detail
#endif
