#include "gobs/mask/samplevalue.h"

#include "toolkit/core/numbertext.h"

#include <cmath>

namespace krv::gobs
{

SampleValue SampleValue::FromUnsigned(std::uint64_t nValue)
{
    return {eUnsigned, nValue, 0.0};
}

SampleValue SampleValue::FromSigned(std::int64_t nValue)
{
    return {nValue < 0 ? eNegative : eUnsigned, static_cast<std::uint64_t>(nValue), 0.0};
}

SampleValue SampleValue::FromReal(double nValue)
{
    return {eReal, 0, nValue};
}

double SampleValue::GetReal() const
{
    if (meKind == eReal)
        return mnReal;
    return meKind == eNegative ? static_cast<double>(GetNegative()) : static_cast<double>(mnBits);
}

std::string SampleValue::GetText() const
{
    if (meKind == eUnsigned)
        return std::to_string(mnBits);
    if (meKind == eNegative)
        return std::to_string(GetNegative());
    if (std::isnan(mnReal))
        return "nan";
    return NumberText(mnReal);
}

} // namespace krv::gobs
