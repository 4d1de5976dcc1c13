#include "operations/copy/detail/copylevels.h"

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/iblocktransfer.h"
#include "datasources/interfaces/ifileformat.h"
#include "datasources/interfaces/ilevelstates.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/ipctdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/iomanager/formatcapabilities.h"
#include "datasources/overviews/overviewbuilder.h"
#include "datasources/reader/basicreader.h"
#include "datasources/writer/basicoverviewwriteraccessor.h"
#include "datasources/writer/basicwriter.h"
#include "gobs/raster/raster.h"
#include "operations/copy/detail/copypixels.h"
#include "operations/copy/detail/keptform.h"
#include "operations/job/progress.h"
#include "operations/source/fileworkers.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/threading/foreachitem.h"

#include <fmt/format.h>

#include <algorithm>
#include <map>
#include <memory>
#include <numeric>

namespace krv::operations::detail
{

using namespace krv::datasources;

namespace
{

using ManagerPointer = std::unique_ptr<IOverviewManager>;

unsigned int DivideUp(unsigned int nSize, unsigned int nPart)
{
    return (nSize + nPart - 1) / nPart;
}

std::vector<unsigned int> AllChannels(const CopyPlan& oPlan)
{
    std::vector<unsigned int> oChannels;
    for (unsigned int nChannel = 1; nChannel <= oPlan.GetChannels().size(); ++nChannel)
        oChannels.push_back(nChannel);
    return oChannels;
}

PixelWindow GetPart(const EncodedForm& oForm, const BlockNumber& oBlock)
{
    const unsigned int nX = oBlock.mnColumn * oForm.mnBlockWidth, nY = oBlock.mnRow * oForm.mnBlockHeight;
    return {nX, nY, std::min(oForm.mnBlockWidth, oForm.mnWidth - nX),
            std::min(oForm.mnBlockHeight, oForm.mnHeight - nY)};
}

// The blocks of an image in their order, in runs that are worth a task.
class BlockGrid
{
public:
    // oForm: borrowed.
    explicit BlockGrid(const EncodedForm& oForm)
        : moForm(oForm), mnColumns(DivideUp(oForm.mnWidth, oForm.mnBlockWidth)),
          mnRows(DivideUp(oForm.mnHeight, oForm.mnBlockHeight)),
          mnBlocks(std::uint64_t{oForm.mbSeparate ? oForm.mnChannels : 1} * mnColumns * mnRows)
    {
        const std::uint64_t nBytes = std::uint64_t{oForm.mnBlockWidth} * oForm.mnBlockHeight;
        mnRun = std::clamp<std::uint64_t>(RUN_PIXELS / std::max<std::uint64_t>(nBytes, 1), 1, MOST_RUN);
    }

    std::uint64_t CountRuns() const { return (mnBlocks + mnRun - 1) / mnRun; }

    std::vector<BlockNumber> GetRun(std::uint64_t nRun) const
    {
        std::vector<BlockNumber> oBlocks;
        for (std::uint64_t n = nRun * mnRun; n < std::min(mnBlocks, (nRun + 1) * mnRun); ++n)
            oBlocks.push_back({static_cast<unsigned int>(n / mnColumns / mnRows),
                               static_cast<unsigned int>(n % mnColumns),
                               static_cast<unsigned int>(n / mnColumns % mnRows)});
        return oBlocks;
    }

    // The bytes of the pixels in a block.
    std::uint64_t GetPixelBytes(const BlockNumber& oBlock) const
    {
        const PixelWindow oPart = GetPart(moForm, oBlock);
        return krv::gobs::BufferBytes(oPart.width, oPart.height, moForm.mbSeparate ? 1 : moForm.mnChannels,
                                      moForm.moType);
    }

private:
    static constexpr std::uint64_t RUN_PIXELS = std::uint64_t{1} << 20;
    static constexpr std::uint64_t MOST_RUN = 64;

    const EncodedForm& moForm;
    std::uint64_t mnColumns;
    std::uint64_t mnRows;
    std::uint64_t mnBlocks;
    std::uint64_t mnRun;
};

// A block on its way from file to file.
struct MovedBlock
{
    BlockNumber number;
    bool stored = false;
    std::vector<unsigned char> bytes = {};
};

// What a thread fetches blocks with.
class BlockReader
{
public:
    BlockReader(FilePointer poFile, const EncodedForm& oForm, unsigned int nLevel, bool bCheck)
        : mpoFile(std::move(poFile)), moForm(oForm), mnLevel(nLevel),
          moBlocks(dynamic_cast<IEncodedBlocks&>(mpoFile->GetDataset()))
    {
        std::vector<unsigned int> oAll(oForm.mnChannels);
        std::iota(oAll.begin(), oAll.end(), 1U);
        if (bCheck && !oForm.mbSeparate)
            moPlanes.push_back(mpoFile->Read(oAll, nLevel));
        for (const unsigned int nChannel : bCheck&& oForm.mbSeparate ? oAll : std::vector<unsigned int>())
            moPlanes.push_back(mpoFile->Read({nChannel}, nLevel));
    }

    MovedBlock Read(const BlockNumber& oBlock)
    {
        MovedBlock oMoved{oBlock};
        oMoved.stored = moBlocks.ReadEncoded(mnLevel, oBlock, oMoved.bytes);
        if (oMoved.stored && !moPlanes.empty())
            CheckPixels(moPlanes[oBlock.mnPlane].Get(), GetPart(moForm, oBlock));
        return oMoved;
    }

private:
    // Reads pixels and drops them: what is damaged throws.
    static void CheckPixels(IRasterReader& oReader, const PixelWindow& oPart)
    {
        krv::gobs::Raster oPixels({oPart.width, oPart.height, oReader.GetChansCount(), oReader.GetDataType()},
                                  {static_cast<int>(oPart.x), static_cast<int>(oPart.y)});
        oReader.ReadRaster(&oPixels);
    }

    FilePointer mpoFile;
    const EncodedForm& moForm;
    unsigned int mnLevel;
    IEncodedBlocks& moBlocks;
    std::vector<LevelReader> moPlanes; // that are decoded, too; none when nothing is
};

// One bitmap at a level is copied pixel for pixel.
void CopyMaskLevel(IRasterIO& oFrom, IRasterIO& oTo)
{
    const unsigned int nWidth = oFrom.GetFileWidth(), nHeight = oFrom.GetFileHeight();
    const unsigned int nRows = std::max(oTo.GetTileHeight(), 1U);
    std::vector<unsigned char> oRows(std::size_t{nWidth} * std::min(nRows, nHeight));
    for (unsigned int nY = 0; nY < nHeight; nY += std::min(nRows, nHeight - nY))
    {
        const unsigned int nCount = std::min(nRows, nHeight - nY);
        oFrom.ReadWindow(0U, nY, nWidth, nCount, oRows.data());
        oTo.WriteWindow(0U, nY, nWidth, nCount, oRows.data());
    }
}

class LevelCopy
{
public:
    LevelCopy(const CopyPlan& oPlan, const Target& oTarget, IOverviewManager& oTo)
        : moPlan(oPlan), moTarget(oTarget), moSource(oPlan.GetSource(0)), moTo(oTo), moChannels(AllChannels(oPlan))
    {
    }

    // False for a level that is out of date or of a size that the target does not give it.
    bool Copy(IOverviewManager& oFrom, unsigned int nLevel)
    {
        const bool bValid = std::all_of(moChannels.begin(), moChannels.end(),
                                        [&](unsigned int nChannel) { return oFrom.IsValid(nChannel, nLevel); });
        if (!bValid)
            return false;
        moTo.CreateLevel(nLevel);
        const bool bBlocks = TakesBlocks(nLevel);
        if (!bBlocks && !TakesSize(oFrom, nLevel))
        {
            moTo.DeleteLevel(nLevel);
            return false;
        }
        if (bBlocks)
            MoveBlocks(moPlan, moTarget, nLevel);
        else
            CopyValues(nLevel);
        const std::string method = oFrom.GetResamplingName();
        if (!method.empty())
            moTarget.Try(fmt::format("the method {} of level {}", method, nLevel),
                         [&] { moTo.SetResamplingName(method); });
        SetChannelsValid(moTo, moChannels, nLevel, true);
        return true;
    }

private:
    bool TakesBlocks(unsigned int nLevel) const
    {
        const auto oForm = FindForm(moSource, nLevel);
        return moTarget.TakesBlocks() && oForm && oForm->mbReadable &&
               moTarget.Find<IEncodedBlocks>()->SetEncodedForm(nLevel, *oForm);
    }

    // Formats and programs differ in how they round the sides of a level.
    bool TakesSize(const IOverviewManager& oFrom, unsigned int nLevel) const
    {
        const unsigned int nWidth = oFrom.GetLevelWidth(nLevel), nHeight = oFrom.GetLevelHeight(nLevel);
        if (moTo.GetLevelWidth(nLevel) == nWidth && moTo.GetLevelHeight(nLevel) == nHeight)
            return true;
        auto* const poBlocks = moTarget.Find<IEncodedBlocks>();
        if (poBlocks == nullptr)
            return false;
        EncodedForm oForm = poBlocks->GetEncodedForm(nLevel);
        const auto Cut = [](unsigned int nBlock, unsigned int nOld, unsigned int nNew)
        {
            return nBlock == nOld ? nNew : std::min(nBlock, nNew);
        };
        const auto Set = [&](bool bWhole)
        {
            EncodedForm oNew = oForm;
            oNew.mbWholeBlocks = bWhole;
            oNew.mnWidth = nWidth;
            oNew.mnHeight = nHeight;
            if (!bWhole)
            {
                oNew.mnBlockWidth = Cut(oForm.mnBlockWidth, oForm.mnWidth, nWidth);
                oNew.mnBlockHeight = Cut(oForm.mnBlockHeight, oForm.mnHeight, nHeight);
            }
            return poBlocks->SetEncodedForm(nLevel, oNew);
        };
        // Some formats have whole blocks in one size of a level, and blocks that end with it in another.
        return Set(oForm.mbWholeBlocks) || (oForm.mbWholeBlocks && Set(false));
    }

    // The channels of each type by themselves.
    void CopyValues(unsigned int nLevel) const
    {
        std::map<krv::gobs::DataType, std::vector<unsigned int>> oByType;
        for (std::size_t n = 0; n < moChannels.size(); ++n)
            oByType[moPlan.GetTypes()[n]].push_back(moChannels[n]);
        for (const auto& oEntry : oByType)
            CopyValues(nLevel, oEntry.second);
    }

    void CopyValues(unsigned int nLevel, const std::vector<unsigned int>& oChannels) const
    {
        BasicOverviewWriterAccessor oAccessor(&moTarget.GetRaster(), oChannels);
        const std::unique_ptr<IRasterWriter> poWriter(oAccessor.CreateRasterWriter(nLevel));
        const PixelWindow oAll{0, 0, poWriter->GetWidth(), poWriter->GetHeight()};
        std::vector<unsigned int> oPositions(oChannels.size());
        for (unsigned int nAt = 0; nAt < oPositions.size(); ++nAt)
            oPositions[nAt] = nAt;
        ProgressCounter oCounter(
            moTarget.GetProgress(), "overviews",
            krv::gobs::BufferBytes(oAll.width, oAll.height, poWriter->GetChansCount(), poWriter->GetDataType()));
        const auto Open = [oChannels, nLevel](const SourceFile& oFile)
        {
            return oFile.Read(oChannels, nLevel);
        };
        CopyPixels({{&moSource, Open, oPositions}}, {*poWriter, nLevel}, oAll, oCounter, moTarget.GetExecutor());
    }

    const CopyPlan& moPlan;
    const Target& moTarget;
    const SourceFile& moSource;
    IOverviewManager& moTo;
    std::vector<unsigned int> moChannels;
};

void CopyMaskLevels(const CopyPlan& oPlan, const Target& oTarget, const BitmapNumbers& oBitmaps, unsigned int nLevel)
{
    auto* const poFrom = dynamic_cast<IBitmapDataset*>(&oPlan.GetSource(0).GetDataset());
    auto* const poTo = oTarget.Find<IBitmapDataset>();
    if (poFrom == nullptr || poTo == nullptr)
        return;
    const ManagerPointer poFromLevels(poFrom->GetBitmapOverviewManager());
    const ManagerPointer poToLevels(poTo->GetBitmapOverviewManager());
    if (poFromLevels == nullptr || poToLevels == nullptr)
        return;
    for (const auto& [nFrom, nTo] : oBitmaps)
    {
        if (!poFromLevels->IsValid(nFrom, nLevel))
            continue;
        const unsigned int nCopy = nTo; // a structured binding does not go into a closure
        const auto oThere = poToLevels->GetLevels();
        if (std::find(oThere.begin(), oThere.end(), nLevel) == oThere.end())
            poToLevels->CreateLevel(nLevel);
        const std::unique_ptr<IRasterIO> poRead(poFromLevels->GetOverviewIO(nLevel, {nFrom}));
        oTarget.Try(fmt::format("level {} of bitmap {}", nLevel, nFrom),
                    [&]
                    {
                        const std::unique_ptr<IRasterIO> poWrite(poToLevels->GetOverviewIO(nLevel, {nCopy}));
                        if (poWrite->GetFileWidth() != poRead->GetFileWidth() ||
                            poWrite->GetFileHeight() != poRead->GetFileHeight())
                            throw krv::DataException("the copy's is of another size");
                        CopyMaskLevel(*poRead, *poWrite);
                        poToLevels->SetValid(nCopy, nLevel, true);
                    });
    }
}

// Mixing the indices of a colour table gives colours that mean nothing.
std::string ChooseMethod(const Target& oTarget, const std::string& own)
{
    const auto* const poTables = oTarget.Find<IPCTDataset>();
    const bool bIndexed = poTables != nullptr && !poTables->GetPCTList().empty();
    if (!own.empty() && own != "NONE")
        return own;
    return bIndexed ? "mode" : "average";
}

// The source's pixels are read in place of the target's where they are the same: others than its own thread can open
// it.
void BuildLevels(const CopyPlan& oPlan, const Target& oTarget, const std::vector<unsigned int>& oLevels,
                 const std::string& method)
{
    if (oLevels.empty())
        return;
    BasicWriter oWriter(&oTarget.GetRaster(), {});
    const std::uint64_t nPixelBytes = krv::gobs::BufferBytes(1, 1, oWriter.GetChansCount(), oWriter.GetDataType());
    OverviewOptions oOptions;
    oOptions.moProgress = [&](std::uint64_t nDone, std::uint64_t nTotal)
    {
        Report(oTarget.GetProgress(), {"overviews", nDone * nPixelBytes, nTotal * nPixelBytes});
        return true;
    };
    oOptions.mpoExecutor = oTarget.GetExecutor();
    if (oPlan.IsWholeFile() && !oPlan.IsCut() && oPlan.AreTypesKept() && (oTarget.TakesBlocks() || !oTarget.IsLossy()))
        oOptions.moMakeReader = [&oPlan]
        {
            return oPlan.GetSource(0).ReadAgain(AllChannels(oPlan));
        };
    BuildOverviews(oWriter, oLevels, method, oOptions);
}

// From file to file, when the target knows the source's kind.
bool TakeRuns(const SourceFile& oSource, const Target& oTarget, unsigned int nLevel, const BlockGrid& oGrid,
              ProgressCounter& oCounter)
{
    auto* const poTransfer = oTarget.Find<IBlockTransfer>();
    for (std::uint64_t nRun = 0; poTransfer != nullptr && nRun < oGrid.CountRuns(); ++nRun)
    {
        const std::vector<BlockNumber> oBlocks = oGrid.GetRun(nRun);
        if (!poTransfer->TakeBlocks(nLevel, oSource.GetDataset(), oBlocks))
            return false;
        for (const BlockNumber& oBlock : oBlocks)
            oCounter.Advance(oGrid.GetPixelBytes(oBlock));
    }
    return poTransfer != nullptr;
}

} // namespace

void MoveBlocks(const CopyPlan& oPlan, const Target& oTarget, unsigned int nLevel)
{
    const SourceFile& oSource = oPlan.GetSource(0);
    IEncodedBlocks& oTo = *oTarget.Find<IEncodedBlocks>();
    const EncodedForm oForm = dynamic_cast<IEncodedBlocks&>(oSource.GetDataset()).GetEncodedForm(nLevel);
    const BlockGrid oGrid(oForm);
    ProgressCounter oCounter(oTarget.GetProgress(), nLevel == 1 ? "convert" : "overviews",
                             krv::gobs::BufferBytes(oForm.mnWidth, oForm.mnHeight, oForm.mnChannels, oForm.moType));
    const bool bCheck = oTarget.IsChecked() && oForm.moCodec != "NONE";
    if (!bCheck && TakeRuns(oSource, oTarget, nLevel, oGrid, oCounter))
        return;
    FileWorkers<BlockReader> oWorkers(
        oSource,
        [&](FilePointer poFile) { return std::make_unique<BlockReader>(std::move(poFile), oForm, nLevel, bCheck); });
    krv::threading::TaskGroup oThreads(oTarget.GetExecutor(), [&oCounter] { oCounter.Repeat(); });
    krv::threading::ForEachItem(
        oThreads, oGrid.CountRuns(),
        [&](std::uint64_t nRun)
        {
            const FileWorkers<BlockReader>::Use oReader(oWorkers);
            std::vector<MovedBlock> oBlocks;
            for (const BlockNumber& oBlock : oGrid.GetRun(nRun))
                oBlocks.push_back(oReader->Read(oBlock));
            return oBlocks;
        },
        [&](const std::vector<MovedBlock>& oBlocks)
        {
            for (const MovedBlock& oBlock : oBlocks)
            {
                if (oBlock.stored)
                    oTo.StoreEncoded(nLevel, oBlock.number, oBlock.bytes.data(), oBlock.bytes.size());
                oCounter.Advance(oGrid.GetPixelBytes(oBlock.number));
            }
        });
}

void CopyLevels(const CopyPlan& oPlan, const Target& oTarget, const BitmapNumbers& oBitmaps, bool bSame, bool bWanted)
{
    const ManagerPointer poFrom(oPlan.GetSource(0).GetRaster().GetOverviewManager());
    std::vector<unsigned int> oLevels = poFrom != nullptr ? poFrom->GetLevels() : std::vector<unsigned int>();
    const ManagerPointer poTo(oTarget.GetRaster().GetOverviewManager());
    const std::string name = oPlan.GetSource(0).GetName();
    if (poTo == nullptr && !oLevels.empty())
    {
        const std::string format = oTarget.Get().GetFileFormat()->GetShortName();
        if (!DatasetManager::GetInstance()->GetCapabilities(format).IsSupported(CAPABILITY_MAKES_LEVELS))
            Target::Warn(name + ": its levels are not kept: the format has none");
        return;
    }
    const PixelWindow& oWindow = oPlan.GetWindow();
    std::erase_if(oLevels,
                  [&](unsigned int nLevel) { return nLevel < 2 || nLevel >= std::max(oWindow.width, oWindow.height); });
    if (oLevels.empty())
        return bWanted ? BuildLevels(oPlan, oTarget, GetDefaultLevels(oWindow.width, oWindow.height),
                                     ChooseMethod(oTarget, ""))
                       : void();
    std::vector<unsigned int> oAnew;
    LevelCopy oCopy(oPlan, oTarget, *poTo);
    for (const unsigned int nLevel : oLevels)
    {
        if (bSame && oCopy.Copy(*poFrom, nLevel))
            CopyMaskLevels(oPlan, oTarget, oBitmaps, nLevel);
        else
            oAnew.push_back(nLevel);
    }
    if (oAnew.empty())
        return;
    const std::string own = poFrom->GetResamplingName();
    const std::string method = ChooseMethod(oTarget, own);
    if (own != method)
        Target::Warn(fmt::format("{}: levels {} are made anew by {}: the file does not say how they were made", name,
                                 fmt::join(oAnew, ", "), method));
    oTarget.Try("levels", [&] { BuildLevels(oPlan, oTarget, oAnew, method); });
}

} // namespace krv::operations::detail
