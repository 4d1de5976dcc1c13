#include "datasources/reader/irasterreader.h"
#include "tools/krv/checksums.h"
#include "tools/krv/jsontext.h"
#include "tools/krv/progress.h"
#include "tools/krv/sourcefile.h"
#include "tools/krv/verbs/verbs.h"

#include <CLI/CLI.hpp>
#include <fmt/format.h>

#include <limits>
#include <memory>

namespace krv::tool
{

namespace
{

struct Options
{
    std::string channels;
    unsigned int level = 1;
    bool json = false;
};

int RunChecksum(const std::string& file, const Options& oOptions)
{
    const auto oWanted = ParseNumbers(oOptions.channels, "--channels");
    const SourceFile oFile(file);
    const auto oChannels = oFile.CheckChannels(oWanted);
    Json oRows = Json::array();
    oRows.get_ref<Json::array_t&>().resize(oChannels.size());
    unsigned int nWidth = 0, nHeight = 0;
    for (const ChannelGroup& oGroup : oFile.GroupByType(oChannels))
    {
        const LevelReader oReader = oFile.Read(oGroup.channels, oOptions.level);
        nWidth = oReader.Get().GetWidth();
        nHeight = oReader.Get().GetHeight();
        const krv::gobs::DataType oType = oReader.Get().GetDataType();
        Progress oProgress("checksum", krv::gobs::BufferBytes(nWidth, nHeight, oGroup.channels.size(), oType));
        const auto oSums = ComputeChecksums(oReader.Get(), oProgress);
        for (std::size_t i = 0; i < oSums.size(); ++i)
            oRows[oGroup.positions[i]] = {
                {"number", oGroup.channels[i]}, {"type", oType.Describe()}, {"crc32", fmt::format("{:08x}", oSums[i])}};
    }
    if (oOptions.json)
    {
        Print(ToText({{"file", file}, {"width", nWidth}, {"height", nHeight}, {"channels", oRows}}));
        return 0;
    }
    std::string text;
    for (const Json& oRow : oRows)
        text += fmt::format("{:>4}  {:<5} {}\n", oRow["number"].get<unsigned int>(), oRow["type"].get<std::string>(),
                            oRow["crc32"].get<std::string>());
    Print(text);
    return 0;
}

} // namespace

void AddChecksumVerb(CLI::App& oApp, Selection& oSelection)
{
    auto* const poVerb = oApp.add_subcommand(
        "checksum", "CRC-32 of each channel over its decoded pixels: row by row, little-endian, without margins");
    const auto poOptions = std::make_shared<Options>();
    poVerb->add_option("FILE", oSelection.file, "The file")->required();
    poVerb->add_option("--channels", poOptions->channels, "Only these, such as 1,3");
    poVerb->add_option("--level", poOptions->level, "Of an overview level, such as 2 (`krv info` lists them)")
        ->check(CLI::Range(1U, std::numeric_limits<unsigned int>::max()));
    poVerb->add_flag("--json", poOptions->json, "As JSON");
    poVerb->callback(
        [&oSelection, poOptions]
        {
            oSelection.run = [&oSelection, poOptions]
            {
                return RunChecksum(oSelection.file, *poOptions);
            };
        });
}

} // namespace krv::tool
