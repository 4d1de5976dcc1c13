#include "toolkit/core/detail/edgebatch.h"

#include "toolkit/simd/vectors.h"

#include <algorithm>
#include <bit>
#include <cmath>
#include <cstring>

namespace krv::core::detail
{

namespace
{

constexpr double GREATEST = std::numeric_limits<double>::max();

constexpr std::size_t LANES = 2;
using Doubles = simd::Vector<double, LANES>;

Doubles Lesser(Doubles a, Doubles b)
{
    return a < b ? a : b;
}

Doubles Greater(Doubles a, Doubles b)
{
    return a > b ? a : b;
}

#if defined(KRV_VECTORS)

// For four flags the bytes of the numbers whose flags are set, moved to the front. Of the flags 1 0 1 1, say:
//     places   p0 p1 p2 p3      to   p0 p2 p3 p0
constexpr std::array<simd::Shuffle, 16> MakeShuffles()
{
    std::array<simd::Shuffle, 16> oShuffles{};
    for (std::size_t nFlags = 0; nFlags < 16; ++nFlags)
    {
        std::size_t nTo = 0;
        for (std::size_t i = 0; i < 16; ++i)
        {
            if ((nFlags >> i / 4 & 1) != 0)
                oShuffles[nFlags].moIndices[nTo++] = static_cast<unsigned char>(i);
        }
    }
    return oShuffles;
}
constexpr std::array<simd::Shuffle, 16> SHUFFLES = MakeShuffles();

// The places where a row differs from the one before it, 0 for the second of all. Reads and writes up to three more.
std::size_t FindChanges(const std::int32_t* pnRows, std::size_t nCount, std::uint32_t* pnChanges)
{
    std::size_t nChanges = 0;
    using Rows = simd::Vector<std::int32_t, 4>;
    Rows oPlaces{0, 1, 2, 3};
    for (std::size_t i = 0; i < nCount; i += 4)
    {
        unsigned int nFlags = 15u ^ simd::TopBits(simd::Load<Rows>(pnRows + i) == simd::Load<Rows>(pnRows + i + 1));
        if (nCount - i < 4)
            nFlags &= (1u << (nCount - i)) - 1;
        simd::Store(pnChanges + nChanges, SHUFFLES[nFlags](simd::As<std::uint8_t>(oPlaces)));
        nChanges += static_cast<std::size_t>(std::popcount(nFlags));
        oPlaces += 4;
    }
    return nChanges;
}

#else

std::size_t FindChanges(const std::int32_t* pnRows, std::size_t nCount, std::uint32_t* pnChanges)
{
    std::size_t nChanges = 0;
    for (std::size_t i = 0; i < nCount; ++i)
    {
        pnChanges[nChanges] = static_cast<std::uint32_t>(i);
        nChanges += pnRows[i] == pnRows[i + 1] ? 0 : 1;
    }
    return nChanges;
}

#endif

} // namespace

// The first row whose centre is not above a vertex, one beyond the last row at most.
void EdgeBatch::FindRows(const GDBVertex* poVertices, std::size_t nCount, std::int32_t* pnRows) const
{
    const double nLowest = mnLowest, nHighest = mnHighest;
    for (std::size_t i = 0; i < nCount; ++i)
    {
        double nRow = std::ceil(poVertices[i].y - 0.5);
        nRow = nRow > nLowest ? nRow : nLowest; // NaN too
        pnRows[i] = static_cast<std::int32_t>(nRow < nHighest ? nRow : nHighest);
    }
}

void EdgeBatch::Take(const GDBVertex& oBefore, const GDBVertex* poVertices, std::size_t nCount)
{
    FindRows(poVertices, nCount, &moRows[1]);
    mnCount = FindChanges(moRows.data(), nCount, moCrossing.data());
    for (std::size_t i = 0; i < mnCount; ++i)
    {
        const std::size_t nTo = moCrossing[i];
        const GDBVertex* const poTo = poVertices + nTo;
        const GDBVertex* const poFrom = nTo == 0 ? &oBefore : poTo - 1;
        const std::int32_t nFromRow = moRows[nTo], nToRow = moRows[nTo + 1];
        const GDBVertex* const poUpper = nFromRow < nToRow ? poFrom : poTo;
        const GDBVertex* const poLower = nFromRow < nToRow ? poTo : poFrom;
        moUpperX[i] = poUpper->x;
        moUpperY[i] = poUpper->y;
        moLowerX[i] = poLower->x;
        moLowerY[i] = poLower->y;
        moFirstRows[i] = std::min(nFromRow, nToRow);
        moLastRows[i] = std::max(nFromRow, nToRow) - 1;
    }
    moRows[0] = moRows[nCount];
}

// Two edges at a time, the lists of their ends side by side:
//     upper x, upper y, lower x, lower y, rows   e0 e1 | e2 e3 | ..     to     x, slope   e0 e1 | e2 e3 | ..
bool EdgeBatch::Compute()
{
    // To whole vectors by the last edge again.
    for (std::size_t i = mnCount; i % LANES != 0; ++i)
    {
        for (Values* poValues : {&moUpperX, &moUpperY, &moLowerX, &moLowerY})
            (*poValues)[i] = (*poValues)[i - 1];
        moFirstRows[i] = moFirstRows[i - 1];
        moLastRows[i] = moLastRows[i - 1];
    }
    Doubles oLeft = Doubles{} + mnLeft, oRight = Doubles{} + mnRight;
    auto oBad = oLeft < oLeft;
    for (std::size_t i = 0; i < mnCount; i += LANES)
    {
        const auto oUpperX = simd::Load<Doubles>(&moUpperX[i]), oUpperY = simd::Load<Doubles>(&moUpperY[i]);
        const auto oLowerX = simd::Load<Doubles>(&moLowerX[i]), oLowerY = simd::Load<Doubles>(&moLowerY[i]);
        const auto oFirst = simd::LoadWidened<double, LANES>(&moFirstRows[i]);
        const auto oLast = simd::LoadWidened<double, LANES>(&moLastRows[i]);
        const Doubles oDeltaX = oLowerX - oUpperX, oDeltaY = oLowerY - oUpperY, oSum = oDeltaX + oDeltaY;
        oBad |= oSum - oSum != 0;
        const Doubles oSlope = Greater(Doubles{} - GREATEST, Lesser(Doubles{} + GREATEST, oDeltaX / oDeltaY));
        Doubles oX = oUpperX + (oFirst + 0.5 - oUpperY) * oSlope;
        oX = Lesser(Greater(oLowerX, oUpperX), Greater(Lesser(oUpperX, oLowerX), oX));
        const Doubles oEnd = oX + (oLast - oFirst) * oSlope;
        oLeft = Lesser(oLeft, Lesser(oX, oEnd));
        oRight = Greater(oRight, Greater(oX, oEnd));
        simd::Store(&moX[i], oX);
        simd::Store(&moSlopes[i], oSlope);
    }
    for (std::size_t i = 0; i < LANES; ++i)
    {
        if (oBad[i] != 0)
            return false;
        mnLeft = std::min(mnLeft, oLeft[i]);
        mnRight = std::max(mnRight, oRight[i]);
    }
    return true;
}

} // namespace krv::core::detail
