#pragma once

#include <cmath>
#include <concepts>
#include <cstddef>
#include <cstring>
#include <limits>
#include <type_traits>
#include <utility>

namespace krv::raster::detail
{

// One value from one type to another by the rules of CopyData.
template <typename TTarget, typename TSource>
inline TTarget ConvertValue(TSource nValue)
{
    using Limits = std::numeric_limits<TTarget>;
    if constexpr (std::floating_point<TTarget> || std::same_as<TTarget, TSource>)
        return static_cast<TTarget>(nValue);
    else if constexpr (std::integral<TSource>)
    {
        if (std::cmp_less(nValue, Limits::min()))
            return Limits::min();
        return std::cmp_greater(nValue, Limits::max()) ? Limits::max() : static_cast<TTarget>(nValue);
    }
    else
    {
        // 2 to the number of magnitude bits: the first whole number above the type, exact in both real types.
        constexpr TSource END = static_cast<TSource>(Limits::max() / 2 + 1) * 2;
        const TSource nRounded = std::rint(nValue);
        if (!(nRounded < END))
            return nRounded >= END ? Limits::max() : TTarget(0);
        return nRounded < static_cast<TSource>(Limits::min()) ? Limits::min() : static_cast<TTarget>(nRounded);
    }
}

// Buffers of files need not be aligned.
template <typename T>
inline T LoadValue(const unsigned char* pSource, std::size_t nIndex)
{
    T nValue;
    std::memcpy(&nValue, pSource + nIndex * sizeof(T), sizeof(T));
    return nValue;
}

template <typename T>
inline void StoreValue(unsigned char* pTarget, std::size_t nIndex, T nValue)
{
    std::memcpy(pTarget + nIndex * sizeof(T), &nValue, sizeof(T));
}

template <typename TSource, typename TTarget>
inline void ConvertPlain(const unsigned char* __restrict pSource, unsigned char* __restrict pTarget, std::size_t nFirst,
                         std::size_t nCount)
{
    for (std::size_t i = nFirst; i < nCount; ++i)
        StoreValue(pTarget, i, ConvertValue<TTarget>(LoadValue<TSource>(pSource, i)));
}

} // namespace krv::raster::detail
