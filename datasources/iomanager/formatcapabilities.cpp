#include "datasources/iomanager/formatcapabilities.h"

#include "datasources/iomanager/detail/xmlsupport.h"
#include "toolkit/core/numbertext.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/debugger.h"

#include <limits>
#include <optional>
#include <source_location>

namespace krv::datasources
{

namespace
{

constexpr unsigned long long NO_LIMIT = std::numeric_limits<unsigned long long>::max();

void Report(const std::string& message, std::source_location oLocation = std::source_location::current())
{
    if (krv::nspio::Debugger::GetLevel() != 0)
        krv::nspio::Debugger::Debug(1, "qrframework", message, std::string(krv::SourceFileText(oLocation.file_name())),
                                    oLocation.line());
}

// The text of the node that the XPath finds in the description; any failure is reported as debug output and finds none.
std::optional<std::string> Find(const std::string& xmlPath, const std::string& xpath)
{
    try
    {
        std::string text;
        std::string problem;
        if (detail::LoadXmlSupport().mpSelectText(xmlPath, xpath, text, problem))
            return text;
        if (!problem.empty())
            Report(problem);
    }
    catch (const std::exception& oException)
    {
        Report(oException.what());
    }
    return std::nullopt;
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
    return Find(moXmlPath, xpath).has_value();
}

unsigned long long FormatCapabilities::GetLimit(const std::string& xpath) const
{
    const std::optional<std::string> text = Find(moXmlPath, xpath);
    const auto oLimit = text ? krv::ParseNumber<unsigned long long>(*text) : std::optional(NO_LIMIT);
    if (!oLimit)
        Report("The limit is not a number: " + *text);
    return oLimit.value_or(NO_LIMIT);
}

} // namespace krv::datasources
