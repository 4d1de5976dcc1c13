#include "datasources/iomanager/formatcapabilities.h"

#include "datasources/iomanager/detail/description.h"
#include "datasources/iomanager/detail/xmlsupport.h"
#include "toolkit/core/numbertext.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/debugger.h"

#include <algorithm>
#include <cctype>
#include <limits>
#include <optional>
#include <source_location>
#include <vector>

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

// The names on a way from the root; empty for any other XPath.
std::vector<std::string> SplitPlainPath(const std::string& xpath)
{
    const auto IsLetter = [](unsigned char nByte)
    {
        return std::isalpha(nByte) != 0;
    };
    std::vector<std::string> oNames;
    for (std::size_t nAt = 0; nAt < xpath.size();)
    {
        const auto nEnd = std::min(xpath.find('/', nAt + 1), xpath.size());
        oNames.push_back(xpath.substr(nAt + 1, nEnd - nAt - 1));
        if (xpath[nAt] != '/' || oNames.back().empty() ||
            !std::all_of(oNames.back().begin(), oNames.back().end(), IsLetter))
            return {};
        nAt = nEnd;
    }
    return oNames;
}

// Whether names may mean something else in the document than they say.
bool HasNamespaces(const krv::xml::Element& oElement)
{
    const auto IsOfOne = [](const auto& oAttribute)
    {
        return oAttribute.first == "xmlns" || oAttribute.first.find(':') != std::string::npos;
    };
    return oElement.name.find(':') != std::string::npos ||
           std::any_of(oElement.attributes.begin(), oElement.attributes.end(), IsOfOne) ||
           std::any_of(oElement.children.begin(), oElement.children.end(), HasNamespaces);
}

const krv::xml::Element* FindFirst(const krv::xml::Element& oElement, const std::vector<std::string>& oNames,
                                   std::size_t nDepth)
{
    if (oElement.name != oNames[nDepth])
        return nullptr;
    if (nDepth + 1 == oNames.size())
        return &oElement;
    for (const krv::xml::Element& oChild : oElement.children)
        if (const auto* const poFound = FindFirst(oChild, oNames, nDepth + 1))
            return poFound;
    return nullptr;
}

// The same answer as Find without libkrvxml, or false: for plain questions to plain documents, nearly all there are.
bool FindPlain(const std::string& xmlPath, const std::string& xpath, std::optional<std::string>& text)
try
{
    const std::vector<std::string> oNames = SplitPlainPath(xpath);
    if (oNames.empty())
        return false;
    const krv::xml::Element oRoot = detail::ReadDescription(xmlPath);
    const krv::xml::Element* const poFound = FindFirst(oRoot, oNames, 0);
    if (HasNamespaces(oRoot) || (poFound != nullptr && !poFound->children.empty()))
        return false;
    if (poFound != nullptr)
        text = detail::Trimmed(poFound->text);
    return true;
}
catch (const krv::DataException&)
{
    return false;
}

// The text of the node that the XPath finds in the description; any failure is reported as debug output and finds none.
std::optional<std::string> Find(const std::string& xmlPath, const std::string& xpath)
{
    try
    {
        std::optional<std::string> plain;
        if (FindPlain(xmlPath, xpath, plain))
            return plain;
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
