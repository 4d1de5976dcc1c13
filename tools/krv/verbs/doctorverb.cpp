#include "operations/diagnosis/diagnosis.h"
#include "tools/krv/errors.h"
#include "tools/krv/jsontext.h"
#include "tools/krv/verbs/verbs.h"

#include <CLI/CLI.hpp>
#include <fmt/format.h>
#include <fmt/ranges.h>

#include <algorithm>
#include <memory>

namespace krv::tool
{

using namespace krv::operations;

namespace
{

// What to do, with the words of this command where it can do it.
std::string RemedyText(const Finding& oFinding)
{
    switch (oFinding.step)
    {
    case RemedyStep::eBuildLevels:
        return fmt::format("{}: krv overviews FILE --levels {}", oFinding.remedy, fmt::join(oFinding.levels, ","));
    case RemedyStep::eLinkAnew:
        return oFinding.remedy + ": krv link TARGET SOURCE";
    case RemedyStep::eConvert:
        return oFinding.remedy + "; `krv formats` lists the installed formats";
    case RemedyStep::eCloudCopy:
        return oFinding.remedy + ": krv convert IN OUT.tif --options \"LAYOUT=COG COMPRESS=DEFLATE\"";
    default:
        return oFinding.remedy;
    }
}

std::string FindingText(const Finding& oFinding)
{
    std::string text = fmt::format("{}  {}: {}\n", oFinding.good ? "ok  " : "BAD ", OneLine(oFinding.subject),
                                   OneLine(oFinding.found));
    if (!oFinding.remedy.empty())
        text += fmt::format("      what to do: {}\n", RemedyText(oFinding));
    return text;
}

Json FindingToJson(const Finding& oFinding)
{
    return {{"ok", oFinding.good},
            {"subject", oFinding.subject},
            {"found", OneLine(oFinding.found)},
            {"remedy", TextOrNull(RemedyText(oFinding))}};
}

std::vector<Finding> Find(const std::string& file, bool bCog)
{
    if (bCog && file.empty())
        throw UsageError("doctor: --cog is about a FILE; name it");
    if (bCog)
        return CheckCloudLayout(file);
    const InstallationCheck oInstallation;
    std::vector<Finding> oFindings = oInstallation.GetFindings();
    if (!file.empty())
    {
        const auto oMore = CheckFile(file, oInstallation.GetPlugins());
        oFindings.insert(oFindings.end(), oMore.begin(), oMore.end());
    }
    return oFindings;
}

int RunDoctor(const std::string& file, bool bCog, bool bJson)
{
    const std::vector<Finding> oFindings = Find(file, bCog);
    Json oJson = Json::array();
    std::string text;
    for (const Finding& oFinding : oFindings)
    {
        oJson.push_back(FindingToJson(oFinding));
        text += FindingText(oFinding);
    }
    Print(bJson ? ToText({{"findings", oJson}}) : text);
    return std::all_of(oFindings.begin(), oFindings.end(), [](const Finding& oFinding) { return oFinding.good; }) ? 0
                                                                                                                  : 1;
}

} // namespace

void AddDoctorVerb(CLI::App& oApp, Selection& oSelection)
{
    auto* const poVerb = oApp.add_subcommand(
        "doctor", "Checks the installation and each plug-in, and says why a FILE does or does not open");
    const auto poJson = std::make_shared<bool>(false), poCog = std::make_shared<bool>(false);
    poVerb->add_option("FILE", oSelection.file, "A file that should open");
    poVerb->add_flag("--cog", *poCog, "Whether FILE is laid out for reading over a network (COG), and if not, why");
    poVerb->add_flag("--json", *poJson, "As JSON");
    poVerb->footer("The exit code is 1 when anything is wrong.");
    poVerb->callback(
        [&oSelection, poCog, poJson]
        {
            oSelection.run = [&oSelection, poCog, poJson]
            {
                return RunDoctor(oSelection.file, *poCog, *poJson);
            };
        });
}

} // namespace krv::tool
