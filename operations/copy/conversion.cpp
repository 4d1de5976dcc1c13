#include "operations/copy/conversion.h"

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/ipageddataset.h"
#include "datasources/interfaces/ipctdataset.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/derived/totalpowerrasterreader.h"
#include "datasources/writer/basicwriter.h"
#include "datasources/writer/defaultwriter.h"
#include "datasources/writer/irasterwriter.h"
#include "gobs/pct/pct.h"
#include "operations/copy/detail/copylevels.h"
#include "operations/copy/detail/copymodels.h"
#include "operations/copy/detail/copypixels.h"
#include "operations/copy/detail/copyrecord.h"
#include "operations/copy/detail/copystatistics.h"
#include "operations/copy/detail/copyvalidity.h"
#include "operations/copy/detail/keptform.h"
#include "operations/copy/detail/scaledreader.h"
#include "operations/copy/detail/storereader.h"
#include "operations/copy/detail/target.h"
#include "operations/job/exceptions.h"
#include "operations/job/progress.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/ogc/cs/icrs.h"

#include <fmt/format.h>

#include <algorithm>
#include <filesystem>
#include <memory>
#include <numeric>
#include <optional>
#include <system_error>

namespace krv::operations
{

using namespace detail;

using namespace krv::datasources;

namespace
{

std::string Of(const CopyPlan& oPlan, std::size_t nSource, const std::string& what)
{
    return oPlan.GetSource(nSource).GetName() + ": " + what;
}

// The tables of the copied channels, each once.
TableNumbers CopyTables(const CopyPlan& oPlan, const Target& oTarget)
{
    TableNumbers oNumbers;
    unsigned int nPosition = 0;
    for (const CopiedChannel& oChannel : oPlan.GetChannels())
    {
        ++nPosition;
        auto* const poFrom = dynamic_cast<IPCTDataset*>(&oPlan.GetSource(oChannel.source).GetDataset());
        for (const unsigned int nTable : poFrom != nullptr ? poFrom->GetPCTList() : std::vector<unsigned int>())
        {
            if (poFrom->GetPCTChannel(nTable) != oChannel.channel || oNumbers.contains({oChannel.source, nTable}))
                continue;
            auto* const poTo = oTarget.Find<IPCTDataset>();
            const std::string what = Of(oPlan, oChannel.source, fmt::format("colour table {}", nTable));
            if (poTo == nullptr)
            {
                Target::Warn(what + " is not kept: the format has none");
                continue;
            }
            oTarget.Try(what,
                        [&]
                        {
                            const std::unique_ptr<krv::gobs::PCT> poTable(poFrom->GetPCT(nTable));
                            const unsigned int nNew = poTo->CreatePCT(*poTable, nPosition);
                            oNumbers[{oChannel.source, nTable}] = nNew;
                            const std::string description = poFrom->GetPCTDescription(nTable);
                            if (!description.empty())
                                poTo->SetPCTDescription(nNew, description);
                        });
        }
    }
    return oNumbers;
}

// Where the first file lies on the ground.
void CopyGeography(const CopyPlan& oPlan, const Target& oTarget)
{
    const SourceFile& oSource = oPlan.GetSource(0);
    std::unique_ptr<krv::ogc::cs::ICRS> poCrs;
    oTarget.Try(Of(oPlan, 0, "the reference system"), [&] { poCrs.reset(oSource.GetDataset().ReadCRS()); });
    if (poCrs != nullptr)
        oTarget.Try(Of(oPlan, 0, "the reference system"), [&] { oTarget.Get().UpdateCRS(*poCrs); });
    const auto* const poFrom = dynamic_cast<IGeocodedDataset*>(&oSource.GetDataset());
    if (poFrom == nullptr)
        return;
    const krv::ogc::cs::GeocodingInfo& oInfo = poFrom->GetGeocoding();
    for (std::size_t s = 1; s < oPlan.GetSourceCount(); ++s)
    {
        const auto* const poOther = dynamic_cast<IGeocodedDataset*>(&oPlan.GetSource(s).GetDataset());
        if (poOther != nullptr && !(poOther->GetGeocoding() == oInfo))
            Target::Warn(Of(oPlan, s, "it lies elsewhere than " + oSource.GetName() + ", whose place is taken"));
    }
    if (oInfo.IsIdentity() && !oSource.IsIdentityPlace(poCrs != nullptr))
        return;
    auto* const poTo = oTarget.Find<IGeocodedDataset>();
    if (poTo == nullptr)
        return Target::Warn(Of(oPlan, 0, "the geocoding is not kept: the format has none"));
    oTarget.Try(Of(oPlan, 0, "the geocoding"),
                [&] { poTo->SetGeocoding(ShiftGeocoding(oInfo, oPlan.GetWindow().x, oPlan.GetWindow().y)); });
}

void CopyChannels(const CopyPlan& oPlan, const Target& oTarget)
{
    const auto& oChannels = oPlan.GetChannels();
    std::vector<krv::gobs::DataType> oTypes = oPlan.GetTypes();
    ProgressCounter oCounter(oTarget.GetProgress(), "convert",
                             [&]
                             {
                                 std::uint64_t nBytes = 0;
                                 for (const auto& oType : oTypes)
                                     nBytes += krv::gobs::BufferBytes(oPlan.GetWindow().width, oPlan.GetWindow().height,
                                                                      1, oType);
                                 return nBytes;
                             }());
    std::sort(oTypes.begin(), oTypes.end());
    oTypes.erase(std::unique(oTypes.begin(), oTypes.end()), oTypes.end());
    for (const krv::gobs::DataType& oType : oTypes)
    {
        // The channels of one type make one writer; those of one file and type one reader.
        std::vector<unsigned int> oWritten;
        std::vector<std::pair<std::size_t, krv::gobs::DataType>> oKeys;
        std::vector<std::vector<unsigned int>> oRead;
        std::vector<CopySource> oSources;
        for (std::size_t i = 0; i < oChannels.size(); ++i)
        {
            if (oChannels[i].to != oType)
                continue;
            const std::pair oKey(oChannels[i].source, oChannels[i].from);
            const auto nAt = static_cast<std::size_t>(std::find(oKeys.begin(), oKeys.end(), oKey) - oKeys.begin());
            if (nAt == oKeys.size())
            {
                oKeys.push_back(oKey);
                oRead.emplace_back();
                oSources.emplace_back().file = &oPlan.GetSource(oKey.first);
            }
            oRead[nAt].push_back(oChannels[i].channel);
            oSources[nAt].positions.push_back(static_cast<unsigned int>(oWritten.size()));
            oWritten.push_back(static_cast<unsigned int>(i) + 1);
        }
        for (std::size_t nAt = 0; nAt < oKeys.size(); ++nAt)
            oSources[nAt].open = [oChannelList = oRead[nAt]](const SourceFile& oFile)
            {
                return oFile.Read(oChannelList);
            };
        // Types are never promoted on the way: some promotions lose values.
        const std::unique_ptr<IRasterWriter> poWriter(CreateDefaultWriter(&oTarget.Get(), oWritten));
        CopyPixels(oSources, {*poWriter}, oPlan.GetWindow(), oCounter, oTarget.GetExecutor());
    }
}

// What is said of a bitmap beside its pixels.
struct BitmapRecord
{
    std::string description;
    MetadataMap tags;
};

// Of a bitmap of the first file; one that belongs to a channel follows it to its new number. No value when the channel
// is not copied.
std::optional<BitmapRecord> FindBitmapRecord(const CopyPlan& oPlan, const IBitmapDataset& oFrom, unsigned int nBitmap)
{
    BitmapRecord oRecord{oFrom.GetBitmapDescription(nBitmap), oFrom.GetBitmapMetadata(nBitmap)};
    const auto oOwner = oRecord.tags.find(krv::datasources::VALIDITY_OF_CHANNEL);
    if (oOwner == oRecord.tags.end())
        return oRecord;
    for (std::size_t i = 0; i < oPlan.GetChannels().size(); ++i)
    {
        const CopiedChannel& oChannel = oPlan.GetChannels()[i];
        if (oChannel.source != 0 || std::to_string(oChannel.channel) != oOwner->second)
            continue;
        oOwner->second = std::to_string(i + 1);
        if (oRecord.description == krv::datasources::NameChannelMask(oChannel.channel))
            oRecord.description = krv::datasources::NameChannelMask(static_cast<unsigned int>(i) + 1);
        return oRecord;
    }
    return std::nullopt;
}

unsigned int CopyBitmap(const SourceFile& oSource, unsigned int nFrom, const BitmapRecord& oRecord,
                        const Target& oTarget, const PixelWindow& oWindow)
{
    IBitmapDataset& oTo = *oTarget.Find<IBitmapDataset>();
    const unsigned int nTo = oTo.CreateBitmap();
    // What it is comes before what it is called: some formats have room for validity alone, and the mask of their only
    // channel is that of the image, which has no name.
    if (!oRecord.tags.empty())
        oTo.SetBitmapMetadata(nTo, oRecord.tags);
    if (krv::datasources::FindValidityMask(oTo) != nTo)
        oTo.SetBitmapDescription(nTo, oRecord.description);
    const auto Open = [nFrom](const SourceFile& oFile)
    {
        auto& oBitmaps = dynamic_cast<IBitmapDataset&>(oFile.GetDataset());
        return LevelReader(std::make_unique<BasicReader>(&oBitmaps, std::vector<unsigned int>{nFrom}, false), nullptr,
                           nullptr);
    };
    BasicWriter oWriter(&oTo, {nTo});
    ProgressCounter oCounter(oTarget.GetProgress(), "bitmap", std::uint64_t{oWindow.width} * oWindow.height);
    CopyPixels({{&oSource, Open, {0}}}, {oWriter}, oWindow, oCounter, oTarget.GetExecutor());
    return nTo;
}

// Those of the first file: a validity mask of another one would hold for all channels.
BitmapNumbers CopyBitmaps(const CopyPlan& oPlan, const Target& oTarget)
{
    auto* const poTo = oTarget.Find<IBitmapDataset>();
    BitmapNumbers oNumbers;
    for (std::size_t s = 0; s < oPlan.GetSourceCount(); ++s)
    {
        auto* const poFrom = dynamic_cast<IBitmapDataset*>(&oPlan.GetSource(s).GetDataset());
        const auto oList = poFrom != nullptr ? poFrom->GetBitmapList() : std::vector<unsigned int>();
        if (oList.empty())
            continue;
        if (poTo == nullptr || s > 0)
        {
            Target::Warn(Of(oPlan, s,
                            poTo == nullptr ? "bitmaps are not kept: the format has none"
                                            : "bitmaps are not kept: those of the first file are"));
            continue;
        }
        for (const unsigned int nBitmap : oList)
            if (const auto oRecord = FindBitmapRecord(oPlan, *poFrom, nBitmap))
                oTarget.Try(Of(oPlan, s, fmt::format("bitmap {}", nBitmap)),
                            [&] {
                                oNumbers[nBitmap] =
                                    CopyBitmap(oPlan.GetSource(s), nBitmap, *oRecord, oTarget, oPlan.GetWindow());
                            });
    }
    return oNumbers;
}

void WarnOfFurtherImages(const CopyPlan& oPlan)
{
    for (std::size_t s = 0; s < oPlan.GetSourceCount(); ++s)
    {
        const auto* const poPages = dynamic_cast<const IPagedDataset*>(&oPlan.GetSource(s).GetDataset());
        const unsigned int nFurther = poPages != nullptr ? poPages->CountFurtherImages() : 0;
        if (nFurther != 0)
            Target::Warn(Of(oPlan, s, fmt::format("{} further images of the file are not copied", nFurther)));
    }
}

bool HasLevels(const SourceFile& oSource)
{
    const std::unique_ptr<IOverviewManager> poLevels(oSource.GetRaster().GetOverviewManager());
    return poLevels != nullptr && !poLevels->GetLevels().empty();
}

// A copy of what a reader makes of one file.
void ConvertByReader(const StoredChannels::Open& oOpen, const SourceFile& oSource, const CopyRequest& oRequest,
                     const TargetForm& oForm, const Progress& oProgress, krv::threading::IExecutor* poExecutor)
{
    const std::shared_ptr<const IRasterReader> poReader = oOpen(oSource);
    const PixelWindow oWindow =
        FindWindow(oSource, oRequest.window).value_or(PixelWindow{0, 0, poReader->GetWidth(), poReader->GetHeight()});
    if (oWindow.width == 0 || oWindow.height == 0 || std::uint64_t{oWindow.x} + oWindow.width > poReader->GetWidth() ||
        std::uint64_t{oWindow.y} + oWindow.height > poReader->GetHeight())
        throw RequestException(fmt::format("{}: the window is not inside the image of {} x {} pixels",
                                           oSource.GetName(), poReader->GetWidth(), poReader->GetHeight()));
    const std::vector<krv::gobs::DataType> oTypes(poReader->GetChansCount(), poReader->GetDataType());
    std::vector<unsigned int> oChannels(oTypes.size());
    std::iota(oChannels.begin(), oChannels.end(), 1U);
    const Target oTarget(TargetLayout{oWindow.width, oWindow.height, oTypes}, oForm, oProgress, poExecutor);
    StoreReaders(oSource, {{oOpen, oChannels}}, oWindow, oTarget, "convert");
}

void ConvertPower(const CopyRequest& oRequest, const TargetForm& oForm, const Progress& oProgress,
                  krv::threading::IExecutor* poExecutor)
{
    if (oRequest.sources.size() != 1 || oRequest.type || oRequest.promote || oRequest.noData)
        throw RequestException("the power is that of one file, and has a type and a no-data value of its own", "power");
    const SourceFile oSource(oRequest.sources.front());
    PowerRequest oPower;
    oPower.moChannels = oRequest.channels.empty() ? oRequest.channels : oSource.CheckChannels(oRequest.channels);
    const auto Open = [&oPower](const SourceFile& oFile)
    {
        return std::make_shared<TotalPowerRasterReader>(&oFile.GetDataset(), false, oPower);
    };
    ConvertByReader(Open, oSource, oRequest, oForm, oProgress, poExecutor);
}

void ConvertScaled(const CopyRequest& oRequest, const TargetForm& oForm, const Progress& oProgress,
                   krv::threading::IExecutor* poExecutor)
{
    if (oRequest.sources.size() != 1 || oRequest.promote || oRequest.power)
        throw RequestException("values of one file are scaled, neither to a promoted type nor as power",
                               oRequest.unscale ? "unscale" : "scale");
    const SourceFile oSource(oRequest.sources.front(), eReadOnly, oRequest.noData);
    const auto Open = [&oRequest](const SourceFile& oFile)
    {
        return std::make_shared<ScaledReader>(oFile, oRequest);
    };
    ConvertByReader(Open, oSource, oRequest, oForm, oProgress, poExecutor);
}

} // namespace

void Convert(const CopyRequest& oRequest, const TargetForm& oForm, const Progress& oProgress,
             krv::threading::IExecutor* poExecutor)
{
    CheckTarget(oRequest.sources, oForm.name);
    if (oRequest.unscale || !oRequest.scale.empty())
        return ConvertScaled(oRequest, oForm, oProgress, poExecutor);
    if (oRequest.power)
        return ConvertPower(oRequest, oForm, oProgress, poExecutor);
    const CopyPlan oPlan(oRequest);
    WarnOfFurtherImages(oPlan);
    const Target oTarget(oPlan, oForm, oProgress, poExecutor);
    // What a codec changes says nothing of validity any more: a mask does.
    const bool bPixelsChange = oTarget.IsLossy() && !oTarget.TakesBlocks();
    const bool bMask = bPixelsChange && HasValidityInValues(oPlan);
    if (bMask)
        CheckLossyValidity(oTarget);
    const TableNumbers oTables = CopyTables(oPlan, oTarget);
    CopyGeography(oPlan, oTarget);
    AuxiliaryData oRecord = MakeRecord(oPlan, oForm.name, oTables, bPixelsChange, bMask);
    RecordModel(oPlan, oTarget, oRecord);
    oTarget.Try("the metadata", [&] { oTarget.Get().WriteAuxiliaryData(oRecord); });
    CopyModels(oPlan, oTarget);
    if (oTarget.TakesBlocks())
        MoveBlocks(oPlan, oTarget, 1);
    else
        CopyChannels(oPlan, oTarget);
    const BitmapNumbers oBitmaps = CopyBitmaps(oPlan, oTarget);
    if (bMask)
        WriteValidity(oPlan, oTarget, FindValidityMask(*oTarget.Find<IBitmapDataset>()));
    // LAYOUT=COG means the same to every format: a file laid out for reading over a network has its levels.
    const auto oOptions = ParseOptions(oForm.options);
    const auto oLayout = oOptions.find("LAYOUT");
    const bool bCloud = oLayout != oOptions.end() && oLayout->second == "COG";
    const bool bWanted = bCloud && !HasLevels(oPlan.GetSource(0));
    // Levels that are encoded with loss beside blocks that moved: a mask tells of theirs which pixels are valid.
    auto* const poBitmaps = oTarget.Find<IBitmapDataset>();
    if (bWanted && oTarget.IsLossy() && poBitmaps != nullptr && FindValidityMask(*poBitmaps) == 0 &&
        HasValidityInValues(oPlan))
        WriteValidity(oPlan, oTarget, 0);
    // Levels that were made by another no-data value are none of this copy.
    CopyLevels(oPlan, oTarget, oBitmaps,
               oPlan.IsWholeFile() && !oPlan.IsCut() && oPlan.AreTypesKept() && !bMask && !oRequest.noData, bWanted);
    if (bCloud)
        AddStatistics(oPlan, oTarget, oRecord);
    oTarget.Get().Close();
}

} // namespace krv::operations
