#include "toolkit/raster/interleave.h"

#include "toolkit/raster/detail/shuffleplan.h"
#include "toolkit/simd/memoryaccess.h"
#include "toolkit/simd/vectors.h"

#include <algorithm>
#include <type_traits>

namespace krv::raster
{

namespace
{

using simd::Load;
using simd::Store;

constexpr std::size_t PIECE_BYTES = 8192; // of the destination, a quarter of the first-level cache

struct Sixteen
{
    std::uint64_t moParts[2];
};

// Calls oWork with a value of the unsigned type that has so many bytes.
template <typename Work>
void WithSampleType(std::size_t nSampleBytes, const Work& oWork)
{
    switch (nSampleBytes)
    {
    case 1:
        return oWork(std::uint8_t{});
    case 2:
        return oWork(std::uint16_t{});
    case 4:
        return oWork(std::uint32_t{});
    case 8:
        return oWork(std::uint64_t{});
    case 16:
        return oWork(Sixteen{});
    default:
        return;
    }
}

constexpr std::size_t COPY_BYTES = 1024;

// Longer copies are done by the processor's own string instruction, which is ten times slower and worse on some when
// the destination lies up to a cache line behind the source within a page.
void CopyRow(const unsigned char* source, unsigned char* destination, std::size_t nBytes)
{
    const auto nBehind =
        (reinterpret_cast<std::uintptr_t>(destination) - reinterpret_cast<std::uintptr_t>(source)) % 4096;
    if (nBehind > 0 && nBehind < 64)
        for (; nBytes > COPY_BYTES; nBytes -= COPY_BYTES, source += COPY_BYTES, destination += COPY_BYTES)
            std::memcpy(destination, source, COPY_BYTES);
    std::memcpy(destination, source, nBytes);
}

// Small samples of a plane, as many as fit eight bytes at a time. Returns the samples done.
template <typename T>
std::size_t SpreadWords(const unsigned char* plane, unsigned char* destination, std::size_t nTo, std::size_t nWidth)
{
    constexpr std::size_t SAMPLES = 8 / sizeof(T);
    std::size_t x = 0;
    for (; x + SAMPLES <= nWidth; x += SAMPLES)
    {
        const auto nWord = simd::LoadLittleEndian<std::uint64_t>(plane + x * sizeof(T));
        for (std::size_t k = 0; k < SAMPLES; ++k)
            simd::StoreLittleEndian(destination + (x + k) * nTo, static_cast<T>(nWord >> (k * 8 * sizeof(T))));
    }
    return x;
}

// One sample out of nFrom bytes to one in nTo bytes, over and over.
template <typename T>
void MoveRow(const unsigned char* source, std::size_t nFrom, unsigned char* destination, std::size_t nTo,
             std::size_t nWidth)
{
    std::size_t i = 0;
    if constexpr (sizeof(T) <= 2)
        i = nFrom == sizeof(T) ? SpreadWords<T>(source, destination, nTo, nWidth) : 0;
    for (; i < nWidth; ++i)
        Store(destination + i * nTo, Load<T>(source + i * nFrom));
}

template <typename T>
void MoveChannel(const unsigned char* source, std::size_t nSourcePitch, std::size_t nFrom, unsigned char* destination,
                 std::size_t nDestinationPitch, std::size_t nTo, const PixelArea& oArea)
{
    for (std::size_t i = 0; i < oArea.mnRows; ++i)
        MoveRow<T>(source + i * nSourcePitch, nFrom, destination + i * nDestinationPitch, nTo, oArea.mnWidth);
}

template <typename T>
void GatherRow(const unsigned char* source, std::size_t nSourceBytes, unsigned char* destination,
               const std::size_t* channels, std::size_t nChannels, std::size_t nWidth)
{
    if (nChannels == 1)
        return MoveRow<T>(source + channels[0] * sizeof(T), nSourceBytes, destination, sizeof(T), nWidth);
    for (std::size_t x = 0; x < nWidth; ++x)
        for (std::size_t k = 0; k < nChannels; ++k)
            Store(destination + (x * nChannels + k) * sizeof(T),
                  Load<T>(source + x * nSourceBytes + channels[k] * sizeof(T)));
}

template <typename T>
void GatherRows(const unsigned char* source, std::size_t nSourcePitch, std::size_t nSourceChannels,
                unsigned char* destination, std::size_t nDestinationPitch, const std::size_t* channels,
                std::size_t nChannels, const PixelArea& oArea)
{
    const detail::ShufflePlan oPlan(nSourceChannels, channels, nChannels, sizeof(T));
    const std::size_t nTurns = oPlan.IsUsable() ? oArea.mnWidth / oPlan.GetTurnPixels() : 0;
    const std::size_t nDone = nTurns * (16 / sizeof(T));
    for (std::size_t i = 0; i < oArea.mnRows; ++i, source += nSourcePitch, destination += nDestinationPitch)
    {
        if (nTurns > 0)
            oPlan.Run(source, destination, nTurns);
        GatherRow<T>(source + nDone * nSourceChannels * sizeof(T), nSourceChannels * sizeof(T),
                     destination + nDone * nChannels * sizeof(T), channels, nChannels, oArea.mnWidth - nDone);
    }
}

#if defined(KRV_VECTORS)
using simd::Block;
using simd::MixHigh;
using simd::MixLow;

template <std::size_t nBytes>
using Unsigned =
    std::conditional_t<nBytes == 2, std::uint16_t, std::conditional_t<nBytes == 4, std::uint32_t, std::uint64_t>>;

// 16 / sizeof(T) pixels of four channels, by two rounds of mixing: single samples, then pairs of them.
//     a  a0 a1 a2 a3 ..     a0 b0 a1 b1 ..
//     b  b0 b1 b2 b3 ..     c0 d0 c1 d1 ..     a0 b0 c0 d0 a1 b1 c1 d1 ..   vectors 0 and 1
//     c  c0 c1 c2 c3 ..  >  a8 b8 a9 b9 ..  >  a8 b8 c8 d8 a9 b9 c9 d9 ..   vectors 2 and 3
//     d  d0 d1 d2 d3 ..     c8 d8 c9 d9 ..     (of bytes; wider samples have fewer lanes)
template <typename T>
struct Quads
{
    Block moVectors[4];

    explicit Quads(const unsigned char* const* planes, std::size_t nOffset)
    {
        using Pair = Unsigned<2 * sizeof(T)>;
        const Block a = Load<Block>(planes[0] + nOffset), b = Load<Block>(planes[1] + nOffset);
        const Block c = Load<Block>(planes[2] + nOffset), d = Load<Block>(planes[3] + nOffset);
        const Block oLowAb = MixLow<T>(a, b), oHighAb = MixHigh<T>(a, b);
        const Block oLowCd = MixLow<T>(c, d), oHighCd = MixHigh<T>(c, d);
        moVectors[0] = MixLow<Pair>(oLowAb, oLowCd);
        moVectors[1] = MixHigh<Pair>(oLowAb, oLowCd);
        moVectors[2] = MixLow<Pair>(oHighAb, oHighCd);
        moVectors[3] = MixHigh<Pair>(oHighAb, oHighCd);
    }
};

// These work on 16 / sizeof(T) pixels at nOffset bytes into every plane.
template <typename T>
void MixTwo(const unsigned char* const* planes, std::size_t nOffset, unsigned char* destination, std::size_t)
{
    const Block a = Load<Block>(planes[0] + nOffset), b = Load<Block>(planes[1] + nOffset);
    Store(destination, MixLow<T>(a, b));
    Store(destination + 16, MixHigh<T>(a, b));
}

// What plane nPlane gives to vector nVector of three-channel pixels. Each of the three vectors is put together from one
// shuffle of each plane, with zeros where the others come:
//     plane 0   a0 .  .  a1 .  .  a2 ..
//     plane 1   .  b0 .  .  b1 .  .  ..    or    a0 b0 c0 a1 b1 c1 a2 ..
//     plane 2   .  .  c0 .  .  c1 .  ..
template <typename T, std::size_t nVector, std::size_t nPlane>
inline constexpr simd::Shuffle THIRD = simd::Shuffle::Make(
    [](std::size_t i)
    {
        const std::size_t nSample = (nVector * 16 + i) / sizeof(T);
        return nSample % 3 == nPlane ? nSample / 3 * sizeof(T) + i % sizeof(T) : 0x80;
    });

template <typename T>
void MixThree(const unsigned char* const* planes, std::size_t nOffset, unsigned char* destination, std::size_t)
{
    const Block a = Load<Block>(planes[0] + nOffset), b = Load<Block>(planes[1] + nOffset);
    const Block c = Load<Block>(planes[2] + nOffset);
    Store(destination, THIRD<T, 0, 0>(a) | THIRD<T, 0, 1>(b) | THIRD<T, 0, 2>(c));
    Store(destination + 16, THIRD<T, 1, 0>(a) | THIRD<T, 1, 1>(b) | THIRD<T, 1, 2>(c));
    Store(destination + 32, THIRD<T, 2, 0>(a) | THIRD<T, 2, 1>(b) | THIRD<T, 2, 2>(c));
}

template <typename T>
void MixFour(const unsigned char* const* planes, std::size_t nOffset, unsigned char* destination, std::size_t)
{
    const Quads<T> oQuads(planes, nOffset);
    for (std::size_t i = 0; i < 4; ++i)
        Store(destination + i * 16, oQuads.moVectors[i]);
}

template <typename T>
void MixEight(const unsigned char* const* planes, std::size_t nOffset, unsigned char* destination, std::size_t)
{
    using Quad = Unsigned<4 * sizeof(T)>;
    const Quads<T> oFirst(planes, nOffset), oSecond(planes + 4, nOffset);
    for (std::size_t i = 0; i < 4; ++i)
    {
        Store(destination + i * 32, MixLow<Quad>(oFirst.moVectors[i], oSecond.moVectors[i]));
        Store(destination + i * 32 + 16, MixHigh<Quad>(oFirst.moVectors[i], oSecond.moVectors[i]));
    }
}

// Four channels of pixels that have more of them, and lie nPixelBytes apart.
template <typename T>
void MixFourApart(const unsigned char* const* planes, std::size_t nOffset, unsigned char* destination,
                  std::size_t nPixelBytes)
{
    const Quads<T> oQuads(planes, nOffset);
    alignas(16) unsigned char aQuads[64];
    for (std::size_t i = 0; i < 4; ++i)
        Store(aQuads + i * 16, oQuads.moVectors[i]);
    for (std::size_t i = 0; i < 16 / sizeof(T); ++i)
        std::memcpy(destination + i * nPixelBytes, aQuads + i * 4 * sizeof(T), 4 * sizeof(T));
}

// Whole vectors of a row by one of the functions above. Returns the pixels done.
template <typename T, auto oMix>
std::size_t MixRow(const unsigned char* const* planes, std::size_t nOffset, unsigned char* destination,
                   std::size_t nPixelBytes, std::size_t nWidth)
{
    constexpr std::size_t PIXELS = 16 / sizeof(T);
    std::size_t x = 0;
    for (; x + PIXELS <= nWidth; x += PIXELS)
        oMix(planes, nOffset + x * sizeof(T), destination + x * nPixelBytes, nPixelBytes);
    return x;
}

// More than four channels, four at a time; the last four may take some again.
template <typename T>
std::size_t MixMany(const unsigned char* const* planes, std::size_t nOffset, unsigned char* destination,
                    std::size_t nChannels, std::size_t nWidth)
{
    std::size_t nDone = 0;
    for (std::size_t k = 0; k < nChannels; k += 4)
    {
        const std::size_t nFirst = std::min(k, nChannels - 4);
        nDone = MixRow<T, &MixFourApart<T>>(planes + nFirst, nOffset, destination + nFirst * sizeof(T),
                                            nChannels * sizeof(T), nWidth);
    }
    return nDone;
}

template <typename T>
std::size_t InterleaveVectors(const unsigned char* const* planes, std::size_t nOffset, unsigned char* destination,
                              std::size_t nChannels, std::size_t nWidth)
{
    const std::size_t nPixelBytes = nChannels * sizeof(T);
    if constexpr (sizeof(T) > 4)
        return 0;
    else if (nChannels == 2)
        return MixRow<T, &MixTwo<T>>(planes, nOffset, destination, nPixelBytes, nWidth);
    else if (nChannels == 3)
        return MixRow<T, &MixThree<T>>(planes, nOffset, destination, nPixelBytes, nWidth);
    else if (nChannels == 4)
        return MixRow<T, &MixFour<T>>(planes, nOffset, destination, nPixelBytes, nWidth);
    else if (nChannels == 8 && sizeof(T) <= 2)
        return MixRow<T, &MixEight<T>>(planes, nOffset, destination, nPixelBytes, nWidth);
    else
        return nChannels > 4 ? MixMany<T>(planes, nOffset, destination, nChannels, nWidth) : 0;
}
#else
template <typename T>
std::size_t InterleaveVectors(const unsigned char* const*, std::size_t, unsigned char*, std::size_t, std::size_t)
{
    return 0;
}
#endif

template <typename T>
void InterleavePiece(const unsigned char* const* planes, std::size_t nOffset, unsigned char* destination,
                     std::size_t nChannels, std::size_t nWidth)
{
    const std::size_t nDone = InterleaveVectors<T>(planes, nOffset, destination, nChannels, nWidth);
    const std::size_t nPixelBytes = nChannels * sizeof(T);
    for (std::size_t k = 0; k < nChannels; ++k)
        MoveRow<T>(planes[k] + nOffset + nDone * sizeof(T), sizeof(T),
                   destination + nDone * nPixelBytes + k * sizeof(T), nPixelBytes, nWidth - nDone);
}

// Piece by piece, so that the destination stays in the cache while several passes fill it.
template <typename T>
void InterleaveRow(const unsigned char* const* planes, std::size_t nOffset, unsigned char* destination,
                   std::size_t nChannels, std::size_t nWidth)
{
    const std::size_t nPiece = std::max<std::size_t>(PIECE_BYTES / (nChannels * sizeof(T)) / 16 * 16, 16);
    for (std::size_t x = 0; x < nWidth; x += nPiece)
        InterleavePiece<T>(planes, nOffset + x * sizeof(T), destination + x * nChannels * sizeof(T), nChannels,
                           std::min(nPiece, nWidth - x));
}

bool IsStraight(const std::size_t* channels, std::size_t nChannels)
{
    for (std::size_t i = 0; i < nChannels; ++i)
        if (channels[i] != i)
            return false;
    return true;
}

} // namespace

void CopyRows(const unsigned char* source, std::size_t nSourcePitch, unsigned char* destination,
              std::size_t nDestinationPitch, std::size_t nRowBytes, std::size_t nRows)
{
    if (nRowBytes == 0)
        return;
    const bool bOneRow = nSourcePitch == nRowBytes && nDestinationPitch == nRowBytes;
    const std::size_t nCalls = bOneRow ? std::min<std::size_t>(nRows, 1) : nRows;
    for (std::size_t i = 0; i < nCalls; ++i)
        CopyRow(source + i * nSourcePitch, destination + i * nDestinationPitch,
                bOneRow ? nRowBytes * nRows : nRowBytes);
}

void GatherChannels(const unsigned char* source, std::size_t nSourcePitch, std::size_t nSourceChannels,
                    unsigned char* destination, std::size_t nDestinationPitch, const std::size_t* channels,
                    std::size_t nChannels, const PixelArea& oArea)
{
    if (nChannels == nSourceChannels && IsStraight(channels, nChannels))
        return CopyRows(source, nSourcePitch, destination, nDestinationPitch,
                        oArea.mnWidth * nChannels * oArea.mnSampleBytes, oArea.mnRows);
    WithSampleType(oArea.mnSampleBytes,
                   [&](auto oType)
                   {
                       GatherRows<decltype(oType)>(source, nSourcePitch, nSourceChannels, destination,
                                                   nDestinationPitch, channels, nChannels, oArea);
                   });
}

void PlaceChannel(const unsigned char* plane, std::size_t nPlanePitch, unsigned char* destination,
                  std::size_t nDestinationPitch, std::size_t nChannel, std::size_t nChannels, const PixelArea& oArea)
{
    WithSampleType(oArea.mnSampleBytes,
                   [&](auto oType)
                   {
                       MoveChannel<decltype(oType)>(plane, nPlanePitch, sizeof(oType),
                                                    destination + nChannel * sizeof(oType), nDestinationPitch,
                                                    nChannels * sizeof(oType), oArea);
                   });
}

void ExtractChannel(const unsigned char* source, std::size_t nSourcePitch, std::size_t nChannel, std::size_t nChannels,
                    unsigned char* plane, std::size_t nPlanePitch, const PixelArea& oArea)
{
    GatherChannels(source, nSourcePitch, nChannels, plane, nPlanePitch, &nChannel, 1, oArea);
}

void InterleavePlanes(const unsigned char* const* planes, std::size_t nPlanePitch, unsigned char* destination,
                      std::size_t nDestinationPitch, std::size_t nChannels, const PixelArea& oArea)
{
    if (nChannels == 0)
        return;
    WithSampleType(oArea.mnSampleBytes,
                   [&](auto oType)
                   {
                       for (std::size_t i = 0; i < oArea.mnRows; ++i)
                           InterleaveRow<decltype(oType)>(planes, i * nPlanePitch, destination + i * nDestinationPitch,
                                                          nChannels, oArea.mnWidth);
                   });
}

} // namespace krv::raster
