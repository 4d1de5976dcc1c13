#include "plugins/support/codec/bits.h"

#include "toolkit/raster/swapbytes.h"
#include "toolkit/simd/memoryaccess.h"
#include "toolkit/simd/vectors.h"

#include <algorithm>
#include <array>

namespace krv::plugins::codec
{

namespace
{

using simd::Load;
using simd::Store;

// Bits packed most significant first.
struct BitSource
{
    const unsigned char* mpoBytes;
    std::size_t mnBytes;

    // The sixty-four bits from nBit on; the last seven of them are unspecified. Needs eight bytes.
    std::uint64_t GetInside(std::uint64_t nBit) const
    {
        return simd::LoadBigEndian<std::uint64_t>(mpoBytes + (nBit >> 3)) << (nBit & 7);
    }

    // nBits bits from nBit on, at the top of the result. Bits behind the end are 0.
    std::uint64_t GetAnywhere(std::uint64_t nBit, unsigned int nBits) const
    {
        std::uint64_t nValue = 0;
        for (unsigned int i = 0; i < nBits; ++i, ++nBit)
            if ((nBit >> 3) < mnBytes)
                nValue |= static_cast<std::uint64_t>((mpoBytes[nBit >> 3] >> (7 - (nBit & 7))) & 1) << (63 - i);
        return nValue;
    }
};

template <typename Signed>
Signed TakeTop(std::uint64_t nValue, unsigned int nBits, bool bSigned)
{
    return bSigned ? static_cast<Signed>(static_cast<std::int64_t>(nValue) >> (64 - nBits))
                   : static_cast<Signed>(nValue >> (64 - nBits));
}

// How many samples of a row can be read by whole words.
std::size_t CountInside(std::size_t nBytes, std::uint64_t nFirstBit, std::size_t nSamples, unsigned int nBits)
{
    if (nBytes < 8 || nFirstBit > (std::uint64_t{nBytes} - 8) * 8 || nBits > 57)
        return 0;
    return std::min<std::uint64_t>(nSamples, ((std::uint64_t{nBytes} - 8) * 8 - nFirstBit) / nBits + 1);
}

// Floating-point numbers of fewer bits than 32, beside those: what turns one into the other.
template <unsigned int nExponentBits, unsigned int nFractionBits>
struct NarrowFloat
{
    static constexpr std::uint32_t MAGNITUDE = (1U << (nExponentBits + nFractionBits)) - 1;
    static constexpr std::uint32_t SIGN_SHIFT = 31 - nExponentBits - nFractionBits;
    static constexpr std::uint32_t BIAS_GAP = (128U - (1U << (nExponentBits - 1))) << 23;
    static constexpr std::uint32_t INFINITE = ((1U << nExponentBits) - 1) << nFractionBits;
    static constexpr std::uint32_t SMALLEST_NORMAL = 1U << nFractionBits;
    // The smallest number there is, as one of 32 bits.
    static constexpr std::uint32_t STEP = (128U - (1U << (nExponentBits - 1)) + 1 - nFractionBits) << 23;
};

#if defined(KRV_VECTORS)
using simd::As;
using simd::Bytes;
using simd::Shuffle;
using Ints = simd::Vector<std::int32_t, 4>;
using Numbers = simd::Vector<std::uint32_t, 4>;

constexpr unsigned int WIDEST_IN_VECTORS = 25; // with seven bits in front of it, a sample still fits four bytes

// Takes four samples of nBits bits, of which the first begins nPhase bits into the first of sixteen bytes. Of 12 bits:
//     bytes      s0 s0|s1 s1 s2 s2|s3 s3 ..                 the samples' bits, most significant first
//     integers   the four bytes from each sample's first on, the first byte highest
//     times      1, 2^4, 1, 2^4: each sample at the top     then shifted down to the bottom
class FourSamples
{
public:
    FourSamples(unsigned int nBits, unsigned int nPhase, bool bSigned) : mbSigned(bSigned)
    {
        const std::uint32_t nDown = 32 - nBits;
        moDown = simd::LoadFirst<4>(&nDown);
        for (unsigned int i = 0; i < 4; ++i)
            moUp[i] = 1U << ((nPhase + i * nBits) & 7);
        moBytes = Shuffle::Make([&](std::size_t i) { return (nPhase + i / 4 * nBits) / 8 + 3 - i % 4; });
    }

    Ints Take(Bytes oBytes) const
    {
        // Bits above the sample go, which unsigned numbers alone may lose.
        const auto oTop = As<std::int32_t>(As<std::uint32_t>(moBytes(oBytes)) * moUp);
        return mbSigned ? simd::ShiftDown(oTop, moDown) : Ints(simd::ShiftDown(Numbers(oTop), moDown));
    }

private:
    Shuffle moBytes;
    Numbers moUp;
    Bytes moDown;
    bool mbSigned;
};

// Eight samples, given as words of four bytes, in words of the size of Signed.
template <typename Signed>
void StoreEight(unsigned char* destination, Ints oFirst, Ints oSecond, bool bSigned)
{
    if constexpr (sizeof(Signed) == 4)
    {
        Store(destination, oFirst);
        Store(destination + 16, oSecond);
        return;
    }
    const auto oWords = bSigned ? simd::Pack<std::int16_t>(oFirst, oSecond)
                                : As<std::int16_t>(simd::Pack<std::uint16_t>(oFirst, oSecond));
    if constexpr (sizeof(Signed) == 2)
        Store(destination, oWords);
    else if (bSigned)
        simd::StoreFirst<8>(destination, simd::Pack<std::int8_t>(oWords, oWords));
    else
        simd::StoreFirst<8>(destination, simd::Pack<std::uint8_t>(oWords, oWords));
}

// Eight samples at a time, which take nBits bytes, from the beginning of a row on. Returns the samples done.
template <typename Signed, bool bSigned>
std::size_t UnpackVectors(const unsigned char* source, std::size_t nBytes, unsigned char* destination,
                          std::size_t nSamples, unsigned int nBits)
{
    const FourSamples oFirst(nBits, 0, bSigned), oSecond(nBits, nBits * 4 % 8, bSigned);
    const std::size_t nSecond = nBits / 2;
    std::size_t i = 0;
    for (std::size_t nAt = 0; i + 8 <= nSamples && nAt + nSecond + 16 <= nBytes; i += 8, nAt += nBits)
        StoreEight<Signed>(destination + i * sizeof(Signed), oFirst.Take(Load<Bytes>(source + nAt)),
                           oSecond.Take(Load<Bytes>(source + nAt + nSecond)), bSigned);
    return i;
}

template <typename Signed>
std::size_t UnpackVectors(const BitSource& oSource, std::uint64_t nBit, unsigned char* destination,
                          std::size_t nSamples, unsigned int nBits, bool bSigned)
{
    if (nBits > WIDEST_IN_VECTORS || (nBit >> 3) >= oSource.mnBytes)
        return 0;
    const unsigned char* row = oSource.mpoBytes + (nBit >> 3);
    const std::size_t nBytes = oSource.mnBytes - (nBit >> 3);
    return bSigned ? UnpackVectors<Signed, true>(row, nBytes, destination, nSamples, nBits)
                   : UnpackVectors<Signed, false>(row, nBytes, destination, nSamples, nBits);
}

// Four integers of three bytes, out of the first twelve bytes, as words of four. Big-endian:
//     bytes      a2 a1 a0 b2 b1 b0 ..
//     integers   0 a0 a1 a2 | 0 b0 b1 b2 | ..      then shifted down by a byte
template <bool bBigEndian, bool bSigned>
Numbers TakeFour24(const unsigned char* source)
{
    static constexpr Shuffle TOP =
        Shuffle::Make([](std::size_t i)
                      { return i % 4 == 0 ? std::size_t{0x80} : i / 4 * 3 + (bBigEndian ? 3 - i % 4 : i % 4 - 1); });
    const Bytes oTop = TOP(Load<Bytes>(source));
    return bSigned ? As<std::uint32_t>(As<std::int32_t>(oTop) >> 8) : As<std::uint32_t>(oTop) >> 8;
}

template <bool bBigEndian, bool bSigned>
std::size_t Unpack24Vectors(const unsigned char* source, unsigned char* destination, std::size_t nCount)
{
    std::size_t i = 0;
    for (; i + 6 <= nCount; i += 4)
        Store(destination + i * 4, TakeFour24<bBigEndian, bSigned>(source + i * 3));
    return i;
}

// Four numbers with fewer exponent and fraction bits as ones of 32 bits, one in each lane: normal ones by shifting, the
// smallest ones by a multiplication, and what is infinite or no number with the gap of the exponents twice.
template <unsigned int nExponentBits, unsigned int nFractionBits>
Numbers WidenFour(Numbers oNumbers)
{
    using Format = NarrowFloat<nExponentBits, nFractionBits>;
    const Numbers oMagnitude = oNumbers & Format::MAGNITUDE;
    const Numbers oSign = (oNumbers & ~Format::MAGNITUDE) << Format::SIGN_SHIFT;
    const auto oSmall = simd::Convert<float>(Ints(oMagnitude)) * std::bit_cast<float>(Format::STEP);
    const Numbers oNormal = (oMagnitude << (23 - nFractionBits)) + Format::BIAS_GAP;
    const auto oIsSmall = Ints(oMagnitude) < static_cast<std::int32_t>(Format::SMALLEST_NORMAL);
    const Numbers oFinite = simd::Select(oIsSmall, As<std::uint32_t>(oSmall), oNormal);
    const auto oIsInfinite = Ints(oMagnitude) > static_cast<std::int32_t>(Format::INFINITE - 1);
    return (oFinite + (Numbers(oIsInfinite) & Format::BIAS_GAP)) | oSign;
}

std::size_t WidenHalfs(const unsigned char* source, unsigned char* destination, std::size_t nCount)
{
    std::size_t i = 0;
    for (; i + 8 <= nCount; i += 8)
    {
        const auto oHalfs = Load<Bytes>(source + i * 2);
        Store(destination + i * 4, WidenFour<5, 10>(As<std::uint32_t>(simd::MixLow<std::uint16_t>(oHalfs, Bytes{}))));
        Store(destination + i * 4 + 16,
              WidenFour<5, 10>(As<std::uint32_t>(simd::MixHigh<std::uint16_t>(oHalfs, Bytes{}))));
    }
    return i;
}

std::size_t Widen24s(const unsigned char* source, unsigned char* destination, std::size_t nCount)
{
    std::size_t i = 0;
    for (; i + 6 <= nCount; i += 4)
        Store(destination + i * 4, WidenFour<7, 16>(TakeFour24<false, false>(source + i * 3)));
    return i;
}

// The bits of each byte turned round, by a table of halves of bytes:
//     bytes   h l | ..      turned halves   turned(l) turned(h) | ..
std::size_t ReverseVectors(const unsigned char* source, unsigned char* destination, std::size_t nBytes)
{
    static constexpr Shuffle TURNED =
        Shuffle::Make([](std::size_t i) { return (i & 1) << 3 | (i & 2) << 1 | (i & 4) >> 1 | (i & 8) >> 3; });
    const auto oTurned = Load<Bytes>(TURNED.moIndices);
    std::size_t i = 0;
    for (; i + 16 <= nBytes; i += 16)
    {
        const auto oBytes = Load<Bytes>(source + i);
        const Bytes oLow = simd::PickBytes(oTurned, oBytes & 15);
        const Bytes oHigh = simd::PickBytes(oTurned, As<std::uint8_t>(As<std::uint16_t>(oBytes) >> 4) & 15);
        Store(destination + i, As<std::uint8_t>(As<std::uint16_t>(oLow) << 4) | oHigh);
    }
    return i;
}
#else
template <typename Signed>
std::size_t UnpackVectors(const BitSource&, std::uint64_t, unsigned char*, std::size_t, unsigned int, bool)
{
    return 0;
}

template <bool, bool>
std::size_t Unpack24Vectors(const unsigned char*, unsigned char*, std::size_t)
{
    return 0;
}

std::size_t WidenHalfs(const unsigned char*, unsigned char*, std::size_t)
{
    return 0;
}
std::size_t Widen24s(const unsigned char*, unsigned char*, std::size_t)
{
    return 0;
}
std::size_t ReverseVectors(const unsigned char*, unsigned char*, std::size_t)
{
    return 0;
}
#endif

template <typename Signed>
void UnpackRow(const BitSource& oSource, std::uint64_t nBit, unsigned char* destination, std::size_t nSamples,
               unsigned int nBits, bool bSigned)
{
    std::size_t i = UnpackVectors<Signed>(oSource, nBit, destination, nSamples, nBits, bSigned);
    nBit += std::uint64_t{i} * nBits;
    const std::size_t nInside = i + CountInside(oSource.mnBytes, nBit, nSamples - i, nBits);
    for (; i < nInside; ++i, nBit += nBits)
        Store(destination + i * sizeof(Signed), TakeTop<Signed>(oSource.GetInside(nBit), nBits, bSigned));
    for (; i < nSamples; ++i, nBit += nBits)
        Store(destination + i * sizeof(Signed), TakeTop<Signed>(oSource.GetAnywhere(nBit, nBits), nBits, bSigned));
}

// Eight pixels of one bit each, as bytes with the first one at the lowest address.
std::uint64_t SpreadBits(unsigned char nBits)
{
    const std::uint64_t nApart = nBits * 0x0101010101010101U & 0x0102040810204080U;
    return (nApart + 0x7F7F7F7F7F7F7F7FU) >> 7 & 0x0101010101010101U;
}

// A row of pixels of one bit, of which nBytes bytes can be read. Sixteen bytes of it become eight vectors:
//     byte k twice eight times   b0 b0 b0 b0 b0 b0 b0 b0 b1 b1 ..
//     and                        80 40 20 10 08 04 02 01 80 40 ..
//     at most one                1 or 0 in each byte
void UnpackSingleBits(const unsigned char* source, std::size_t nBytes, unsigned char* destination, std::size_t nSamples)
{
    const std::size_t nWhole = std::min(nBytes, nSamples / 8);
    std::size_t i = 0;
#if defined(KRV_VECTORS)
    static constexpr Shuffle FIRST = Shuffle::Make([](std::size_t k) { return k / 8; });
    const auto oBits = As<std::uint8_t>(simd::Spread<simd::Vector<std::uint64_t, 2>>(0x0102040810204080));
    const auto oOne = simd::Spread<Bytes>(1);
    for (; i + 16 <= nWhole; i += 16)
    {
        const auto oBytes = Load<Bytes>(source + i);
        auto oPlaces = Load<Bytes>(FIRST.moIndices);
        for (std::size_t k = 0; k < 8; ++k, oPlaces += 2)
            Store(destination + i * 8 + k * 16, simd::Smaller(simd::PickBytes(oBytes, oPlaces) & oBits, oOne));
    }
#endif
    for (; i < nWhole; ++i)
        simd::StoreLittleEndian(destination + i * 8, SpreadBits(source[i]));
    for (std::size_t k = i * 8; k < nSamples; ++k)
        destination[k] = k / 8 < nBytes ? source[k / 8] >> (7 - k % 8) & 1 : 0;
}

// A number with fewer exponent and fraction bits as one of 32 bits.
template <unsigned int nExponentBits, unsigned int nFractionBits>
std::uint32_t Widen(std::uint32_t nNumber)
{
    using Format = NarrowFloat<nExponentBits, nFractionBits>;
    const std::uint32_t nMagnitude = nNumber & Format::MAGNITUDE;
    const float nSmall = static_cast<float>(nMagnitude) * std::bit_cast<float>(Format::STEP);
    const std::uint32_t nNormal = (nMagnitude << (23 - nFractionBits)) + Format::BIAS_GAP;
    const std::uint32_t nFinite = nMagnitude < Format::SMALLEST_NORMAL ? std::bit_cast<std::uint32_t>(nSmall) : nNormal;
    return (nFinite + (nMagnitude >= Format::INFINITE ? Format::BIAS_GAP : 0)) | (nNumber & ~Format::MAGNITUDE)
                                                                                     << Format::SIGN_SHIFT;
}

// A number of 32 bits as one with fewer exponent and fraction bits, rounded half to even.
template <unsigned int nExponentBits, unsigned int nFractionBits>
std::uint32_t Narrow(std::uint32_t nNumber)
{
    using Format = NarrowFloat<nExponentBits, nFractionBits>;
    constexpr std::uint32_t LOST_BITS = 23 - nFractionBits;
    constexpr std::uint32_t FRACTION = 0x7FFFFFU;
    constexpr std::uint32_t INFINITE_FLOAT = 0x7F800000U;
    constexpr std::uint32_t SMALLEST_NORMAL = Format::BIAS_GAP + (1U << 23);
    const auto oRound = [](std::uint32_t nValue, std::uint32_t nBits)
    {
        return (nValue + (1U << (nBits - 1)) - 1 + (nValue >> nBits & 1)) >> nBits;
    };

    const std::uint32_t nMagnitude = nNumber & 0x7FFFFFFFU;
    const std::uint32_t nSign = nNumber >> Format::SIGN_SHIFT & ~Format::MAGNITUDE;
    if (nMagnitude > INFINITE_FLOAT)
    {
        const std::uint32_t nPayload = (nMagnitude & FRACTION) >> LOST_BITS;
        return nSign | Format::INFINITE | (nPayload != 0 ? nPayload : 1U << (nFractionBits - 1));
    }
    if (nMagnitude >= SMALLEST_NORMAL)
        return nSign | std::min(oRound(nMagnitude - Format::BIAS_GAP, LOST_BITS), Format::INFINITE);
    const std::uint32_t nShift = (SMALLEST_NORMAL >> 23) - (nMagnitude >> 23) + LOST_BITS;
    return nSign | (nShift > 24 ? 0 : oRound((nMagnitude & FRACTION) | 1U << 23, nShift));
}

constexpr std::uint64_t ReverseEach(std::uint64_t nValue)
{
    nValue = ((nValue >> 1) & 0x5555555555555555U) | ((nValue & 0x5555555555555555U) << 1);
    nValue = ((nValue >> 2) & 0x3333333333333333U) | ((nValue & 0x3333333333333333U) << 2);
    return ((nValue >> 4) & 0x0F0F0F0F0F0F0F0FU) | ((nValue & 0x0F0F0F0F0F0F0F0FU) << 4);
}

void SwapOdd(const unsigned char* source, unsigned char* destination, std::size_t nCount, std::size_t nSampleBytes)
{
    std::array<unsigned char, 8> oSample{};
    for (std::size_t i = 0; i < nCount * nSampleBytes; i += nSampleBytes)
    {
        std::reverse_copy(source + i, source + i + nSampleBytes, oSample.begin());
        std::copy_n(oSample.begin(), nSampleBytes, destination + i);
    }
}

} // namespace

std::size_t GetContainerBytes(unsigned int nBits)
{
    return nBits <= 8 ? 1 : nBits <= 16 ? 2 : nBits <= 32 ? 4 : 8;
}

void UnpackBits(const unsigned char* source, std::size_t nSourceBytes, std::size_t nSourcePitch,
                unsigned char* destination, std::size_t nDestinationPitch, std::size_t nRowSamples, std::size_t nRows,
                unsigned int nBits, bool bSigned)
{
    const BitSource oSource{source, nSourceBytes};
    if (nBits == 1 && !bSigned)
    {
        for (std::size_t i = 0; i < nRows; ++i)
            UnpackSingleBits(source + i * nSourcePitch, nSourceBytes - std::min(nSourceBytes, i * nSourcePitch),
                             destination + i * nDestinationPitch, nRowSamples);
        return;
    }
    const auto Unpack = [&]<typename Signed>(Signed)
    {
        for (std::size_t i = 0; i < nRows; ++i)
            UnpackRow<Signed>(oSource, std::uint64_t{i} * nSourcePitch * 8, destination + i * nDestinationPitch,
                              nRowSamples, nBits, bSigned);
    };
    switch (GetContainerBytes(nBits))
    {
    case 1:
        return Unpack(std::int8_t());
    case 2:
        return Unpack(std::int16_t());
    case 4:
        return Unpack(std::int32_t());
    default:
        return Unpack(std::int64_t());
    }
}

void Unpack24(const unsigned char* source, unsigned char* destination, std::size_t nCount, bool bBigEndian,
              bool bSigned)
{
    std::size_t i = 0;
    if (bBigEndian)
        i = bSigned ? Unpack24Vectors<true, true>(source, destination, nCount)
                    : Unpack24Vectors<true, false>(source, destination, nCount);
    else
        i = bSigned ? Unpack24Vectors<false, true>(source, destination, nCount)
                    : Unpack24Vectors<false, false>(source, destination, nCount);
    for (; i < nCount; ++i)
    {
        const unsigned char* at = source + i * 3;
        const std::uint32_t nHigh = bBigEndian ? at[0] : at[2];
        const std::uint32_t nLow = bBigEndian ? at[2] : at[0];
        const std::uint32_t nTop = nHigh << 24 | static_cast<std::uint32_t>(at[1]) << 16 | nLow << 8;
        Store(destination + i * 4,
              bSigned ? static_cast<std::uint32_t>(static_cast<std::int32_t>(nTop) >> 8) : nTop >> 8);
    }
}

void HalfToFloat(const unsigned char* source, unsigned char* destination, std::size_t nCount)
{
    for (std::size_t i = WidenHalfs(source, destination, nCount); i < nCount; ++i)
        Store(destination + i * 4, Widen<5, 10>(Load<std::uint16_t>(source + i * 2)));
}

void Float24ToFloat(const unsigned char* source, unsigned char* destination, std::size_t nCount)
{
    for (std::size_t i = Widen24s(source, destination, nCount); i < nCount; ++i)
    {
        const unsigned char* at = source + i * 3;
        const std::uint32_t nLow = at[simd::LITTLE ? 0 : 2], nMiddle = at[1], nHigh = at[simd::LITTLE ? 2 : 0];
        Store(destination + i * 4, Widen<7, 16>(nHigh << 16 | nMiddle << 8 | nLow));
    }
}

void FloatToHalf(const unsigned char* source, unsigned char* destination, std::size_t nCount)
{
    for (std::size_t i = 0; i < nCount; ++i)
        Store(destination + i * 2, static_cast<std::uint16_t>(Narrow<5, 10>(Load<std::uint32_t>(source + i * 4))));
}

void FloatToFloat24(const unsigned char* source, unsigned char* destination, std::size_t nCount)
{
    for (std::size_t i = 0; i < nCount; ++i)
    {
        const std::uint32_t nNarrow = Narrow<7, 16>(Load<std::uint32_t>(source + i * 4));
        for (std::size_t k = 0; k < 3; ++k)
            destination[i * 3 + k] = static_cast<unsigned char>(nNarrow >> 8 * (simd::LITTLE ? k : 2 - k));
    }
}

namespace
{

template <typename T>
void FitValues(unsigned char* values, std::size_t nCount, std::int64_t nLowest, std::int64_t nHighest)
{
    T* const pValues = reinterpret_cast<T*>(values);
    for (std::size_t n = 0; n < nCount; ++n)
        pValues[n] = static_cast<T>(std::clamp<std::int64_t>(pValues[n], nLowest, nHighest));
}

} // namespace

void FitBits(unsigned char* values, std::size_t nCount, std::size_t nValueBytes, unsigned int nBits, bool bSigned)
{
    const std::int64_t nHighest = (std::int64_t{1} << (nBits - (bSigned ? 1 : 0))) - 1;
    const std::int64_t nLowest = bSigned ? -nHighest - 1 : 0;
    if (nValueBytes == 1)
        bSigned ? FitValues<std::int8_t>(values, nCount, nLowest, nHighest)
                : FitValues<std::uint8_t>(values, nCount, nLowest, nHighest);
    else if (nValueBytes == 2)
        bSigned ? FitValues<std::int16_t>(values, nCount, nLowest, nHighest)
                : FitValues<std::uint16_t>(values, nCount, nLowest, nHighest);
    else
        bSigned ? FitValues<std::int32_t>(values, nCount, nLowest, nHighest)
                : FitValues<std::uint32_t>(values, nCount, nLowest, nHighest);
}

void ReverseBits(const unsigned char* source, unsigned char* destination, std::size_t nBytes)
{
    std::size_t i = ReverseVectors(source, destination, nBytes);
    for (; i + 8 <= nBytes; i += 8)
        Store(destination + i, ReverseEach(Load<std::uint64_t>(source + i)));
    for (; i < nBytes; ++i)
        destination[i] = static_cast<unsigned char>(ReverseEach(source[i]));
}

void SwapBytes(const unsigned char* source, unsigned char* destination, std::size_t nCount, std::size_t nSampleBytes)
{
    if (nSampleBytes == 2 || nSampleBytes == 4 || nSampleBytes == 8)
        return raster::SwapBytes(source, destination, nCount, nSampleBytes);
    SwapOdd(source, destination, nCount, nSampleBytes);
}

} // namespace krv::plugins::codec
