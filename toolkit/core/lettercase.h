#pragma once

#include "toolkit/api.h"

#include <string>
#include <string_view>

namespace krv
{

// The text with the letters a to z as capitals, and the other way. ASCII alone changes: names of formats, options and
// systems do not depend on the locale.
// Bytes above 127, those of UTF-8 among them, pass unchanged.
KRV_TOOLKIT_API std::string ToUpper(std::string_view text);
KRV_TOOLKIT_API std::string ToLower(std::string_view text);

} // namespace krv
