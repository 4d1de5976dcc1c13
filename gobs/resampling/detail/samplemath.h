#pragma once

#include <algorithm>
#include <concepts>
#include <cstdint>
#include <limits>
#include <type_traits>

namespace krv::gobs::detail
{

__extension__ using Integer128 = __int128;

template <typename T>
struct SumTraits
{
    using Type = Integer128;
};
template <typename T>
requires(std::integral<T> && sizeof(T) <= 2) struct SumTraits<T>
{
    using Type = std::int64_t;
};
template <>
struct SumTraits<float>
{
    using Type = double;
};
template <>
struct SumTraits<double>
{
    using Type = long double;
};

// What the samples of a box are added up in: exact for integers.
template <typename T>
using SumOf = typename SumTraits<T>::Type;

// What weighted samples are added up in.
template <typename T>
using RealOf = std::conditional_t<sizeof(T) == 8, long double, double>;

// The sum of samples divided by their number; integers round half to even.
template <typename T, typename Sum>
inline T MeanOf(Sum nSum, std::uint64_t nCount)
{
    if constexpr (std::floating_point<T>)
        return static_cast<T>(nSum / static_cast<Sum>(nCount));
    else
    {
        const auto nDivisor = static_cast<Sum>(nCount);
        Sum nQuotient = nSum / nDivisor;
        Sum nRest = nSum % nDivisor;
        if (nRest < 0)
        {
            nRest += nDivisor;
            --nQuotient;
        }
        const Sum nAbove = nDivisor - nRest;
        if (nRest > nAbove || (nRest == nAbove && (nQuotient & 1) != 0))
            ++nQuotient;
        return static_cast<T>(nQuotient);
    }
}

} // namespace krv::gobs::detail
