#include "operations/checksum/checksums.h"
#include "operations/source/sourcefile.h"
#include "tools/krv/errors.h"
#include "tools/krv/jsontext.h"
#include "tools/krv/progress.h"
#include "tools/krv/threads.h"
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
    std::vector<std::string> files;
    std::string channels;
    unsigned int level = 1;
    bool json = false;
};

int RunChecksum(Selection& oSelection, const Options& oOptions)
{
    const auto oChannels = ParseNumbers(oOptions.channels, "--channels");
    Json oFiles = Json::array();
    std::string text;
    const auto Sum = [&](const std::string& file)
    {
        const auto oSums = operations::ComputeChecksums(operations::SourceFile(file), oChannels, oOptions.level,
                                                        ShowProgress(), GetExecutor());
        Json oRows = Json::array();
        text += oOptions.files.size() > 1 ? OneLine(file) + "\n" : "";
        for (const operations::ChannelChecksum& oSum : oSums.channels)
        {
            const std::string type = oSum.type.Describe(), crc = fmt::format("{:08x}", oSum.crc32);
            oRows.push_back({{"number", oSum.number}, {"type", type}, {"crc32", crc}});
            text += fmt::format("{:>4}  {:<5} {}\n", oSum.number, type, crc);
        }
        oFiles.push_back({{"file", file}, {"width", oSums.width}, {"height", oSums.height}, {"channels", oRows}});
    };
    const int nCode = ForEachFile(oSelection, oOptions.files, Sum);
    Print(!oOptions.json ? text : oOptions.files.size() == 1 ? ToText(oFiles.front()) : ToText({{"files", oFiles}}));
    return nCode;
}

} // namespace

void AddChecksumVerb(CLI::App& oApp, Selection& oSelection)
{
    auto* const poVerb = oApp.add_subcommand(
        "checksum",
        "Computes the CRC-32 of each channel over its decoded pixels: row by row, little-endian, without margins");
    const auto poOptions = std::make_shared<Options>();
    poVerb->add_option("FILES", poOptions->files, "The files")->required();
    poVerb->add_option("--channels", poOptions->channels, "Only these, such as 1,3 or 1-3");
    poVerb->add_option("--level", poOptions->level, "Of an overview level, such as 2 (`krv info` lists them)")
        ->check(CLI::Range(1U, std::numeric_limits<unsigned int>::max()));
    poVerb->add_flag("--json", poOptions->json, "As JSON");
    poVerb->callback(
        [&oSelection, poOptions]
        {
            oSelection.file = poOptions->files.front();
            oSelection.run = [&oSelection, poOptions]
            {
                return RunChecksum(oSelection, *poOptions);
            };
        });
}

} // namespace krv::tool
