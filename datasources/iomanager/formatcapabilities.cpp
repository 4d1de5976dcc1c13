#include "datasources/iomanager/formatcapabilities.h"

#include "datasources/iomanager/xalanselect.h"
#include "toolkit/core/numbertext.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/debugger.h"
#include "toolkit/xml/xmldocument.h"
#include "toolkit/xml/xmlerror.h"
#include "toolkit/xml/xmlutil.h"

#include <xalanc/PlatformSupport/XSLException.hpp>
#include <xalanc/XalanDOM/XalanNode.hpp>

#include <limits>

namespace krv::datasources
{

namespace
{

constexpr unsigned long long NO_LIMIT = std::numeric_limits<unsigned long long>::max();

constexpr const char* UNKNOWN_ERROR = "An unknown error occur during the XPath evaluation"; // the wording is intended

void Report(const std::string& message, std::source_location oLocation = std::source_location::current())
{
    if (krv::nspio::Debugger::GetLevel() != 0)
        krv::nspio::Debugger::Debug(1, "qrframework", message, std::string(krv::SourceFileText(oLocation.file_name())),
                                    oLocation.line());
}

// Asks a question of the parsed description; any failure is reported as debug output and answers `oOtherwise`.
template <typename Answer, typename Question>
Answer Ask(const std::string& xmlPath, const std::string& xpath, Answer oOtherwise, Question oQuestion)
{
    try
    {
        const krv::xml::Document oDocument = krv::xml::ParseFile(xmlPath);
        return oQuestion(SelectSingleNode(xpath, oDocument.Get()));
    }
    catch (const xalanc::XSLException& oException)
    {
        Report(XmlTranscode(oException.getMessage().c_str()));
    }
    catch (const std::exception& oException)
    {
        // The XML parser's own exception has no words here, intended, whatever else it is.
        Report(krv::xml::IsParseException(oException) ? UNKNOWN_ERROR : oException.what());
    }
    catch (...)
    {
        Report(UNKNOWN_ERROR);
    }
    return oOtherwise;
}

unsigned long long ParseLimit(const std::string& text)
{
    const auto oLimit = krv::ParseNumber<unsigned long long>(text);
    if (!oLimit)
        throw krv::DataException("The limit is not a number: " + text);
    return *oLimit;
}

} // namespace

FormatCapabilities::FormatCapabilities(const std::string& xmlPath) : moXmlPath(xmlPath) {}

FormatCapabilities::FormatCapabilities(const FormatCapabilities& oOther)
{
    Copy(oOther);
}

FormatCapabilities& FormatCapabilities::operator=(const FormatCapabilities& oOther)
{
    Copy(oOther);
    return *this;
}

FormatCapabilities::~FormatCapabilities() = default;

void FormatCapabilities::Copy(const FormatCapabilities& oOther)
{
    moXmlPath = oOther.moXmlPath;
}

bool FormatCapabilities::IsSupported(const std::string& xpath) const
{
    return Ask(moXmlPath, xpath, false, [](const xalanc::XalanNode* poNode) { return poNode != nullptr; });
}

unsigned long long FormatCapabilities::GetLimit(const std::string& xpath) const
{
    return Ask(moXmlPath, xpath, NO_LIMIT,
               [](const xalanc::XalanNode* poNode)
               { return poNode == nullptr ? NO_LIMIT : ParseLimit(GetNodeText(*poNode)); });
}

} // namespace krv::datasources
