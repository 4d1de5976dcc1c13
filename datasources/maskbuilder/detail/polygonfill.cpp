#include "datasources/maskbuilder/detail/polygonfill.h"

#include "toolkit/simd/vectors.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <limits>

namespace krv::datasources::detail
{

namespace
{

using Edge = GGLPolyRaster::Edge;

constexpr int BLOCK_ROWS = 64;
// Rows whose two planes are to stay in the nearest cache.
constexpr int DENSE_ROWS = 32;
// Crossings in a row from which on sorting them costs more than two planes.
constexpr std::int64_t MANY_CROSSINGS = 64;
// Wider areas would need planes beyond the caches.
constexpr std::int64_t WIDEST_PLANE = 1 << 20;
constexpr std::size_t SHORT_LIST = 24;
// Crossings in a row up to which it has a slot for each.
constexpr std::size_t FEW_CROSSINGS = 8;

std::int64_t Truncated(double nValue)
{
    return static_cast<std::int64_t>(std::min(std::max(nValue, -9e18), 9e18));
}

void Order(double& nLow, double& nHigh)
{
    const double nFirst = nLow;
    nLow = std::min(nFirst, nHigh);
    nHigh = std::max(nFirst, nHigh);
}

void SortCrossings(double* pFirst, std::size_t nCount)
{
    // Two and four without a branch: their order is anything but predictable.
    if (nCount == 2)
        return Order(pFirst[0], pFirst[1]);
    if (nCount == 4)
    {
        Order(pFirst[0], pFirst[1]);
        Order(pFirst[2], pFirst[3]);
        Order(pFirst[0], pFirst[2]);
        Order(pFirst[1], pFirst[3]);
        return Order(pFirst[1], pFirst[2]);
    }
    if (nCount > SHORT_LIST)
        return std::sort(pFirst, pFirst + nCount);
    for (std::size_t i = 1; i < nCount; ++i)
    {
        const double nValue = pFirst[i];
        std::size_t k = i;
        for (; k > 0 && pFirst[k - 1] > nValue; --k)
            pFirst[k] = pFirst[k - 1];
        pFirst[k] = nValue;
    }
}

// The part of the area that a polygon can reach.
PixelArea Narrowed(PixelArea oArea, const GGLPolyRaster& oPolygon)
{
    oArea.firstRow = std::max<std::int64_t>(oArea.firstRow, oPolygon.GetFirstRow());
    oArea.lastRow = std::min<std::int64_t>(oArea.lastRow, oPolygon.GetLastRow());
    const double nFarthest = std::max(std::fabs(oPolygon.GetLeft()), std::fabs(oPolygon.GetRight()));
    const double nRounding = 2 + nFarthest * 1e-9;
    oArea.lastColumn = std::min(oArea.lastColumn, Truncated(oPolygon.GetRight() + nRounding));
    // Columns up to 0 keep their own rule, so the area never begins at 0 unless it did or nothing is left of it.
    const std::int64_t nLeft = Truncated(oPolygon.GetLeft() - nRounding);
    if (nLeft > 0)
        oArea.firstColumn = std::max(oArea.firstColumn, nLeft);
    return oArea;
}

// The rows of a block that an edge crosses.
struct EdgeRows
{
    EdgeRows(const Edge& oEdge, int nFirstRow, int nLastRow)
        : first(std::max(oEdge.firstRow, nFirstRow)), last(std::min(oEdge.lastRow, nLastRow))
    {
    }
    int first;
    int last;
};

// The crossings of a block of rows with few each, side by side: what is done to one row is done to several at once.
class Slots
{
public:
    // False when a row has more crossings than slots.
    bool Place(const std::vector<const Edge*>& oActive, const Edge* pNew, const Edge* pNewEnd, int nFirstRow,
               int nLastRow)
    {
        mnFirstRow = nFirstRow;
        mnRows = static_cast<std::size_t>(nLastRow - nFirstRow + 1);
        const auto bActive = [&](const Edge* pEdge)
        {
            return PlaceFrom(0, *pEdge);
        };
        if (!std::all_of(oActive.begin(), oActive.end(), bActive))
            return false;
        for (std::size_t r = 0; r < mnRows; ++r)
        {
            const int nRow = nFirstRow + static_cast<int>(r);
            std::size_t nCount = moCounts[r];
            for (; pNew != pNewEnd && pNew->firstRow == nRow; ++pNew)
            {
                if (nCount == FEW_CROSSINGS || (pNew->lastRow > nRow && !PlaceFrom(r + 1, *pNew)))
                    return false;
                moValues[nCount++][r] = pNew->x;
            }
            moCounts[r] = nCount;
        }
        mnCount = *std::max_element(moCounts.begin(), moCounts.end());
        for (std::size_t r = 0; r < mnRows; ++r)
        {
            for (std::size_t i = moCounts[r]; i < mnCount; ++i)
                moValues[i][r] = std::numeric_limits<double>::infinity();
        }
        return true;
    }

    // Neighbours in turn, as often as there are slots.
    void Sort()
    {
        for (std::size_t nPass = 0; nPass < mnCount; ++nPass)
        {
            for (std::size_t i = nPass % 2; i + 1 < mnCount; i += 2)
            {
                for (std::size_t r = 0; r < mnRows; ++r)
                    Order(moValues[i][r], moValues[i + 1][r]);
            }
        }
    }

    // Makes the ends of its span of every pair, clipped to the area; the first beyond the last where there is none.
    void TakeSpans(double nFirst, double nLast)
    {
        for (std::size_t i = 0; i < mnCount; i += 2)
        {
            for (std::size_t r = 0; r < mnRows; ++r)
            {
                const double nCrossing = moValues[i + 1][r];
                const double nStart = std::trunc(moValues[i][r] + 0.5);
                const double nEnd = std::max(nStart, std::trunc(nCrossing - 0.5));
                moValues[i][r] = std::max(nStart, nFirst);
                moValues[i + 1][r] = nCrossing < nFirst ? nFirst - 1 : std::min(nEnd, nLast);
            }
        }
    }

    std::size_t GetRows() const { return mnRows; }
    std::size_t GetCount() const { return mnCount; }
    std::pair<double, double> GetSpan(std::size_t i, std::size_t r) const
    {
        return {moValues[i][r], moValues[i + 1][r]};
    }

private:
    // Goes from a row to the end of the edge or of the block.
    bool PlaceFrom(std::size_t nFirst, const Edge& oEdge)
    {
        const auto nEnd = static_cast<std::size_t>(
            std::min<std::int64_t>(std::int64_t{oEdge.lastRow} - mnFirstRow + 1, static_cast<std::int64_t>(mnRows)));
        for (std::size_t r = nFirst; r < nEnd; ++r)
        {
            if (moCounts[r] == FEW_CROSSINGS)
                return false;
            moValues[moCounts[r]++][r] = oEdge.At(mnFirstRow + static_cast<int>(r));
        }
        return true;
    }

    std::array<std::array<double, BLOCK_ROWS>, FEW_CROSSINGS> moValues;
    std::array<std::size_t, BLOCK_ROWS> moCounts{};
    int mnFirstRow = 0;
    std::size_t mnRows = 0;
    std::size_t mnCount = 0;
};

constexpr std::array<std::array<std::uint64_t, 2>, 64> MakeBitMasks()
{
    std::array<std::array<std::uint64_t, 2>, 64> oMasks{};
    for (std::size_t i = 0; i < 64; ++i)
        oMasks[i] = {std::uint64_t{1} << (63 - i), 0};
    return oMasks;
}

// A pair of planes with one bit of the first set, for each of its 64.
alignas(16) constexpr std::array<std::array<std::uint64_t, 2>, 64> BIT_MASKS = MakeBitMasks();

// Flips the bits of edges in the planes of a dense block: column c of the area has the bit c + 64, and all that lies
// right of it the one behind its last. What lies left of the area is bit 63 where it rounds to the first column and
// else bit 62. The crossings are those of Edge::At; where they are below 0 the bits are some of these all the same.
class BitFlipper
{
public:
    BitFlipper(std::int64_t nFirstColumn, std::int64_t nLastColumn, PolygonFill::Planes* pPlanes, std::size_t nRowWords)
        : mnFirst(static_cast<std::int32_t>(nFirstColumn)),
          mnLowest(static_cast<double>(std::max<std::int64_t>(nFirstColumn - 1, 0))),
          mnHighest(static_cast<double>(nLastColumn + 1)), mpPlanes(pPlanes), mnRowWords(nRowWords)
    {
    }

    // Rows nFirst to nLast, counted from the block's first.
    void Flip(const Edge& oEdge, int nBlockRow, int nFirst, int nLast) const
    {
        Bits oBits;
        FindBits(oEdge, nBlockRow, nFirst / 4 * 4, nLast, oBits);
        auto* pRow = reinterpret_cast<unsigned char*>(mpPlanes + static_cast<std::size_t>(nFirst) * mnRowWords + 1);
        const std::size_t nRowBytes = mnRowWords * sizeof(PolygonFill::Planes);
        const auto nEnd = static_cast<std::size_t>(nLast) + 1;
        auto k = static_cast<std::size_t>(nFirst);
        for (; k + 2 <= nEnd; k += 2, pRow += 2 * nRowBytes)
        {
            FlipBit(pRow + oBits.places[k], oBits.masks[k]);
            FlipBit(pRow + nRowBytes + oBits.places[k + 1], oBits.masks[k + 1]);
        }
        if (k < nEnd)
            FlipBit(pRow + oBits.places[k], oBits.masks[k]);
    }

private:
    // Where the bits of the rows lie: bytes from the row's first column, and bytes into the table of masks.
    struct Bits
    {
        alignas(16) std::array<std::int32_t, DENSE_ROWS> places;
        alignas(16) std::array<std::int32_t, DENSE_ROWS> masks;
    };

#if defined(KRV_VECTORS)
    // By fours of rows; those beyond the edge are not looked at.
    //     rows        r0 r1 | r2 r3      as doubles, in two vectors
    //     crossings   x0 x1 | x2 x3
    //     bits        b0 b1 b2 b3        of 32 bits, one less where a crossing lies left of the area
    void FindBits(const Edge& oEdge, int nBlockRow, int nFirst, int nLast, Bits& oBits) const
    {
        using Doubles = simd::Vector<double, 2>;
        const auto oX = simd::Spread<Doubles>(oEdge.x), oSlope = simd::Spread<Doubles>(oEdge.slope);
        const auto oArea = simd::Spread<Doubles>(mnFirst);
        const auto oFrom =
            simd::Spread<Doubles>(static_cast<double>(std::int64_t{nBlockRow} + nFirst - oEdge.firstRow));
        Doubles oRows = oFrom + Doubles{0, 1}, oNextRows = oFrom + Doubles{2, 3};
        const auto Columns = [this](Doubles oCrossings)
        {
            return simd::Smaller(simd::Larger(oCrossings + 0.5, simd::Spread<Doubles>(mnLowest)),
                                 simd::Spread<Doubles>(mnHighest));
        };
        for (auto nRow = static_cast<std::size_t>(nFirst); nRow <= static_cast<std::size_t>(nLast); nRow += 4)
        {
            const Doubles oCrossings = oX + oRows * oSlope, oNextCrossings = oX + oNextRows * oSlope;
            const auto oLeft =
                simd::As<std::int32_t>(simd::EveryOther<float, false>(oCrossings < oArea, oNextCrossings < oArea));
            const auto oFour = simd::TruncateInts(Columns(oCrossings), Columns(oNextCrossings));
            const auto oBit = oFour - mnFirst + oLeft;
            simd::Store(&oBits.places[nRow], (oBit >> 6) << 4);
            simd::Store(&oBits.masks[nRow], (oBit & 63) << 4);
            oRows += 4;
            oNextRows += 4;
        }
    }

    // The bit in the odd plane, and in the one beside it where it was set:
    //     planes   odd | again      bit   b | 0      odd & b, moved up   0 | odd & b
    static void FlipBit(unsigned char* pPlanes, std::int32_t nMask)
    {
        const auto* const pMasks = reinterpret_cast<const unsigned char*>(BIT_MASKS.data());
        const auto oBit = simd::Load<simd::Block>(pMasks + nMask), oOld = simd::Load<simd::Block>(pPlanes);
        simd::Store(pPlanes, (oOld ^ oBit) | simd::MoveUp<8>(oOld & oBit));
    }
#else
    void FindBits(const Edge& oEdge, int nBlockRow, int nFirst, int nLast, Bits& oBits) const
    {
        const auto nFrom = static_cast<double>(std::int64_t{nBlockRow} - oEdge.firstRow);
        for (int nRow = nFirst; nRow <= nLast; ++nRow)
        {
            const double nCrossing = oEdge.x + (nFrom + nRow) * oEdge.slope;
            const auto nColumn = static_cast<std::int32_t>(std::min(std::max(nCrossing + 0.5, mnLowest), mnHighest));
            const std::int32_t nBit = nColumn - mnFirst - (nCrossing < mnFirst ? 1 : 0);
            oBits.places[static_cast<std::size_t>(nRow)] = (nBit >> 6) * 16;
            oBits.masks[static_cast<std::size_t>(nRow)] = (nBit & 63) * 16;
        }
    }

    static void FlipBit(unsigned char* pPlanes, std::int32_t nMask)
    {
        auto& oPlanes = *reinterpret_cast<PolygonFill::Planes*>(pPlanes);
        const std::uint64_t nBit = BIT_MASKS[static_cast<std::size_t>(nMask) / 16][0];
        oPlanes.again |= oPlanes.odd & nBit;
        oPlanes.odd ^= nBit;
    }
#endif

    std::int32_t mnFirst;
    double mnLowest;
    double mnHighest;
    PolygonFill::Planes* mpPlanes;
    std::size_t mnRowWords;
};

// The highest bit is the first: every bit becomes the exclusive-or of all up to it.
std::uint64_t RunningXor(std::uint64_t n)
{
    n ^= n >> 1;
    n ^= n >> 2;
    n ^= n >> 4;
    n ^= n >> 8;
    n ^= n >> 16;
    n ^= n >> 32;
    return n;
}

} // namespace

PolygonFill::PolygonFill(MaskRows& oRows, const PixelArea& oArea) : moRows(oRows), moArea(oArea) {}

void PolygonFill::Fill(const GGLPolyRaster& oPolygon)
{
    const PixelArea oWhole = moArea;
    moArea = Narrowed(oWhole, oPolygon);
    if (!moArea.IsEmpty())
        FillRows(oPolygon, static_cast<int>(moArea.firstRow), static_cast<int>(moArea.lastRow));
    moArea = oWhole;
}

void PolygonFill::FillRows(const GGLPolyRaster& oPolygon, int nFirstRow, int nLastRow)
{
    const auto& oEdges = oPolygon.GetEdges();
    const Edge* const pEnd = oEdges.data() + oEdges.size();
    const std::size_t nAbove = oPolygon.CountEdgesAbove(nFirstRow);
    oPolygon.FindReaching(nFirstRow, nAbove, moActive);
    mpNew = mpNewEnd = oEdges.data() + nAbove;
    for (std::int64_t nBlock = nFirstRow; nBlock <= nLastRow; nBlock += BLOCK_ROWS)
    {
        const auto nFirst = static_cast<int>(nBlock);
        const auto nLast = static_cast<int>(std::min<std::int64_t>(nBlock + BLOCK_ROWS - 1, nLastRow));
        std::int64_t nCrossings = 0;
        for (const Edge* pEdge : moActive)
            nCrossings += std::min(pEdge->lastRow, nLast) - nFirst + 1;
        for (; mpNewEnd != pEnd && mpNewEnd->firstRow <= nLast; ++mpNewEnd)
            nCrossings += std::min(mpNewEnd->lastRow, nLast) - mpNewEnd->firstRow + 1;
        FillBlock(oPolygon, nFirst, nLast, nCrossings);
        std::erase_if(moActive, [nLast](const Edge* pEdge) { return pEdge->lastRow <= nLast; });
        for (; mpNew != mpNewEnd; ++mpNew)
        {
            if (mpNew->lastRow > nLast)
                moActive.push_back(mpNew);
        }
    }
}

void PolygonFill::FillBlock(const GGLPolyRaster& oPolygon, int nFirstRow, int nLastRow, std::int64_t nCrossings)
{
    const int nRows = nLastRow - nFirstRow + 1;
    if (nCrossings <= nRows * static_cast<std::int64_t>(FEW_CROSSINGS) && FillFew(nFirstRow, nLastRow))
        return;
    const bool bPlanesFit = moArea.lastColumn >= 0 && moArea.lastColumn < std::numeric_limits<int>::max() &&
                            moArea.lastColumn - moArea.firstColumn < WIDEST_PLANE;
    if (nCrossings <= nRows * MANY_CROSSINGS || !bPlanesFit)
        return FillSparse(nFirstRow, nLastRow);
    for (std::int64_t nRow = nFirstRow; nRow <= nLastRow; nRow += DENSE_ROWS)
        FillDense(oPolygon, static_cast<int>(nRow),
                  static_cast<int>(std::min<std::int64_t>(nRow + DENSE_ROWS - 1, nLastRow)));
}

bool PolygonFill::FillFew(int nFirstRow, int nLastRow)
{
    Slots oSlots;
    if (!oSlots.Place(moActive, mpNew, mpNewEnd, nFirstRow, nLastRow))
        return false;
    oSlots.Sort();
    oSlots.TakeSpans(static_cast<double>(moArea.firstColumn), static_cast<double>(moArea.lastColumn));
    // The writing comes last, by itself: how long each run is can hardly be foreseen, and what follows a wrong guess
    // is quickly begun anew when the ends of the runs are there.
    for (std::size_t r = 0; r < oSlots.GetRows(); ++r)
        for (std::size_t i = 0; i < oSlots.GetCount(); i += 2)
        {
            const auto [nStart, nEnd] = oSlots.GetSpan(i, r);
            if (nStart <= nEnd)
                moRows.SetRun(nFirstRow + static_cast<int>(r), static_cast<std::int64_t>(nStart),
                              static_cast<std::int64_t>(nEnd));
        }
    return true;
}

void PolygonFill::FillSparse(int nFirstRow, int nLastRow)
{
    moReaching = moActive;
    moCrossings.resize(moActive.size() + static_cast<std::size_t>(mpNewEnd - mpNew));
    const Edge* pNew = mpNew;
    for (int nRow = nFirstRow; nRow <= nLastRow; ++nRow)
    {
        std::size_t nCount = 0, nStay = 0;
        for (const Edge* const pEdge : moReaching)
        {
            moCrossings[nCount++] = pEdge->At(nRow);
            moReaching[nStay] = pEdge;
            nStay += pEdge->lastRow > nRow ? 1 : 0;
        }
        moReaching.resize(nStay);
        for (; pNew != mpNewEnd && pNew->firstRow == nRow; ++pNew)
        {
            moCrossings[nCount++] = pNew->x;
            if (pNew->lastRow > nRow)
                moReaching.push_back(pNew);
        }
        FillRow(nRow, moCrossings.data(), nCount);
    }
}

void PolygonFill::FillRow(int nRow, double* pCrossings, std::size_t nCount)
{
    SortCrossings(pCrossings, nCount);
    const std::int64_t nFirst = moArea.firstColumn, nLast = moArea.lastColumn;
    for (std::size_t i = 0; i + 1 < nCount; i += 2)
    {
        const std::int64_t nStart = Truncated(pCrossings[i] + 0.5);
        const std::int64_t nEnd = std::max(nStart, Truncated(pCrossings[i + 1] - 0.5));
        if (nStart > nLast)
            return;
        if (nEnd >= nFirst && !(pCrossings[i + 1] < static_cast<double>(nFirst)))
            moRows.SetRun(nRow, std::max(nStart, nFirst), std::min(nEnd, nLast));
    }
}

void PolygonFill::FillDense(const GGLPolyRaster& oPolygon, int nFirstRow, int nLastRow)
{
    const std::int64_t nWidth = moArea.lastColumn - std::max<std::int64_t>(moArea.firstColumn, 0) + 1;
    mnRowWords = static_cast<std::size_t>(nWidth) / 64 + 2; // one bit right of the area is written too
    moPlanes.resize(mnRowWords * DENSE_ROWS);               // all clear: TakeRow leaves them so
    moWords.resize(mnRowWords);
    moSpanRows.assign(DENSE_ROWS, false);
    const bool bSpanRows = Flip(nFirstRow, nLastRow);
    for (int nRow = nFirstRow; nRow <= nLastRow; ++nRow)
    {
        const auto r = static_cast<std::size_t>(nRow - nFirstRow);
        Planes* const pRow = moPlanes.data() + r * mnRowWords;
        if (!bSpanRows || !moSpanRows[r])
        {
            TakeRow(nRow, pRow);
            continue;
        }
        std::fill_n(pRow, mnRowWords, Planes{});
        oPolygon.GetScanline(nRow, moCrossings);
        FillRow(nRow, moCrossings.data(), moCrossings.size());
    }
}

// Flips the bits of a block's crossings. Returns whether there are rows to be filled span by span.
bool PolygonFill::Flip(int nFirstRow, int nLastRow)
{
    const BitFlipper oFlipper(std::max<std::int64_t>(moArea.firstColumn, 0), moArea.lastColumn, moPlanes.data(),
                              mnRowWords);
    const bool bAtZero = moArea.firstColumn <= 0;
    bool bSpanRows = false;
    const auto FlipEdge = [&](const Edge& oEdge)
    {
        const EdgeRows oRows(oEdge, nFirstRow, nLastRow);
        if (oRows.first > oRows.last)
            return;
        if (bAtZero && std::min(oEdge.At(oRows.first), oEdge.At(oRows.last)) < 0)
        {
            bSpanRows = true;
            for (int nRow = oRows.first; nRow <= oRows.last; ++nRow)
            {
                if (oEdge.At(nRow) < 0)
                    moSpanRows[static_cast<std::size_t>(nRow - nFirstRow)] = true;
            }
        }
        oFlipper.Flip(oEdge, nFirstRow, oRows.first - nFirstRow, oRows.last - nFirstRow);
    };
    for (const Edge* const pEdge : moActive)
        FlipEdge(*pEdge);
    std::for_each(mpNew, mpNewEnd, FlipEdge);
    return bSpanRows;
}

void PolygonFill::TakeRow(int nRow, Planes* pRow)
{
    const std::int64_t nFirstColumn = std::max<std::int64_t>(moArea.firstColumn, 0);
    const auto nBits = static_cast<std::uint64_t>(moArea.lastColumn - nFirstColumn + 1);
    const auto nWords = static_cast<std::size_t>((nBits + 63) / 64);
    std::uint64_t nInside = 0 - ((pRow[0].odd ^ pRow[0].odd >> 1) & 1);
    // A span that begins left of the area and rounds to its first column has at least this one.
    pRow[1].again |= nInside << 63 & (pRow[0].odd | pRow[0].again) << 63;
    pRow[0] = {};
    for (std::size_t i = 0; i < nWords; ++i)
    {
        const std::uint64_t nRun = RunningXor(pRow[i + 1].odd) ^ nInside;
        moWords[i] = nRun | pRow[i + 1].again;
        nInside = 0 - (nRun & 1);
        pRow[i + 1] = {};
    }
    if (nWords + 1 < mnRowWords)
        pRow[nWords + 1] = {};
    if (nBits % 64 != 0)
        moWords[nWords - 1] &= ~std::uint64_t{0} << (64 - nBits % 64);
    moRows.OrWords(nRow, nFirstColumn, moWords.data(), nBits);
}

} // namespace krv::datasources::detail
