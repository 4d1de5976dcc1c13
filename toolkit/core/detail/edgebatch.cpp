#include "toolkit/core/detail/edgebatch.h"

#include <algorithm>
#include <bit>
#include <cmath>
#include <cstring>

#ifdef __SSE4_1__
#include <immintrin.h>
#endif

namespace krv::core::detail
{

namespace
{

constexpr double GREATEST = std::numeric_limits<double>::max();

constexpr std::size_t LANES = 2;
using Doubles = double __attribute__((vector_size(LANES * sizeof(double))));
using Ints = std::int32_t __attribute__((vector_size(LANES * sizeof(std::int32_t))));

template <typename TVector, typename TArray>
TVector Load(const TArray& oArray, std::size_t i)
{
    TVector oVector;
    std::memcpy(&oVector, &oArray[i], sizeof oVector);
    return oVector;
}

Doubles Lesser(Doubles a, Doubles b)
{
    return a < b ? a : b;
}

Doubles Greater(Doubles a, Doubles b)
{
    return a > b ? a : b;
}

#ifdef __SSE4_1__

// For four flags the bytes of the numbers whose flags are set, moved to the front.
using Shuffle = std::array<std::uint8_t, 16>;
constexpr std::array<Shuffle, 16> MakeShuffles()
{
    std::array<Shuffle, 16> oShuffles{};
    for (std::size_t nFlags = 0; nFlags < 16; ++nFlags)
    {
        std::size_t nTo = 0;
        for (std::size_t i = 0; i < 16; ++i)
        {
            if ((nFlags >> i / 4 & 1) != 0)
                oShuffles[nFlags][nTo++] = static_cast<std::uint8_t>(i);
        }
    }
    return oShuffles;
}
alignas(16) constexpr std::array<Shuffle, 16> SHUFFLES = MakeShuffles();

// The places where a row differs from the one before it, 0 for the second of all. Reads and writes up to three more.
std::size_t FindChanges(const std::int32_t* pnRows, std::size_t nCount, std::uint32_t* pnChanges)
{
    std::size_t nChanges = 0;
    __m128i oPlaces = _mm_setr_epi32(0, 1, 2, 3);
    for (std::size_t i = 0; i < nCount; i += 4)
    {
        const __m128i oBefore = _mm_loadu_si128(reinterpret_cast<const __m128i*>(pnRows + i));
        const __m128i oRows = _mm_loadu_si128(reinterpret_cast<const __m128i*>(pnRows + i + 1));
        unsigned int nFlags =
            15u ^ static_cast<unsigned int>(_mm_movemask_ps(_mm_castsi128_ps(_mm_cmpeq_epi32(oBefore, oRows))));
        if (nCount - i < 4)
            nFlags &= (1u << (nCount - i)) - 1;
        const __m128i oShuffle = _mm_load_si128(reinterpret_cast<const __m128i*>(SHUFFLES[nFlags].data()));
        _mm_storeu_si128(reinterpret_cast<__m128i*>(pnChanges + nChanges), _mm_shuffle_epi8(oPlaces, oShuffle));
        nChanges += static_cast<std::size_t>(std::popcount(nFlags));
        oPlaces = _mm_add_epi32(oPlaces, _mm_set1_epi32(4));
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
        const auto oUpperX = Load<Doubles>(moUpperX, i), oUpperY = Load<Doubles>(moUpperY, i);
        const auto oLowerX = Load<Doubles>(moLowerX, i), oLowerY = Load<Doubles>(moLowerY, i);
        const auto oFirst = __builtin_convertvector(Load<Ints>(moFirstRows, i), Doubles);
        const auto oLast = __builtin_convertvector(Load<Ints>(moLastRows, i), Doubles);
        const Doubles oDeltaX = oLowerX - oUpperX, oDeltaY = oLowerY - oUpperY, oSum = oDeltaX + oDeltaY;
        oBad |= oSum - oSum != 0;
        const Doubles oSlope = Greater(Doubles{} - GREATEST, Lesser(Doubles{} + GREATEST, oDeltaX / oDeltaY));
        Doubles oX = oUpperX + (oFirst + 0.5 - oUpperY) * oSlope;
        oX = Lesser(Greater(oLowerX, oUpperX), Greater(Lesser(oUpperX, oLowerX), oX));
        const Doubles oEnd = oX + (oLast - oFirst) * oSlope;
        oLeft = Lesser(oLeft, Lesser(oX, oEnd));
        oRight = Greater(oRight, Greater(oX, oEnd));
        std::memcpy(&moX[i], &oX, sizeof oX);
        std::memcpy(&moSlopes[i], &oSlope, sizeof oSlope);
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
