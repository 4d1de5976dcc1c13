#include "operations/copy/conversion.h"
#include "toolkit/core/lettercase.h"
#include "tools/krv/errors.h"
#include "tools/krv/progress.h"
#include "tools/krv/threads.h"
#include "tools/krv/verbs/verbs.h"

#include <CLI/CLI.hpp>

#include <limits>
#include <memory>

namespace krv::tool
{

using namespace krv::operations;

namespace
{

struct Options
{
    std::vector<std::string> files;
    std::string channels;
    WindowOptions window;
    std::string type;
    bool power = false;
    TargetForm form;
};

krv::gobs::DataType ParseType(const std::string& given)
{
    const std::string text = krv::ToUpper(given);
    std::string all;
    for (int nCode = krv::gobs::eDT_8U; nCode <= krv::gobs::eDT_C64R; ++nCode)
    {
        const krv::gobs::DataType oType(static_cast<krv::gobs::NativeDataTypeCode>(nCode));
        if (oType.Describe() == text)
            return oType;
        all += " " + oType.Describe();
    }
    throw UsageError("--type: \"" + text + "\" is none of promoted" + all);
}

int RunConvert(Options& oOptions)
{
    CopyRequest oRequest;
    oOptions.form.name = oOptions.files.back();
    oRequest.sources.assign(oOptions.files.begin(), oOptions.files.end() - 1);
    oRequest.channels = ParseNumbers(oOptions.channels, "--channels");
    oRequest.window = ParseWindow(oOptions.window, "--window");
    oRequest.power = oOptions.power;
    oRequest.promote = oOptions.type == "promoted";
    if (!oOptions.type.empty() && !oRequest.promote)
        oRequest.type = ParseType(oOptions.type);
    Convert(oRequest, oOptions.form, ShowProgress(), GetExecutor());
    return 0;
}

} // namespace

void AddConvertVerb(CLI::App& oApp, Selection& oSelection)
{
    auto* const poVerb = oApp.add_subcommand(
        "convert", "Copies a file into a new one, or stacks the channels of several files of one size");
    const auto poOptions = std::make_shared<Options>();
    poVerb->add_option("FILES", poOptions->files, "The files to copy, and last the new one, which is replaced")
        ->required()
        ->expected(2, std::numeric_limits<int>::max());
    poVerb->add_option("--channels", poOptions->channels,
                       "Only these, in this order, such as 3,1; counted through all files");
    AddWindowOptions(*poVerb, poOptions->window, "--window", "Only this part");
    poVerb->add_flag("--power", poOptions->power, "The power of a radar scene in place of its channels");
    poVerb->add_option("--type", poOptions->type,
                       "Values of this type, such as 16S, or of the smallest that holds all: promoted");
    poVerb->add_option("--format", poOptions->form.format,
                       "The new file's format (`krv formats`); else by its extension, TIF when it has none");
    poVerb->add_option("--options", poOptions->form.options,
                       "\"KEY=VALUE ...\" of the format, such as \"COMPRESS=ZSTD BLOCKXSIZE=512\"; \"LAYOUT=COG\" of "
                       "TIF also builds levels");
    poVerb->add_flag("--check", poOptions->form.check,
                     "Decode what is copied as it is stored: a damaged file is refused instead of copied");
    poVerb->callback(
        [&oSelection, poOptions]
        {
            oSelection.file = poOptions->files.front();
            oSelection.run = [poOptions]
            {
                return RunConvert(*poOptions);
            };
        });
}

} // namespace krv::tool
