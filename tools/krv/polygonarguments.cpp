#include "tools/krv/polygonarguments.h"

#include "operations/source/sourcefile.h"
#include "toolkit/nspio/warning.h"
#include "tools/krv/errors.h"

#include <nlohmann/json.hpp>

#include <algorithm>
#include <cctype>
#include <fstream>
#include <iterator>

namespace krv::tool
{

namespace
{

using nlohmann::json;

constexpr unsigned int DEEPEST = 32;

bool IsBlank(char c)
{
    return std::isspace(static_cast<unsigned char>(c)) != 0;
}

class GeoJsonReader
{
public:
    explicit GeoJsonReader(operations::PolygonText& oResult) : moResult(oResult) {}

    void Read(const json& oObject, unsigned int nDepth = 0)
    {
        if (oObject.is_null()) // a feature without a place
            return;
        if (!oObject.is_object() || !oObject.contains("type") || !oObject["type"].is_string())
            Fail("an object has no \"type\"");
        if (nDepth > DEEPEST)
            Fail("collections are nested too deep");
        const std::string type = oObject["type"].get<std::string>();
        if (type == "FeatureCollection")
            ReadAll(oObject, "features", nDepth);
        else if (type == "GeometryCollection")
            ReadAll(oObject, "geometries", nDepth);
        else if (type == "Feature")
            Read(Member(oObject, "geometry"), nDepth + 1);
        else if (type == "Polygon")
            ReadPolygon(Member(oObject, "coordinates"));
        else if (type == "MultiPolygon")
        {
            for (const json& oPolygon : List(Member(oObject, "coordinates")))
                ReadPolygon(oPolygon);
        }
        else
            krv::nspio::Warning::Warn("GeoJSON of type \"" + type + "\" is no polygon and is left out");
        if (nDepth == 0 && oObject.contains("crs") && !oObject["crs"].is_null())
            ReadCrs(oObject["crs"]);
    }

private:
    [[noreturn]] static void Fail(const std::string& what) { throw UsageError("the GeoJSON is not valid: " + what); }

    static const json& Member(const json& oObject, const char* pName)
    {
        if (!oObject.contains(pName))
            Fail(std::string("there is no \"") + pName + "\"");
        return oObject[pName];
    }

    static const json& List(const json& oList)
    {
        if (!oList.is_array())
            Fail("something is no list that should be one");
        return oList;
    }

    void ReadAll(const json& oObject, const char* pName, unsigned int nDepth)
    {
        for (const json& oMember : List(Member(oObject, pName)))
            Read(oMember, nDepth + 1);
    }

    void ReadPolygon(const json& oPolygon)
    {
        auto& oRings = moResult.polygons.emplace_back();
        for (const json& oRing : List(oPolygon))
        {
            auto& oVertices = oRings.emplace_back();
            for (const json& oPosition : List(oRing))
            {
                if (!oPosition.is_array() || oPosition.size() < 2 || !oPosition[0].is_number() ||
                    !oPosition[1].is_number())
                    Fail("a position is not of the form [x, y]");
                oVertices.push_back({oPosition[0].get<double>(), oPosition[1].get<double>()});
            }
        }
    }

    // An older form of the standard let files name a system.
    void ReadCrs(const json& oCrs)
    {
        const std::string name = oCrs.value(json::json_pointer("/properties/name"), std::string());
        const auto nEpsg = name.find("EPSG:");
        if (name.find("CRS84") != std::string::npos)
            moResult.crs = "EPSG:4326";
        else if (nEpsg != std::string::npos)
            moResult.crs = "EPSG:" + name.substr(name.find_last_of(':') + 1);
        else
            throw UsageError("the GeoJSON names a reference system that is not known; say which with --crs");
    }

    operations::PolygonText& moResult;
};

void ReadGeoJson(const std::string& text, operations::PolygonText& oResult)
{
    oResult.geographic = true;
    try
    {
        GeoJsonReader(oResult).Read(json::parse(text));
    }
    catch (const json::exception& oError)
    {
        // In front of its words the library puts a tag of its own in brackets.
        const std::string what = oError.what();
        const auto nTag = what.starts_with('[') ? what.find("] ") : std::string::npos;
        throw UsageError("the GeoJSON is not valid: " + (nTag == std::string::npos ? what : what.substr(nTag + 2)));
    }
}

// Whether it is meant as a polygon rather than as the name of a file. What is a geometry or JSON but no polygon is
// text only where there is no such file.
bool IsPolygonText(const std::string& text)
{
    const auto oFirst = std::find_if_not(text.begin(), text.end(), IsBlank);
    std::string start(oFirst, text.end() - oFirst > 19 ? oFirst + 19 : text.end());
    std::transform(start.begin(), start.end(), start.begin(), [](unsigned char c) { return std::toupper(c); });
    const auto Starts = [&start](const char* pWith)
    {
        return start.starts_with(pWith);
    };
    constexpr const char* TEXTS[] = {"{", "POLYG", "MULTI", "SRID="};
    constexpr const char* OTHERS[] = {"[", "POINT(", "POINT ", "LINESTRING", "GEOMETRYCOLLECTION"};
    return std::any_of(std::begin(TEXTS), std::end(TEXTS), Starts) ||
           ((start == "NULL" || std::any_of(std::begin(OTHERS), std::end(OTHERS), Starts)) &&
            !operations::WhyUnreadable(text).empty());
}

operations::PolygonText Parse(const std::string& text)
{
    operations::PolygonText oResult;
    if (std::find_if_not(text.begin(), text.end(), IsBlank) != text.end() &&
        text[text.find_first_not_of(" \t\r\n")] == '{')
        ReadGeoJson(text, oResult);
    else
        oResult = operations::ParsePolygons(text);
    if (oResult.polygons.empty())
        throw UsageError("there is no polygon in it");
    return oResult;
}

std::string ReadText(const std::string& name)
{
    const std::string why = operations::WhyUnreadable(name);
    std::ifstream oStream(name, std::ios::binary);
    if (!why.empty() || !oStream)
        throw UsageError(why.empty() ? "it cannot be read" : why);
    std::string text((std::istreambuf_iterator<char>(oStream)), std::istreambuf_iterator<char>());
    if (text.starts_with(std::string("\0\0\x27\x0A", 4)))
        throw UsageError("it is a shapefile, which is not read; give GeoJSON or WKT");
    if (text.starts_with("SQLite format 3"))
        throw UsageError("it is a database such as a GeoPackage, which is not read; give GeoJSON or WKT");
    return text.starts_with("\xEF\xBB\xBF") ? text.substr(3) : text;
}

} // namespace

operations::PolygonText ReadPolygons(const std::string& text)
{
    const bool bFile = !IsPolygonText(text);
    try
    {
        return Parse(bFile ? ReadText(text) : text);
    }
    catch (const UsageError& oError)
    {
        throw UsageError("--polygon: " + (bFile ? text + ": " : std::string()) + oError.what());
    }
}

} // namespace krv::tool
