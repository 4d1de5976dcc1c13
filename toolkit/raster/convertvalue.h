#pragma once

#include <limits>
#include <type_traits>

// The one rule by which a number becomes a sample of another type: copies, levels and margins all stand on it. It is
// always inlined, since sources that are compiled for one instruction set use it too: a function that the linker shares
// could be the other file's.

namespace krv::raster
{

namespace detail
{

// From an integer to another: what is below the target's range becomes its least value, what is above its largest.
template <typename TTarget, typename TSource>
[[gnu::always_inline]] inline TTarget ClampInteger(TSource nValue)
{
    using Source = std::numeric_limits<TSource>;
    using Target = std::numeric_limits<TTarget>;
    constexpr bool BELOW = std::is_signed_v<TSource> && (!std::is_signed_v<TTarget> || Source::digits > Target::digits);
    if constexpr (BELOW)
    {
        constexpr TSource LOWEST = static_cast<TSource>(Target::min());
        nValue = nValue < LOWEST ? LOWEST : nValue;
    }
    if constexpr (Source::digits > Target::digits)
    {
        constexpr TSource MOST = static_cast<TSource>(Target::max());
        nValue = nValue > MOST ? MOST : nValue;
    }
    return static_cast<TTarget>(nValue);
}

// From a real to an integer: rounded half to even, as programs leave the processor's mode; NaN becomes 0.
template <typename TTarget, typename TSource>
[[gnu::always_inline]] inline TTarget RoundInteger(TSource nValue)
{
    using Limits = std::numeric_limits<TTarget>;
    // 2 to the number of magnitude bits: the first whole number above the type, exact in all real types.
    constexpr TSource END = static_cast<TSource>(Limits::max() / 2 + 1) * 2;
    constexpr TSource LOWEST = static_cast<TSource>(Limits::min());
    TSource nRounded = 0;
    if constexpr (std::is_same_v<TSource, long double>)
        nRounded = __builtin_rintl(nValue);
    else
        nRounded = static_cast<TSource>(__builtin_rint(nValue));
    if (!(nRounded < END))
        return nRounded >= END ? Limits::max() : TTarget(0);
    return nRounded < LOWEST ? Limits::min() : static_cast<TTarget>(nRounded);
}

} // namespace detail

// The number as a sample of a type of one part. Integers saturate; reals go to integers rounded half to even and
// saturated, NaN to 0; integers go to reals rounded to nearest; what is beyond 32R becomes infinite.
// Examples: 300 as 8U is 255, -1 as 16U is 0, 2.5 as 16S is 2 and 3.5 is 4, 1e39 as 32R is infinite.
// Never throws and has no undefined value. Complex values go part by part, by the caller.
template <typename TTarget, typename TSource>
[[gnu::always_inline]] inline TTarget ConvertValue(TSource nValue)
{
    if constexpr (std::is_floating_point_v<TTarget>)
        return static_cast<TTarget>(nValue);
    else if constexpr (std::is_integral_v<TSource>)
        return detail::ClampInteger<TTarget>(nValue);
    else
        return detail::RoundInteger<TTarget>(nValue);
}

} // namespace krv::raster
