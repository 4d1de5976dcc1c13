#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/ipctdataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/overviews/overviewbuilder.h"
#include "datasources/reader/irasterreader.h"
#include "datasources/writer/basicwriter.h"
#include "operations/source/sourcefile.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"
#include "tools/krv/errors.h"
#include "tools/krv/jsontext.h"
#include "tools/krv/progress.h"
#include "tools/krv/threads.h"
#include "tools/krv/verbs/verbs.h"

#include <CLI/CLI.hpp>
#include <fmt/format.h>

#include <algorithm>
#include <exception>
#include <memory>
#include <optional>

namespace krv::tool
{

using namespace krv::operations;

namespace
{

using krv::datasources::BasicWriter;
using krv::datasources::IDataset;
using krv::datasources::OverviewOptions;
using krv::datasources::Resampling;

struct Options
{
    std::string levels;
    std::string resampling;
    std::string noData;
    WindowOptions changed;
    OverviewOptions building;
};

// Mixing the indices of a colour table gives colours that mean nothing.
bool IsIndexed(IDataset& oDataset)
{
    const auto* const poTables = dynamic_cast<krv::datasources::IPCTDataset*>(&oDataset);
    return poTables != nullptr && !poTables->GetPCTList().empty();
}

std::string ChooseMethod(const std::string& file, const std::string& wanted, bool bIndexed)
{
    if (wanted.empty())
        return bIndexed ? "mode" : "average";
    const Resampling eMethod = krv::datasources::ParseResampling(wanted);
    if (bIndexed && eMethod != Resampling::eNearest && eMethod != Resampling::eMode)
        throw UsageError(file + ": its pixels are indices of a colour table; use --resampling mode or nearest");
    return wanted;
}

std::vector<unsigned int> ParseLevels(const std::string& text)
{
    auto oLevels = ParseNumbers(text, "--levels");
    std::sort(oLevels.begin(), oLevels.end());
    oLevels.erase(std::unique(oLevels.begin(), oLevels.end()), oLevels.end());
    if (!oLevels.empty() && oLevels.front() < 2)
        throw UsageError("--levels: \"" + text + "\" holds a number below 2; levels are factors from 2, such as 2,4,8");
    return oLevels;
}

void SetChanged(const std::string& file, const WindowOptions& oWindow, OverviewOptions& oOptions)
{
    const WindowRequest oRequest = ParseWindow(oWindow, "--changed");
    std::optional<PixelWindow> oPart = oRequest.pixels;
    if (!oPart && (oRequest.bounds || !oRequest.like.empty()))
        oPart = FindWindow(SourceFile(file), oRequest);
    if (oPart)
        oOptions.moChanged = OverviewOptions::Rectangle{oPart->x, oPart->y, oPart->width, oPart->height};
}

void CheckChanged(const std::string& file, const OverviewOptions& oOptions, unsigned int nWidth, unsigned int nHeight)
{
    if (!oOptions.moChanged)
        return;
    const OverviewOptions::Rectangle& oPart = *oOptions.moChanged;
    if (oPart.mnWidth == 0 || oPart.mnHeight == 0 || oPart.mnX >= nWidth || oPart.mnY >= nHeight)
        throw UsageError(fmt::format("{}: --changed: {} x {} at {}, {} holds no pixel of the image of {} x {}", file,
                                     oPart.mnWidth, oPart.mnHeight, oPart.mnX, oPart.mnY, nWidth, nHeight));
}

bool HasPlaceForLevels(IDataset& oDataset)
{
    auto* const poRaster = dynamic_cast<krv::datasources::IRasterDataset*>(&oDataset);
    return poRaster != nullptr &&
           std::unique_ptr<krv::datasources::IOverviewManager>(poRaster->GetOverviewManager()) != nullptr;
}

// A file that cannot hold levels, or cannot be changed, gets them in a file beside it.
std::unique_ptr<IDataset> OpenForUpdate(const std::string& file, krv::datasources::IRasterDataset& oRead)
{
    auto* const poManager = krv::datasources::DatasetManager::GetInstance();
    std::unique_ptr<IDataset> poDataset;
    std::exception_ptr poRefusal;
    try
    {
        poDataset.reset(poManager->Open(file, eUpdate));
        if (poDataset != nullptr && HasPlaceForLevels(*poDataset))
            return poDataset;
    }
    catch (const krv::DataException&)
    {
        poRefusal = std::current_exception();
    }
    poDataset.reset();
    poDataset.reset(poManager->OpenFormat("GDBALL", file, eUpdate));
    if (poDataset == nullptr && poRefusal)
        std::rethrow_exception(poRefusal);
    if (poDataset == nullptr)
        throw krv::DataException(file + ": levels can be made neither in the file nor beside it");
    const std::unique_ptr<krv::datasources::IOverviewManager> poOwn(oRead.GetOverviewManager());
    if (poOwn != nullptr && !poOwn->GetLevels().empty())
        krv::nspio::Warning::Warn(file + ": it holds levels of its own, which are read in place of those beside it");
    return poDataset;
}

void Build(BasicWriter& oWriter, const std::vector<unsigned int>& oLevels, const std::string& method,
           OverviewOptions oOptions)
{
    const std::uint64_t nPixelBytes = oWriter.GetDataType().GetValueBits() / 8 * oWriter.GetChansCount();
    const Progress oProgress = ShowProgress();
    oOptions.moProgress = [&](std::uint64_t nDone, std::uint64_t nTotal)
    {
        Report(oProgress, {"overviews", nDone * nPixelBytes, nTotal * nPixelBytes});
        return true;
    };
    try
    {
        krv::datasources::BuildOverviews(oWriter, oLevels, method, oOptions);
    }
    catch (const krv::ParameterException& oError)
    {
        throw UsageError("--levels: " + oError.GetMessage());
    }
}

int RunOverviews(const std::string& file, Options& oOptions)
{
    auto oLevels = ParseLevels(oOptions.levels);
    SetChanged(file, oOptions.changed, oOptions.building);
    const SourceFile oFile(file, eReadOnly, GivenOrNone(oOptions.noData));
    oOptions.building.moNoData = krv::datasources::ParseNoData(oOptions.noData);
    const unsigned int nWidth = oFile.GetRaster().GetWidth(), nHeight = oFile.GetRaster().GetHeight();
    const std::vector<ChannelGroup> oGroups = oFile.GroupByType(oFile.CheckChannels({}));
    CheckChanged(file, oOptions.building, nWidth, nHeight);
    const std::string method = ChooseMethod(file, oOptions.resampling, IsIndexed(oFile.GetDataset()));
    if (oLevels.empty())
        oLevels = krv::datasources::GetDefaultLevels(nWidth, nHeight);
    if (oLevels.empty())
    {
        Print(fmt::format("{}: {} x {} pixels need no overviews\n", file, nWidth, nHeight));
        return 0;
    }
    const std::unique_ptr<IDataset> poDataset = OpenForUpdate(file, oFile.GetRaster());
    for (const ChannelGroup& oGroup : oGroups)
    {
        BasicWriter oWriter(dynamic_cast<krv::datasources::IRasterDataset*>(poDataset.get()), oGroup.channels);
        oOptions.building.mpoExecutor = GetExecutor();
        oOptions.building.moMakeReader = [&oFile, &oGroup]
        {
            return oFile.ReadAgain(oGroup.channels, true);
        };
        Build(oWriter, oLevels, method, oOptions.building);
    }
    const StoringProgress oStoring(*poDataset, ShowProgress());
    poDataset->Synchronize();
    for (const unsigned int nLevel : oLevels)
        Print(fmt::format("level {}: {} x {}\n", nLevel, (nWidth - 1) / nLevel + 1, (nHeight - 1) / nLevel + 1));
    return 0;
}

} // namespace

void AddOverviewsVerb(CLI::App& oApp, Selection& oSelection)
{
    auto* const poVerb = oApp.add_subcommand("overviews", "Builds the overview levels of a file in one pass over it");
    const auto poOptions = std::make_shared<Options>();
    poVerb->add_option("FILE", oSelection.file, "The file; it is changed in place")->required();
    poVerb->add_option("--levels", poOptions->levels,
                       "Reduction factors, such as 2,4,8,16 (powers of two, until a level is below 256 pixels)");
    AddWord(*poVerb, "--resampling", poOptions->resampling,
            "How pixels are made; average by default, mode for indices of a colour table",
            {"average", "nearest", "mode", "bilinear", "cubic", "lanczos", "rms", "min", "max"});
    poVerb->add_option("--no-data", poOptions->noData, "The no-data value, in place of the recorded one");
    AddWindowOptions(*poVerb, poOptions->changed, "--changed",
                     "Only this part of the image changed since its levels were built");
    poVerb->add_flag("--half-valid", poOptions->building.mbHalfValid,
                     "A pixel counts as valid when half of its source pixels are, instead of one");
    poVerb->add_flag("--nan-is-nodata", poOptions->building.mbNaNIsNoData, "Values that are no numbers are not valid");
    poVerb->add_flag("--power", poOptions->building.mbPower, "Average the power of complex values, not their parts");
    poVerb->footer("No-data values, masks and alpha are respected. Stopped or failed, the file keeps what it had.\n"
                   "Example:\n"
                   "  krv overviews scene.tif --levels 2,4,8 --resampling cubic");
    poVerb->callback(
        [&oSelection, poOptions]
        {
            oSelection.run = [&oSelection, poOptions]
            {
                return RunOverviews(oSelection.file, *poOptions);
            };
        });
}

} // namespace krv::tool
