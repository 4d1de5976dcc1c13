#include "datasources/interfaces/irasterdataset.h"
#include "datasources/reader/irasterreader.h"
#include "tools/krv/progress.h"
#include "tools/krv/sourcefile.h"
#include "tools/krv/statistics.h"
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
    bool json = false;
};

Json StatisticsToJson(const SourceFile& oFile, unsigned int nChannel, const krv::gobs::DataType& oType,
                      const ChannelStatistics& oStatistics)
{
    return {{"number", nChannel},
            {"type", oType.Describe()},
            {"of", oType.IsComplex() ? "magnitude" : "value"},
            {"noDataValue", TextOrNull(oFile.GetNoDataText(nChannel))},
            {"min", oStatistics.minimum},
            {"max", oStatistics.maximum},
            {"mean", oStatistics.mean},
            {"stdDev", oStatistics.deviation},
            {"valid", oStatistics.valid},
            {"noData", oStatistics.noData},
            {"nan", oStatistics.nan},
            {"infinite", oStatistics.infinite}};
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
    const auto oWanted = ParseNumbers(oOptions.channels, "--channels");
    const SourceFile oFile(file);
    const auto oChannels = oFile.CheckChannels(oWanted);
    Json oRows = Json::array();
    oRows.get_ref<Json::array_t&>().resize(oChannels.size());
    for (const ChannelGroup& oGroup : oFile.GroupByType(oChannels))
    {
        const LevelReader oReader = oFile.Read(oGroup.channels);
        const krv::gobs::DataType oType = oReader.Get().GetDataType();
        std::vector<OptionalNoData> oNoData;
        for (const unsigned int nChannel : oGroup.channels)
            oNoData.push_back(oFile.GetNoData(nChannel));
        Progress oProgress("stats", krv::gobs::BufferBytes(oReader.Get().GetWidth(), oReader.Get().GetHeight(),
                                                           oGroup.channels.size(), oType));
        const auto oFound = ComputeStatistics(oReader.Get(), oNoData, oProgress);
        for (std::size_t i = 0; i < oFound.size(); ++i)
            oRows[oGroup.positions[i]] = StatisticsToJson(oFile, oGroup.channels[i], oType, oFound[i]);
    }
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
    poVerb->footer("No-data values, NaN and infinities take no part. Complex channels: of the magnitude.");
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
