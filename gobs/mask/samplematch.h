#pragma once

#include "gobs/api.h"
#include "gobs/mask/samplevalue.h"
#include "gobs/raster/datatype.h"

#include <cmath>
#include <cstdint>
#include <limits>
#include <optional>
#include <type_traits>
#include <utility>

// The rule by which a sample equals a recorded number, in the sample's own type. Masks, validity, statistics, levels
// and margins all stand on it:
// - integers: the number must be whole and in range; a real that is the rounded maximum of 64 bits means that maximum;
// - 32R: the number rounded to nearest, as long as that is finite: what exceeds the largest float by less than half a
//   step is the largest float, what exceeds it by more equals nothing; 64R: the number;
// - -0 equals 0, NaN equals NaN, the infinities equal themselves;
// - complex types: the real part equals the number and the imaginary part is 0, or both are NaN.

namespace krv::gobs
{

namespace detail
{

// Nothing for a fraction, for NaN and for what lies outside the type.
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

// Nothing where no float is meant; NaN and the infinities stay what they are.
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

} // namespace detail

// The number as a sample, of one part for complex types; nothing when no sample can equal it.
// Example: ToSample<std::uint8_t>(SampleValue::FromReal(300)) is nothing: no 8-bit pixel is no-data by that number.
// Constant time; to be asked once for a channel, not for each pixel.
template <class Sample>
std::optional<Sample> ToSample(const SampleValue& oValue)
{
    const auto eKind = oValue.GetKind();
    if constexpr (std::is_integral_v<Sample>)
    {
        const auto IfInRange = [](auto nValue)
        {
            return std::in_range<Sample>(nValue) ? std::optional<Sample>(static_cast<Sample>(nValue)) : std::nullopt;
        };
        if (eKind == SampleValue::eReal)
            return detail::RealToInteger<Sample>(oValue.GetReal());
        return eKind == SampleValue::eUnsigned ? IfInRange(oValue.GetUnsigned()) : IfInRange(oValue.GetNegative());
    }
    else
    {
        // Integers round once, in the sample's own type.
        if (eKind == SampleValue::eUnsigned)
            return static_cast<Sample>(oValue.GetUnsigned());
        if (eKind == SampleValue::eNegative)
            return static_cast<Sample>(oValue.GetNegative());
        if constexpr (std::is_same_v<Sample, float>)
            return detail::RealToFloat(oValue.GetReal());
        else
            return oValue.GetReal();
    }
}

// Compares the samples of a channel with its number, one by one.
// A plain value; any thread. Example: SampleMatch<float> oMatch(oNoData); oMatch.Matches(nPixel).
template <class Sample>
class SampleMatch
{
public:
    // No number matches nothing.
    // A number that no sample equals, such as 300 for 8U, is as good as none.
    explicit SampleMatch(const std::optional<SampleValue>& oNumber)
    {
        const std::optional<Sample> oValue = oNumber ? ToSample<Sample>(*oNumber) : std::nullopt;
        mbSet = oValue.has_value();
        mnValue = oValue.value_or(Sample{});
        mbNaN = mbSet && mnValue != mnValue;
    }

    // False when no sample can match.
    // Worth asking before a loop over pixels: without a number there is nothing to look for.
    bool IsSet() const { return mbSet; }
    // 0 when it is not set.
    Sample GetValue() const { return mnValue; }

    // NaN matches NaN, unlike in comparisons of C++.
    bool Matches(Sample nSample) const
    {
        if constexpr (std::is_floating_point_v<Sample>)
            return mbSet && (nSample == mnValue || (mbNaN && nSample != nSample));
        else
            return mbSet && nSample == mnValue;
    }
    // A complex sample by its parts.
    bool Matches(Sample nReal, Sample nImaginary) const
    {
        return Matches(nReal) && (mbNaN ? nImaginary != nImaginary : nImaginary == Sample{0});
    }

private:
    Sample mnValue{};   // as the sample's type has it
    bool mbSet = false; // there is a number that a sample can equal
    bool mbNaN = false; // it is NaN
};

// Writes the value that equals the number into the bytes of one value of a type; false, and nothing written, when there
// is none. Throws DataException for one-bit values and for a type outside the table.
// pTarget: as many bytes as one value of the type has, both parts of a complex one; nothing need be aligned.
KRV_GOBS_API bool StoreSample(const SampleValue& oNumber, const DataType& oType, unsigned char* pTarget);

} // namespace krv::gobs
