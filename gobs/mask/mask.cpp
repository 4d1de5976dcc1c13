#include "gobs/mask/mask.h"

#include "gobs/raster/raster.h"
#include "toolkit/core/hblock.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/simd/vectors.h"

#include <array>
#include <bit>
#include <cstring>
#include <string>

namespace krv::gobs
{

namespace
{

std::uint64_t LoadWord(const unsigned char* p)
{
    std::uint64_t nWord;
    std::memcpy(&nWord, p, sizeof nWord);
    if constexpr (std::endian::native == std::endian::big)
        nWord = __builtin_bswap64(nWord);
    return nWord;
}

// Eight bytes to eight bits, the first byte to the highest: bit 0 of byte i moves to bit 63 - i of the product, and no
// two of the other terms meet there.
unsigned char PackWord(std::uint64_t nWord)
{
    constexpr std::uint64_t LOW7 = 0x7F7F7F7F7F7F7F7Full;
    const std::uint64_t nSet = (((nWord & LOW7) + LOW7) | nWord) >> 7 & 0x0101010101010101ull;
    return static_cast<unsigned char>((nSet * 0x8040201008040201ull) >> 56);
}

// Packs whole pairs of words, as far as vectors can; returns the number of words done. The first byte's bit is the
// highest of its eight:
//     bytes    b0 b1 .. b7 | b8 .. b15      turned   b7 .. b1 b0 | b15 .. b8      their tops, lowest first
std::uint64_t PackVectors([[maybe_unused]] const unsigned char* pBytes, [[maybe_unused]] std::uint64_t nWords,
                          [[maybe_unused]] unsigned char* pBits)
{
    std::uint64_t i = 0;
#if defined(KRV_VECTORS)
    for (; i + 2 <= nWords; i += 2)
    {
        const auto oClear = simd::SwapBytes<std::uint64_t>(simd::Load<simd::Bytes>(pBytes + i * 8)) == simd::Bytes{};
        simd::Store(pBits + i, static_cast<std::uint16_t>(~simd::TopBits(oClear)));
    }
#endif
    return i;
}

void PackBytes(const unsigned char* pBytes, std::uint64_t nCount, unsigned char* pBits)
{
    const std::uint64_t nWords = nCount / 8;
    for (std::uint64_t i = PackVectors(pBytes, nWords, pBits); i < nWords; ++i)
        pBits[i] = PackWord(LoadWord(pBytes + i * 8));
    if (nCount % 8 == 0)
        return;
    unsigned char oTail[8] = {};
    std::memcpy(oTail, pBytes + nWords * 8, nCount % 8);
    pBits[nWords] = PackWord(LoadWord(oTail));
}

using EightBytes = std::array<unsigned char, 8>;

constexpr std::array<EightBytes, 256> MakeExpansion()
{
    std::array<EightBytes, 256> oTable{};
    for (unsigned int nByte = 0; nByte < 256; ++nByte)
        for (unsigned int nBit = 0; nBit < 8; ++nBit)
            oTable[nByte][nBit] = static_cast<unsigned char>(nByte >> (7 - nBit) & 1);
    return oTable;
}

constexpr std::array<EightBytes, 256> EXPANSION = MakeExpansion();

// Expands whole pairs of bytes, as far as vectors can; returns the number of bytes of bits done.
//     each eight times   b0 b0 b0 b0 b0 b0 b0 b0 | b1 b1 ..
//     and                80 40 20 10 08 04 02 01 | 80 40 ..      then at most 1
std::uint64_t ExpandVectors([[maybe_unused]] const unsigned char* pBits, [[maybe_unused]] std::uint64_t nBytes,
                            [[maybe_unused]] unsigned char* pBytes)
{
    std::uint64_t i = 0;
#if defined(KRV_VECTORS)
    static constexpr simd::Shuffle EIGHT_TIMES = simd::Shuffle::Make([](std::size_t n) { return n / 8; });
    const auto oPlaces = simd::As<std::uint8_t>(simd::Spread<simd::Vector<std::uint64_t, 2>>(0x0102040810204080));
    for (; i + 2 <= nBytes; i += 2)
    {
        const simd::Bytes oBits = EIGHT_TIMES(simd::LoadFirst<2>(pBits + i)) & oPlaces;
        simd::Store(pBytes + i * 8, simd::Smaller(oBits, simd::Spread<simd::Bytes>(1)));
    }
#endif
    return i;
}

void ExpandBits(const unsigned char* pBits, std::uint64_t nCount, unsigned char* pBytes)
{
    for (std::uint64_t i = ExpandVectors(pBits, nCount / 8, pBytes); i < nCount / 8; ++i)
        std::memcpy(pBytes + i * 8, EXPANSION[pBits[i]].data(), 8);
    if (nCount % 8 != 0)
        std::memcpy(pBytes + nCount / 8 * 8, EXPANSION[pBits[nCount / 8]].data(), nCount % 8);
}

std::uint64_t CountBytes(const unsigned char* pBits, std::uint64_t nBytes)
{
    std::uint64_t nCount = 0;
    std::uint64_t i = 0;
    for (; i + 8 <= nBytes; i += 8)
        nCount += static_cast<std::uint64_t>(std::popcount(LoadWord(pBits + i)));
    for (; i < nBytes; ++i)
        nCount += static_cast<std::uint64_t>(std::popcount(pBits[i]));
    return nCount;
}

std::uint64_t CountRun(const unsigned char* pBits, std::uint64_t nFirst, std::uint64_t nCount)
{
    if (nCount == 0)
        return 0;
    const std::uint64_t nEnd = nFirst + nCount;
    const unsigned int nHead = 0xFFu >> (nFirst % 8);
    const unsigned int nTail = nEnd % 8 != 0 ? 0xFFu << (8 - nEnd % 8) & 0xFF : 0xFFu;
    const std::uint64_t nFirstByte = nFirst / 8;
    const std::uint64_t nLastByte = (nEnd - 1) / 8;
    if (nFirstByte == nLastByte)
        return static_cast<std::uint64_t>(std::popcount(pBits[nFirstByte] & nHead & nTail));
    return static_cast<std::uint64_t>(std::popcount(pBits[nFirstByte] & nHead)) +
           CountBytes(pBits + nFirstByte + 1, nLastByte - nFirstByte - 1) +
           static_cast<std::uint64_t>(std::popcount(pBits[nLastByte] & nTail));
}

std::uint64_t MaskBytes(const RasterInfo& oInfo, const RasterContext& oContext, const Place& oPlace)
{
    return BufferBytes(oInfo.GetWidth() + 2ull * oContext.GetXMargin(),
                       oInfo.GetHeight() + 2ull * oContext.GetYMargin(), 1, DataType(eDT_BIT), oPlace);
}

} // namespace

Mask::Mask(const RasterInfo& oInfo, const RasterContext& oContext) : Mask(oInfo, oContext, NotCleared())
{
    std::memset(mpBits, 0, mnBitsSize);
}

Mask::Mask(const RasterInfo& oInfo, const RasterContext& oContext, NotCleared)
    : mnWidth(oInfo.GetWidth()), mnHeight(oInfo.GetHeight()), moContext(oContext),
      mnBitsSize(MaskBytes(oInfo, oContext, Place::Current())), mpBits(static_cast<unsigned char*>(HMalloc(mnBitsSize)))
{
}

Mask::Mask(const RasterInfo& oInfo, const RasterContext& oContext, unsigned char* pBytes, bool bTakeOwnership)
    : mnWidth(oInfo.GetWidth()), mnHeight(oInfo.GetHeight()), moContext(oContext), mnBitsSize(0), mpBits(nullptr)
{
    const HBlock oOwned(bTakeOwnership ? pBytes : nullptr);
    if (pBytes == nullptr)
        throw DataException("pBytes is NULL, cannot create a Mask from NULL");
    mnBitsSize = MaskBytes(oInfo, oContext, Place::Current());
    mpBits = static_cast<unsigned char*>(HMalloc(mnBitsSize));
    PackBytes(pBytes, GetFullWidth() * GetFullHeight(), mpBits);
}

Mask::~Mask()
{
    HFree(mpBits);
}

bool Mask::GetBit(std::uint64_t nColumn, std::uint64_t nRow) const
{
    const std::uint64_t nIndex = nRow * GetFullWidth() + nColumn;
    return (mpBits[nIndex / 8] & (128u >> (nIndex % 8))) != 0;
}

void Mask::SetBit(std::uint64_t nColumn, std::uint64_t nRow)
{
    const std::uint64_t nIndex = nRow * GetFullWidth() + nColumn;
    mpBits[nIndex / 8] |= static_cast<unsigned char>(128u >> (nIndex % 8));
}

void Mask::KeepCommon(const Mask& oOther)
{
    if (oOther.GetFullWidth() != GetFullWidth() || oOther.GetFullHeight() != GetFullHeight())
        throw krv::DataException("The masks differ in their extent");
    for (std::uint64_t n = 0; n < mnBitsSize; ++n)
        mpBits[n] &= oOther.mpBits[n];
}

std::uint64_t Mask::CountSet() const
{
    return CountRun(mpBits, 0, GetFullWidth() * GetFullHeight());
}

std::uint64_t Mask::CountSetInCentre() const
{
    std::uint64_t nCount = 0;
    for (std::uint64_t nRow = GetYMargin(); nRow < std::uint64_t(GetYMargin()) + mnHeight; ++nRow)
        nCount += CountRun(mpBits, nRow * GetFullWidth() + GetXMargin(), mnWidth);
    return nCount;
}

void Mask::RetrieveRaster(Raster& oRaster) const
{
    const bool bPacked = oRaster.GetDataType() == DataType(eDT_BIT);
    if (!bPacked && oRaster.GetDataType() != DataType(eDT_8U))
        throw DataException("We can only rasterize into a eDT_BIT or eDT_8U Raster", Place::AtLine(233));
    if (oRaster.GetChansCount() != 1)
        throw DataException("A mask is rasterized into one channel, not " + std::to_string(oRaster.GetChansCount()));
    if (oRaster.GetFullWidth() != GetFullWidth() || oRaster.GetFullHeight() != GetFullHeight())
        throw DataException("The raster is not of the mask's size: " + std::to_string(oRaster.GetFullWidth()) + " x " +
                            std::to_string(oRaster.GetFullHeight()) + " instead of " + std::to_string(GetFullWidth()) +
                            " x " + std::to_string(GetFullHeight()) + " with margins");
    if (bPacked)
        std::memcpy(oRaster.GetBuffer(), mpBits, mnBitsSize);
    else
        ExpandBits(mpBits, GetFullWidth() * GetFullHeight(), oRaster.GetBuffer());
}

} // namespace krv::gobs
