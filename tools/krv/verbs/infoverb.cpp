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

int RunInfo(const std::string& file, bool bJson)
{
    const SourceFile oFile(file);
    const Json oInfo = InfoToJson(GatherInfo(oFile));
    Print(bJson ? ToText(oInfo) : InfoText(oInfo));
    return 0;
}

} // namespace

void AddInfoVerb(CLI::App& oApp, Selection& oSelection)
{
    auto* const poVerb = oApp.add_subcommand(
        "info", "Shows everything known of a file: size, types, metadata, reference system, overviews, masks");
    const auto poJson = std::make_shared<bool>(false);
    poVerb->add_option("FILE", oSelection.file, "The file")->required();
    poVerb->add_flag("--json", *poJson, "As JSON; absent facts are null, no-data values are text");
    poVerb->callback(
        [&oSelection, poJson]
        {
            oSelection.run = [&oSelection, poJson]
            {
                return RunInfo(oSelection.file, *poJson);
            };
        });
}

} // namespace krv::tool
