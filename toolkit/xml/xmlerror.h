#pragma once

#include "toolkit/api.h"

#include <exception>
#include <string>

namespace krv::xml
{

// What the exception that is being handled says, as one line of UTF-8, for the kinds that are no std::exception too:
// those of the XML parser ("file:line:column: message") and of the XPath evaluation. "Unknown error" for any other. For
// use in a catch block only, so that callers can report XML failures without the XML library's headers.
KRV_TOOLKIT_API std::string DescribeCurrentException();

// Whether an exception is the XML parser's: what the parsers of this folder throw is that and a std::exception at once.
KRV_TOOLKIT_API bool IsParseException(const std::exception& oException);

} // namespace krv::xml
