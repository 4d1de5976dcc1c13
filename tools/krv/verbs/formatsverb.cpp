#include "datasources/formatregistrar/winformatregistrar.h"
#include "datasources/interfaces/ifileformat.h"
#include "datasources/interfaces/iformatoptions.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/iomanager/formatcapabilities.h"
#include "operations/home/formathome.h"
#include "toolkit/core/lettercase.h"
#include "tools/krv/errors.h"
#include "tools/krv/jsontext.h"
#include "tools/krv/verbs/verbs.h"

#include <CLI/CLI.hpp>
#include <fmt/format.h>

#include <algorithm>
#include <array>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

namespace krv::tool
{

using namespace krv::datasources;
using namespace krv::operations;

namespace
{

constexpr std::pair<const char*, const char*> CAPABILITIES[] = {
    {"create", CAPABILITY_CREATE},
    {"update", CAPABILITY_UPDATE},
    {"metadata", CAPABILITY_METADATA},
    {"georeferencing", CAPABILITY_GEOREFERENCING},
    {"narrowSamples", CAPABILITY_NARROW_SAMPLES},
    {"createBitmap", CAPABILITY_BITMAP_CREATE},
    {"deleteBitmap", CAPABILITY_BITMAP_DELETE},
    {"createControlPoint", CAPABILITY_CONTROL_POINT_CREATE},
    {"deleteControlPoint", CAPABILITY_CONTROL_POINT_DELETE}};

Json FormatToJson(const DatasetManager& oManager, const IFileFormat& oFormat)
{
    const FormatCapabilities& oCapabilities = oManager.GetCapabilities(oFormat.GetShortName());
    Json oJson{{"name", oFormat.GetShortName()},
               {"description", oFormat.GetDescription()},
               {"extensions", oFormat.GetExtensions()},
               {"capabilities", Json::object()}};
    for (const auto& [pName, pXPath] : CAPABILITIES)
        oJson["capabilities"][pName] = oCapabilities.IsSupported(pXPath);
    oJson["options"] = Json::array();
    if (const auto* const poOptions = dynamic_cast<const IFormatOptions*>(&oFormat))
        for (const FormatOption& oOption : poOptions->ListOptions())
            oJson["options"].push_back({{"key", oOption.moKey}, {"takes", oOption.moTakes}});
    return oJson;
}

using Row = std::array<std::string, 4>;

Row FormatRow(const Json& oFormat)
{
    std::string can = "read";
    for (const auto& [name, supported] : oFormat["capabilities"].items())
        can += supported.get<bool>() ? ", " + name : "";
    const auto oExtensions = oFormat["extensions"].get<std::vector<std::string>>();
    return {OneLine(oFormat["name"].get<std::string>()), OneLine(oFormat["description"].get<std::string>()),
            OneLine(fmt::format("{}", fmt::join(oExtensions, " "))), can};
}

// Columns as wide as their longest text.
std::string TableText(const std::vector<Row>& oRows)
{
    std::array<std::size_t, 3> aWidths{};
    for (const Row& oRow : oRows)
        for (std::size_t i = 0; i < aWidths.size(); ++i)
            aWidths[i] = std::max(aWidths[i], oRow[i].size());
    std::string text;
    for (const Row& oRow : oRows)
        text += fmt::format("{:<{}}  {:<{}}  {:<{}}  {}\n", oRow[0], aWidths[0], oRow[1], aWidths[1], oRow[2],
                            aWidths[2], oRow[3]);
    return text;
}

// What a new file of the format may be told, key by key.
std::string OptionsText(const Json& oFormat)
{
    std::string text;
    for (const Json& oOption : oFormat["options"])
        text += fmt::format("  {:<16}{}\n", OneLine(oOption["key"].get<std::string>()),
                            OneLine(oOption["takes"].get<std::string>()));
    return text.empty() ? text
                        : fmt::format("\nOptions of a new {}\n{}", OneLine(oFormat["name"].get<std::string>()), text);
}

struct Options
{
    std::string name;
    HomeRequest home;
    bool json = false;
};

int ListFormats(const std::string& name, bool bJson)
{
    const DatasetManager& oManager = *DatasetManager::GetInstance();
    Json oJson{{"home", GetFormatHome()}, {"formats", Json::array()}};
    std::string options;
    std::vector<std::string> oNames;
    std::vector<Row> oRows{{"NAME", "DESCRIPTION", "EXTENSIONS", "CAN"}};
    for (const IFileFormat* const poFormat : oManager.GetFormatList())
    {
        oNames.push_back(poFormat->GetShortName());
        if (!name.empty() && krv::ToUpper(name) != krv::ToUpper(oNames.back()))
            continue;
        oJson["formats"].push_back(FormatToJson(oManager, *poFormat));
        oRows.push_back(FormatRow(oJson["formats"].back()));
        options += OptionsText(oJson["formats"].back());
    }
    if (oJson["formats"].empty())
        throw UsageError(
            fmt::format("formats: there is no format \"{}\"; there are {}", name, fmt::join(oNames, ", ")));
    const std::string hint = name.empty() ? "\n`krv formats NAME` lists the options of new files of a format.\n" : "";
    Print(bJson ? ToText(oJson) : TableText(oRows) + (name.empty() ? hint : options));
    return 0;
}

int MakeHome(const HomeRequest& oHome, bool bJson)
{
    const HomeResult oResult = MakeFormatHome(oHome);
    Print(bJson ? ToText({{"home", oHome.folder}, {"formats", oResult.formats}, {"added", oResult.added}})
                : fmt::format("{}: a home with {}\nuse it by KRVHOME={}\n", oHome.folder,
                              fmt::join(oResult.formats, ", "), std::filesystem::absolute(oHome.folder).string()));
    return 0;
}

int RunFormats(const Options& oOptions)
{
    if (!oOptions.home.folder.empty() && !oOptions.name.empty())
        throw UsageError("formats: a NAME and --home do not go together");
    return oOptions.home.folder.empty() ? ListFormats(oOptions.name, oOptions.json)
                                        : MakeHome(oOptions.home, oOptions.json);
}

} // namespace

void AddFormatsVerb(CLI::App& oApp, Selection& oSelection)
{
    auto* const poVerb =
        oApp.add_subcommand("formats", "Lists the formats: name, extensions, what each can do, options of new files");
    const auto poOptions = std::make_shared<Options>();
    poVerb->add_option("NAME", poOptions->name, "One format, with the options of its new files");
    auto* const poHome = poVerb->add_option(
        "--home", poOptions->home.folder,
        "Make this folder a home of your own, with the installed formats; set KRVHOME to it to use it");
    poVerb
        ->add_option("--add", poOptions->home.plugins,
                     "Add this plug-in (.so, with its description .xml beside it) to that home; may be repeated")
        ->expected(1)
        ->multi_option_policy(CLI::MultiOptionPolicy::TakeAll)
        ->needs(poHome);
    poVerb->add_flag("--json", poOptions->json, "As JSON");
    poVerb->callback(
        [&oSelection, poOptions]
        {
            oSelection.run = [poOptions]
            {
                return RunFormats(*poOptions);
            };
        });
}

} // namespace krv::tool
