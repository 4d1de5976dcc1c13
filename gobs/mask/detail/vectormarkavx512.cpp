#include "gobs/mask/detail/vectormark.h"

#if defined(KRV_VECTOR_MASKS)
#if !defined(__AVX512VBMI__)
#error "This file is compiled for AVX-512 alone; the caller asks the processor first."
#endif
#include "gobs/raster/complex.h"
#include "toolkit/simd/vectors.h"

#include <cstdint>
#include <cstring>
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

    // As lanes of T.
    template <typename T>
    simd::Full<T> Get(std::size_t nVector) const
    {
        return simd::Load<simd::Full<T>>(moBytes + 64 * nVector);
    }
};

// A bit for each of 64 / N pixels whose N bytes are all zero.
template <unsigned int N>
std::uint64_t ZeroPixels(simd::Full<std::uint8_t> oBytes)
{
    using Pixel = std::conditional_t<N == 2, std::uint16_t, std::conditional_t<N == 4, std::uint32_t, std::uint64_t>>;
    return simd::ZeroBits(simd::As<Pixel>(oBytes));
}

// A bit for each of 64 pixels of three samples whose bits in three words are all zero.
std::uint64_t ZeroTriples(const std::uint64_t* pWords)
{
    constexpr std::uint64_t THIRDS = 0x9249249249249249ull;
    const std::uint64_t nNext[3] = {pWords[1], pWords[2], 0};
    std::uint64_t nAny[3];
    KRV_UNROLL
    for (int n = 0; n < 3; ++n)
        nAny[n] = pWords[n] | pWords[n] >> 1 | pWords[n] >> 2 | nNext[n] << 63 | nNext[n] << 62;
    return ~(simd::GatherBits(nAny[0], THIRDS) | simd::GatherBits(nAny[1], THIRDS << 2) << 22 |
             simd::GatherBits(nAny[2], THIRDS << 1 & ~(1ull << 63)) << 43);
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
                const auto oPixels = simd::Load<simd::Full<Sample>>(pPixels + 64 * nAt);
                std::uint64_t nEqual = simd::EqualBits(oPixels, oValues.template Get<Sample>(nAt));
                if constexpr (WithNaN)
                    nEqual |= simd::NaNBits(simd::TopBits(oNaNs.template Get<Sample>(nAt)), oPixels);
                nWords[n] |= nEqual << (64 / SIZE * k);
            }
            if constexpr (N == 1)
                nMarked = nWords[0];
            else
            {
                const auto oBytes = (simd::BytesOfBits(nWords[n]) ^ oExpected.template Get<std::uint8_t>(n)) &
                                    oUsed.template Get<std::uint8_t>(n);
                if constexpr (N == 3)
                    nWords[n] = simd::TopBits(oBytes);
                else
                    nMarked |= ZeroPixels<N>(oBytes) << (64 / N * n);
            }
        }
        if constexpr (N == 3)
            nMarked = ZeroTriples(nWords);
        if constexpr (N != 1)
            nMarked ^= nInvert;
        simd::Store(pBits, simd::TurnBits(nMarked));
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
