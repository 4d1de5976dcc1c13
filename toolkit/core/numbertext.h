#pragma once

#include "toolkit/api.h"

#include <charconv>
#include <optional>
#include <string>
#include <string_view>
#include <system_error>

namespace krv
{

// Numbers as text, whatever the locale.

// The shortest text that reads back as the same number; "inf", "-inf" and "nan" for what is none.
// Such as "0.1" for 0.1 and "1e+30" for 1e30: at most 24 characters.
KRV_TOOLKIT_API std::string NumberText(double nValue);

// A text that is a number from its first character to its last; no value for any other, and for what Number cannot
// hold.
// No white space, no "+" and no locale: "1,5" is none. Reals may be "inf" and "nan"; integers are decimal.
template <class Number>
std::optional<Number> ParseNumber(std::string_view text)
{
    Number nValue = 0;
    const char* const pEnd = text.data() + text.size();
    const auto [pNext, eError] = std::from_chars(text.data(), pEnd, nValue);
    return eError == std::errc() && pNext == pEnd ? std::optional(nValue) : std::nullopt;
}

} // namespace krv
