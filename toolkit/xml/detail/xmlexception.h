#pragma once

#include "toolkit/api.h"
#include "toolkit/xml/xmlerror.h"

#include <xercesc/sax/SAXParseException.hpp>

namespace krv::xml::detail
{

// What the parsers above throw.
class KRV_TOOLKIT_API ParseException : public xercesc::SAXParseException, public ParseError
{
public:
    explicit ParseException(const xercesc::SAXParseException& oException);
    ParseException(const ParseException&);
    ParseException& operator=(const ParseException&);
    ~ParseException() override;
};

} // namespace krv::xml::detail
