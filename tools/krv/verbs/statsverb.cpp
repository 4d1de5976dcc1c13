#include "datasources/interfaces/irasterdataset.h"
#include "operations/source/sourcefile.h"
#include "operations/statistics/statistics.h"
#include "tools/krv/jsontext.h"
#include "tools/krv/progress.h"
#include "tools/krv/threads.h"
#include "tools/krv/verbs/verbs.h"

#include <CLI/CLI.hpp>
#include <fmt/format.h>

#include <memory>

namespace krv::tool
{

namespace
{

struct Options
{
    std::string channels;
    bool raw = false;
    bool power = false;
    bool json = false;
};

Json ToJson(const std::optional<operations::ExactNumber>& oNumber)
{
    return oNumber ? std::visit([](auto nNumber) { return Json(nNumber); }, *oNumber) : Json();
}

Json StatisticsToJson(const operations::ChannelStatistics& oStatistics)
{
    const auto Unless = [&oStatistics](const Json& oValue)
    {
        return oStatistics.alpha ? Json() : oValue;
    };
    return {{"number", oStatistics.number},
            {"type", oStatistics.type.Describe()},
            {"of", oStatistics.alpha              ? "alpha"
                   : oStatistics.type.IsComplex() ? "magnitude"
                                                  : "value"},
            {"noDataValue", TextOrNull(oStatistics.noDataText)},
            {"min", ToJson(oStatistics.minimum)},
            {"max", ToJson(oStatistics.maximum)},
            {"mean", ToJson(oStatistics.mean)},
            {"stdDev", ToJson(oStatistics.deviation)},
            {"valid", Unless(oStatistics.valid)},
            {"noData", Unless(oStatistics.noData)},
            {"masked", Unless(oStatistics.masked)},
            {"nan", Unless(oStatistics.nan)},
            {"infinite", Unless(oStatistics.infinite)}};
}

std::string Number(const Json& oNumber)
{
    if (oNumber.is_null())
        return "-";
    return oNumber.is_number_float() ? fmt::format("{:.9g}", oNumber.get<double>()) : oNumber.dump();
}

std::string Table(const Json& oRows)
{
    std::string text = fmt::format("{:>4}  {:<5} {:>14} {:>14} {:>14} {:>14} {:>12} {:>10}\n", "CH", "TYPE", "MIN",
                                   "MAX", "MEAN", "STDDEV", "VALID", "NO-DATA");
    for (const Json& oRow : oRows)
    {
        text +=
            fmt::format("{:>4}  {:<5} {:>14} {:>14} {:>14} {:>14} {:>12} {:>10}", Number(oRow["number"]),
                        oRow["type"].get<std::string>(), Number(oRow["min"]), Number(oRow["max"]), Number(oRow["mean"]),
                        Number(oRow["stdDev"]), Number(oRow["valid"]), Number(oRow["noData"]));
        if (oRow["of"] == "alpha")
        {
            text += "  alpha: where it is 0 pixels are not valid\n";
            continue;
        }
        if (oRow["masked"] != 0)
            text += fmt::format("  {} masked", Number(oRow["masked"]));
        if (oRow["nan"] != 0)
            text += fmt::format("  {} not a number", Number(oRow["nan"]));
        if (oRow["infinite"] != 0)
            text += fmt::format("  {} infinite", Number(oRow["infinite"]));
        text += oRow["of"] == "magnitude" ? "  of the magnitude\n" : "\n";
    }
    return text;
}

int RunStats(const std::string& file, const Options& oOptions)
{
    const operations::StatisticsRequest oRequest{ParseNumbers(oOptions.channels, "--channels"), oOptions.raw,
                                                 oOptions.power};
    const operations::SourceFile oFile(file);
    Json oRows = Json::array();
    for (const auto& oStatistics : operations::ComputeStatistics(oFile, oRequest, ShowProgress(), GetExecutor()))
        oRows.push_back(StatisticsToJson(oStatistics));
    Print(oOptions.json ? ToText({{"file", file},
                                  {"width", oFile.GetRaster().GetWidth()},
                                  {"height", oFile.GetRaster().GetHeight()},
                                  {"channels", oRows}})
                        : Table(oRows));
    return 0;
}

} // namespace

void AddStatsVerb(CLI::App& oApp, Selection& oSelection)
{
    auto* const poVerb = oApp.add_subcommand(
        "stats",
        "Minimum, maximum, mean, standard deviation (of the population), valid and no-data counts per channel");
    const auto poOptions = std::make_shared<Options>();
    poVerb->add_option("FILE", oSelection.file, "The file")->required();
    poVerb->add_option("--channels", poOptions->channels, "Only these, such as 1,3");
    poVerb->add_flag("--json", poOptions->json, "As JSON; 64-bit integers are exact");
    poVerb->add_flag("--raw", poOptions->raw,
                     "Count pixels that the validity mask or the alpha channel leaves out too");
    poVerb->add_flag("--power", poOptions->power, "Of the power of a radar scene, all channels together");
    poVerb->footer("No-data values, pixels that the validity mask or the alpha channel leaves out, NaN and infinities "
                   "take no part. Complex channels: of the magnitude.");
    poVerb->callback(
        [&oSelection, poOptions]
        {
            oSelection.run = [&oSelection, poOptions]
            {
                return RunStats(oSelection.file, *poOptions);
            };
        });
}

} // namespace krv::tool
