#pragma once

#include <cstddef>
#include <string>

namespace krv::plugins::support
{

// The name of an ICC profile: its description, as far as it is plain text; empty for bytes that are no profile.
// Such as "sRGB IEC61966-2.1". pBytes: borrowed, and from a file: nothing behind nBytes is read.
std::string ReadProfileName(const unsigned char* pBytes, std::size_t nBytes);

} // namespace krv::plugins::support
