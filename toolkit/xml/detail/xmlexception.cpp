#include "toolkit/xml/detail/xmlexception.h"

#include "toolkit/xml/xmlutil.h"

namespace krv::xml::detail
{

namespace
{

std::string Describe(const xercesc::SAXParseException& oException)
{
    std::string description = XmlTranscode(oException.getSystemId());
    if (oException.getLineNumber() > 0)
        description +=
            ":" + std::to_string(oException.getLineNumber()) + ":" + std::to_string(oException.getColumnNumber());
    return description + (description.empty() ? "" : ": ") + XmlTranscode(oException.getMessage());
}

} // namespace

ParseException::ParseException(const xercesc::SAXParseException& oException)
    : SAXParseException(oException), ParseError(Describe(oException))
{
}

ParseException::ParseException(const ParseException&) = default;
ParseException& ParseException::operator=(const ParseException&) = default;
ParseException::~ParseException() = default;

} // namespace krv::xml::detail
