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
    std::string noData;
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
        return "the one with a colour table";
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

std::string Describe(const SourceFile& oFile, const QuickLook& oLook)
{
    const DisplayChoice& oChoice = oLook.choice;
    std::string text = oLook.power ? std::string("total power")
                                   : fmt::format("channel{} {} ({})", oChoice.channels.size() > 1 ? "s" : "",
                                                 fmt::join(oChoice.channels, ", "), ReasonText(oChoice.reason));
    if (oChoice.table != nullptr)
        return text + ", in the colours of its table";
    text += ", shown from";
    for (std::size_t c = 0; c < oLook.stretches.size(); ++c)
    {
        const Stretch& oStretch = oLook.stretches[c];
        const bool bStored = oLook.power || oLook.decibels || oChoice.channels.size() <= c;
        const ValueScale oScale = bStored ? ValueScale() : oFile.GetScale(oChoice.channels[c]);
        text += fmt::format("{} {:.4g} to {:.4g}", c == 0 ? "" : ",", oScale(oStretch.low), oScale(oStretch.high));
    }
    return text + (oLook.decibels ? " dB" : "");
}

int RunView(const std::string& file, Options& oOptions)
{
    oOptions.look.channels = ParseNumbers(oOptions.channels, "--channels");
    oOptions.look.average = !oOptions.nearest;
    std::error_code oNone;
    if (std::filesystem::equivalent(file, oOptions.target, oNone))
        throw UsageError(oOptions.target + " is the file itself; name another for the quick look");
    if (!IsPictureName(oOptions.target))
        throw UsageError(oOptions.target + ": pictures are written as .png or .jpg, or to - as PNG");
    const SourceFile oFile(file, eReadOnly, GivenOrNone(oOptions.noData));
    const Progress oProgress = ShowProgress();
    const QuickLook oLook = MakeQuickLook(oFile, oOptions.look, oProgress, GetExecutor());
    WritePicture(oLook.picture, oOptions.target, oProgress);
    if (oOptions.target != "-")
        Print(fmt::format("{}: {} x {}, {}\n", oOptions.target, oLook.picture.width, oLook.picture.height,
                          Describe(oFile, oLook)));
    return 0;
}

} // namespace

void AddViewVerb(CLI::App& oApp, Selection& oSelection)
{
    auto* const poVerb = oApp.add_subcommand("view", "Makes a quick look as PNG or JPEG, missing pixels transparent");
    const auto poOptions = std::make_shared<Options>();
    poVerb->add_option("FILE", oSelection.file, "The file")->required();
    poVerb
        ->add_option("OUT", poOptions->target,
                     "The picture to write, .png or .jpg; it is replaced. - is PNG on the standard output")
        ->required();
    poVerb->add_option("--size", poOptions->look.size, "Longest side in pixels (1024); nothing is enlarged")
        ->check(CLI::Range(1, 16384));
    poVerb->add_option("--channels", poOptions->channels,
                       "Three as red,green,blue, or a single one; by default those that the file says, else the first");
    AddChoice<StretchMode>(*poVerb, "--stretch", poOptions->look.stretch,
                           "What becomes black and white. auto (the default): 8-bit colours and 8-bit data of good "
                           "contrast stay as they are, the rest is percentile. percentile: the 2nd and the 98th, a "
                           "black collar left out. minmax: the smallest and the largest. none: 0 and 255",
                           {{"auto", StretchMode::eAuto},
                            {"none", StretchMode::eNone},
                            {"percentile", StretchMode::ePercentile},
                            {"minmax", StretchMode::eMinMax}});
    poVerb->add_flag("--power", poOptions->look.power,
                     "The power of a radar scene, all channels together; the default for complex files");
    poVerb->add_flag("--decibels", poOptions->look.decibels, "Values in decibels: 10 times their logarithm");
    poVerb->add_flag("--legend", poOptions->look.legend,
                     "Below the picture, what its levels or colours stand for; for one channel");
    poVerb->add_option("--no-data", poOptions->noData, "The no-data value, in place of the recorded one");
    poVerb->add_flag("--nearest", poOptions->nearest, "Take single pixels instead of means: for class numbers");
    poVerb->footer("Examples:\n"
                   "  krv view scene.tif look.png --channels 4,3,2\n"
                   "  krv view backscatter.tif look.jpg --decibels --legend\n"
                   "  krv view scene.tif - --size 300 > look.png");
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
