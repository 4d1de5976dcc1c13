#pragma once

#include "gobs/mask/mask.h"

#include <cstdint>

namespace krv::datasources::detail
{

// A rectangle of file pixels, all four ends included; nothing when an end lies before its beginning.
struct PixelArea
{
    std::int64_t firstColumn;
    std::int64_t lastColumn;
    std::int64_t firstRow;
    std::int64_t lastRow;

    bool IsEmpty() const { return firstColumn > lastColumn || firstRow > lastRow; }
};

// The bits of a mask by file pixels. Positions are not checked: they lie in the mask's full extent.
//
// The bytes of a mask that was not cleared are cleared a little ahead of the bits that are set, while they are in the
// nearest cache; ClearRest ends that.
class MaskRows
{
public:
    MaskRows(krv::gobs::Mask& oMask, bool bCleared);
    MaskRows(const MaskRows&) = delete;
    MaskRows& operator=(const MaskRows&) = delete;

    // The full extent.
    PixelArea GetArea() const;

    // Sets the bits of a row from one column to another, both included.
    void SetRun(std::int64_t nRow, std::int64_t nFirst, std::int64_t nLast)
    {
        const std::uint64_t nFrom = IndexOf(nFirst, nRow), nTo = IndexOf(nLast, nRow);
        unsigned char* const pFirst = mpBits + nFrom / 8;
        unsigned char* const pLast = mpBits + nTo / 8;
        if (pLast >= mpCleared)
            ClearTo(pLast + 1);
        const auto nHead = static_cast<unsigned char>(0xFFu >> (nFrom % 8));
        const auto nTail = static_cast<unsigned char>(0xFFu << (7 - nTo % 8));
        if (pFirst == pLast)
        {
            *pFirst |= nHead & nTail;
            return;
        }
        *pFirst |= nHead;
        SetBytes(pFirst + 1, pLast);
        *pLast |= nTail;
    }

    // Ors in the bits of a row from a column on, 64 in each word, the highest first; spare bits of the last word are 0.
    void OrWords(std::int64_t nRow, std::int64_t nFirst, const std::uint64_t* pWords, std::uint64_t nBits);

    void ClearRest() { ClearTo(mpEnd); }

private:
    std::uint64_t IndexOf(std::int64_t nColumn, std::int64_t nRow) const
    {
        return static_cast<std::uint64_t>(nRow - mnFirstRow) * mnWidth +
               static_cast<std::uint64_t>(nColumn - mnFirstColumn);
    }
    void ClearTo(unsigned char* pEnd);
    static void SetBytes(unsigned char* pFirst, unsigned char* pEnd);

    unsigned char* mpBits;
    unsigned char* mpEnd;
    unsigned char* mpCleared; // the end of what is
    std::uint64_t mnWidth;
    std::uint64_t mnHeight;
    std::int64_t mnFirstColumn;
    std::int64_t mnFirstRow;
};

} // namespace krv::datasources::detail
