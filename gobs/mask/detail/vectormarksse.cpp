#include "gobs/mask/detail/vectormark.h"

#if defined(KRV_VECTOR_MASKS)
#include "gobs/mask/detail/vectormatch.h"

#include <cstdint>
#include <vector>

namespace krv::gobs::detail
{

namespace
{

// Any number of channels: the comparison of a group passes through a buffer, of which the bytes of each pixel are then
// looked at.
template <class Sample, bool WithNaN>
std::size_t MarkMany(const unsigned char* pPixels, std::size_t nPixels, const MarkPattern& oPattern,
                     unsigned char* pBits)
{
    const std::size_t nChannels = oPattern.mnChannels;
    const std::size_t nWhole = nChannels / 16 * 16;
    std::vector<unsigned char> oBytes(16 * nChannels + 16);
    alignas(16) unsigned char oRest[16] = {};
    std::memset(oRest, 0xFF, nChannels - nWhole);
    for (std::size_t nGroup = 0; nGroup < nPixels / 16; ++nGroup)
    {
        for (std::size_t k = 0; k < nChannels; ++k)
            simd::Store(oBytes.data() + 16 * k, Compare<SseOps, Sample, WithNaN>(pPixels, 0, k, oPattern));
        unsigned int nBits = 0;
        for (unsigned int nPixel = 0; nPixel < 16; ++nPixel)
        {
            const unsigned char* pBytes = oBytes.data() + nPixel * nChannels;
            SseOps::Vector oAny = SseOps::Broadcast(pBytes + nWhole) & SseOps::Broadcast(oRest);
            for (std::size_t n = 0; n < nWhole; n += 16)
                oAny |= SseOps::Broadcast(pBytes + n);
            nBits = nBits << 1 | (simd::IsZero(oAny) ? 1u : 0u);
        }
        nBits ^= oPattern.mbInvert ? ~0u : 0u;
        pBits[2 * nGroup] = static_cast<unsigned char>(nBits >> 8);
        pBits[2 * nGroup + 1] = static_cast<unsigned char>(nBits);
        pPixels += 16 * nChannels * sizeof(Sample);
    }
    return nPixels / 16 * 16;
}

bool IsFew(std::size_t nChannels)
{
    return nChannels <= 4 || nChannels == 8;
}

} // namespace

template <class Sample>
std::size_t MarkBySse(const unsigned char* pPixels, std::size_t nPixels, const MarkPattern& oPattern,
                      unsigned char* pBits)
{
    if (IsFew(oPattern.mnChannels))
        return MarkAnyNaN<SseOps, Sample>(pPixels, nPixels, oPattern, pBits);
    if (oPattern.mpNaNs != nullptr)
        return MarkMany<Sample, true>(pPixels, nPixels, oPattern, pBits);
    return MarkMany<Sample, false>(pPixels, nPixels, oPattern, pBits);
}

template std::size_t MarkBySse<std::uint8_t>(const unsigned char*, std::size_t, const MarkPattern&, unsigned char*);
template std::size_t MarkBySse<std::uint16_t>(const unsigned char*, std::size_t, const MarkPattern&, unsigned char*);
template std::size_t MarkBySse<std::uint32_t>(const unsigned char*, std::size_t, const MarkPattern&, unsigned char*);
template std::size_t MarkBySse<std::uint64_t>(const unsigned char*, std::size_t, const MarkPattern&, unsigned char*);
template std::size_t MarkBySse<float>(const unsigned char*, std::size_t, const MarkPattern&, unsigned char*);
template std::size_t MarkBySse<double>(const unsigned char*, std::size_t, const MarkPattern&, unsigned char*);
template std::size_t MarkBySse<Complex<float>>(const unsigned char*, std::size_t, const MarkPattern&, unsigned char*);
template std::size_t MarkBySse<Complex<double>>(const unsigned char*, std::size_t, const MarkPattern&, unsigned char*);

} // namespace krv::gobs::detail
#endif
