#include "datasources/reader/irasterreader.h"
#include "datasources/reader/rasterrange.h"
#include "gobs/raster/raster.h"
#include "operations/source/sourcefile.h"
#include "toolkit/exceptions/exceptions.h"
#include "tools/krv/errors.h"
#include "tools/krv/jsontext.h"
#include "tools/krv/progress.h"
#include "tools/krv/verbs/verbs.h"

#include <CLI/CLI.hpp>
#include <fmt/format.h>

#include <algorithm>
#include <chrono>
#include <map>
#include <memory>

namespace krv::tool
{

using namespace krv::operations;

namespace
{

struct Options
{
    std::string channels;
    std::string margins;
    std::string tile;
    eMarginBehaviour behaviour = eMirror;
    bool json = false;
};

struct Walked
{
    std::uint64_t tiles = 0;
    std::uint64_t pixels = 0; // with margins
    std::uint64_t bytes = 0;
};

// "X,Y", or one number for both; an empty text leaves the defaults.
void ParsePair(const std::string& text, const std::string& option, unsigned int& nX, unsigned int& nY)
{
    const auto oNumbers = ParseNumbers(text, option);
    if (oNumbers.empty())
        return;
    if (oNumbers.size() > 2)
        throw UsageError(option + ": \"" + text + "\" is neither one number nor two");
    nX = oNumbers.front();
    nY = oNumbers.back();
}

void SetMargins(krv::datasources::IRasterReader& oReader, unsigned int nX, unsigned int nY, eMarginBehaviour eBehaviour)
{
    try
    {
        oReader.SetMargins(nX, nY, eBehaviour);
    }
    catch (const krv::DataException& oError)
    {
        throw UsageError("--margins: " + oError.GetMessage());
    }
}

void Walk(krv::datasources::IRasterReader& oReader, ProgressCounter& oProgress, Walked& oWalked)
{
    for (const std::unique_ptr<krv::gobs::Raster> poTile : krv::datasources::RasterRange(oReader))
    {
        ++oWalked.tiles;
        oWalked.pixels += poTile->GetFullWidth() * poTile->GetFullHeight();
        oWalked.bytes += poTile->GetBufferSize();
        oProgress.Advance(poTile->GetBufferSize());
    }
}

// What all tiles with their margins come to.
std::uint64_t ExpectedBytes(const krv::datasources::IRasterReader& oReader)
{
    const std::uint64_t nWidth = oReader.GetWidth(), nHeight = oReader.GetHeight();
    const std::uint64_t nColumns = (nWidth + oReader.GetTileWidth() - 1) / std::max(oReader.GetTileWidth(), 1U);
    const std::uint64_t nRows = (nHeight + oReader.GetTileHeight() - 1) / std::max(oReader.GetTileHeight(), 1U);
    return krv::gobs::BufferBytes(nWidth + 2 * nColumns * oReader.GetXMargin(),
                                  nHeight + 2 * nRows * oReader.GetYMargin(), oReader.GetChansCount(),
                                  oReader.GetDataType());
}

int RunWalk(const std::string& file, const Options& oOptions)
{
    unsigned int nXMargin = 0, nYMargin = 0, nTileWidth = 0, nTileHeight = 0;
    ParsePair(oOptions.margins, "--margins", nXMargin, nYMargin);
    ParsePair(oOptions.tile, "--tile", nTileWidth, nTileHeight);
    if (!oOptions.tile.empty() && (nTileWidth == 0 || nTileHeight == 0))
        throw UsageError("--tile: \"" + oOptions.tile + "\" holds a 0; tiles have pixels");
    const auto oWanted = ParseNumbers(oOptions.channels, "--channels");
    const SourceFile oFile(file);
    Walked oWalked;
    const auto oStart = std::chrono::steady_clock::now();
    for (const ChannelGroup& oGroup : oFile.GroupByType(oFile.CheckChannels(oWanted)))
    {
        const LevelReader oReader = oFile.Read(oGroup.channels);
        if (nTileWidth != 0 && nTileHeight != 0)
            oReader.Get().SetTileSize(nTileWidth, nTileHeight);
        nTileWidth = oReader.Get().GetTileWidth();
        nTileHeight = oReader.Get().GetTileHeight();
        SetMargins(oReader.Get(), nXMargin, nYMargin, oOptions.behaviour);
        ProgressCounter oProgress(ShowProgress(), "walk", ExpectedBytes(oReader.Get()));
        Walk(oReader.Get(), oProgress, oWalked);
    }
    const double nSeconds = std::chrono::duration<double>(std::chrono::steady_clock::now() - oStart).count();
    const double nRate = static_cast<double>(oWalked.bytes) / std::max(nSeconds, 1e-9);
    if (oOptions.json)
        Print(ToText({{"file", file},
                      {"tileWidth", nTileWidth},
                      {"tileHeight", nTileHeight},
                      {"xMargin", nXMargin},
                      {"yMargin", nYMargin},
                      {"tiles", oWalked.tiles},
                      {"pixels", oWalked.pixels},
                      {"bytes", oWalked.bytes},
                      {"seconds", nSeconds},
                      {"bytesPerSecond", nRate}}));
    else
        Print(fmt::format("{} tiles of {} x {} with margins of {} x {}: {} pixels, {} in {:.3f} s, {}/s\n",
                          oWalked.tiles, nTileWidth, nTileHeight, nXMargin, nYMargin, oWalked.pixels,
                          BytesText(static_cast<double>(oWalked.bytes)), nSeconds, BytesText(nRate)));
    return 0;
}

} // namespace

void AddWalkVerb(CLI::App& oApp, Selection& oSelection)
{
    auto* const poVerb =
        oApp.add_subcommand("walk", "Reads every tile with margins, as processing does, and says how fast");
    const auto poOptions = std::make_shared<Options>();
    poVerb->add_option("FILE", oSelection.file, "The file")->required();
    poVerb->add_option("--channels", poOptions->channels, "Only these, such as 1,3 or 1-3");
    poVerb->add_option("--margins", poOptions->margins,
                       "Pixels left and right, above and below, such as 8,4, or 8 for both (0)");
    poVerb->add_option("--tile", poOptions->tile,
                       "Tile size, such as 512,256, or 512 for both (what the format prefers)");
    AddChoice<eMarginBehaviour>(*poVerb, "--behaviour", poOptions->behaviour,
                                "How pixels outside of the image are made (mirror)",
                                {{"exception", eException},
                                 {"replicate", eReplicate},
                                 {"mirror", eMirror},
                                 {"mirror101", eMirror101},
                                 {"constant", eConstant},
                                 {"wrap", eWrap}});
    poVerb->add_flag("--json", poOptions->json, "As JSON");
    poVerb->callback(
        [&oSelection, poOptions]
        {
            oSelection.run = [&oSelection, poOptions]
            {
                return RunWalk(oSelection.file, *poOptions);
            };
        });
}

} // namespace krv::tool
