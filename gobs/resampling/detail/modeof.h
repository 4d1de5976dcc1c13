#pragma once

#include "gobs/resampling/detail/samplevectors.h"

#include <algorithm>
#include <cmath>
#include <concepts>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <type_traits>

namespace krv::gobs::detail
{

// Of 4 values in order: one that occurs twice, the smallest of several, else the smallest.
template <std::integral T>
inline T ModeOfFour(const T* pValues)
{
    const T nLow = std::min(pValues[0], pValues[1]), nHigh = std::max(pValues[0], pValues[1]);
    const T nOtherLow = std::min(pValues[2], pValues[3]), nOtherHigh = std::max(pValues[2], pValues[3]);
    const T nFirst = std::min(nLow, nOtherLow), nLast = std::max(nHigh, nOtherHigh);
    const T nMiddle = std::max(nLow, nOtherLow), nOtherMiddle = std::min(nHigh, nOtherHigh);
    const T nSecond = std::min(nMiddle, nOtherMiddle), nThird = std::max(nMiddle, nOtherMiddle);
    const T nUpper = nThird == nLast ? nThird : nFirst;
    const T nInner = nSecond == nThird ? nSecond : nUpper;
    return nFirst == nSecond ? nFirst : nInner;
}

template <typename V>
inline V LargerOf(const V& oOne, const V& oOther)
{
    return oOne > oOther ? oOne : oOther;
}

// Of 16 bytes: each is compared with all others at once, turn after turn.
//     values    v0 v1 v2 .. v15       turned by one   v1 v2 v3 .. v0      how many of the others are equal: a count
//     keys      count0 ~v0 | count1 ~v1 | ..          of 16 bits each, of which the largest is the mode's
inline std::uint8_t ModeOfSixteen(const std::uint8_t* pValues)
{
    using Bytes = VectorsOf<std::uint8_t>::Samples;
    using Words = VectorsOf<std::uint16_t>::Samples;
    using Half = VectorsOf<std::uint16_t>::Valid;
    std::uint8_t aTwice[32];
    std::memcpy(aTwice, pValues, 16);
    std::memcpy(aTwice + 16, pValues, 16);
    const auto oValues = simd::Load<Bytes>(pValues);
    Bytes oCounts{};
    for (unsigned int n = 1; n < 16; ++n)
        oCounts -= reinterpret_cast<Bytes>(oValues == simd::Load<Bytes>(aTwice + n));
    // The count above, the smaller value below.
    const Bytes oSmaller = ~oValues;
    const auto Keys = [&](unsigned int nFirst)
    {
        const auto oHigh = simd::Load<Half>(reinterpret_cast<const char*>(&oCounts) + nFirst);
        const auto oLow = simd::Load<Half>(reinterpret_cast<const char*>(&oSmaller) + nFirst);
        return (simd::Convert<std::uint16_t>(oHigh) << 8) | simd::Convert<std::uint16_t>(oLow);
    };
    const Words oKeys = LargerOf<Words>(Keys(0), Keys(8));
    unsigned int nBest = 0;
    for (unsigned int n = 0; n < 8; ++n)
        nBest = std::max<unsigned int>(nBest, oKeys[n]);
    return static_cast<std::uint8_t>(255 - nBest % 256);
}

// The mode of bytes, by how often each occurs: fewer than 256 or 65536 of them, as Count says.
template <typename Count>
inline std::uint8_t ModeByCounts(const std::uint8_t* pValues, std::size_t nValues)
{
    using Vector = typename VectorsOf<Count>::Samples;
    constexpr std::size_t LANES = VectorsOf<Count>::LANES;
    // Two tables, so that equal neighbours do not wait for each other.
    Count aCounts[2][256];
    std::memset(aCounts, 0, sizeof aCounts);
    for (std::size_t n = 0; n + 1 < nValues; n += 2)
    {
        ++aCounts[0][pValues[n]];
        ++aCounts[1][pValues[n + 1]];
    }
    if (nValues % 2 != 0)
        ++aCounts[0][pValues[nValues - 1]];
    Vector oMost{};
    for (std::size_t n = 0; n < 256; n += LANES)
    {
        const Vector oSums = simd::Load<Vector>(aCounts[0] + n) + simd::Load<Vector>(aCounts[1] + n);
        std::memcpy(aCounts[0] + n, &oSums, sizeof oSums);
        oMost = LargerOf(oMost, oSums);
    }
    Count nMost = 0;
    for (std::size_t n = 0; n < LANES; ++n)
        nMost = std::max<Count>(nMost, oMost[n]);
    if constexpr (sizeof(Count) == 1)
        return static_cast<std::uint8_t>(static_cast<Count*>(std::memchr(aCounts[0], nMost, 256)) - aCounts[0]);
    else
        return static_cast<std::uint8_t>(std::find(aCounts[0], aCounts[0] + 256, nMost) - aCounts[0]);
}

// The most frequent of one or more values, of several the smallest; NaN above all others, -0 is 0. The values change
// their places.
template <typename T>
inline T ModeOf(T* pValues, std::size_t nValues)
{
    if constexpr (std::integral<T>)
    {
        if (nValues == 4)
            return ModeOfFour(pValues);
    }
    if constexpr (std::is_same_v<T, std::uint8_t>)
    {
        if (nValues == 16)
            return ModeOfSixteen(pValues);
        if (nValues > 16 && nValues < 65536)
            return nValues < 256 ? ModeByCounts<std::uint8_t>(pValues, nValues)
                                 : ModeByCounts<std::uint16_t>(pValues, nValues);
    }
    const auto IsLess = [](T nOne, T nOther)
    {
        if constexpr (std::floating_point<T>)
            return nOne < nOther || (std::isnan(nOther) && !std::isnan(nOne));
        else
            return nOne < nOther;
    };
    std::sort(pValues, pValues + nValues, IsLess);
    T nMode = pValues[0];
    std::size_t nMost = 0;
    for (std::size_t n = 0; n < nValues;)
    {
        std::size_t nEnd = n + 1;
        while (nEnd < nValues && !IsLess(pValues[n], pValues[nEnd]))
            ++nEnd;
        if (nEnd - n > nMost)
        {
            nMost = nEnd - n;
            nMode = pValues[n];
        }
        n = nEnd;
    }
    return static_cast<T>(nMode + T(0));
}

} // namespace krv::gobs::detail
