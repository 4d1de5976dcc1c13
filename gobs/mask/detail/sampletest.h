#pragma once

#include "gobs/mask/detail/complex.h"
#include "gobs/mask/samplevalue.h"

#include <cmath>
#include <cstdint>
#include <limits>
#include <optional>
#include <type_traits>

namespace krv::gobs::detail
{

template <class Sample>
bool IsNaN(const Sample& nSample)
{
    if constexpr (std::is_floating_point_v<Sample>)
        return std::isnan(nSample);
    else
        return false;
}

template <class Part>
bool IsNaN(const Complex<Part>& oSample)
{
    return IsNaN(oSample.mnReal) && IsNaN(oSample.mnImaginary);
}

// The test of one channel, in the type of its samples.
template <class Sample>
struct SampleTest
{
    unsigned int mnChannel; // from 0
    Sample mnValue;
    bool mbNaN; // NaN samples match too

    bool Matches(const Sample& nSample) const { return nSample == mnValue || (mbNaN && IsNaN(nSample)); }
};

template <class Integer>
std::optional<Integer> RealToInteger(double nValue)
{
    using Limits = std::numeric_limits<Integer>;
    // One above the maximum: exact for every type, and what the maximum of 64 bits rounds to.
    const double nEnd = std::ldexp(1.0, Limits::digits);
    if (Limits::digits >= 63 && nValue == nEnd)
        return Limits::max();
    const bool bInside = nValue >= static_cast<double>(Limits::min()) && nValue < nEnd;
    if (!bInside || nValue != std::trunc(nValue))
        return std::nullopt;
    return static_cast<Integer>(nValue);
}

inline std::optional<float> RealToFloat(double nValue)
{
    using Limits = std::numeric_limits<float>;
    // Half a step above the largest float: texts of limits that were rounded upwards lie below it.
    constexpr double ROUNDED = 0x1.ffffffp127;
    if (std::isfinite(nValue) && std::fabs(nValue) > static_cast<double>(Limits::max()))
    {
        if (std::fabs(nValue) > ROUNDED)
            return std::nullopt;
        return nValue < 0 ? Limits::lowest() : Limits::max();
    }
    return static_cast<float>(nValue);
}

// The value in a sample's own type; nothing when no sample can equal it.
template <class Sample>
std::optional<Sample> ToSample(const SampleValue& oValue)
{
    const auto eKind = oValue.GetKind();
    if constexpr (std::is_integral_v<Sample>)
    {
        if (eKind == SampleValue::eReal)
            return RealToInteger<Sample>(oValue.GetReal());
        using Limits = std::numeric_limits<Sample>;
        if (eKind == SampleValue::eUnsigned && oValue.GetUnsigned() <= static_cast<std::uint64_t>(Limits::max()))
            return static_cast<Sample>(oValue.GetUnsigned());
        if constexpr (std::is_signed_v<Sample>)
        {
            if (eKind == SampleValue::eNegative && oValue.GetNegative() >= static_cast<std::int64_t>(Limits::min()))
                return static_cast<Sample>(oValue.GetNegative());
        }
        return std::nullopt;
    }
    else
    {
        // Integers round once, in the sample's own type.
        if (eKind == SampleValue::eUnsigned)
            return static_cast<Sample>(oValue.GetUnsigned());
        if (eKind == SampleValue::eNegative)
            return static_cast<Sample>(oValue.GetNegative());
        if constexpr (std::is_same_v<Sample, float>)
            return RealToFloat(oValue.GetReal());
        else
            return oValue.GetReal();
    }
}

} // namespace krv::gobs::detail
