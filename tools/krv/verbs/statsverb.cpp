#include "datasources/interfaces/irasterdataset.h"
#include "operations/source/sourcefile.h"
#include "operations/statistics/statistics.h"
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

namespace
{

struct Options
{
    std::vector<std::string> files;
    std::string channels;
    std::string noData;
    std::string percentiles;
    operations::StatisticsRequest request;
    bool histogram = false;
    bool json = false;
};

constexpr std::size_t USUAL_BINS = 256;
// 2: the count of no-data values is noDataCount, with what was not there before.
constexpr int STATISTICS_VERSION = 2;

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
            {"noDataCount", Unless(oStatistics.noData)},
            {"masked", Unless(oStatistics.masked)},
            {"transparent", Unless(oStatistics.transparent)},
            {"nan", Unless(oStatistics.nan)},
            {"infinite", Unless(oStatistics.infinite)}};
}

void AddDistribution(const operations::ChannelStatistics& oStatistics, const std::vector<double>& oPercentiles,
                     Json& oJson)
{
    if (!oPercentiles.empty())
        oJson["percentiles"] = Json::array();
    for (std::size_t i = 0; i < oPercentiles.size(); ++i)
        oJson["percentiles"].push_back(
            {{"percent", oPercentiles[i]},
             {"value", i < oStatistics.percentiles.size() ? Json(oStatistics.percentiles[i]) : Json()}});
    if (!oStatistics.histogram.empty())
        oJson["histogram"] = {
            {"low", oStatistics.histogramLow}, {"high", oStatistics.histogramHigh}, {"counts", oStatistics.histogram}};
}

std::string Number(const Json& oNumber)
{
    if (oNumber.is_null())
        return "-";
    return oNumber.is_number_float() ? fmt::format("{:.9g}", oNumber.get<double>()) : oNumber.dump();
}

// Percentiles on a line for each channel; of a histogram the bins that hold anything, a line for each.
std::string DistributionText(const Json& oRows)
{
    std::string text;
    for (const Json& oRow : oRows)
    {
        if (oRow.contains("percentiles"))
        {
            text += fmt::format("{:>4}  percentiles", Number(oRow["number"]));
            for (const Json& oOne : oRow["percentiles"])
                text += fmt::format("  {:g} %: {}", oOne["percent"].get<double>(), Number(oOne["value"]));
            text += "\n";
        }
        if (!oRow.contains("histogram"))
            continue;
        const Json& oCounts = oRow["histogram"]["counts"];
        const double nLow = oRow["histogram"]["low"].get<double>();
        const double nStep = (oRow["histogram"]["high"].get<double>() - nLow) / static_cast<double>(oCounts.size());
        for (std::size_t i = 0; i < oCounts.size(); ++i)
            if (oCounts[i] != 0)
                text += fmt::format("{:>4}  {:.9g} to {:.9g}: {}\n", Number(oRow["number"]),
                                    nLow + static_cast<double>(i) * nStep, nLow + static_cast<double>(i + 1) * nStep,
                                    Number(oCounts[i]));
    }
    return text;
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
                        Number(oRow["stdDev"]), Number(oRow["valid"]), Number(oRow["noDataCount"]));
        if (oRow["of"] == "alpha")
        {
            text += "  alpha: where it is 0 pixels are not valid\n";
            continue;
        }
        if (oRow["masked"] != oRow["transparent"])
            text += fmt::format("  {} masked",
                                oRow["masked"].get<std::uint64_t>() - oRow["transparent"].get<std::uint64_t>());
        if (oRow["transparent"] != 0)
            text += fmt::format("  {} transparent", Number(oRow["transparent"]));
        if (oRow["nan"] != 0)
            text += fmt::format("  {} not a number", Number(oRow["nan"]));
        if (oRow["infinite"] != 0)
            text += fmt::format("  {} infinite", Number(oRow["infinite"]));
        text += oRow["of"] == "magnitude" ? "  of the magnitude\n" : "\n";
    }
    return text + DistributionText(oRows);
}

int RunStats(Selection& oSelection, Options& oOptions)
{
    operations::StatisticsRequest& oRequest = oOptions.request;
    oRequest.channels = ParseNumbers(oOptions.channels, "--channels");
    oRequest.percentiles = ParseReals(oOptions.percentiles, "--percentiles", 1, 1000);
    if (oOptions.histogram && oRequest.bins == 0)
        oRequest.bins = USUAL_BINS;
    Json oFiles = Json::array();
    std::string text;
    const auto Count = [&](const std::string& file)
    {
        const operations::SourceFile oFile(file, eReadOnly, GivenOrNone(oOptions.noData));
        Json oRows = Json::array();
        for (const auto& oStatistics : operations::ComputeStatistics(oFile, oRequest, ShowProgress(), GetExecutor()))
        {
            oRows.push_back(StatisticsToJson(oStatistics));
            AddDistribution(oStatistics, oRequest.percentiles, oRows.back());
        }
        text += (oOptions.files.size() > 1 ? OneLine(file) + "\n" : "") + Table(oRows);
        oFiles.push_back({{"file", file},
                          {"width", oFile.GetRaster().GetWidth()},
                          {"height", oFile.GetRaster().GetHeight()},
                          {"channels", oRows},
                          {"version", STATISTICS_VERSION}});
    };
    const int nCode = ForEachFile(oSelection, oOptions.files, Count);
    Print(!oOptions.json ? text : oOptions.files.size() == 1 ? ToText(oFiles.front()) : ToText({{"files", oFiles}}));
    return nCode;
}

} // namespace

void AddStatsVerb(CLI::App& oApp, Selection& oSelection)
{
    auto* const poVerb = oApp.add_subcommand("stats", "Computes minimum, maximum, mean, standard deviation (of the "
                                                      "population) and counts of valid pixels per channel");
    const auto poOptions = std::make_shared<Options>();
    poVerb->add_option("FILES", poOptions->files, "The files; each is counted by itself")->required();
    poVerb->add_option("--channels", poOptions->channels, "Only these, such as 1,3 or 1-3");
    poVerb->add_option("--no-data", poOptions->noData, "The no-data value, in place of the recorded one");
    poVerb->add_option("--percentiles", poOptions->percentiles,
                       "Values below which this many percent lie, such as 2,50,98; the file is read twice");
    poVerb->add_flag("--histogram", poOptions->histogram,
                     "How often values occur, in 256 bins from the smallest to the largest; the file is read twice");
    poVerb->add_option("--bins", poOptions->request.bins, "A histogram of this many bins")->check(CLI::Range(1, 65536));
    poVerb->add_flag("--unscale", poOptions->request.unscale, "Multiply by the recorded scale and add the offset");
    poVerb->add_flag("--raw", poOptions->request.raw,
                     "Also count pixels that the validity mask or the alpha channel leaves out");
    poVerb->add_flag("--power", poOptions->request.power,
                     "Statistics of the power of a radar scene, all channels together");
    poVerb->add_flag("--json", poOptions->json, "As JSON; 64-bit integers are exact");
    poVerb->footer("No-data values, pixels that the validity mask or the alpha channel leaves out, NaN and infinities\n"
                   "take no part. Complex channels are counted by their magnitude.\n"
                   "Example:\n"
                   "  krv stats scene.tif --percentiles 2,98 --histogram --json");
    poVerb->callback(
        [&oSelection, poOptions]
        {
            oSelection.file = poOptions->files.front();
            oSelection.run = [&oSelection, poOptions]
            {
                return RunStats(oSelection, *poOptions);
            };
        });
}

} // namespace krv::tool
