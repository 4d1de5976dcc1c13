#include "datasources/maskbuilder/detail/maskrows.h"

#include <algorithm>
#include <bit>
#include <cstring>

namespace krv::datasources::detail
{

namespace
{

// Less than what string instructions are used for, which clear past the nearest cache.
constexpr std::ptrdiff_t CLEARED_AHEAD = 1024;

// Turns a word whose highest bit is the first into eight bytes whose highest bits are, and back.
std::uint64_t InByteOrder(std::uint64_t nWord)
{
    return std::endian::native == std::endian::little ? __builtin_bswap64(nWord) : nWord;
}

void OrBytes(unsigned char* pTo, std::uint64_t nWord, std::size_t nBytes)
{
    for (std::size_t i = 0; i < nBytes; ++i)
        pTo[i] |= static_cast<unsigned char>(nWord >> (56 - 8 * i));
}

} // namespace

MaskRows::MaskRows(krv::gobs::Mask& oMask, bool bCleared)
    : mpBits(oMask.GetBits()), mpEnd(mpBits + oMask.GetBitsSize()), mpCleared(bCleared ? mpEnd : mpBits),
      mnWidth(oMask.GetFullWidth()), mnHeight(oMask.GetFullHeight()),
      mnFirstColumn(std::int64_t{oMask.GetX()} - oMask.GetXMargin()),
      mnFirstRow(std::int64_t{oMask.GetY()} - oMask.GetYMargin())
{
}

PixelArea MaskRows::GetArea() const
{
    return {mnFirstColumn, mnFirstColumn + static_cast<std::int64_t>(mnWidth) - 1, mnFirstRow,
            mnFirstRow + static_cast<std::int64_t>(mnHeight) - 1};
}

void MaskRows::ClearTo(unsigned char* pEnd)
{
    const std::ptrdiff_t nBytes = std::min(std::max(pEnd - mpCleared, CLEARED_AHEAD), mpEnd - mpCleared);
    std::memset(mpCleared, 0, static_cast<std::size_t>(nBytes));
    mpCleared += nBytes;
}

void MaskRows::SetBytes(unsigned char* pFirst, unsigned char* pEnd)
{
    if (pFirst < pEnd)
        std::memset(pFirst, 0xFF, static_cast<std::size_t>(pEnd - pFirst));
}

void MaskRows::OrWords(std::int64_t nRow, std::int64_t nFirst, const std::uint64_t* pWords, std::uint64_t nBits)
{
    const std::uint64_t nIndex = IndexOf(nFirst, nRow);
    const unsigned int nShift = nIndex % 8;
    unsigned char* pTo = mpBits + nIndex / 8;
    unsigned char* const pEnd = mpBits + (nIndex + nBits + 7) / 8;
    if (pEnd > mpCleared)
        ClearTo(pEnd);
    std::uint64_t nCarry = 0; // what the word before left for the byte at its end, in the highest bits
    const std::uint64_t nWhole = nBits / 64;
    for (std::uint64_t i = 0; i < nWhole; ++i, pTo += 8)
    {
        std::uint64_t nOld;
        std::memcpy(&nOld, pTo, sizeof nOld);
        nOld |= InByteOrder(pWords[i] >> nShift | nCarry);
        std::memcpy(pTo, &nOld, sizeof nOld);
        nCarry = nShift == 0 ? 0 : pWords[i] << (64 - nShift);
    }
    const std::uint64_t nRest = nShift + nBits % 64; // bits from pTo on
    if (nRest == 0)
        return;
    const std::uint64_t nLast = nBits % 64 != 0 ? pWords[nWhole] : 0;
    OrBytes(pTo, nLast >> nShift | nCarry, nRest < 64 ? (nRest + 7) / 8 : 8);
    if (nRest > 64)
        pTo[8] |= static_cast<unsigned char>(nLast << (64 - nShift) >> 56);
}

} // namespace krv::datasources::detail
