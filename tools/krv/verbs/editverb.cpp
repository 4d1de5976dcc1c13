#include "operations/edit/editing.h"
#include "tools/krv/errors.h"
#include "tools/krv/jsontext.h"
#include "tools/krv/verbs/verbs.h"

#include <CLI/CLI.hpp>
#include <fmt/format.h>

#include <memory>
#include <sstream>
#include <utility>

namespace krv::tool
{

using namespace krv::operations;

namespace
{

constexpr char NONE[] = "none";
constexpr std::pair<const char*, EditPart> PARTS[] = {{"no-data", eEditNoData},
                                                      {"crs", eEditCrs},
                                                      {"geocoding", eEditGeocoding},
                                                      {"tags", eEditTags},
                                                      {"descriptions", eEditDescriptions},
                                                      {"colours", eEditColours},
                                                      {"display", eEditDisplay}};

struct Options
{
    std::vector<std::string> files;
    EditRequest request;
    std::string noData;
    std::string crs;
    std::string geocoding;
    std::string origin;
    std::string pixelSize;
    std::string bounds;
    std::string copy;
    std::string channels;
    std::string display;
    std::vector<std::string> tags;
    std::vector<std::string> removedTags;
    std::vector<std::string> descriptions;
    std::vector<std::string> colours;
    bool json = false;
};

// The word none as an empty text, which removes.
std::string Unless(const std::string& text)
{
    return text == NONE ? std::string() : text;
}

unsigned int ParseParts(const std::string& text)
{
    if (text.empty())
        return eEditAll;
    unsigned int nParts = 0;
    std::istringstream oWords(text);
    for (std::string word; std::getline(oWords, word, ',');)
    {
        std::string all;
        unsigned int nPart = 0;
        for (const auto& [pName, ePart] : PARTS)
        {
            nPart = word == pName ? ePart : nPart;
            all += (all.empty() ? "" : ", ") + std::string(pName);
        }
        if (nPart == 0)
            throw UsageError("--copy: \"" + word + "\" is none of " + all);
        nParts |= nPart;
    }
    return nParts;
}

// "KEY=VALUE"; the rest behind the first "=".
std::pair<std::string, std::string> ParsePair(const std::string& text, const char* pOption, const char* pForm)
{
    const std::size_t nAt = text.find('=');
    if (nAt == std::string::npos || nAt == 0)
        throw UsageError(fmt::format("{}: \"{}\" is not of the form {}", pOption, text, pForm));
    return {text.substr(0, nAt), text.substr(nAt + 1)};
}

std::map<unsigned int, std::string> ParseByChannel(const std::vector<std::string>& oTexts, const char* pOption,
                                                   const char* pForm)
{
    std::map<unsigned int, std::string> oResult;
    for (const std::string& text : oTexts)
    {
        const auto [number, value] = ParsePair(text, pOption, pForm);
        for (const unsigned int nChannel : ParseNumbers(number, pOption))
            oResult[nChannel] = Unless(value);
    }
    return oResult;
}

void ParsePlace(const Options& oOptions, EditRequest& oRequest)
{
    if (oOptions.geocoding == NONE)
        oRequest.geocoding.emplace();
    else if (const auto oTerms = ParseReals(oOptions.geocoding, "--geocoding", 6, 6); !oTerms.empty())
        oRequest.geocoding.emplace(oTerms[0], oTerms[1], oTerms[2], oTerms[3], oTerms[4], oTerms[5]);
    const auto oOrigin = ParseReals(oOptions.origin, "--origin", 2, 2);
    const auto oSize = ParseReals(oOptions.pixelSize, "--pixel-size", 1, 2);
    if (!oOrigin.empty())
        oRequest.geocoding.emplace(oOrigin[0], oSize.front(), 0, oOrigin[1], 0, -oSize.back());
    if (!oSize.empty() && !(oSize.front() > 0 && oSize.back() > 0))
        throw UsageError("--pixel-size: \"" + oOptions.pixelSize + "\" is not above 0");
    if (const auto oEdges = ParseReals(oOptions.bounds, "--bounds", 4, 4); !oEdges.empty())
        oRequest.bounds = PlacedBounds{oEdges[0], oEdges[1], oEdges[2], oEdges[3]};
}

EditRequest MakeRequest(const Options& oOptions)
{
    EditRequest oRequest = oOptions.request;
    oRequest.parts = ParseParts(oOptions.copy);
    oRequest.channels = ParseNumbers(oOptions.channels, "--channels");
    if (!oOptions.noData.empty())
        oRequest.noData = Unless(oOptions.noData);
    if (!oOptions.crs.empty())
        oRequest.crs = Unless(oOptions.crs);
    ParsePlace(oOptions, oRequest);
    for (const std::string& text : oOptions.tags)
    {
        auto [key, value] = ParsePair(text, "--tag", "KEY=VALUE");
        oRequest.tags.push_back({std::move(key), std::move(value)});
    }
    for (const std::string& key : oOptions.removedTags)
        oRequest.tags.push_back({key, std::nullopt});
    oRequest.descriptions = ParseByChannel(oOptions.descriptions, "--description", "CHANNEL=TEXT");
    oRequest.colours = ParseByChannel(oOptions.colours, "--colour", "CHANNEL=red");
    if (!oOptions.display.empty())
        oRequest.display = ParseNumbers(Unless(oOptions.display), "--display");
    return oRequest;
}

int RunEdit(Selection& oSelection, const Options& oOptions)
{
    const EditRequest oRequest = MakeRequest(oOptions);
    if (oRequest.like.empty() && !oRequest.noData && !oRequest.crs && !oRequest.geocoding && !oRequest.bounds &&
        oRequest.tags.empty() && oRequest.descriptions.empty() && oRequest.colours.empty() && !oRequest.display)
        throw UsageError("edit: say what is to change; `krv edit --help` lists it");
    Json oRows = Json::array();
    std::string text;
    const auto Edit = [&](const std::string& file)
    {
        const EditResult oResult = EditFile(file, oRequest);
        oRows.push_back({{"file", file}, {"changed", oResult.changed}});
        text += fmt::format("{}: {}\n", file,
                            oResult.changed.empty() ? "nothing changed: it says so already"
                                                    : fmt::format("changed {}", fmt::join(oResult.changed, ", ")));
        if (oResult.levels)
            text += file + ": its levels were made by the old no-data value; build them anew with krv overviews\n";
    };
    const int nCode = ForEachFile(oSelection, oOptions.files, Edit);
    Print(oOptions.json ? ToText({{"files", oRows}}) : text);
    return nCode;
}

} // namespace

void AddEditVerb(CLI::App& oApp, Selection& oSelection)
{
    auto* const poVerb = oApp.add_subcommand(
        "edit", "Changes what files say beside their pixels, in place: no-data, place, tags, descriptions");
    const auto poOptions = std::make_shared<Options>();
    poVerb->add_option("FILES", poOptions->files, "The files; they are changed in place")->required();
    poVerb->add_option("--no-data", poOptions->noData, "The no-data value, such as -9999 or nan; none removes it");
    poVerb->add_option("--crs", poOptions->crs,
                       "The reference system: EPSG:32633, WKT, or a file that holds it, such as a .prj; none removes "
                       "it. Pixels stay where they are: krv warp resamples");
    auto* const poTerms = poVerb->add_option(
        "--geocoding", poOptions->geocoding,
        "Map coordinates of pixels: x0,x per column,x per row,y0,y per column,y per row, from the outer corner of the "
        "first pixel; none removes it");
    auto* const poOrigin =
        poVerb->add_option("--origin", poOptions->origin, "Map coordinates x,y of the outer corner of the first pixel");
    auto* const poSize = poVerb->add_option("--pixel-size", poOptions->pixelSize,
                                            "Map units of a pixel, such as 10, or of a column and a row: 10,20");
    auto* const poBounds =
        poVerb->add_option("--bounds", poOptions->bounds, "Map coordinates of the outer edges: west,south,east,north");
    poOrigin->needs(poSize)->excludes(poTerms);
    poSize->needs(poOrigin);
    poBounds->excludes(poTerms)->excludes(poOrigin);
    poVerb->add_option("--tag", poOptions->tags, "Set a tag: KEY=VALUE; may be repeated")
        ->expected(1)
        ->multi_option_policy(CLI::MultiOptionPolicy::TakeAll);
    poVerb->add_option("--remove-tag", poOptions->removedTags, "Remove the tag of this name; may be repeated")
        ->expected(1)
        ->multi_option_policy(CLI::MultiOptionPolicy::TakeAll);
    poVerb->add_option("--channels", poOptions->channels,
                       "Tags and the no-data value are of these channels, such as 1,3 or 1-3, not of the whole file");
    poVerb
        ->add_option("--description", poOptions->descriptions,
                     "What a channel is, such as 4=\"near infrared\"; 4=none removes it; may be repeated")
        ->expected(1)
        ->multi_option_policy(CLI::MultiOptionPolicy::TakeAll);
    poVerb
        ->add_option("--colour,--color", poOptions->colours,
                     "What a channel shows, such as 4=alpha: gray, palette, red, green, blue, alpha, cyan, magenta, "
                     "yellow, black, undefined; 4=none removes it; may be repeated")
        ->expected(1)
        ->multi_option_policy(CLI::MultiOptionPolicy::TakeAll);
    poVerb->add_option("--display", poOptions->display,
                       "The channels shown by default: 4,3,2 as red, green and blue, or 1 as grey; none removes them");
    poVerb->add_option("--like", poOptions->request.like,
                       "Copy what this file says; options given beside it win over that");
    poVerb
        ->add_option("--copy", poOptions->copy,
                     "What of it, such as crs,geocoding, among no-data, crs, geocoding, tags, descriptions, colours "
                     "and display (all)")
        ->needs("--like");
    poVerb->add_flag("--json", poOptions->json, "As JSON");
    poVerb->footer("Stored statistics are removed when the no-data value changes.\n"
                   "Examples:\n"
                   "  krv edit dem.tif --no-data -9999 --crs EPSG:32633 --origin 500000,5200000 --pixel-size 10\n"
                   "  krv edit result.tif --like scene.tif --copy crs,geocoding");
    poVerb->callback(
        [&oSelection, poOptions]
        {
            oSelection.file = poOptions->files.front();
            oSelection.run = [&oSelection, poOptions]
            {
                return RunEdit(oSelection, *poOptions);
            };
        });
}

} // namespace krv::tool
