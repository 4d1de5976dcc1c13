#pragma once

#include "toolkit/api.h"

#include <string>
#include <string_view>

namespace krv
{

// The text with the letters a to z as capitals. ASCII alone changes: names of formats, options and systems do not
// depend on the locale.
KRV_TOOLKIT_API std::string ToUpper(std::string_view text);

} // namespace krv
