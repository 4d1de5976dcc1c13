#include "operations/source/referencesystem.h"

#include "operations/job/exceptions.h"
#include "operations/source/sourcefile.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/ogc/cs/crsfactory.h"

#include <fstream>

namespace krv::operations
{

namespace
{

constexpr std::size_t LONGEST_DEFINITION = std::size_t{1} << 20;
constexpr std::size_t LONGEST_NAME = 4096;

// The text of a file of that name; the text itself when there is no such file.
std::string ReadDefinition(const std::string& text)
{
    if (text.find_first_of("[{\n") != std::string::npos || text.size() > LONGEST_NAME || !WhyUnreadable(text).empty())
        return text;
    std::ifstream oStream(text, std::ios::binary);
    std::string definition(LONGEST_DEFINITION, '\0');
    oStream.read(definition.data(), static_cast<std::streamsize>(definition.size()));
    definition.resize(static_cast<std::size_t>(oStream.gcount()));
    return definition;
}

} // namespace

std::unique_ptr<krv::ogc::cs::ICRS> ParseReferenceSystem(const std::string& text)
{
    const bool bNumber = !text.empty() && text.find_first_not_of("0123456789") == std::string::npos;
    try
    {
        return krv::ogc::cs::CreateCRSFromWKT(bNumber ? "EPSG:" + text : ReadDefinition(text));
    }
    catch (const krv::DataException& oError)
    {
        throw RequestException(oError.GetMessage());
    }
}

} // namespace krv::operations
