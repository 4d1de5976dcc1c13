#pragma once

#include "datasources/api.h"

#include <cstddef>
#include <string>

namespace krv::datasources
{

// What kind of file the first bytes say it is, such as "a PNG image"; empty when they say nothing.
KRV_DATASOURCES_API std::string GuessFileKind(const unsigned char* pHeader, std::size_t nBytes);

// Whether they say so by four bytes or more, which plain pixels do not begin with by chance.
KRV_DATASOURCES_API bool HasSignature(const unsigned char* pHeader, std::size_t nBytes);

} // namespace krv::datasources
