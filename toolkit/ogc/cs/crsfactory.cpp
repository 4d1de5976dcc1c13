#include "toolkit/ogc/cs/crsfactory.h"

#include "toolkit/core/lettercase.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/ogc/cs/detail/projcrs.h"

#include <algorithm>
#include <cctype>
#include <cstddef>
#include <string_view>
#include <utility>

namespace krv::ogc::cs
{
namespace detail
{
namespace
{

constexpr std::size_t MAX_DEFINITION = 1U << 20U;
constexpr int MAX_NESTING = 64;

std::string_view Trimmed(std::string_view text)
{
    constexpr std::string_view BLANKS(" \t\r\n\f\v\0", 7);
    const auto nFirst = text.find_first_not_of(BLANKS);
    if (nFirst == std::string_view::npos)
        return {};
    return text.substr(nFirst, text.find_last_not_of(BLANKS) - nFirst + 1);
}

// For messages: the start of a definition, on one line.
std::string Excerpt(std::string_view text)
{
    constexpr std::size_t MAX_EXCERPT = 60;
    std::string excerpt(text.substr(0, MAX_EXCERPT));
    std::replace_if(
        excerpt.begin(), excerpt.end(), [](unsigned char nByte) { return nByte < ' '; }, ' ');
    return "\"" + excerpt + (text.size() > MAX_EXCERPT ? "...\"" : "\"");
}

// PROJ walks nested definitions by recursion.
bool IsNestedTooDeep(std::string_view text)
{
    int nDepth = 0;
    bool bQuoted = false;
    for (std::size_t nAt = 0; nAt < text.size(); ++nAt)
    {
        if (bQuoted && text[nAt] == '\\')
            ++nAt;
        else if (text[nAt] == '"')
            bQuoted = !bQuoted;
        else if (!bQuoted && (text[nAt] == '{' || text[nAt] == '['))
            ++nDepth;
        else if (!bQuoted && (text[nAt] == '}' || text[nAt] == ']'))
            --nDepth;
        if (nDepth > MAX_NESTING)
            return true;
    }
    return false;
}

// "EPSG:4326" and the like: the name of an authority in the database and a number.
bool IsCodeText(std::string_view text, std::string& authority, std::string& code)
{
    const auto nColon = text.find(':');
    if (nColon == std::string_view::npos || nColon == 0 || nColon + 1 == text.size())
        return false;
    const auto IsName = [](unsigned char nByte)
    {
        return std::isalnum(nByte) != 0 || nByte == '_';
    };
    const auto IsDigit = [](unsigned char nByte)
    {
        return std::isdigit(nByte) != 0;
    };
    authority = ToUpper(text.substr(0, nColon));
    code = text.substr(nColon + 1);
    return std::all_of(authority.begin(), authority.end(), IsName) && std::all_of(code.begin(), code.end(), IsDigit);
}

ProjObject FindPart(const ProjContext& oContext, PJ_CATEGORY eCategory, int nCode)
{
    const std::string code = std::to_string(nCode);
    return ProjObject(Proj().proj_create_from_database(oContext.Get(), "EPSG", code.c_str(), eCategory, 0, nullptr));
}

ProjObject FindCRS(const ProjContext& oContext, const std::string& authority, const std::string& code,
                   const Place& oPlace)
{
    ProjObject poObject(
        Proj().proj_create_from_database(oContext.Get(), authority.c_str(), code.c_str(), PJ_CATEGORY_CRS, 0, nullptr));
    if (!poObject)
        oContext.Fail(authority + ":" + code + " is no known reference system", oPlace);
    return poObject;
}

ProjObject ParseWKT(const ProjContext& oContext, const std::string& text)
{
    const char* const OPTIONS[] = {"STRICT=NO", nullptr};
    return ProjObject(Proj().proj_create_from_wkt(oContext.Get(), text.c_str(), OPTIONS, nullptr, nullptr));
}

PJ_CATEGORY CategoryOf(eEPSGPart ePart)
{
    switch (ePart)
    {
    case eEPSG_Datum:
        return PJ_CATEGORY_DATUM;
    case eEPSG_Ellipsoid:
        return PJ_CATEGORY_ELLIPSOID;
    case eEPSG_PrimeMeridian:
        return PJ_CATEGORY_PRIME_MERIDIAN;
    case eEPSG_Conversion:
        return PJ_CATEGORY_COORDINATE_OPERATION;
    default:
        return PJ_CATEGORY_CRS;
    }
}

} // namespace

ProjObject ParseDefinition(const ProjContext& oContext, const std::string& definition, const Place& oPlace)
{
    const std::string text(Trimmed(definition));
    const std::string what = "The reference system " + Excerpt(text) + " cannot be understood";
    if (text.empty())
        throw DataException("The definition of the reference system is empty", oPlace);
    if (text.size() > MAX_DEFINITION)
        throw DataException(what + ": it is longer than " + std::to_string(MAX_DEFINITION) + " bytes", oPlace);
    if (IsNestedTooDeep(text))
        throw DataException(what + ": it is nested too deep", oPlace);
    std::string authority;
    std::string code;
    if (IsCodeText(text, authority, code))
        return FindCRS(oContext, authority, code, oPlace);
    ProjObject poObject =
        text.front() == '{' ? ProjObject(Proj().proj_create(oContext.Get(), text.c_str())) : ParseWKT(oContext, text);
    if (!poObject)
        oContext.Fail(what, oPlace);
    if (detail::Proj().proj_is_crs(poObject.get()) == 0)
        throw DataException(what + ": it does not define a reference system", oPlace);
    return poObject;
}

} // namespace detail

std::unique_ptr<ICRS> CreateCRSFromEPSG(int nCode, const Place& oPlace)
{
    auto poContext = std::make_unique<detail::ProjContext>();
    detail::ProjObject poObject = detail::FindCRS(*poContext, "EPSG", std::to_string(nCode), oPlace);
    return std::make_unique<detail::ProjCRS>(std::move(poContext), std::move(poObject));
}

std::unique_ptr<ICRS> CreateCRSFromWKT(const std::string& definition, const Place& oPlace)
{
    auto poContext = std::make_unique<detail::ProjContext>();
    detail::ProjObject poObject = detail::ParseDefinition(*poContext, definition, oPlace);
    return std::make_unique<detail::ProjCRS>(std::move(poContext), std::move(poObject));
}

std::string DescribeEPSGPart(eEPSGPart ePart, int nCode, const Place& oPlace)
{
    const detail::ProjContext oContext;
    const detail::ProjObject poObject = detail::FindPart(oContext, detail::CategoryOf(ePart), nCode);
    const char* const OPTIONS[] = {"MULTILINE=NO", "SCHEMA=", nullptr};
    const char* poText = poObject ? detail::Proj().proj_as_projjson(oContext.Get(), poObject.get(), OPTIONS) : nullptr;
    if (poText == nullptr)
        oContext.Fail("EPSG:" + std::to_string(nCode) + " is not known", oPlace);
    return poText;
}

EPSGUnit FindEPSGUnit(int nCode, const Place& oPlace)
{
    const detail::ProjContext oContext;
    EPSGUnit oUnit;
    const char* poName = nullptr;
    const char* poCategory = nullptr;
    if (detail::Proj().proj_uom_get_info_from_database(oContext.Get(), "EPSG", std::to_string(nCode).c_str(), &poName,
                                                       &oUnit.factor, &poCategory) == 0)
        oContext.Fail("The unit EPSG:" + std::to_string(nCode) + " is not known", oPlace);
    oUnit.name = poName;
    oUnit.isAngular = std::string_view(poCategory) == "angular";
    oUnit.isLinear = std::string_view(poCategory) == "linear";
    return oUnit;
}

} // namespace krv::ogc::cs
