#pragma once

// Vectors of reals rounded to integers of at most 32 bits, which compilers do not find because of NaN. Part of
// kernelcode.h, whose rules hold here too. Floats to bytes, with four vectors of L lanes:
//     reals     f0 .. | fL .. | f2L .. | f3L ..     limited, NaN made 0
//     integers  i0 .. | iL .. | i2L .. | i3L ..     of 32 bits, rounded by the processor
//     words     two vectors, saturated               bytes  one vector, saturated, put in order

#include "toolkit/simd/vectors.h"

#include <cstddef>
#include <limits>
#include <type_traits>

#if defined(KRV_VECTORS)

namespace krv::raster::detail
{

namespace
{

#if defined(__AVX512VBMI__)

// These processors saturate by themselves, to unsigned integers on both sides once NaN and what lies below are 0, and
// narrow one vector to less: 148 GB/s of floats to bytes against 125 by packing four vectors, 141 against 97 to signed
// ones (24 576 values in the first-level cache).
template <typename TTarget>
inline auto IntsOf(simd::Full<float> o)
{
    constexpr auto MOST = static_cast<float>(std::numeric_limits<TTarget>::max());
    if constexpr (!std::is_signed_v<TTarget>)
        return simd::RoundUnsigned(simd::Larger(o, simd::Full<float>{}));
    else if constexpr (sizeof(TTarget) < 4)
        return simd::RoundIntsOf(simd::NumberBits(o), simd::Smaller(o, simd::Spread<simd::Full<float>>(MOST)));
    else
    {
        using Ints = simd::Full<std::int32_t>;
        const auto nAbove = simd::NotBelowBits(o, simd::Spread<simd::Full<float>>(MOST));
        return simd::SelectByBits(nAbove, simd::Spread<Ints>(std::numeric_limits<std::int32_t>::max()),
                                  simd::RoundIntsOf(simd::NumberBits(o), o));
    }
}

template <typename TTarget>
inline auto IntsOf(simd::Full<double> o)
{
    constexpr auto MOST = static_cast<double>(std::numeric_limits<TTarget>::max());
    if constexpr (!std::is_signed_v<TTarget>)
        return simd::RoundUnsigned(simd::Larger(o, simd::Full<double>{}));
    else
        return simd::RoundIntsOf(simd::NumberBits(o), simd::Smaller(o, simd::Spread<simd::Full<double>>(MOST)));
}

template <typename TTarget>
inline auto LoadInts(const float* p)
{
    return IntsOf<TTarget>(simd::Load<simd::Full<float>>(p));
}
template <typename TTarget>
inline auto LoadInts(const double* p)
{
    return simd::Join(IntsOf<TTarget>(simd::Load<simd::Full<double>>(p)),
                      IntsOf<TTarget>(simd::Load<simd::Full<double>>(p + 8)));
}

template <typename TTarget>
constexpr std::size_t ROUNDED_VALUES = 16;

template <typename TTarget, typename TSource>
inline void StoreRounded(unsigned char* pTarget, const TSource* pSource)
{
    const auto oInts = LoadInts<TTarget>(pSource);
    if constexpr (sizeof(TTarget) == 4)
        simd::Store(pTarget, oInts);
    else
        simd::Store(pTarget, simd::Saturate<TTarget>(oInts));
}

#else

using Ints = simd::Full<std::int32_t>;

template <typename TReal>
inline simd::Full<TReal> LoadReals(const TReal* p)
{
    return simd::Load<simd::Full<TReal>>(p);
}

// Out of range, and for NaN, the processor's conversion gives the lowest integer. That is right below the range; above
// it values are limited beforehand, and NaN is made 0. A limit from below makes NaN 0 by itself.
template <typename TTarget, typename TReals>
inline TReals Limited(TReals oValue)
{
    if constexpr (!std::is_signed_v<TTarget>)
        return simd::Larger(oValue, TReals{});
    else
        return simd::Keep(oValue, oValue == oValue);
}

// 32-bit integers from which packing saturates to the target.
template <typename TTarget>
inline Ints IntsOf(const float* pSource)
{
    constexpr auto MOST = static_cast<float>(std::numeric_limits<TTarget>::max());
    using Floats = simd::Full<float>;
    const Floats oValue = Limited<TTarget>(LoadReals(pSource));
    if constexpr (sizeof(TTarget) < 4)
        return simd::RoundInts(simd::Smaller(oValue, simd::Spread<Floats>(MOST)));
    else if constexpr (std::is_signed_v<TTarget>)
        return simd::RoundInts(oValue) ^ (oValue >= MOST);
    else
    {
        constexpr float HALF = 2147483648.0F;
        const auto oUpper = oValue >= HALF;
        const Ints oRest = simd::RoundInts(oValue - simd::Keep(simd::Spread<Floats>(HALF), oUpper));
        return (oRest ^ oUpper << 31) | (oValue >= MOST);
    }
}

template <typename TTarget>
inline Ints IntsOf(const double* pSource)
{
    using Doubles = simd::Full<double>;
    const Doubles oMost = simd::Spread<Doubles>(static_cast<double>(std::numeric_limits<TTarget>::max()));
    const Doubles oFirst = simd::Smaller(Limited<TTarget>(LoadReals(pSource)), oMost);
    const Doubles oSecond = simd::Smaller(Limited<TTarget>(LoadReals(pSource + sizeof(Doubles) / 8)), oMost);
    if constexpr (sizeof(TTarget) < 4 || std::is_signed_v<TTarget>)
        return simd::RoundInts(oFirst, oSecond);
    else
    {
        constexpr double HALF = 2147483648.0;
        return simd::RoundInts(simd::Rounded(oFirst) - HALF, simd::Rounded(oSecond) - HALF) ^
               std::numeric_limits<std::int32_t>::min();
    }
}

template <typename TTarget>
constexpr std::size_t ROUNDED_VALUES = simd::VECTOR_BYTES / sizeof(TTarget);

template <typename TTarget, typename TSource>
inline void StoreRounded(unsigned char* pTarget, const TSource* pSource)
{
    constexpr std::size_t STEP = simd::VECTOR_BYTES / 4;
    const auto oPair = [pSource](std::size_t nFirst)
    {
        using Half = std::conditional_t<std::is_signed_v<TTarget>, std::int16_t, std::uint16_t>;
        return simd::Pack<Half>(IntsOf<TTarget>(pSource + nFirst), IntsOf<TTarget>(pSource + nFirst + STEP));
    };
    if constexpr (sizeof(TTarget) == 4)
        simd::Store(pTarget, IntsOf<TTarget>(pSource));
    else if constexpr (sizeof(TTarget) == 2)
        simd::Store(pTarget, simd::InOrder<2>(oPair(0)));
    else
        simd::Store(pTarget, simd::InOrder<4>(simd::Pack<TTarget>(oPair(0), oPair(2 * STEP))));
}

#endif

} // namespace

} // namespace krv::raster::detail

#endif
