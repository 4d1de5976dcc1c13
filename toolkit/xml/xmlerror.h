#pragma once

#include "toolkit/api.h"

#include <exception>
#include <string>

namespace krv::xml
{

// The half of the XML parser's own exception that programs see that know nothing of that library: what the parsers of
// xmldocument.h throw is a xercesc::SAXParseException and one of these at once. what() is "file:line:column: message",
// without the numbers where there are none.
// Example: catch (const krv::xml::ParseError& oError) in a program that links neither Xerces nor Xalan.
class KRV_TOOLKIT_API ParseError : public std::exception
{
public:
    // description: what() in full. Made by the parsers alone.
    explicit ParseError(std::string description);
    ParseError(const ParseError&);
    ParseError& operator=(const ParseError&);
    ~ParseError() override;

    const char* what() const noexcept override;

private:
    std::string moDescription;
};

} // namespace krv::xml
