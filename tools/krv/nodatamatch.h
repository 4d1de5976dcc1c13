#pragma once

#include "datasources/metadata/typednodata.h"

#include <cmath>
#include <concepts>
#include <limits>
#include <optional>
#include <utility>

namespace krv::tool
{

using OptionalNoData = std::optional<krv::datasources::NoDataValue>;

// The number in a pixel type: an integer type must hold it exactly, reals round it. Nothing when no value of the type
// can equal it.
template <std::integral T>
std::optional<T> ValueAs(const krv::gobs::SampleValue& oNumber)
{
    constexpr T HIGHEST = std::numeric_limits<T>::max();
    const auto IfInRange = [](auto nValue)
    {
        return std::in_range<T>(nValue) ? std::optional<T>(static_cast<T>(nValue)) : std::nullopt;
    };
    if (oNumber.GetKind() == krv::gobs::SampleValue::eUnsigned)
        return IfInRange(oNumber.GetUnsigned());
    if (oNumber.GetKind() == krv::gobs::SampleValue::eNegative)
        return IfInRange(oNumber.GetNegative());
    const double nReal = oNumber.GetReal();
    if (!std::isfinite(nReal) || std::trunc(nReal) != nReal)
        return std::nullopt;
    // The largest 64-bit integers, written as reals, are rounded up by one.
    if (nReal == static_cast<double>(HIGHEST))
        return HIGHEST;
    if (nReal < static_cast<double>(std::numeric_limits<T>::min()) || nReal > static_cast<double>(HIGHEST))
        return std::nullopt;
    return static_cast<T>(nReal);
}

template <std::floating_point T>
std::optional<T> ValueAs(const krv::gobs::SampleValue& oNumber)
{
    constexpr double HIGHEST = std::numeric_limits<T>::max();
    const double nReal = oNumber.GetReal();
    if (!std::isfinite(nReal) || std::fabs(nReal) <= HIGHEST)
        return static_cast<T>(nReal);
    // -3.40282347e+38 means the limit, which it exceeds by the rounding of its digits alone.
    return std::fabs(nReal) <= HIGHEST * (1 + std::numeric_limits<T>::epsilon())
               ? std::optional<T>(static_cast<T>(std::copysign(HIGHEST, nReal)))
               : std::nullopt;
}

// Whether values of one type are a channel's no-data value. NaN matches NaN. A complex value matches when its real part
// does and its imaginary part is 0 (when NaN is the value: both are NaN).
template <typename T>
class NoDataMatch
{
public:
    explicit NoDataMatch(const OptionalNoData& oNumber)
    {
        const std::optional<T> oValue = oNumber ? ValueAs<T>(*oNumber) : std::nullopt;
        mbSet = oValue.has_value();
        mnValue = oValue.value_or(T{});
        mbNan = mbSet && mnValue != mnValue;
    }

    // False when no value of the type can match.
    bool IsSet() const { return mbSet; }

    bool Matches(T nValue) const
    {
        if constexpr (std::is_floating_point_v<T>)
            return mbSet && (nValue == mnValue || (mbNan && nValue != nValue));
        else
            return mbSet && nValue == mnValue;
    }

    bool Matches(T nReal, T nImaginary) const
    {
        return Matches(nReal) && (mbNan ? nImaginary != nImaginary : nImaginary == T{0});
    }

private:
    T mnValue{};
    bool mbSet = false;
    bool mbNan = false;
};

} // namespace krv::tool
