#include "operations/masking/masking.h"
#include "operations/source/sourcefile.h"
#include "tools/krv/errors.h"
#include "tools/krv/jsontext.h"
#include "tools/krv/polygonarguments.h"
#include "tools/krv/progress.h"
#include "tools/krv/threads.h"
#include "tools/krv/verbs/verbs.h"

#include <CLI/CLI.hpp>
#include <fmt/format.h>

#include <charconv>
#include <filesystem>
#include <map>
#include <memory>

namespace krv::tool
{

using namespace krv::operations;

namespace
{

constexpr char RECORDED[] = "true"; // what the parser says for a flag without a value

struct Options
{
    MaskRequest request;
    std::vector<std::string> polygons;
    std::string coordinates;
    std::string bitmaps;
    std::string channels;
    std::string rule;
    std::string write;
    std::string noData; // what --no-data is given, RECORDED without a value
    bool validity = false;
    bool zone = false;
    bool json = false;
};

// "new" as 0.
unsigned int ParseTarget(const std::string& text)
{
    if (text == "new")
        return 0;
    unsigned int nBitmap = 0;
    const auto [pEnd, eError] = std::from_chars(text.data(), text.data() + text.size(), nBitmap);
    if (eError != std::errc() || pEnd != text.data() + text.size() || nBitmap == 0)
        throw UsageError("--write: \"" + text + "\" is neither the number of a bitmap nor the word new");
    return nBitmap;
}

void Settle(Options& oOptions)
{
    MaskRequest& oRequest = oOptions.request;
    oRequest.noData = !oOptions.noData.empty();
    oRequest.bitmaps = ParseNumbers(oOptions.bitmaps, "--bitmap");
    oRequest.channels = ParseNumbers(oOptions.channels, "--channels");
    oRequest.rule = oOptions.rule == "all" ? krv::gobs::eAllChannels : krv::gobs::eAnyChannel;
    if (!oOptions.polygons.empty() + !oRequest.bitmaps.empty() + oRequest.noData != 1)
        throw UsageError("mask: say what it is made of: --polygon, --bitmap or --no-data, one of them");
    const bool bPlaced = !oOptions.coordinates.empty() || !oRequest.crs.empty();
    if (bPlaced && oOptions.polygons.empty())
        throw UsageError("mask: --coordinates and --crs belong to --polygon");
    if ((!oRequest.channels.empty() || !oOptions.rule.empty()) && !oRequest.noData)
        throw UsageError("mask: --channels and --rule belong to --no-data");
    if (!oOptions.coordinates.empty())
        oRequest.coordinates = oOptions.coordinates == "pixel" ? PolygonCoordinates::ePixels : PolygonCoordinates::eMap;
    if (!oRequest.crs.empty())
    {
        if (oRequest.coordinates == PolygonCoordinates::ePixels)
            throw UsageError("mask: pixels have no reference system; leave out --crs or --coordinates pixel");
        oRequest.coordinates = PolygonCoordinates::eNamedMap;
    }
    if (!oOptions.write.empty())
        oRequest.target = ParseTarget(oOptions.write);
    if (oOptions.zone && !oRequest.target)
        throw UsageError("mask: --zone goes with --write");
    if (oOptions.validity || (oRequest.noData && oRequest.target && !oOptions.zone))
        oRequest.kind = BitmapKind::eValidity;
    else if (oOptions.zone)
        oRequest.kind = BitmapKind::eZone;
}

MaskResult Make(const std::string& file, Options& oOptions)
{
    const SourceFile oFile(file, oOptions.request.IsWriting() ? eUpdate : eReadOnly,
                           oOptions.noData == RECORDED ? std::nullopt : GivenOrNone(oOptions.noData));
    for (const std::string& text : oOptions.polygons)
        oOptions.request.polygons.push_back(ReadPolygons(text));
    return MakeMask(oFile, oOptions.request, ShowProgress(), GetExecutor());
}

int RunMask(const std::string& file, Options& oOptions)
{
    Settle(oOptions);
    const MaskRequest& oRequest = oOptions.request;
    std::error_code oNone;
    if (!oRequest.picture.empty() && std::filesystem::equivalent(file, oRequest.picture, oNone))
        throw UsageError(oRequest.picture + " is the file itself; name another for the picture");
    const MaskResult oResult = Make(file, oOptions);
    const char* const pSource = oRequest.noData ? "no-data" : oRequest.bitmaps.empty() ? "polygons" : "bitmaps";
    if (oOptions.json)
    {
        Print(ToText({{"file", file},
                      {"source", pSource},
                      {"set", oResult.set},
                      {"pixels", oResult.pixels},
                      {"bitmap", oResult.bitmap != 0 ? Json(oResult.bitmap) : Json()},
                      {"complement", oResult.complement},
                      {"validity", oResult.validity},
                      {"picture", TextOrNull(oRequest.picture)}}));
        return 0;
    }
    std::string text = fmt::format("{} of {} pixels set ({})\n", oResult.set, oResult.pixels, pSource);
    if (oResult.bitmap != 0)
        text +=
            fmt::format("written to bitmap {}{}{}\n", oResult.bitmap, oResult.complement ? " as the complement" : "",
                        oResult.validity ? ", the image's validity mask: there a set bit is a valid pixel" : "");
    if (oResult.validity && oResult.levels)
        text += "the levels were made before: build them anew with krv overviews\n";
    if (!oRequest.picture.empty())
        text += fmt::format("drawn to {}: set pixels are white\n", oRequest.picture);
    Print(text);
    return 0;
}

} // namespace

void AddMaskVerb(CLI::App& oApp, Selection& oSelection)
{
    auto* const poVerb = oApp.add_subcommand(
        "mask", "Makes a mask from polygons, bitmaps or no-data values: counts, stores and draws it");
    const auto poOptions = std::make_shared<Options>();
    poVerb->add_option("FILE", oSelection.file, "The file")->required();
    poVerb
        ->add_option("--polygon", poOptions->polygons,
                     "Pixels inside: WKT or GeoJSON, the text itself or a file; may be repeated")
        ->expected(1)
        ->multi_option_policy(CLI::MultiOptionPolicy::TakeAll);
    AddWord(*poVerb, "--coordinates", poOptions->coordinates,
            "What the polygons are in: pixel ((0, 0) is the outer corner of the first) or map (the file's own system, "
            "the default for WKT; GeoJSON is longitude, latitude by default)",
            {"pixel", "map"});
    poVerb
        ->add_option("--crs", poOptions->request.crs,
                     "Reference system of the polygons, such as EPSG:4326, in which their edges are straight; x is "
                     "always the easting or longitude")
        ->check([](const std::string& text)
                { return text.empty() ? std::string("the empty text is no known reference system") : std::string(); });
    poVerb->add_option("--bitmap", poOptions->bitmaps, "Pixels set in one of these bitmaps, such as 1,3");
    poVerb->add_flag("--no-data", poOptions->noData,
                     "Pixels that equal the recorded no-data values, or with --no-data=-9999 that one");
    AddWord(*poVerb, "--rule", poOptions->rule,
            "Whether any (the default) or all of the channels that have a no-data value must equal it", {"any", "all"});
    poVerb->add_option("--channels", poOptions->channels, "No-data of these channels only, such as 1,3 or 1-3");
    poVerb->add_option("--write", poOptions->write,
                       "Store it in this bitmap of the file, or in a new one (the word new)");
    auto* const poValidity = poVerb->add_flag(
        "--validity", poOptions->validity,
        "Store it as the image's validity mask, whose set bits are valid pixels: in the bitmap of "
        "--write, else in the validity mask that there is, else in a new one. No-data is stored so, as "
        "its complement, unless --zone is given");
    poVerb
        ->add_flag("--zone", poOptions->zone,
                   "Store it as a zone, which says nothing of validity; the default for all but no-data")
        ->excludes(poValidity);
    poVerb->add_option("--png", poOptions->request.picture, "Draw it, set pixels white; the file is replaced");
    poVerb->add_option("--size", poOptions->request.pictureSize, "Longest side of the picture in pixels (1024)")
        ->check(CLI::Range(1, 16384));
    poVerb->add_flag("--json", poOptions->json, "As JSON");
    poVerb->footer("Examples:\n"
                   "  krv mask scene.tif --polygon lakes.geojson --write new\n"
                   "  krv mask scene.tif --no-data=0 --validity");
    poVerb->callback(
        [&oSelection, poOptions]
        {
            oSelection.run = [&oSelection, poOptions]
            {
                return RunMask(oSelection.file, *poOptions);
            };
        });
}

} // namespace krv::tool
