#pragma once

namespace krv::datasources::detail
{

// The keys that the library itself reads and writes; the grey one is spelled so.
inline constexpr const char* DEFAULT_RED = "DefaultRed";
inline constexpr const char* DEFAULT_GREEN = "DefaultGreen";
inline constexpr const char* DEFAULT_BLUE = "DefaultBlue";
inline constexpr const char* DEFAULT_GRAY = "DefaultGray";
inline constexpr const char* DEFAULT_LUT = "DEFAULT_LUT_REF";
inline constexpr const char* DEFAULT_PCT = "DEFAULT_PCT_REF";
inline constexpr const char* NO_DATA_VALUE = "NO_DATA_VALUE";

} // namespace krv::datasources::detail
