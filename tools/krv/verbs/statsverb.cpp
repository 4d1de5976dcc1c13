#include "datasources/interfaces/irasterdataset.h"
#include "datasources/reader/irasterreader.h"
#include "datasources/reader/validitysource.h"
#include "tools/krv/progress.h"
#include "tools/krv/sourcefile.h"
#include "tools/krv/statistics.h"
#include "tools/krv/verbs/verbs.h"

#include <CLI/CLI.hpp>
#include <fmt/format.h>

#include <algorithm>
#include <memory>

namespace krv::tool
{

namespace
{

using krv::datasources::ValiditySource;

struct Options
{
    std::string channels;
    bool raw = false;
    bool json = false;
};

// What says which pixels are valid beside the values of their own channels; null when nothing does.
std::unique_ptr<ValiditySource> FindValidity(const SourceFile& oFile, const std::vector<unsigned int>& oChannels)
{
    const auto IsNone = [&oFile](unsigned int nChannel)
    {
        return !oFile.GetNoData(nChannel);
    };
    const auto IsUnread = [&](unsigned int nChannel)
    {
        return IsNone(nChannel) && !oFile.GetNoDataText(nChannel).empty();
    };
    const bool bUnread = std::any_of(oChannels.begin(), oChannels.end(), IsUnread);
    auto poSource = std::make_unique<ValiditySource>(&oFile.GetDataset(), oChannels, krv::gobs::eAllChannels, !bUnread);
    // A pixel without data in all channels that have a value is none in those that have not.
    const bool bPixels = poSource->HasNoData() && std::any_of(oChannels.begin(), oChannels.end(), IsNone);
    return poSource->HasBitmap() || poSource->HasAlpha() || bPixels ? std::move(poSource) : nullptr;
}

// The alpha channel says which pixels are valid; it has no statistics of its own.
Json AlphaToJson(unsigned int nChannel, const krv::gobs::DataType& oType)
{
    Json oRow = {{"number", nChannel}, {"type", oType.Describe()}, {"of", "alpha"}};
    for (const char* pKey :
         {"noDataValue", "min", "max", "mean", "stdDev", "valid", "noData", "masked", "nan", "infinite"})
        oRow[pKey] = nullptr;
    return oRow;
}

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
            {"masked", oStatistics.masked},
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
    const auto oWanted = ParseNumbers(oOptions.channels, "--channels");
    const SourceFile oFile(file);
    const auto oChannels = oFile.CheckChannels(oWanted);
    const unsigned int nAlpha = oOptions.raw ? 0 : krv::datasources::FindAlpha(oFile.GetMetadata());
    Json oRows = Json::array();
    oRows.get_ref<Json::array_t&>().resize(oChannels.size());
    for (ChannelGroup oGroup : oFile.GroupByType(oChannels))
    {
        for (std::size_t i = oGroup.channels.size(); i-- > 0;)
        {
            if (oGroup.channels[i] != nAlpha)
                continue;
            oRows[oGroup.positions[i]] = AlphaToJson(nAlpha, oFile.GetType(nAlpha));
            oGroup.channels.erase(oGroup.channels.begin() + static_cast<std::ptrdiff_t>(i));
            oGroup.positions.erase(oGroup.positions.begin() + static_cast<std::ptrdiff_t>(i));
        }
        if (oGroup.channels.empty())
            continue;
        const LevelReader oReader = oFile.Read(oGroup.channels);
        const krv::gobs::DataType oType = oReader.Get().GetDataType();
        std::vector<OptionalNoData> oNoData;
        for (const unsigned int nChannel : oGroup.channels)
            oNoData.push_back(oFile.GetNoData(nChannel));
        Progress oProgress("stats", krv::gobs::BufferBytes(oReader.Get().GetWidth(), oReader.Get().GetHeight(),
                                                           oGroup.channels.size(), oType));
        const auto poValidity = oOptions.raw ? nullptr : FindValidity(oFile, oGroup.channels);
        const auto oFound = ComputeStatistics(oReader.Get(), oNoData, poValidity.get(), oProgress);
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
    poVerb->add_flag("--raw", poOptions->raw,
                     "Count pixels that the validity mask or the alpha channel leaves out too");
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
