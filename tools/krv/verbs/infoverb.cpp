#include "operations/source/fileinfo.h"
#include "operations/source/sourcefile.h"
#include "tools/krv/infotext.h"
#include "tools/krv/verbs/verbs.h"

#include <CLI/CLI.hpp>

#include <memory>

namespace krv::tool
{

using namespace krv::operations;

namespace
{

int RunInfo(Selection& oSelection, const std::vector<std::string>& oNames, bool bJson)
{
    Json oFiles = Json::array();
    std::string text;
    const auto Gather = [&](const std::string& file)
    {
        const SourceFile oFile(file);
        oFiles.push_back(InfoToJson(GatherInfo(oFile)));
        text += InfoText(oFiles.back());
    };
    const int nCode = ForEachFile(oSelection, oNames, Gather);
    Print(!bJson ? text : oNames.size() == 1 ? ToText(oFiles.front()) : ToText({{"files", oFiles}}));
    return nCode;
}

} // namespace

void AddInfoVerb(CLI::App& oApp, Selection& oSelection)
{
    auto* const poVerb = oApp.add_subcommand(
        "info", "Shows everything known of a file: size, types, metadata, reference system, overviews, masks");
    const auto poJson = std::make_shared<bool>(false);
    const auto poFiles = std::make_shared<std::vector<std::string>>();
    poVerb->add_option("FILES", *poFiles, "The files")->required();
    poVerb->add_flag("--json", *poJson, "As JSON; absent facts are null, no-data values are text");
    poVerb->callback(
        [&oSelection, poFiles, poJson]
        {
            oSelection.file = poFiles->front();
            oSelection.run = [&oSelection, poFiles, poJson]
            {
                return RunInfo(oSelection, *poFiles, *poJson);
            };
        });
}

} // namespace krv::tool
