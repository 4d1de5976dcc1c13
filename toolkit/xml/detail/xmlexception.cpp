#include "toolkit/xml/detail/xmlexception.h"

#include "toolkit/xml/xmlutil.h"

namespace krv::xml::detail
{

ParseException::ParseException(const xercesc::SAXParseException& oException)
    : SAXParseException(oException), moDescription(XmlTranscode(oException.getSystemId()))
{
    if (getLineNumber() > 0)
        moDescription += ":" + std::to_string(getLineNumber()) + ":" + std::to_string(getColumnNumber());
    moDescription += (moDescription.empty() ? "" : ": ") + XmlTranscode(getMessage());
}

ParseException::ParseException(const ParseException&) = default;
ParseException& ParseException::operator=(const ParseException&) = default;
ParseException::~ParseException() = default;

const char* ParseException::what() const noexcept
{
    return moDescription.c_str();
}

} // namespace krv::xml::detail
