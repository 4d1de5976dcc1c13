#include "toolkit/xml/xmlerror.h"

#include "toolkit/xml/detail/xmlexception.h"
#include "toolkit/xml/xmlutil.h"

#include <xalanc/PlatformSupport/XSLException.hpp>
#include <xercesc/util/OutOfMemoryException.hpp>
#include <xercesc/util/XMLException.hpp>

#include <algorithm>
#include <exception>

namespace krv::xml
{
namespace
{

std::string OneLine(std::string text)
{
    std::replace_if(
        text.begin(), text.end(), [](char nCharacter) { return nCharacter == '\n' || nCharacter == '\r'; }, ' ');
    return text;
}

std::string DescribeRaw()
{
    try
    {
        throw;
    }
    catch (const xercesc::SAXParseException& oException)
    {
        return detail::ParseException(oException).what();
    }
    catch (const xercesc::SAXException& oException)
    {
        return XmlTranscode(oException.getMessage());
    }
    catch (const xercesc::XMLException& oException)
    {
        return XmlTranscode(oException.getMessage());
    }
    catch (const xercesc::OutOfMemoryException&)
    {
        return "Out of memory";
    }
    catch (const xalanc::XSLException& oException)
    {
        return XmlTranscode(oException.getMessage().c_str());
    }
    catch (const std::exception& oException)
    {
        return oException.what();
    }
    catch (...)
    {
        return "Unknown error";
    }
}

} // namespace

std::string DescribeCurrentException()
{
    return OneLine(DescribeRaw());
}

bool IsParseException(const std::exception& oException)
{
    return dynamic_cast<const detail::ParseException*>(&oException) != nullptr;
}

} // namespace krv::xml
