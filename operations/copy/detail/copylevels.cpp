#include "operations/copy/detail/copylevels.h"

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/ipctdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/overviews/overviewbuilder.h"
#include "datasources/reader/basicreader.h"
#include "datasources/writer/basicoverviewwriteraccessor.h"
#include "datasources/writer/basicwriter.h"
#include "gobs/raster/raster.h"
#include "operations/copy/detail/copypixels.h"
#include "operations/copy/detail/keptform.h"
#include "operations/job/progress.h"
#include "toolkit/exceptions/exceptions.h"

#include <fmt/format.h>

#include <algorithm>
#include <memory>

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

// Reads pixels and drops them: what is damaged throws.
void CheckPixels(IRasterReader& oReader, const PixelWindow& oPart)
{
    krv::gobs::Raster oPixels({oPart.width, oPart.height, oReader.GetChansCount(), oReader.GetDataType()},
                              {static_cast<int>(oPart.x), static_cast<int>(oPart.y)});
    oReader.ReadRaster(&oPixels);
}

// Of one bitmap at a level, pixel for pixel.
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
        for (const unsigned int nChannel : moChannels)
            moTo.SetValid(nChannel, nLevel, true);
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
        oForm.mnWidth = nWidth;
        oForm.mnHeight = nHeight;
        if (!oForm.mbWholeBlocks)
        {
            oForm.mnBlockWidth = nWidth;
            oForm.mnBlockHeight = std::min(oForm.mnBlockHeight, nHeight);
        }
        return poBlocks->SetEncodedForm(nLevel, oForm);
    }

    void CopyValues(unsigned int nLevel) const
    {
        const LevelReader oReader = moSource.Read(moChannels, nLevel);
        BasicOverviewWriterAccessor oAccessor(&moTarget.GetRaster(), moChannels);
        const std::unique_ptr<IRasterWriter> poWriter(oAccessor.CreateRasterWriter(nLevel));
        const PixelWindow oAll{0, 0, oReader.Get().GetWidth(), oReader.Get().GetHeight()};
        std::vector<unsigned int> oPositions(moChannels.size());
        for (unsigned int nAt = 0; nAt < oPositions.size(); ++nAt)
            oPositions[nAt] = nAt;
        ProgressCounter oCounter(
            moTarget.GetProgress(), "overviews",
            krv::gobs::BufferBytes(oAll.width, oAll.height, poWriter->GetChansCount(), poWriter->GetDataType()));
        CopyPixels({{&oReader.Get(), oPositions}}, *poWriter, oAll, oCounter);
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

void BuildLevels(const Target& oTarget, const std::vector<unsigned int>& oLevels, const std::string& method)
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
    BuildOverviews(oWriter, oLevels, method, oOptions);
}

} // namespace

void MoveBlocks(const CopyPlan& oPlan, const Target& oTarget, unsigned int nLevel)
{
    const SourceFile& oSource = oPlan.GetSource(0);
    auto& oFrom = dynamic_cast<IEncodedBlocks&>(oSource.GetDataset());
    IEncodedBlocks& oTo = *oTarget.Find<IEncodedBlocks>();
    const EncodedForm oForm = oFrom.GetEncodedForm(nLevel);
    ProgressCounter oCounter(oTarget.GetProgress(), nLevel == 1 ? "convert" : "overviews",
                             krv::gobs::BufferBytes(oForm.mnWidth, oForm.mnHeight, oForm.mnChannels, oForm.moType));
    std::vector<unsigned char> oBytes;
    const unsigned int nPlanes = oForm.mbSeparate ? oForm.mnChannels : 1;
    const unsigned int nColumns = DivideUp(oForm.mnWidth, oForm.mnBlockWidth);
    const unsigned int nRows = DivideUp(oForm.mnHeight, oForm.mnBlockHeight);
    for (unsigned int nPlane = 0; nPlane < nPlanes; ++nPlane)
    {
        const LevelReader oReader =
            oSource.Read(oForm.mbSeparate ? std::vector<unsigned int>{nPlane + 1} : AllChannels(oPlan), nLevel);
        for (unsigned int nRow = 0; nRow < nRows; ++nRow)
            for (unsigned int nColumn = 0; nColumn < nColumns; ++nColumn)
            {
                const BlockNumber oBlock{nPlane, nColumn, nRow};
                const PixelWindow oPart = GetPart(oForm, oBlock);
                oCounter.Advance(
                    krv::gobs::BufferBytes(oPart.width, oPart.height, oReader.Get().GetChansCount(), oForm.moType));
                if (!oFrom.ReadEncoded(nLevel, oBlock, oBytes))
                    continue;
                if (oForm.moCodec != "NONE")
                    CheckPixels(oReader.Get(), oPart);
                oTo.StoreEncoded(nLevel, oBlock, oBytes.data(), oBytes.size());
            }
    }
}

void CopyLevels(const CopyPlan& oPlan, const Target& oTarget, const BitmapNumbers& oBitmaps, bool bSame, bool bWanted)
{
    const ManagerPointer poFrom(oPlan.GetSource(0).GetRaster().GetOverviewManager());
    std::vector<unsigned int> oLevels = poFrom != nullptr ? poFrom->GetLevels() : std::vector<unsigned int>();
    const ManagerPointer poTo(oTarget.GetRaster().GetOverviewManager());
    const std::string name = oPlan.GetSource(0).GetName();
    if (poTo == nullptr && !oLevels.empty())
        return Target::Warn(name + ": its levels are not kept: the format has none");
    const PixelWindow& oWindow = oPlan.GetWindow();
    std::erase_if(oLevels,
                  [&](unsigned int nLevel) { return nLevel < 2 || nLevel >= std::max(oWindow.width, oWindow.height); });
    if (oLevels.empty())
        return bWanted
                   ? BuildLevels(oTarget, GetDefaultLevels(oWindow.width, oWindow.height), ChooseMethod(oTarget, ""))
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
    oTarget.Try("levels", [&] { BuildLevels(oTarget, oAnew, method); });
}

} // namespace krv::operations::detail
