#pragma once

#include "datasources/api.h"

#include <cstddef>
#include <string>

namespace krv::datasources
{

// What kind of file the first bytes say it is, such as "a PNG image"; empty when they say nothing.
// For messages. pHeader: nBytes bytes, borrowed.
KRV_DATASOURCES_API std::string GuessFileKind(const unsigned char* pHeader, std::size_t nBytes);

// Whether they say so by four bytes or more, which plain pixels do not begin with by chance.
// A plug-in for plain pixels, which have no signature of their own, declines such files.
KRV_DATASOURCES_API bool HasSignature(const unsigned char* pHeader, std::size_t nBytes);

} // namespace krv::datasources
