#include "operations/warp/warping.h"
#include "toolkit/core/lettercase.h"
#include "tools/krv/errors.h"
#include "tools/krv/jsontext.h"
#include "tools/krv/progress.h"
#include "tools/krv/threads.h"
#include "tools/krv/verbs/verbs.h"

#include <CLI/CLI.hpp>
#include <fmt/format.h>

#include <memory>

namespace krv::tool
{

using namespace krv::operations;

namespace
{

struct Options
{
    std::string channels;
    std::string bounds;
    std::string resolution;
    std::string size;
    std::string resampling;
    std::string noData;
    WarpRequest request;
    TargetForm form;
};

std::string Describe(const std::string& target, const WarpResult& oResult)
{
    std::string text = fmt::format("{}: {} x {} pixels of {:g} x {:g}, {}\n", target, oResult.width, oResult.height,
                                   oResult.geocoding.GetColumnSpacing(), oResult.geocoding.GetRowSpacing(),
                                   krv::gobs::GetResamplingName(oResult.method));
    if (oResult.points != 0)
        text += fmt::format("placed by {} control points and a polynomial of degree {}: off by {:.3g} pixels (root "
                            "mean square), at most {:.3g}\n",
                            oResult.points, oResult.degree, oResult.residual, oResult.largestResidual);
    return text;
}

int RunWarp(const std::string& file, Options& oOptions)
{
    WarpRequest& oRequest = oOptions.request;
    oRequest.source = file;
    oRequest.channels = ParseNumbers(oOptions.channels, "--channels");
    oRequest.bounds = ParseWindow({"", oOptions.bounds, ""}, "").bounds;
    oRequest.resolution = ParseReals(oOptions.resolution, "--resolution", 1, 2);
    oRequest.size = ParseNumbers(oOptions.size, "--size");
    if (!oRequest.size.empty() && oRequest.size.size() != 2)
        throw UsageError("--size: \"" + oOptions.size + "\" is not columns,rows");
    if (!oOptions.resampling.empty())
        oRequest.method = krv::gobs::ParseResampling(oOptions.resampling);
    const auto oNoData = ParseReals(oOptions.noData, "--no-data", 1, 1);
    if (!oNoData.empty())
        oRequest.noData = oNoData.front();
    const WarpResult oResult = Warp(oRequest, oOptions.form, ShowProgress(), GetExecutor());
    Print(Describe(oOptions.form.name, oResult));
    return 0;
}

} // namespace

void AddWarpVerb(CLI::App& oApp, Selection& oSelection)
{
    auto* const poVerb =
        oApp.add_subcommand("warp", "Resamples a file into another grid or resolution of its reference system");
    const auto poOptions = std::make_shared<Options>();
    poVerb->add_option("FILE", oSelection.file, "The file")->required();
    poVerb->add_option("OUT", poOptions->form.name, "The new file, which is replaced")->required();
    poVerb->add_option("--like", poOptions->request.like, "Into the grid of this file");
    poVerb->add_option("--bounds", poOptions->bounds,
                       "The outer edges in map units: west,south,east,north (the file's outline)");
    poVerb->add_option("--resolution", poOptions->resolution,
                       "Map units of a pixel, such as 30, or of a column and a row (the file's)");
    poVerb->add_option("--size", poOptions->size, "Columns and rows, such as 2000,1500, in place of a resolution");
    AddWord(*poVerb, "--resampling", poOptions->resampling,
            "How pixels are made; bilinear by default, mode for indices of a colour table",
            {"nearest", "bilinear", "cubic", "lanczos", "average", "mode"});
    poVerb->add_option("--channels", poOptions->channels, "Only these, in this order, such as 3,1");
    poVerb->add_option("--no-data,--nodata", poOptions->noData,
                       "The value of pixels without a source (the file's own; else a mask tells them)");
    poVerb
        ->add_option("--degree", poOptions->request.degree,
                     "Of the polynomial through the ground control points of a file that has nothing else (by their "
                     "number)")
        ->check(CLI::Range(1, 3));
    poVerb->add_flag("--exact", poOptions->request.exact, "From the image at full size, never from its levels");
    poVerb->add_option("--format", poOptions->form.format,
                       "The new file's format (`krv formats`); else by its extension, TIF when it has none");
    poVerb->add_option("--options", poOptions->form.options,
                       "\"KEY=VALUE ...\" of the format, such as \"COMPRESS=ZSTD BLOCKXSIZE=512\"");
    poVerb->footer("No-data values, masks and alpha are respected: what is not valid takes no part.\n"
                   "Example:\n"
                   "  krv warp scene.tif coarse.tif --resolution 60 --resampling average");
    poVerb->callback(
        [&oSelection, poOptions]
        {
            oSelection.run = [&oSelection, poOptions]
            {
                return RunWarp(oSelection.file, *poOptions);
            };
        });
}

} // namespace krv::tool
