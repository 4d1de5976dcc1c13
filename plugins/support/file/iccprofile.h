#pragma once

#include <cstddef>
#include <string>

namespace krv::plugins::support
{

// The name of an ICC profile: its description, as far as it is plain text; empty for bytes that are no profile.
std::string ReadProfileName(const unsigned char* pBytes, std::size_t nBytes);

} // namespace krv::plugins::support
