#include "operations/picture/quicklook.h"
#include "operations/source/sourcefile.h"
#include "tools/krv/errors.h"
#include "tools/krv/jsontext.h"
#include "tools/krv/progress.h"
#include "tools/krv/threads.h"
#include "tools/krv/verbs/verbs.h"

#include <CLI/CLI.hpp>
#include <fmt/format.h>

#include <filesystem>
#include <map>
#include <memory>
#include <system_error>

namespace krv::tool
{

using namespace krv::operations;

namespace
{

struct Options
{
    std::string target;
    std::string channels;
    bool nearest = false;
    QuickLookOptions look;
};

const char* ReasonText(DisplayReason eReason)
{
    switch (eReason)
    {
    case DisplayReason::eAsked:
        return "as asked";
    case DisplayReason::eDefaults:
        return "the file's display defaults";
    case DisplayReason::eColourTable:
        return "it has a colour table";
    case DisplayReason::eRoles:
        return "described as red, green and blue";
    case DisplayReason::eInks:
        return "cyan, magenta, yellow and black";
    case DisplayReason::eFirstThree:
        return "the first three";
    default:
        return "the first";
    }
}

std::string Describe(const QuickLook& oLook)
{
    const DisplayChoice& oChoice = oLook.choice;
    std::string text = fmt::format("channel{} {} ({})", oChoice.channels.size() > 1 ? "s" : "",
                                   fmt::join(oChoice.channels, ", "), ReasonText(oChoice.reason));
    if (oChoice.table != nullptr)
        return text + ", colour table";
    text += ", shown from";
    for (const Stretch& oStretch : oLook.stretches)
        text += fmt::format(" {:g}..{:g}", oStretch.low, oStretch.high);
    return text;
}

int RunView(const std::string& file, Options& oOptions)
{
    oOptions.look.channels = ParseNumbers(oOptions.channels, "--channels");
    oOptions.look.average = !oOptions.nearest;
    std::error_code oNone;
    if (std::filesystem::equivalent(file, oOptions.target, oNone))
        throw UsageError(oOptions.target + " is the file itself; name another for the quick look");
    const SourceFile oFile(file);
    const QuickLook oLook = MakeQuickLook(oFile, oOptions.look, ShowProgress(), GetExecutor());
    WritePng(oLook.picture, oOptions.target);
    Print(
        fmt::format("{}: {} x {}, {}\n", oOptions.target, oLook.picture.width, oLook.picture.height, Describe(oLook)));
    return 0;
}

} // namespace

void AddViewVerb(CLI::App& oApp, Selection& oSelection)
{
    auto* const poVerb = oApp.add_subcommand("view", "Makes a quick look as PNG, missing pixels transparent");
    const auto poOptions = std::make_shared<Options>();
    const std::map<std::string, StretchMode> oModes{{"auto", StretchMode::eAuto},
                                                    {"none", StretchMode::eNone},
                                                    {"percentile", StretchMode::ePercentile},
                                                    {"minmax", StretchMode::eMinMax}};
    poVerb->add_option("FILE", oSelection.file, "The file")->required();
    poVerb->add_option("OUT", poOptions->target, "The PNG file to write; it is replaced")->required();
    poVerb->add_option("--size", poOptions->look.size, "Longest side in pixels (1024); nothing is enlarged")
        ->check(CLI::Range(1, 16384));
    poVerb->add_option("--channels", poOptions->channels,
                       "Three as red,green,blue or a single one; otherwise what the file says, else the first");
    poVerb
        ->add_option("--stretch", poOptions->look.stretch,
                     "auto: 8-bit data of good contrast as it is, else percentile (the 2nd black, the 98th white); "
                     "none: 0 to 255 as they are; minmax")
        ->transform(CLI::CheckedTransformer(oModes, CLI::ignore_case));
    poVerb->add_flag("--nearest", poOptions->nearest, "Take single pixels instead of means: for class numbers");
    poVerb->callback(
        [&oSelection, poOptions]
        {
            oSelection.run = [&oSelection, poOptions]
            {
                return RunView(oSelection.file, *poOptions);
            };
        });
}

} // namespace krv::tool
