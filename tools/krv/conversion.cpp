#include "tools/krv/conversion.h"

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/ifileformat.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/ipctdataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/iomanager/formatcapabilities.h"
#include "datasources/reader/basicreader.h"
#include "datasources/writer/basicwriter.h"
#include "datasources/writer/overviewbuilder.h"
#include "gobs/pct/pct.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"
#include "toolkit/ogc/cs/icrs.h"
#include "tools/krv/copypixels.h"
#include "tools/krv/copyrecord.h"
#include "tools/krv/errors.h"
#include "tools/krv/progress.h"

#include <fmt/format.h>

#include <algorithm>
#include <cctype>
#include <filesystem>
#include <memory>
#include <sstream>
#include <system_error>

namespace krv::tool
{

using namespace krv::datasources;

namespace
{

void Warn(const std::string& message)
{
    krv::nspio::Warning::Warn(message, "tools/krv/conversion", 0);
}

void CheckTarget(const CopyRequest& oRequest, const std::string& target)
{
    std::error_code oNone;
    for (const std::string& source : oRequest.sources)
    {
        if (std::filesystem::equivalent(source, target, oNone))
            throw UsageError(target + " is the file itself; name another for the copy");
    }
    if (std::filesystem::exists(target, oNone) && !std::filesystem::is_regular_file(target, oNone))
        throw krv::DataException(target + " is there and no plain file; name another for the copy");
}

bool EqualNames(const std::string& first, const std::string& second)
{
    return std::equal(first.begin(), first.end(), second.begin(), second.end(),
                      [](unsigned char a, unsigned char b) { return std::tolower(a) == std::tolower(b); });
}

// By the extension of the file's name when the user names no format. A name whose extension belongs to none is refused:
// a file of another kind under it would deceive every other program.
std::string ChooseFormat(const TargetForm& oForm)
{
    const DatasetManager& oManager = *DatasetManager::GetInstance();
    const std::string extension = std::filesystem::path(oForm.name).extension().string();
    std::string format = extension.size() < 2 ? "TIF" : "";
    std::string all;
    bool bKnown = oForm.format.empty();
    for (const IFileFormat* const poFormat : oManager.GetFormatList())
    {
        for (const std::string& own : poFormat->GetExtensions())
        {
            if (oForm.format.empty() && EqualNames("." + own, extension))
                format = poFormat->GetShortName();
        }
        bKnown = bKnown || EqualNames(poFormat->GetShortName(), oForm.format);
        all += (all.empty() ? "" : ", ") + poFormat->GetShortName();
    }
    if (!bKnown)
        throw UsageError(fmt::format("--format: there is no format {}; there are {}", oForm.format, all));
    if (oForm.format.empty() && format.empty())
        throw UsageError(fmt::format("{}: no format has the extension {}; name the file otherwise, or choose with "
                                     "--format among {}{}",
                                     oForm.name, extension, all,
                                     EqualNames(extension, ".png") ? " (`krv view` makes pictures)" : ""));
    if (!oForm.format.empty())
    {
        format = oForm.format;
        std::transform(format.begin(), format.end(), format.begin(), [](unsigned char c) { return std::toupper(c); });
    }
    if (!oManager.GetCapabilities(format).IsSupported(CAPABILITY_CREATE))
        throw UsageError(
            fmt::format("{}: the format {} cannot create files; choose another with --format", oForm.name, format));
    return format;
}

// What a format holds against the options that it was given is a matter of the command line.
template <typename Action>
auto WithOptions(const TargetForm& oForm, Action oAction)
{
    try
    {
        return oAction();
    }
    catch (const krv::DataException& oError)
    {
        if (oForm.options.empty())
            throw;
        throw UsageError("--options: " + oError.GetMessage());
    }
}

// In any letter case; beginning: of a word such as KEY=VALUE.
bool HasOption(const std::string& options, const std::string& beginning)
{
    std::istringstream oWords(options);
    for (std::string word; oWords >> word;)
    {
        if (EqualNames(word.substr(0, beginning.size()), beginning))
            return true;
    }
    return false;
}

// Samples of one bit stay so where the format can do it and the user wants nothing else. JPEG has none, differences of
// values neither.
std::string CompleteOptions(const CopyPlan& oPlan, const std::string& format, const std::string& options)
{
    const unsigned int nBits = oPlan.GetNarrowBits();
    if (nBits == 0 || HasOption(options, "NBITS=") || HasOption(options, "COMPRESS=JPEG") ||
        HasOption(options, "PREDICTOR=2") ||
        !DatasetManager::GetInstance()->GetCapabilities(format).IsSupported(CAPABILITY_NARROW_SAMPLES))
        return options;
    return fmt::format("{} NBITS={}", options, nBits);
}

// The new file while it is being made. What is not finished goes with it.
class Target
{
public:
    Target(const CopyPlan& oPlan, const TargetForm& oForm)
        : moName(oForm.name), mpoDataset(MakeDataset(oPlan, oForm)),
          mpoRaster(dynamic_cast<IRasterDataset*>(mpoDataset.get()))
    {
        if (mpoRaster == nullptr)
            throw krv::DataException(moName + ": the format does not hold images");
        const auto oTypes = oPlan.GetTypes();
        const auto Create = [&]
        {
            mpoRaster->Create(oPlan.GetWindow().width, oPlan.GetWindow().height, oTypes);
        };
        const bool bMixed =
            std::any_of(oTypes.begin(), oTypes.end(), [&](const auto& oType) { return oType != oTypes.front(); });
        try
        {
            bMixed ? Create() : WithOptions(oForm, Create);
        }
        catch (const krv::DataException& oError)
        {
            throw krv::DataException(oError.GetMessage() + (bMixed ? " (--type gives all channels one type)" : ""));
        }
    }

    template <typename Facet>
    Facet* Find() const
    {
        return dynamic_cast<Facet*>(mpoDataset.get());
    }
    IDataset& Get() const { return *mpoDataset; }
    IRasterDataset& GetRaster() const { return *mpoRaster; }
    const std::string& GetName() const { return moName; }

    // What this format cannot keep is told, not taken for a failure: the pixels are the copy.
    template <typename Action>
    void Try(const std::string& what, Action oAction) const
    {
        try
        {
            oAction();
        }
        catch (const krv::DataException& oError)
        {
            Warn(fmt::format("{} is not kept: {}", what, oError.GetMessage()));
        }
    }

private:
    static IDataset* MakeDataset(const CopyPlan& oPlan, const TargetForm& oForm)
    {
        const std::string format = ChooseFormat(oForm);
        const std::string options = CompleteOptions(oPlan, format, oForm.options);
        return WithOptions(oForm,
                           [&] { return DatasetManager::GetInstance()->NewDataset(oForm.name, format, options); });
    }

    std::string moName;
    std::unique_ptr<IDataset> mpoDataset;
    IRasterDataset* mpoRaster;
};

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
                Warn(what + " is not kept: the format has none");
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

// Where the first file lies on the ground. The identity says nothing, unless a reference system stands beside it and no
// control points do.
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
    const bool bPlaced = poCrs != nullptr && oSource.GetMetadata().GetFileMetadataValue("GroundControlPoints").empty();
    const krv::ogc::cs::GeocodingInfo& oInfo = poFrom->GetGeocoding();
    for (std::size_t s = 1; s < oPlan.GetSourceCount(); ++s)
    {
        const auto* const poOther = dynamic_cast<IGeocodedDataset*>(&oPlan.GetSource(s).GetDataset());
        if (poOther != nullptr && !(poOther->GetGeocoding() == oInfo))
            Warn(Of(oPlan, s, "it lies elsewhere than " + oSource.GetName() + ", whose place is taken"));
    }
    if (oInfo.IsIdentity() && !bPlaced)
        return;
    auto* const poTo = oTarget.Find<IGeocodedDataset>();
    if (poTo == nullptr)
        return Warn(Of(oPlan, 0, "the geocoding is not kept: the format has none"));
    oTarget.Try(Of(oPlan, 0, "the geocoding"),
                [&] { poTo->SetGeocoding(ShiftGeocoding(oInfo, oPlan.GetWindow().x, oPlan.GetWindow().y)); });
}

void CopyChannels(const CopyPlan& oPlan, const Target& oTarget)
{
    const auto& oChannels = oPlan.GetChannels();
    std::vector<krv::gobs::DataType> oTypes = oPlan.GetTypes();
    Progress oProgress("convert",
                       [&]
                       {
                           std::uint64_t nBytes = 0;
                           for (const auto& oType : oTypes)
                               nBytes +=
                                   krv::gobs::BufferBytes(oPlan.GetWindow().width, oPlan.GetWindow().height, 1, oType);
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
                oSources.emplace_back();
            }
            oRead[nAt].push_back(oChannels[i].channel);
            oSources[nAt].positions.push_back(static_cast<unsigned int>(oWritten.size()));
            oWritten.push_back(static_cast<unsigned int>(i) + 1);
        }
        std::vector<LevelReader> oReaders;
        for (std::size_t nAt = 0; nAt < oKeys.size(); ++nAt)
            oReaders.push_back(oPlan.GetSource(oKeys[nAt].first).Read(oRead[nAt]));
        for (std::size_t nAt = 0; nAt < oKeys.size(); ++nAt)
            oSources[nAt].reader = &oReaders[nAt].Get();
        BasicWriter oWriter(&oTarget.GetRaster(), oWritten);
        CopyPixels(oSources, oWriter, oPlan.GetWindow(), oProgress);
    }
}

void CopyBitmap(IBitmapDataset& oFrom, unsigned int nFrom, IBitmapDataset& oTo, const PixelWindow& oWindow)
{
    const unsigned int nTo = oTo.CreateBitmap();
    oTo.SetBitmapDescription(nTo, oFrom.GetBitmapDescription(nFrom));
    const MetadataMap oTags = oFrom.GetBitmapMetadata(nFrom);
    if (!oTags.empty())
        oTo.SetBitmapMetadata(nTo, oTags);
    BasicReader oReader(&oFrom, {nFrom}, false);
    BasicWriter oWriter(&oTo, {nTo});
    Progress oProgress("bitmap", std::uint64_t{oWindow.width} * oWindow.height);
    CopyPixels({{&oReader, {0}}}, oWriter, oWindow, oProgress);
}

// Those of the first file: a validity mask of another one would hold for all channels.
void CopyBitmaps(const CopyPlan& oPlan, const Target& oTarget)
{
    auto* const poTo = oTarget.Find<IBitmapDataset>();
    for (std::size_t s = 0; s < oPlan.GetSourceCount(); ++s)
    {
        auto* const poFrom = dynamic_cast<IBitmapDataset*>(&oPlan.GetSource(s).GetDataset());
        const auto oList = poFrom != nullptr ? poFrom->GetBitmapList() : std::vector<unsigned int>();
        if (oList.empty())
            continue;
        if (poTo == nullptr || s > 0)
        {
            Warn(Of(oPlan, s,
                    poTo == nullptr ? "bitmaps are not kept: the format has none"
                                    : "bitmaps are not kept: those of the first file are"));
            continue;
        }
        for (const unsigned int nBitmap : oList)
            CopyBitmap(*poFrom, nBitmap, *poTo, oPlan.GetWindow());
    }
}

// Mixing the indices of a colour table gives colours that mean nothing.
void BuildLevels(const Target& oTarget)
{
    IRasterDataset& oRaster = oTarget.GetRaster();
    const auto oLevels = GetDefaultLevels(oRaster.GetWidth(), oRaster.GetHeight());
    const auto* const poTables = oTarget.Find<IPCTDataset>();
    const bool bIndexed = poTables != nullptr && !poTables->GetPCTList().empty();
    if (oLevels.empty())
        return;
    BasicWriter oWriter(&oRaster, {});
    const std::uint64_t nPixelBytes = krv::gobs::BufferBytes(1, 1, oWriter.GetChansCount(), oWriter.GetDataType());
    std::unique_ptr<Progress> poProgress;
    OverviewOptions oOptions;
    oOptions.moProgress = [&](std::uint64_t nDone, std::uint64_t nTotal)
    {
        if (poProgress == nullptr)
            poProgress = std::make_unique<Progress>("overviews", nTotal * nPixelBytes);
        poProgress->Advance(nDone * nPixelBytes - poProgress->GetDone());
        return true;
    };
    BuildOverviews(oWriter, oLevels, bIndexed ? "mode" : "average", oOptions);
}

} // namespace

void Convert(const CopyRequest& oRequest, const TargetForm& oForm)
{
    CheckTarget(oRequest, oForm.name);
    const CopyPlan oPlan(oRequest);
    const Target oTarget(oPlan, oForm);
    const TableNumbers oTables = CopyTables(oPlan, oTarget);
    CopyGeography(oPlan, oTarget);
    const AuxiliaryData oRecord = MakeRecord(oPlan, oForm.name, oTables);
    oTarget.Try("the metadata", [&] { oTarget.Get().WriteAuxiliaryData(oRecord); });
    CopyChannels(oPlan, oTarget);
    CopyBitmaps(oPlan, oTarget);
    // Means the same to every format: a file laid out for reading over a network has its levels.
    if (HasOption(oForm.options, "LAYOUT=COG"))
        BuildLevels(oTarget);
    oTarget.Get().Close();
}

} // namespace krv::tool
