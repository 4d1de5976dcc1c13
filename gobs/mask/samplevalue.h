#pragma once

#include "gobs/api.h"

#include <cstdint>
#include <string>
#include <type_traits>

namespace krv::gobs
{

// A number to compare pixel values with: any integer of 64 bits, signed or not, exactly, or a real with NaN and the
// infinities. A plain value.
// Example: SampleValue::From(-9999) equals the samples of 16S and 32R that are -9999; no 8U sample equals it.
class KRV_GOBS_API SampleValue
{
public:
    enum eKind
    {
        eUnsigned = 0,
        eNegative = 1, // an integer below 0
        eReal = 2
    };

    static SampleValue FromUnsigned(std::uint64_t nValue);

    // A number from 0 on is of the kind eUnsigned: one number has one form.
    static SampleValue FromSigned(std::int64_t nValue);
    static SampleValue FromReal(double nValue);
    // By the type of a number: integers of any width, float or double.
    template <class Number>
    static SampleValue From(Number nValue)
    {
        static_assert(std::is_arithmetic_v<Number>);
        if constexpr (std::is_floating_point_v<Number>)
            return FromReal(nValue);
        else if constexpr (std::is_signed_v<Number>)
            return FromSigned(nValue);
        else
            return FromUnsigned(nValue);
    }

    eKind GetKind() const { return meKind; }
    bool IsNaN() const { return meKind == eReal && mnReal != mnReal; }

    // Only for the kind that they name.
    // Asking for another kind gives bits without a meaning.
    std::uint64_t GetUnsigned() const { return mnBits; }
    std::int64_t GetNegative() const { return static_cast<std::int64_t>(mnBits); }
    // For every kind; integers are rounded to nearest.
    // Example: 64-bit integers above 2^53 may come out as a neighbour; GetUnsigned and GetNegative are exact.
    double GetReal() const;

    // Decimal digits for integers, the shortest text that reads back the same for reals; "nan", "inf", "-inf".
    // No locale takes part.
    std::string GetText() const;

private:
    SampleValue(eKind eOfValue, std::uint64_t nBits, double nReal) : meKind(eOfValue), mnBits(nBits), mnReal(nReal) {}

    eKind meKind;         // which of the two below counts
    std::uint64_t mnBits; // of an integer
    double mnReal;
};

} // namespace krv::gobs
