#include "datasources/overviews/overviewbuilder.h"

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/overviews/detail/samplevalidity.h"
#include "datasources/reader/idatasetaccess.h"
#include "datasources/writer/ioverviewwriteraccessor.h"
#include "datasources/writer/irasterwriter.h"
#include "datasources/writer/multitypewriter.h"
#include "datasources/writer/splitwriter.h"
#include "gobs/resampling/levelreducer.h"
#include "gobs/resampling/leveltarget.h"
#include "gobs/resampling/nodatasamples.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/threading/foreachitem.h"
#include "toolkit/threading/statestore.h"

#include <algorithm>
#include <atomic>
#include <bit>
#include <map>
#include <numeric>
#include <thread>
#include <utility>

namespace krv::datasources
{

namespace
{

using krv::gobs::ILevelReducer;
using krv::gobs::IValueFinisher;
using krv::gobs::LevelTarget;
using krv::gobs::LevelTask;
using krv::gobs::PixelBounds;
using krv::gobs::Raster;
using krv::gobs::ReductionRule;
using krv::gobs::SourceForm;
using krv::gobs::TileGatherer;

constexpr unsigned int MOST_FACTOR = 65536;
constexpr unsigned int DEFAULT_SIZE = 256;
// Windows of the image: no wider than this when they need not be, and no larger than so many bytes.
constexpr std::uint64_t WINDOW_WIDTH = 4096;
constexpr std::uint64_t WINDOW_BYTES = std::uint64_t{16} << 20;
// Rows of windows that are reduced between looks at whether to stop: about so many bytes, and a multiple of the rows
// that a cascade takes at once.
constexpr std::size_t STRIP_BYTES = std::size_t{1} << 20;
constexpr unsigned int STRIP_ROWS = 32;
// The bytes of windows that were read and wait.
constexpr std::uint64_t MOST_AHEAD_BYTES = std::uint64_t{256} << 20;

unsigned int LevelSize(unsigned int nSize, unsigned int nFactor)
{
    return (nSize - 1) / nFactor + 1;
}

// One level on its way. The writer goes last: the targets store into it.
struct Level
{
    unsigned int mnFactor = 0;
    bool mbWhole = true;
    PixelBounds moBounds;
    std::unique_ptr<IRasterWriter> mpoWriter;
    std::unique_ptr<SplitWriter> mpoSplit;
    std::unique_ptr<IRasterIO> mpoMaskIO;
    std::unique_ptr<LevelTarget> mpoTarget;
    std::vector<std::function<void()>> moStores; // of tiles that the window made whole
};

// A window of the image, when it was read.
using WindowPointer = std::unique_ptr<Raster>;

// The caller's progress function said to stop.
struct Stopped
{
};

class OverviewBuilder
{
public:
    OverviewBuilder(IRasterWriter& oWriter, Resampling eMethod, const OverviewOptions& oOptions, const Place& oPlace);

    void Prepare(const std::vector<unsigned int>& oFactors);
    bool Run();
    void Finish();

private:
    void FindMask(unsigned int nMask);
    bool PrepareMask(unsigned int nFactor);
    PixelBounds GetChanged(unsigned int nFactor) const;
    void Remove(unsigned int nFactor) const;
    std::unique_ptr<LevelTarget> MakeTarget(Level& oLevel);
    void MakeReducers();
    void AddBounds(const PixelBounds& oPart);
    void StoreTile(SplitWriter& oSplit, const std::shared_ptr<const Raster>& poTile);
    void Line(std::function<void()> oWork, std::function<void()> oTake);
    std::vector<PixelBounds> ListWindows() const;
    static WindowPointer Read(IRasterReader& oReader, const SourceForm& oForm, const PixelBounds& oBounds);
    void Reduce(const krv::gobs::SourceWindow& oWindow);
    void AddStrips(ILevelReducer& oReducer, const krv::gobs::SourceWindow& oWindow) const;
    void Take(const WindowPointer& poWindow, const PixelBounds& oBounds);
    void TakeAll(const std::vector<PixelBounds>& oWindows);
    void Ask() const;

    IRasterWriter& moWriter;
    Resampling meMethod;
    const OverviewOptions& moOptions;
    Place moPlace;
    IDataset* mpoDataset = nullptr; // borrowed; null when the writer does not show one
    detail::SampleValidity moValidity;
    SourceForm moForm;
    std::unique_ptr<IValueFinisher> mpoFinisher;
    std::unique_ptr<IOverviewWriterAccessor> mpoAccessor;
    unsigned int mnMask = 0; // the bitmap that gets levels, or 0
    std::unique_ptr<IOverviewManager> mpoMaskManager;
    std::vector<Level> moLevels;
    std::vector<std::unique_ptr<ILevelReducer>> moReducers;
    krv::threading::TaskGroup moThreads;
    krv::threading::TaskLine moEncoding; // of tiles of levels, which go in their order to the file
    PixelBounds moBounds;                // of the pixels that are needed
    unsigned int mnWindowWidth = 0;
    std::uint64_t mnDone = 0;
    std::uint64_t mnTotal = 0;
    std::thread::id mnOwner = std::this_thread::get_id();
    mutable std::atomic<bool> mbStopped = false;
};

OverviewBuilder::OverviewBuilder(IRasterWriter& oWriter, Resampling eMethod, const OverviewOptions& oOptions,
                                 const Place& oPlace)
    : moWriter(oWriter), meMethod(eMethod), moOptions(oOptions), moPlace(oPlace),
      moValidity(oWriter, oOptions), moForm{oWriter.GetWidth(), oWriter.GetHeight(), oWriter.GetChansCount(),
                                            oWriter.GetDataType(), moValidity.IsNeeded()},
      mpoFinisher(moForm.mbValidity
                      ? krv::gobs::MakeValueFinisher(moForm.moType, moValidity.GetNoData(), oOptions.mbNaNIsNoData)
                      : nullptr),
      mpoAccessor(oWriter.GetOverviewWriterAccessor()), moThreads(oOptions.mpoExecutor, [this] { Ask(); }),
      moEncoding(moThreads)
{
    if (const auto* const poAccess = dynamic_cast<const IDatasetAccess*>(&oWriter))
        mpoDataset = poAccess->GetDataset();
    const auto* const poRaster = dynamic_cast<const IRasterDataset*>(mpoDataset);
    if (poRaster != nullptr && (poRaster->GetWidth() != moForm.mnWidth || poRaster->GetHeight() != moForm.mnHeight))
        throw krv::DataException("Overviews: the dataset and its raster I/O are of different sizes", oPlace);
    if (moValidity.GetBitmap() != 0)
        FindMask(moValidity.GetBitmap());
}

void OverviewBuilder::FindMask(unsigned int nMask)
{
    mpoMaskManager.reset(dynamic_cast<IBitmapDataset&>(*mpoDataset).GetBitmapOverviewManager());
    mnMask = mpoMaskManager != nullptr ? nMask : 0;
}

// Whether the level of the mask was there and can be kept.
bool OverviewBuilder::PrepareMask(unsigned int nFactor)
{
    const std::vector<unsigned int> oExisting = mpoMaskManager->GetLevels();
    bool bThere = std::find(oExisting.begin(), oExisting.end(), nFactor) != oExisting.end();
    if (bThere)
        mpoMaskManager->SetValid(mnMask, nFactor, false);
    if (bThere && (mpoMaskManager->GetLevelWidth(nFactor) != LevelSize(moForm.mnWidth, nFactor) ||
                   mpoMaskManager->GetLevelHeight(nFactor) != LevelSize(moForm.mnHeight, nFactor)))
    {
        mpoMaskManager->DeleteLevel(nFactor);
        bThere = false;
    }
    if (!bThere)
        mpoMaskManager->CreateLevel(nFactor);
    return bThere;
}

void OverviewBuilder::Remove(unsigned int nFactor) const
{
    auto* const poRaster = dynamic_cast<IRasterDataset*>(mpoDataset);
    const std::unique_ptr<IOverviewManager> oManager(poRaster != nullptr ? poRaster->GetOverviewManager() : nullptr);
    if (oManager == nullptr)
        throw krv::DataException("Level " + std::to_string(nFactor) + " exists in another size", moPlace);
    oManager->DeleteLevel(nFactor);
}

// Levels exist and are marked as not valid after this; nothing is written yet.
void OverviewBuilder::Prepare(const std::vector<unsigned int>& oFactors)
{
    const std::vector<unsigned int> oExisting = mpoAccessor->GetLevels();
    // Averages made from power are what RMS gives of complex values, and are recorded as such.
    const bool bPower = meMethod == Resampling::eAverage && moForm.moType.IsComplex() && moOptions.mbPower;
    mpoAccessor->SetResamplingName(GetResamplingName(bPower ? Resampling::eRms : meMethod));
    for (const unsigned int nFactor : oFactors)
    {
        Level& oLevel = moLevels.emplace_back();
        oLevel.mnFactor = nFactor;
        const unsigned int nWidth = LevelSize(moForm.mnWidth, nFactor);
        const unsigned int nHeight = LevelSize(moForm.mnHeight, nFactor);
        oLevel.mbWhole = std::find(oExisting.begin(), oExisting.end(), nFactor) == oExisting.end();
        if (!oLevel.mbWhole)
        {
            // This comes before all else: what lies in another file becomes this one's then.
            mpoAccessor->SetLevelValid(nFactor, false);
            oLevel.mpoWriter.reset(mpoAccessor->CreateRasterWriter(nFactor));
            if (oLevel.mpoWriter->GetWidth() != nWidth || oLevel.mpoWriter->GetHeight() != nHeight)
            {
                oLevel.mpoWriter.reset();
                Remove(nFactor);
                oLevel.mbWhole = true;
            }
        }
        if (oLevel.mbWhole)
            mpoAccessor->CreateLevel(nFactor);
        if (mnMask != 0 && !PrepareMask(nFactor))
            oLevel.mbWhole = true;
        oLevel.moBounds = oLevel.mbWhole ? PixelBounds{0, 0, nWidth, nHeight} : GetChanged(nFactor);
    }
    for (Level& oLevel : moLevels)
    {
        if (oLevel.mpoWriter == nullptr)
            oLevel.mpoWriter.reset(mpoAccessor->CreateRasterWriter(oLevel.mnFactor));
        oLevel.mpoTarget = MakeTarget(oLevel);
    }
    MakeReducers();
}

PixelBounds OverviewBuilder::GetChanged(unsigned int nFactor) const
{
    const unsigned int nWidth = LevelSize(moForm.mnWidth, nFactor);
    const unsigned int nHeight = LevelSize(moForm.mnHeight, nFactor);
    if (!moOptions.moChanged)
        return {0, 0, nWidth, nHeight};
    const OverviewOptions::Rectangle& oPart = *moOptions.moChanged;
    if (oPart.mnX >= moForm.mnWidth || oPart.mnY >= moForm.mnHeight || oPart.mnWidth == 0 || oPart.mnHeight == 0)
        return {};
    const unsigned int nRadius = krv::gobs::GetKernelRadius(meMethod);
    const auto First = [=](unsigned int nAt)
    {
        return nAt / nFactor - std::min(nAt / nFactor, nRadius);
    };
    const auto End = [=](unsigned int nAt, unsigned int nLength, unsigned int nSize, unsigned int nLevelSize)
    {
        const std::uint64_t nEnd = std::min<std::uint64_t>(std::uint64_t{nAt} + nLength, nSize);
        return static_cast<unsigned int>(std::min<std::uint64_t>((nEnd + nFactor - 1) / nFactor + nRadius, nLevelSize));
    };
    return {First(oPart.mnX), First(oPart.mnY), End(oPart.mnX, oPart.mnWidth, moForm.mnWidth, nWidth),
            End(oPart.mnY, oPart.mnHeight, moForm.mnHeight, nHeight)};
}

std::unique_ptr<LevelTarget> OverviewBuilder::MakeTarget(Level& oLevel)
{
    IRasterWriter& oWriter = *oLevel.mpoWriter;
    oLevel.mpoSplit = std::make_unique<SplitWriter>(oWriter, oLevel.mnFactor, moThreads.GetThreadCount());
    SplitWriter& oSplit = *oLevel.mpoSplit;
    auto oTarget = std::make_unique<LevelTarget>(
        TileGatherer(oLevel.moBounds, oWriter.GetTileWidth(), oWriter.GetTileHeight(), moForm.mnChannels, moForm.moType,
                     [this, &oLevel, &oSplit](const std::shared_ptr<const Raster>& poTile)
                     { oLevel.moStores.push_back([this, &oSplit, poTile] { StoreTile(oSplit, poTile); }); }),
        moForm, mpoFinisher.get());
    if (mnMask == 0)
        return oTarget;
    oLevel.mpoMaskIO.reset(mpoMaskManager->GetOverviewIO(oLevel.mnFactor, {mnMask}));
    IRasterIO& oIO = *oLevel.mpoMaskIO;
    // In their turn among the tiles of pixels.
    const auto Store = [this, &oLevel, &oIO](const std::shared_ptr<Raster>& poTile)
    {
        const auto Write = [&oIO, poTile]
        {
            oIO.WriteWindow(static_cast<unsigned int>(poTile->GetX()), static_cast<unsigned int>(poTile->GetY()),
                            poTile->GetWidth(), poTile->GetHeight(), poTile->GetBuffer());
        };
        oLevel.moStores.push_back([this, Write] { Line([] {}, Write); });
    };
    oTarget->SetMask(std::make_unique<TileGatherer>(oLevel.moBounds, oIO.GetTileWidth(), oIO.GetTileHeight(), 1,
                                                    krv::gobs::eDT_8U, Store));
    return oTarget;
}

void OverviewBuilder::AddBounds(const PixelBounds& oPart)
{
    if (moBounds.IsEmpty())
        moBounds = oPart;
    moBounds = {std::min(moBounds.mnLeft, oPart.mnLeft), std::min(moBounds.mnTop, oPart.mnTop),
                std::max(moBounds.mnRight, oPart.mnRight), std::max(moBounds.mnBottom, oPart.mnBottom)};
}

// A cascade takes windows that begin at multiples of its largest factor, everything else whole rows.
void OverviewBuilder::MakeReducers()
{
    const ReductionRule oRule{meMethod, moOptions.mbHalfValid, moOptions.mbPower};
    std::vector<LevelTask> oCascade;
    unsigned int nUnit = 1;
    for (const Level& oLevel : moLevels)
    {
        const LevelTask oTask{oLevel.mnFactor, oLevel.moBounds, oLevel.mpoTarget.get()};
        if (oTask.moBounds.IsEmpty())
            continue;
        AddBounds(krv::gobs::GetSourceBounds(moForm, oTask, meMethod));
        if (krv::gobs::IsInCascade(moForm, oRule, oTask.mnFactor))
        {
            oCascade.push_back(oTask);
            nUnit = std::max(nUnit, oTask.mnFactor);
        }
        else
            moReducers.push_back(krv::gobs::MakeLevelReducer(moForm, oTask, oRule));
    }
    const auto RoundUp = [nUnit](unsigned int nAt, unsigned int nSize)
    {
        return static_cast<unsigned int>(
            std::min<std::uint64_t>((std::uint64_t{nAt} + nUnit - 1) / nUnit * nUnit, nSize));
    };
    moBounds = {moBounds.mnLeft / nUnit * nUnit, moBounds.mnTop / nUnit * nUnit,
                RoundUp(moBounds.mnRight, moForm.mnWidth), RoundUp(moBounds.mnBottom, moForm.mnHeight)};
    mnTotal = std::uint64_t{moBounds.GetWidth()} * moBounds.GetHeight();
    mnWindowWidth = moBounds.GetWidth();
    const std::uint64_t nAligned = std::lcm<std::uint64_t>(std::max(moWriter.GetTileWidth(), 1U), nUnit);
    if (moReducers.empty() && nAligned <= WINDOW_WIDTH)
        mnWindowWidth = static_cast<unsigned int>(nAligned);
    if (!oCascade.empty())
        moReducers.push_back(krv::gobs::MakeAverageCascade(moForm, oCascade, moBounds, moOptions.mbHalfValid));
}

void OverviewBuilder::StoreTile(SplitWriter& oSplit, const std::shared_ptr<const Raster>& poTile)
{
    using Encoded = std::shared_ptr<const SplitWriter::Encoded>;
    const auto poEncoded = std::make_shared<Encoded>();
    Line([&oSplit, poEncoded, poTile] { *poEncoded = oSplit.Encode(poTile); },
         [&oSplit, poEncoded] { oSplit.Store(**poEncoded); });
}

// What goes to the file does so in this order.
void OverviewBuilder::Line(std::function<void()> oWork, std::function<void()> oTake)
{
    moEncoding.Add(std::move(oWork), std::move(oTake));
    while (moEncoding.GetCount() >= moThreads.GetAhead())
        moEncoding.TakeNext();
}

void OverviewBuilder::Ask() const
{
    try
    {
        if (moOptions.moProgress && !moOptions.moProgress(mnDone, mnTotal))
            throw Stopped();
    }
    catch (...)
    {
        mbStopped = true;
        throw;
    }
}

// Row by row. They end with the rows of tiles, unless these are too high.
std::vector<PixelBounds> OverviewBuilder::ListWindows() const
{
    const std::uint64_t nRowBytes = std::max<std::uint64_t>(1, mnWindowWidth * moForm.GetPixelBytes());
    const std::uint64_t nMostRows = std::max<std::uint64_t>(1, WINDOW_BYTES / nRowBytes);
    const std::uint64_t nTileHeight = std::max(moWriter.GetTileHeight(), 1U);
    const bool bWhole = mnWindowWidth == moBounds.GetWidth();
    std::vector<PixelBounds> oWindows;
    for (PixelBounds oWindow = moBounds; oWindow.mnTop < moBounds.mnBottom; oWindow.mnTop = oWindow.mnBottom)
    {
        const std::uint64_t nTileEnd = (oWindow.mnTop / nTileHeight + 1) * nTileHeight;
        oWindow.mnBottom = static_cast<unsigned int>(
            std::min<std::uint64_t>({nTileEnd, oWindow.mnTop + nMostRows, std::uint64_t{moBounds.mnBottom}}));
        for (oWindow.mnLeft = moBounds.mnLeft; oWindow.mnLeft < moBounds.mnRight; oWindow.mnLeft = oWindow.mnRight)
        {
            const std::uint64_t nEnd =
                bWhole ? moBounds.mnRight : (std::uint64_t{oWindow.mnLeft} / mnWindowWidth + 1) * mnWindowWidth;
            oWindow.mnRight = static_cast<unsigned int>(std::min<std::uint64_t>(nEnd, moBounds.mnRight));
            oWindows.push_back(oWindow);
        }
    }
    return oWindows;
}

WindowPointer OverviewBuilder::Read(IRasterReader& oReader, const SourceForm& oForm, const PixelBounds& oBounds)
{
    auto poWindow = std::make_unique<Raster>(
        krv::gobs::RasterInfo(oBounds.GetWidth(), oBounds.GetHeight(), oForm.mnChannels, oForm.moType),
        krv::gobs::RasterContext(static_cast<int>(oBounds.mnLeft), static_cast<int>(oBounds.mnTop)));
    oReader.ReadRaster(poWindow.get());
    return poWindow;
}

// Levels that do not come from one another are made side by side. What they make whole is stored afterwards, so that
// its order does not depend on the threads.
void OverviewBuilder::Reduce(const krv::gobs::SourceWindow& oWindow)
{
    if (moReducers.size() == 1)
        return AddStrips(*moReducers.front(), oWindow);
    krv::threading::TaskLine oLine(moThreads);
    for (const auto& poReducer : moReducers)
        oLine.Add([this, &oWindow, &oReducer = *poReducer] { AddStrips(oReducer, oWindow); }, {});
    oLine.TakeAll();
}

// Windows of wide images take long: the thread that may ask does so now and then, the others see what came of it.
void OverviewBuilder::AddStrips(ILevelReducer& oReducer, const krv::gobs::SourceWindow& oWindow) const
{
    const PixelBounds& oBounds = oWindow.moBounds;
    const std::size_t nRowValues = std::size_t{oBounds.GetWidth()} * moForm.mnChannels;
    const std::size_t nRowBytes = oBounds.GetWidth() * moForm.GetPixelBytes();
    const unsigned int nRows =
        std::max(static_cast<unsigned int>(STRIP_BYTES / nRowBytes) / STRIP_ROWS, 1u) * STRIP_ROWS;
    krv::gobs::SourceWindow oStrip = oWindow;
    for (unsigned int nY = oBounds.mnTop; nY < oBounds.mnBottom && !mbStopped; nY = oStrip.moBounds.mnBottom)
    {
        const std::size_t nFirst = nY - oBounds.mnTop;
        oStrip.moBounds.mnTop = nY;
        oStrip.moBounds.mnBottom = static_cast<unsigned int>(
            std::min<std::uint64_t>(oBounds.mnBottom, (std::uint64_t{nY} / nRows + 1) * nRows));
        oStrip.mpPixels = oWindow.mpPixels + nFirst * nRowBytes;
        if (oWindow.mpValid != nullptr)
        {
            oStrip.mpValid = oWindow.mpValid + nFirst * nRowValues;
            oStrip.mpRows = oWindow.mpRows + nFirst;
        }
        oReducer.Add(oStrip);
        if (std::this_thread::get_id() == mnOwner)
            Ask();
    }
}

void OverviewBuilder::Take(const WindowPointer& poWindow, const PixelBounds& oBounds)
{
    const unsigned char* const pValid = moForm.mbValidity ? moValidity.Mark(*poWindow) : nullptr;
    Reduce({oBounds, poWindow->GetBuffer(), pValid, moValidity.GetRows()});
    for (Level& oLevel : moLevels)
        for (const auto& oStore : std::exchange(oLevel.moStores, {}))
            oStore();
    mnDone += std::uint64_t{oBounds.GetWidth()} * oBounds.GetHeight();
    Ask();
}

// Windows are read by all threads, and reduced in their order.
void OverviewBuilder::TakeAll(const std::vector<PixelBounds>& oWindows)
{
    using Reader = std::shared_ptr<IRasterReader>;
    const auto Make = [this]
    {
        Reader poReader =
            moOptions.moMakeReader && moOptions.mpoExecutor != nullptr ? moOptions.moMakeReader() : nullptr;
        return poReader != nullptr ? std::make_unique<Reader>(std::move(poReader)) : nullptr;
    };
    krv::threading::StateStore<Reader> oReaders(Make);
    auto poFirst = Make();
    if (poFirst == nullptr)
    {
        for (const PixelBounds& oBounds : oWindows)
            Take(Read(moWriter, moForm, oBounds), oBounds);
        return;
    }
    oReaders.Add(std::move(poFirst));
    std::size_t nTaken = 0;
    krv::threading::ForEachItem(
        moThreads, oWindows.size(),
        [&](std::uint64_t nWindow)
        {
            const krv::threading::StateStore<Reader>::Use oReader(oReaders);
            return Read(**oReader, moForm, oWindows[nWindow]);
        },
        [&](const WindowPointer& poWindow) { Take(poWindow, oWindows[nTaken++]); }, krv::threading::TaskOrder::eAsAdded,
        MOST_AHEAD_BYTES / WINDOW_BYTES);
}

bool OverviewBuilder::Run()
try
{
    TakeAll(ListWindows());
    moEncoding.TakeAll();
    return true;
}
catch (const Stopped&)
{
    return false;
}

void OverviewBuilder::Finish()
{
    moReducers.clear();
    for (Level& oLevel : moLevels)
    {
        oLevel.mpoTarget.reset();
        oLevel.mpoMaskIO.reset();
        oLevel.mpoSplit.reset();
        oLevel.mpoWriter.reset();
        if (mnMask != 0)
            mpoMaskManager->SetValid(mnMask, oLevel.mnFactor, true);
        mpoAccessor->SetLevelValid(oLevel.mnFactor, true);
    }
}

std::vector<unsigned int> CheckFactors(const std::vector<unsigned int>& oLevels, const IRasterWriter& oWriter,
                                       const Place& oPlace)
{
    const auto Refuse = [&oPlace](const std::string& message)
    {
        throw krv::ParameterException(message, krv::ParameterException::eInvalidValue, "oLevels", oPlace);
    };
    if (oLevels.empty())
        Refuse("No levels to build");
    std::vector<unsigned int> oFactors = oLevels;
    std::sort(oFactors.begin(), oFactors.end());
    oFactors.erase(std::unique(oFactors.begin(), oFactors.end()), oFactors.end());
    const unsigned int nLongest = std::max(oWriter.GetWidth(), oWriter.GetHeight());
    const unsigned int nMost = std::min(MOST_FACTOR, std::bit_ceil(std::min(nLongest, MOST_FACTOR)));
    if (oFactors.front() < 2 || oFactors.back() > nMost)
        Refuse("Levels of an image of " + std::to_string(oWriter.GetWidth()) + " x " +
               std::to_string(oWriter.GetHeight()) + " pixels are factors from 2 to " + std::to_string(nMost) +
               ", not " + std::to_string(oFactors.front() < 2 ? oFactors.front() : oFactors.back()));
    return oFactors;
}

} // namespace

std::vector<unsigned int> GetDefaultLevels(unsigned int nWidth, unsigned int nHeight)
{
    const unsigned int nLongest = std::max(nWidth, nHeight);
    std::vector<unsigned int> oLevels;
    for (unsigned int nFactor = 2; nLongest >= DEFAULT_SIZE && nFactor <= MOST_FACTOR; nFactor *= 2)
    {
        oLevels.push_back(nFactor);
        if (LevelSize(nLongest, nFactor) < DEFAULT_SIZE)
            break;
    }
    return oLevels;
}

namespace
{

// The channels of each type of a writer that has several: values are rounded, and kept apart from no-data, in their own
// type. None for other writers.
std::map<krv::gobs::DataType, std::vector<unsigned int>> FindTypes(const IRasterWriter& oWriter)
{
    std::map<krv::gobs::DataType, std::vector<unsigned int>> oTypes;
    const auto* const poMixed = dynamic_cast<const MultiTypeWriter*>(&oWriter);
    for (std::size_t n = 0; poMixed != nullptr && n < poMixed->GetChannels().size(); ++n)
        oTypes[poMixed->GetChannelsInfo()[n]->GetDataType()].push_back(poMixed->GetChannels()[n]);
    return oTypes;
}

bool BuildEachType(const MultiTypeWriter& oWriter, const std::vector<unsigned int>& oLevels, const std::string& method,
                   OverviewOptions oOptions)
{
    const auto oTypes = FindTypes(oWriter);
    oOptions.moMakeReader = nullptr; // it reads all channels, as one type
    const auto oProgress = std::move(oOptions.moProgress);
    std::uint64_t nTypesDone = 0;
    oOptions.moProgress = [&](std::uint64_t nDone, std::uint64_t nTotal)
    {
        return !oProgress || oProgress(nDone + nTypesDone * nTotal, nTotal * oTypes.size());
    };
    for (const auto& [oType, oChannels] : oTypes)
    {
        BasicWriter oOne(dynamic_cast<IRasterDataset*>(oWriter.GetDataset()), oChannels);
        if (!BuildOverviews(oOne, oLevels, method, oOptions))
            return false;
        ++nTypesDone;
    }
    return true;
}

} // namespace

bool BuildOverviews(IRasterWriter& oWriter, const std::vector<unsigned int>& oLevels, const std::string& method,
                    const OverviewOptions& oOptions)
{
    const Place oPlace = Place::Current();
    const Resampling eMethod = ParseResampling(method);
    if (std::unique_ptr<IOverviewWriterAccessor>(oWriter.GetOverviewWriterAccessor()) == nullptr)
        throw krv::DataException("Overviews are built of image channels at full size", oPlace);
    const std::vector<unsigned int> oFactors = CheckFactors(oLevels, oWriter, oPlace);
    if (const auto oTypes = FindTypes(oWriter); oTypes.size() > 1)
        return BuildEachType(static_cast<const MultiTypeWriter&>(oWriter), oFactors, method, oOptions);
    OverviewBuilder oBuilder(oWriter, eMethod, oOptions, oPlace);
    oBuilder.Prepare(oFactors);
    if (!oBuilder.Run())
        return false;
    oBuilder.Finish();
    return true;
}

} // namespace krv::datasources
