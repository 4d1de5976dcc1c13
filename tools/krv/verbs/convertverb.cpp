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
    std::string noData;
    std::string scale;
    bool unscale = false;
    bool power = false;
    TargetForm form;
};

// As other programs call them; numbers of bits of complex types are those of both parts.
constexpr std::pair<const char*, krv::gobs::NativeDataTypeCode> TYPE_NAMES[] = {
    {"BYTE", krv::gobs::eDT_8U},        {"UINT8", krv::gobs::eDT_8U},      {"INT8", krv::gobs::eDT_8S},
    {"UINT16", krv::gobs::eDT_16U},     {"INT16", krv::gobs::eDT_16S},     {"UINT32", krv::gobs::eDT_32U},
    {"INT32", krv::gobs::eDT_32S},      {"UINT64", krv::gobs::eDT_64U},    {"INT64", krv::gobs::eDT_64S},
    {"FLOAT32", krv::gobs::eDT_32R},    {"FLOAT64", krv::gobs::eDT_64R},   {"FLOAT", krv::gobs::eDT_32R},
    {"DOUBLE", krv::gobs::eDT_64R},     {"CINT16", krv::gobs::eDT_C16S},   {"CINT32", krv::gobs::eDT_C32S},
    {"CFLOAT32", krv::gobs::eDT_C32R},  {"CFLOAT64", krv::gobs::eDT_C64R}, {"COMPLEX64", krv::gobs::eDT_C32R},
    {"COMPLEX128", krv::gobs::eDT_C64R}};

krv::gobs::DataType ParseType(const std::string& given)
{
    const std::string text = krv::ToUpper(given);
    std::string all = "promoted";
    for (int nCode = krv::gobs::eDT_8U; nCode <= krv::gobs::eDT_C64R; ++nCode)
    {
        const krv::gobs::DataType oType(static_cast<krv::gobs::NativeDataTypeCode>(nCode));
        if (oType.Describe() == text)
            return oType;
        all += ", " + oType.Describe();
    }
    for (const auto& [pName, eCode] : TYPE_NAMES)
        if (text == pName)
            return krv::gobs::DataType(eCode);
    throw UsageError("--type: \"" + given + "\" is none of " + all +
                     ", nor a name such as uint8, int16, float32 or complex64");
}

int RunConvert(Options& oOptions)
{
    CopyRequest oRequest;
    oOptions.form.name = oOptions.files.back();
    oRequest.sources.assign(oOptions.files.begin(), oOptions.files.end() - 1);
    oRequest.channels = ParseNumbers(oOptions.channels, "--channels");
    oRequest.window = ParseWindow(oOptions.window, "--window");
    oRequest.power = oOptions.power;
    oRequest.noData = GivenOrNone(oOptions.noData);
    oRequest.unscale = oOptions.unscale;
    oRequest.scale = ParseReals(oOptions.scale, "--scale", 2, 4);
    if (oRequest.scale.size() == 3)
        throw UsageError("--scale: \"" + oOptions.scale + "\" has 3 numbers, not 2 or 4");
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
                       "Only these, in this order, such as 3,1 or 1-3; counted through all files");
    AddWindowOptions(*poVerb, poOptions->window, "--window", "Only this part");
    poVerb->add_flag("--power", poOptions->power, "The power of a radar scene in place of its channels");
    poVerb->add_option("--type", poOptions->type,
                       "Values of this type, such as 16S or int16, or of the smallest that holds all: promoted");
    auto* const poUnscale =
        poVerb->add_flag("--unscale", poOptions->unscale,
                         "Store what the values stand for: multiplied by the recorded scale, with the "
                         "offset added; as 32R unless --type says");
    poVerb
        ->add_option(
            "--scale", poOptions->scale,
            "Spread the values from low,high over the type (reals: over 0 to 1), or from low,high to low,high: "
            "0,4000,0,255. What lies beyond is cut off; scale and offset are recorded")
        ->excludes(poUnscale);
    poVerb->add_option("--no-data", poOptions->noData,
                       "The no-data value, in place of the recorded one; the copy records it");
    poVerb->add_option("--format", poOptions->form.format,
                       "The new file's format (`krv formats`); else by its extension, TIF when it has none");
    poVerb->add_option("--options", poOptions->form.options,
                       "\"KEY=VALUE ...\" of the format, such as \"COMPRESS=ZSTD BLOCKXSIZE=512\"; \"LAYOUT=COG\" of "
                       "TIF also builds levels");
    poVerb->add_flag("--check", poOptions->form.check,
                     "Decode what is copied as it is stored: a damaged file is refused instead of copied");
    poVerb->footer("Examples:\n"
                   "  krv convert scene.tif part.tif --channels 4,3,2 --window 0,0,1000,1000\n"
                   "  krv convert scene.tif cloud.tif --options \"LAYOUT=COG COMPRESS=DEFLATE\"\n"
                   "  krv convert scene.tif small.tif --type uint8 --scale 0,4000");
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
