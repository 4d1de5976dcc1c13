#include "gobs/raster/margins.h"

#include "gobs/raster/detail/bitcopy.h"
#include "gobs/raster/raster.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <array>
#include <cstring>
#include <string>

namespace krv::gobs
{

namespace
{

// One axis of the buffer: `mnValid` good pixels from `mnFirst` on a line of `mnLength`.
struct Axis
{
    Axis(std::uint64_t nLength, std::uint64_t nLow, std::uint64_t nHigh)
        : mnLength(nLength), mnFirst(nLow), mnValid(nLow + nHigh < nLength ? nLength - nLow - nHigh : 0),
          mnEnd(mnFirst + mnValid)
    {
    }

    bool IsComplete() const { return mnValid == mnLength; }
    std::uint64_t Outside() const { return mnLength - mnValid; }
    // The n-th position that is not valid.
    std::uint64_t OutsideAt(std::uint64_t n) const { return n < mnFirst ? n : n + mnValid; }
    std::uint64_t SourceOf(std::uint64_t nPosition, eMarginBehaviour eBehaviour) const
    {
        return mnFirst + static_cast<std::uint64_t>(FoldIndex(static_cast<long long>(nPosition - mnFirst),
                                                              static_cast<long long>(mnValid), eBehaviour));
    }

    std::uint64_t mnLength;
    std::uint64_t mnFirst;
    std::uint64_t mnValid;
    std::uint64_t mnEnd;
};

struct Grid
{
    Axis moX;
    Axis moY;
    std::uint64_t mnPixelBits;
    eMarginBehaviour meBehaviour;
};

// Neighbouring pixels of a row that take neighbouring pixels: forwards (1), backwards (-1), or all the same one (0).
struct ColumnRun
{
    std::uint64_t mnTo;
    std::uint64_t mnFrom;
    std::uint64_t mnCount;
    int mnStep;
};

// The runs that fill the columns outside the valid ones; there are few unless the margin is wider than the valid part.
class ColumnRuns
{
public:
    // Takes up the work at the n-th column outside; what does not fit is left for the next one.
    ColumnRuns(const Grid& oGrid, std::uint64_t nStart) : mnNext(nStart)
    {
        const Axis& oX = oGrid.moX;
        for (; mnNext < oX.Outside(); ++mnNext)
        {
            const std::uint64_t nTo = oX.OutsideAt(mnNext);
            const std::uint64_t nFrom = oX.SourceOf(nTo, oGrid.meBehaviour);
            if (mnCount != 0 && Extend(moRuns[mnCount - 1], nTo, nFrom))
                continue;
            if (mnCount == moRuns.size())
                return;
            moRuns[mnCount++] = {nTo, nFrom, 1, 0};
        }
    }

    std::uint64_t GetNext() const { return mnNext; }
    const ColumnRun* begin() const { return moRuns.data(); }
    const ColumnRun* end() const { return moRuns.data() + mnCount; }

private:
    static bool Extend(ColumnRun& oRun, std::uint64_t nTo, std::uint64_t nFrom)
    {
        const auto nStep = static_cast<std::int64_t>(nFrom - oRun.mnFrom);
        if (nTo != oRun.mnTo + oRun.mnCount)
            return false;
        if (oRun.mnCount == 1 && nStep >= -1 && nStep <= 1)
            oRun.mnStep = static_cast<int>(nStep);
        else if (oRun.mnCount == 1 || nStep != static_cast<std::int64_t>(oRun.mnCount) * oRun.mnStep)
            return false;
        ++oRun.mnCount;
        return true;
    }

    std::array<ColumnRun, 64> moRuns;
    std::size_t mnCount = 0;
    std::uint64_t mnNext;
};

// The rows of a buffer that a run fills.
struct Rows
{
    unsigned char* mpFirst;
    std::size_t mnRowBytes;
    std::uint64_t mnCount;
    std::size_t mnPixelBytes;
};

// A pixel size known to the compiler lets it move whole vectors; 0 stands for any other size.
template <std::size_t N>
void FillRun(const Rows& oRows, const ColumnRun& oRun)
{
    const std::size_t nBytes = N != 0 ? N : oRows.mnPixelBytes;
    for (std::uint64_t nRow = 0; nRow < oRows.mnCount; ++nRow)
    {
        unsigned char* __restrict pTo = oRows.mpFirst + nRow * oRows.mnRowBytes + oRun.mnTo * nBytes;
        const unsigned char* __restrict pFrom = oRows.mpFirst + nRow * oRows.mnRowBytes + oRun.mnFrom * nBytes;
        if (oRun.mnStep > 0)
            std::memcpy(pTo, pFrom, oRun.mnCount * nBytes);
        else if (oRun.mnStep == 0)
            for (std::size_t i = 0; i < oRun.mnCount; ++i)
                std::memcpy(pTo + i * nBytes, pFrom, nBytes);
        else
            for (std::size_t i = 0; i < oRun.mnCount; ++i)
                std::memcpy(pTo + i * nBytes, pFrom - i * nBytes, nBytes);
    }
}

using RunFiller = void (*)(const Rows&, const ColumnRun&);

RunFiller ChooseRunFiller(std::uint64_t nPixelBytes)
{
    switch (nPixelBytes)
    {
    case 1:
        return FillRun<1>;
    case 2:
        return FillRun<2>;
    case 3:
        return FillRun<3>;
    case 4:
        return FillRun<4>;
    case 6:
        return FillRun<6>;
    case 8:
        return FillRun<8>;
    case 12:
        return FillRun<12>;
    case 16:
        return FillRun<16>;
    case 24:
        return FillRun<24>;
    case 32:
        return FillRun<32>;
    default:
        return FillRun<0>;
    }
}

// Buffers in which every pixel begins on a byte.
class ByteFiller
{
public:
    ByteFiller(unsigned char* pBuffer, const Grid& oGrid)
        : mpBuffer(pBuffer), moGrid(oGrid), mnPixelBytes(oGrid.mnPixelBits / 8),
          mnRowBytes(oGrid.moX.mnLength * mnPixelBytes)
    {
    }

    void CopyColumns() const
    {
        const Rows oRows{Row(moGrid.moY.mnFirst), mnRowBytes, moGrid.moY.mnValid, mnPixelBytes};
        const RunFiller FillPixels = ChooseRunFiller(mnPixelBytes);
        for (std::uint64_t nNext = 0; nNext < moGrid.moX.Outside();)
        {
            const ColumnRuns oRuns(moGrid, nNext);
            for (const ColumnRun& oRun : oRuns)
                FillPixels(oRows, oRun);
            nNext = oRuns.GetNext();
        }
    }

    void ClearColumns() const
    {
        const Axis& oX = moGrid.moX;
        for (std::uint64_t nRow = moGrid.moY.mnFirst; nRow < moGrid.moY.mnEnd; ++nRow)
        {
            std::memset(Row(nRow), 0, oX.mnFirst * mnPixelBytes);
            std::memset(Row(nRow) + oX.mnEnd * mnPixelBytes, 0, (oX.mnLength - oX.mnEnd) * mnPixelBytes);
        }
    }

    void CopyRow(std::uint64_t nFrom, std::uint64_t nTo) const { std::memcpy(Row(nTo), Row(nFrom), mnRowBytes); }
    void ClearRow(std::uint64_t nRow) const { std::memset(Row(nRow), 0, mnRowBytes); }

private:
    unsigned char* Row(std::uint64_t nRow) const { return mpBuffer + nRow * mnRowBytes; }

    unsigned char* mpBuffer;
    const Grid& moGrid;
    std::size_t mnPixelBytes;
    std::size_t mnRowBytes;
};

// Packed buffers in which pixels and rows begin on any bit.
class BitFiller
{
public:
    BitFiller(unsigned char* pBuffer, const Grid& oGrid)
        : mpBuffer(pBuffer), moGrid(oGrid), mnRowBits(oGrid.moX.mnLength * oGrid.mnPixelBits)
    {
    }

    void CopyColumns() const
    {
        for (std::uint64_t nRow = moGrid.moY.mnFirst; nRow < moGrid.moY.mnEnd; ++nRow)
            for (std::uint64_t i = 0; i < moGrid.moX.Outside(); ++i)
            {
                const std::uint64_t nTo = moGrid.moX.OutsideAt(i);
                const std::uint64_t nFrom = moGrid.moX.SourceOf(nTo, moGrid.meBehaviour);
                detail::CopyBits(mpBuffer, nRow * mnRowBits + nFrom * moGrid.mnPixelBits, mpBuffer,
                                 nRow * mnRowBits + nTo * moGrid.mnPixelBits, moGrid.mnPixelBits);
            }
    }

    void ClearColumns() const
    {
        const Axis& oX = moGrid.moX;
        for (std::uint64_t nRow = moGrid.moY.mnFirst; nRow < moGrid.moY.mnEnd; ++nRow)
        {
            detail::ClearBits(mpBuffer, nRow * mnRowBits, oX.mnFirst * moGrid.mnPixelBits);
            detail::ClearBits(mpBuffer, nRow * mnRowBits + oX.mnEnd * moGrid.mnPixelBits,
                              (oX.mnLength - oX.mnEnd) * moGrid.mnPixelBits);
        }
    }

    void CopyRow(std::uint64_t nFrom, std::uint64_t nTo) const
    {
        detail::CopyBits(mpBuffer, nFrom * mnRowBits, mpBuffer, nTo * mnRowBits, mnRowBits);
    }

    void ClearRow(std::uint64_t nRow) const { detail::ClearBits(mpBuffer, nRow * mnRowBits, mnRowBits); }

private:
    unsigned char* mpBuffer;
    const Grid& moGrid;
    std::uint64_t mnRowBits;
};

template <typename TFiller>
void Fill(const TFiller& oFiller, const Grid& oGrid)
{
    const bool bClear = oGrid.meBehaviour == eConstant;
    bClear ? oFiller.ClearColumns() : oFiller.CopyColumns();
    for (std::uint64_t i = 0; i < oGrid.moY.Outside(); ++i)
    {
        const std::uint64_t nRow = oGrid.moY.OutsideAt(i);
        bClear ? oFiller.ClearRow(nRow) : oFiller.CopyRow(oGrid.moY.SourceOf(nRow, oGrid.meBehaviour), nRow);
    }
}

[[noreturn]] void ThrowBehaviour(eMarginBehaviour eBehaviour, const Place& oPlace)
{
    throw ParameterException("Margins cannot be filled by the margin behaviour " +
                                 std::to_string(static_cast<int>(eBehaviour)),
                             ParameterException::eInvalidValue, "eBehaviour", oPlace);
}

void CheckBehaviour(eMarginBehaviour eBehaviour, const Place& oPlace)
{
    switch (eBehaviour)
    {
    case eReplicate:
    case eMirror:
    case eMirror101:
    case eConstant:
    case eWrap:
        return;
    default:
        ThrowBehaviour(eBehaviour, oPlace);
    }
}

long long Modulus(long long nIndex, long long nPeriod)
{
    if (nIndex >= -nPeriod && nIndex < nPeriod)
        return nIndex < 0 ? nIndex + nPeriod : nIndex;
    const long long nRest = nIndex % nPeriod;
    return nRest < 0 ? nRest + nPeriod : nRest;
}

long long FoldMirror101(long long nIndex, long long nLength)
{
    if (nLength == 1)
        return 0;
    const long long nPeriod = 2 * (nLength - 1);
    const long long nRest = Modulus(nIndex, nPeriod);
    return nRest < nLength ? nRest : nPeriod - nRest;
}

long long FoldMirror(long long nIndex, long long nLength)
{
    const long long nRest = Modulus(nIndex, 2 * nLength);
    return nRest < nLength ? nRest : 2 * nLength - 1 - nRest;
}

} // namespace

long long FoldIndex(long long nIndex, long long nLength, eMarginBehaviour eBehaviour)
{
    if (nLength <= 0)
        throw ParameterException("A line without pixels cannot be extended", ParameterException::eInvalidValue,
                                 "nLength");
    switch (eBehaviour)
    {
    case eReplicate:
        return std::clamp(nIndex, 0LL, nLength - 1);
    case eMirror:
        return FoldMirror(nIndex, nLength);
    case eMirror101:
        return FoldMirror101(nIndex, nLength);
    case eWrap:
        return Modulus(nIndex, nLength);
    default:
        ThrowBehaviour(eBehaviour, Place::Current());
    }
}

void FillRasterMargins(Raster* const poRaster, eMarginBehaviour eBehaviour, unsigned int nSides)
{
    if (poRaster == nullptr)
        throw DataException("The raster is NULL");
    const auto Margin = [nSides](eMarginSide eSide, unsigned int nMargin)
    {
        return (nSides & eSide) != 0 ? nMargin : 0;
    };
    FillRasterSides(*poRaster, eBehaviour, Margin(eLeftSide, poRaster->GetXMargin()),
                    Margin(eRightSide, poRaster->GetXMargin()), Margin(eTopSide, poRaster->GetYMargin()),
                    Margin(eBottomSide, poRaster->GetYMargin()), Place::Current());
}

void FillRasterSides(Raster& oRaster, eMarginBehaviour eBehaviour, std::uint64_t nLeft, std::uint64_t nRight,
                     std::uint64_t nTop, std::uint64_t nBottom, const Place& oPlace)
{
    CheckBehaviour(eBehaviour, oPlace);
    const Axis oX(oRaster.GetFullWidth(), nLeft, nRight);
    const Axis oY(oRaster.GetFullHeight(), nTop, nBottom);
    if (oX.IsComplete() && oY.IsComplete())
        return;
    if (oX.mnValid == 0 || oY.mnValid == 0)
        throw ParameterException("No pixel of the raster is left to fill its margins from",
                                 ParameterException::eInvalidValue, "nSides", oPlace);
    const Grid oGrid{oX, oY, oRaster.GetDataType().GetValueBits() * oRaster.GetChansCount(), eBehaviour};
    if (oGrid.mnPixelBits % 8 == 0)
        Fill(ByteFiller(oRaster.GetBuffer(), oGrid), oGrid);
    else
        Fill(BitFiller(oRaster.GetBuffer(), oGrid), oGrid);
}

} // namespace krv::gobs
