#pragma once

#include "toolkit/api.h"

#include <exception>
#include <string>

#include <xercesc/sax/SAXParseException.hpp>

namespace krv::xml::detail
{

// What the parsers above throw: the XML parser's own exception, and a std::exception at once for programs that
// know nothing of that library. what() is "file:line:column: message", without the numbers where there are none.
class KRV_TOOLKIT_API ParseException : public xercesc::SAXParseException, public std::exception
{
public:
    explicit ParseException(const xercesc::SAXParseException& oException);
    ParseException(const ParseException&);
    ParseException& operator=(const ParseException&);
    ~ParseException() override;

    const char* what() const noexcept override;

private:
    std::string moDescription;
};

} // namespace krv::xml::detail
