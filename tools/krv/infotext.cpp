#include "tools/krv/infotext.h"

#include "toolkit/ogc/cs/controlpoints.h"
#include "tools/krv/errors.h"
#include "tools/krv/progress.h"

#include <fmt/format.h>

#include <algorithm>
#include <vector>

namespace krv::tool
{

namespace
{

constexpr std::size_t LONGEST_VALUE = 300;
constexpr char CONTROL_POINTS[] = "GroundControlPoints";
constexpr std::size_t SHOWN_POINTS = 5;

// On one line, and not longer than a few lines of a terminal; never cut inside a UTF-8 character.
std::string Short(const std::string& text)
{
    std::string line = OneLine(text);
    if (line.size() <= LONGEST_VALUE)
        return line;
    std::size_t nEnd = LONGEST_VALUE;
    while (nEnd > 0 && (static_cast<unsigned char>(line[nEnd]) & 0xC0U) == 0x80U)
        --nEnd;
    return line.substr(0, nEnd) + fmt::format(" ... ({} characters)", text.size());
}

std::string Text(const Json& oJson)
{
    if (oJson.is_null())
        return "-";
    return oJson.is_string() ? Short(oJson.get<std::string>()) : oJson.dump();
}

std::string Line(const char* pLabel, const std::string& text)
{
    return fmt::format("  {:<12}{}\n", pLabel, text);
}

std::string MapText(const Json& oMap, const char* pIndent)
{
    std::string text;
    for (const auto& [key, value] : oMap.items())
        text += fmt::format("{}{} = {}\n", pIndent, Short(key), Text(value));
    return text;
}

// Their number and the first of them as a table.
std::string PointsText(const std::vector<krv::ogc::cs::ControlPoint>& oPoints)
{
    std::string text = fmt::format("  control points: {}\n    {:>12} {:>12} {:>18} {:>18} {:>12}\n", oPoints.size(),
                                   "column", "row", "x", "y", "z");
    for (std::size_t i = 0; i < std::min(oPoints.size(), SHOWN_POINTS); ++i)
        text += fmt::format("    {:>12} {:>12} {:>18} {:>18} {:>12}\n", oPoints[i].column, oPoints[i].row, oPoints[i].x,
                            oPoints[i].y, oPoints[i].z);
    return oPoints.size() > SHOWN_POINTS
               ? text + fmt::format("    ... and {} more; --json has all\n", oPoints.size() - SHOWN_POINTS)
               : text;
}

std::string MetadataText(const Json& oInfo)
{
    Json oTags = oInfo["metadata"];
    std::vector<krv::ogc::cs::ControlPoint> oPoints;
    if (const auto oFound = oTags.find(CONTROL_POINTS); oFound != oTags.end() && oFound->is_string())
        oPoints = krv::ogc::cs::ParseControlPoints(oFound->get<std::string>());
    if (!oPoints.empty())
        oTags.erase(CONTROL_POINTS);
    return (oPoints.empty() ? "" : PointsText(oPoints)) +
           (oTags.empty() ? "" : "  metadata\n" + MapText(oTags, "    "));
}

std::string GeocodingText(const Json& oTerms)
{
    const auto Term = [&oTerms](int i)
    {
        return oTerms[static_cast<std::size_t>(i)].get<double>();
    };
    if (Term(2) == 0 && Term(4) == 0)
        return Line("origin", fmt::format("{}, {}", Term(0), Term(3)));
    return Line("geocoding", fmt::format("x = {} + {} column + {} row", Term(0), Term(1), Term(2))) +
           Line("", fmt::format("y = {} + {} column + {} row", Term(3), Term(4), Term(5)));
}

// "tiles of 256 x 256, DEFLATE, predictor 2, channels together"
std::string StorageText(const Json& oInfo)
{
    const Json& oStorage = oInfo["storage"];
    const std::string size = Text(oInfo["blockWidth"]) + " x " + Text(oInfo["blockHeight"]);
    std::string text = oStorage["layout"].is_null() ? Line("block", size) : std::string();
    if (text.empty())
    {
        std::string how = Text(oStorage["layout"]) + " of " + size + ", ";
        how += oStorage["compression"] == "NONE" ? "not compressed" : Text(oStorage["compression"]);
        if (oStorage["lossy"] == true)
            how += " (lossy)";
        if (oStorage["predictor"] != 1)
            how += ", predictor " + Text(oStorage["predictor"]);
        if (oInfo["channels"].size() > 1)
            how += oStorage["interleave"] == "band" ? ", each channel by itself" : ", channels together";
        text = Line("stored in", how);
    }
    if (oStorage["bytes"].is_number())
        text += Line("on disk", (oStorage["variant"].is_null() ? "" : Text(oStorage["variant"]) + ", ") +
                                    BytesText(oStorage["bytes"].get<double>()));
    if (oInfo["cloudLayout"].is_null())
        return text;
    return text + Line("cloud", oInfo["cloudLayout"]["valid"] == true
                                    ? "laid out for reading over a network (COG)"
                                    : "not laid out for reading over a network (krv doctor --cog tells why)");
}

std::string PlaceText(const Json& oInfo)
{
    std::string text;
    const Json &oSize = oInfo["pixelSize"], &oBounds = oInfo["bounds"], &oDegrees = oInfo["boundsLonLat"];
    const auto Number = [](const Json& oNumber)
    {
        return oNumber.get<double>();
    };
    if (!oSize.is_null())
        text += Line("pixel", fmt::format("{} x {}{}", Number(oSize["x"]), Number(oSize["y"]),
                                          oSize["unit"].is_null() ? "" : " " + Text(oSize["unit"])));
    if (!oBounds.is_null())
        text += Line("extent", fmt::format("{}, {} to {}, {}", Number(oBounds[0]), Number(oBounds[1]),
                                           Number(oBounds[2]), Number(oBounds[3])));
    if (!oDegrees.is_null())
        text +=
            Line("lon, lat", fmt::format("{:.6f}, {:.6f} to {:.6f}, {:.6f}{}", Number(oDegrees[0]), Number(oDegrees[1]),
                                         Number(oDegrees[2]), Number(oDegrees[3]),
                                         oInfo["placedBy"] == "transform" ? "" : " by its " + Text(oInfo["placedBy"])));
    return text;
}

std::string CrsText(const Json& oCrs)
{
    const std::string code = oCrs["epsg"].is_null() ? "" : " (EPSG:" + oCrs["epsg"].dump() + ")";
    return Line("crs", Text(oCrs["name"]) + code);
}

std::string ReferenceText(const char* pLabel, const Json& oReference)
{
    if (!oReference.is_object())
        return {};
    return fmt::format("       {}: file {}, {} {}\n", pLabel, Text(oReference["file"]), Text(oReference["layer"]),
                       Text(oReference["number"]));
}

std::string ChannelText(const Json& oChannel)
{
    std::string text = fmt::format("    {:>3}  {:<5}", oChannel["number"].get<unsigned int>(), Text(oChannel["type"]));
    if (oChannel["storedType"] != oChannel["type"])
        text += " (stored as " + Text(oChannel["storedType"]) + ")";
    if (!oChannel["description"].is_null())
        text += "  " + Text(oChannel["description"]);
    if (!oChannel["noData"].is_null())
        text += "  no-data " + Text(oChannel["noData"]);
    text += "\n" + MapText(oChannel["metadata"], "         ");
    if (oChannel.contains("defaultLUT"))
        text += ReferenceText("lookup table", oChannel["defaultLUT"]) +
                ReferenceText("colour table", oChannel["defaultPCT"]);
    return text;
}

std::string OverviewsText(const Json& oLevels)
{
    std::string text;
    for (const Json& oLevel : oLevels)
        text += fmt::format("{}{}: {} x {}{}", text.empty() ? "" : ", ", oLevel["level"].get<unsigned int>(),
                            oLevel["width"].get<unsigned int>(), oLevel["height"].get<unsigned int>(),
                            oLevel["valid"] == true ? "" : " (outdated)");
    return text.empty() ? "" : Line("overviews", text);
}

std::string ModelText(const Json& oModel)
{
    const std::string accuracy = oModel["accuracy"].is_null() ? "" : ", accurate to " + Text(oModel["accuracy"]) + " m";
    return Line("model", Text(oModel["number"]) + "  " +
                             (oModel["kind"].is_null() ? "cannot be read" : Text(oModel["kind"]) + accuracy));
}

std::string DisplayText(const Json& oDisplay)
{
    std::string text;
    for (const auto& [colour, channel] : oDisplay.items())
    {
        if (!channel.is_null())
            text += fmt::format("{}{} {}", text.empty() ? "" : ", ", colour, channel.dump());
    }
    return text.empty() ? "" : Line("display", text);
}

std::string SidecarText(const Json& oSidecar)
{
    const bool bUsed = oSidecar["used"] == true;
    std::string text =
        fmt::format("{}: {}{}", Text(oSidecar["file"]), Text(oSidecar["says"]), bUsed ? "" : ", not used");
    if (!oSidecar["trouble"].is_null())
        text += ": " + Text(oSidecar["trouble"]);
    return Line("beside", text);
}

} // namespace

std::string InfoText(const Json& oInfo)
{
    std::string text = Short(oInfo["file"].get<std::string>()) + "\n";
    text += Line("format", Text(oInfo["format"]));
    for (const Json& oFile : oInfo["linkedFiles"])
        text += Line("pixels in", Text(oFile));
    text += Line("size", fmt::format("{} x {} pixels, {} channel{}", Text(oInfo["width"]), Text(oInfo["height"]),
                                     oInfo["channels"].size(), oInfo["channels"].size() == 1 ? "" : "s"));
    text += StorageText(oInfo);
    text += oInfo["crs"].is_null() ? Line("crs", "-") : CrsText(oInfo["crs"]);
    text += oInfo["geocoding"].is_null() ? Line("geocoding", "-") : GeocodingText(oInfo["geocoding"]);
    text += PlaceText(oInfo);
    text += OverviewsText(oInfo["overviews"]);
    for (const Json& oBitmap : oInfo["bitmaps"])
        text += Line("bitmap",
                     fmt::format("{}  {}", Text(oBitmap["number"]),
                                 oBitmap["validity"] == true ? "the validity mask" : Text(oBitmap["description"])));
    for (const Json& oTable : oInfo["colourTables"])
        text += Line("colours", fmt::format("table {} of channel {}, {} entries", Text(oTable["number"]),
                                            Text(oTable["channel"]), Text(oTable["entries"])));
    for (const Json& oModel : oInfo["models"])
        text += ModelText(oModel);
    text += DisplayText(oInfo["displayDefaults"]);
    if (!oInfo["unusedBytes"].is_null() && oInfo["unusedBytes"] != 0)
        text += Line("unused", fmt::format("{} bytes of the file", Text(oInfo["unusedBytes"])));
    for (const Json& oSidecar : oInfo["sidecars"])
        text += SidecarText(oSidecar);
    if (oInfo["furtherImages"].is_number() && oInfo["furtherImages"] != 0)
        text +=
            Line("further", oInfo["furtherImages"].dump() + " images behind this one, which are not shown" +
                                (oInfo["format"] == "GDBALL" ? "; \"FILE[page=N]\" is the one of that number" : ""));
    text += "  channels\n";
    for (const Json& oChannel : oInfo["channels"])
        text += ChannelText(oChannel);
    return text + MetadataText(oInfo);
}

} // namespace krv::tool
