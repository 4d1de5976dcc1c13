#include "operations/source/fileinfo.h"

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/iencodedblocks.h"
#include "datasources/interfaces/ifileformat.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/ilayoutdataset.h"
#include "datasources/interfaces/ilinkeddataset.h"
#include "datasources/interfaces/imathmodeldataset.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/ipageddataset.h"
#include "datasources/interfaces/ipctdataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/isidecardataset.h"
#include "datasources/interfaces/istoragedataset.h"
#include "datasources/metadata/displaydefaults.h"
#include "datasources/metadata/referencetag.h"
#include "datasources/reader/ioverviewaccessor.h"
#include "datasources/reader/irasterreader.h"
#include "gobs/pct/pct.h"
#include "operations/job/exceptions.h"
#include "operations/source/sourcefile.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/mathmodel/imathmodel.h"
#include "toolkit/nspio/warning.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/ogc/cs/icrs.h"

#include <filesystem>
#include <memory>
#include <optional>
#include <system_error>

namespace krv::operations
{

using namespace krv::datasources;

namespace
{

std::optional<TableReference> FindReference(const AuxiliaryData& oMetadata, const char* pTag, unsigned int nChannel)
{
    TableReference oFound;
    const bool bFound =
        ParseRefMetadataTag(oMetadata.GetChanMetadataValue(pTag, nChannel), oFound.file, oFound.layer, oFound.number);
    return bFound ? std::optional(oFound) : std::nullopt;
}

ChannelFacts DescribeChannel(const SourceFile& oFile, unsigned int nChannel)
{
    const AuxiliaryData& oMetadata = oFile.GetMetadata();
    const std::unique_ptr<IChannelInfo> poInfo(oFile.GetRaster().GetChannelInfo(nChannel));
    ChannelFacts oFacts;
    oFacts.number = nChannel;
    oFacts.type = poInfo->GetDataType();
    oFacts.storedType = poInfo->GetNativeDataType();
    oFacts.noDataText = oFile.GetNoDataText(nChannel);
    oFacts.recorded = nChannel <= oMetadata.GetChannelCount();
    if (!oFacts.recorded)
        return oFacts;
    oFacts.description = oMetadata.GetChannelDescription(nChannel);
    oFacts.metadata = oMetadata.GetChanMetadata(nChannel);
    oFacts.defaultLut = FindReference(oMetadata, "DEFAULT_LUT_REF", nChannel);
    oFacts.defaultPct = FindReference(oMetadata, "DEFAULT_PCT_REF", nChannel);
    return oFacts;
}

std::optional<std::array<double, 6>> FindGeocoding(const SourceFile& oFile, bool bHasCrs)
{
    const auto* const poGeocoded = dynamic_cast<IGeocodedDataset*>(&oFile.GetDataset());
    if (poGeocoded == nullptr || (poGeocoded->GetGeocoding().IsIdentity() && !oFile.IsIdentityPlace(bHasCrs)))
        return std::nullopt;
    return poGeocoded->GetGeocoding().GetTerms();
}

std::optional<CrsFacts> FindCrs(const SourceFile& oFile)
{
    const std::unique_ptr<krv::ogc::cs::ICRS> poCrs(oFile.GetDataset().ReadCRS());
    if (poCrs == nullptr)
        return std::nullopt;
    return CrsFacts{poCrs->GetName(), poCrs->GetEPSG(), poCrs->GetWKT()};
}

std::vector<LevelFacts> FindLevels(IRasterReader& oReader)
{
    std::vector<LevelFacts> oLevels;
    const std::unique_ptr<IOverviewReaderAccessor> poAccessor(oReader.GetOverviewReaderAccessor());
    if (poAccessor == nullptr)
        return oLevels;
    for (const unsigned int nLevel : poAccessor->GetLevels())
    {
        const std::unique_ptr<IRasterReader> poLevel(poAccessor->CreateRasterReader(nLevel));
        oLevels.push_back({nLevel, poLevel->GetWidth(), poLevel->GetHeight(), poAccessor->IsLevelValid(nLevel)});
    }
    return oLevels;
}

std::vector<BitmapFacts> FindBitmaps(const SourceFile& oFile)
{
    std::vector<BitmapFacts> oList;
    const auto* const poBitmaps = dynamic_cast<IBitmapDataset*>(&oFile.GetDataset());
    if (poBitmaps == nullptr)
        return oList;
    const unsigned int nMask = FindValidityMask(*poBitmaps);
    for (const unsigned int nBitmap : poBitmaps->GetBitmapList())
        oList.push_back({nBitmap, poBitmaps->GetBitmapDescription(nBitmap), nBitmap == nMask});
    return oList;
}

std::vector<ColourTableFacts> FindTables(const SourceFile& oFile)
{
    std::vector<ColourTableFacts> oList;
    const auto* const poTables = dynamic_cast<IPCTDataset*>(&oFile.GetDataset());
    if (poTables == nullptr)
        return oList;
    for (const unsigned int nTable : poTables->GetPCTList())
    {
        const std::unique_ptr<krv::gobs::PCT> poTable(poTables->GetPCT(nTable));
        oList.push_back({nTable, poTables->GetPCTChannel(nTable), poTables->GetPCTDescription(nTable),
                         poTable != nullptr ? poTable->GetEntries().size() : 0});
    }
    return oList;
}

MathModelFacts DescribeModel(IMathModelDataset& oModels, unsigned int nModel)
{
    const std::unique_ptr<krv::mathmodel::IMathModel> poModel(oModels.GetMathModel(nModel));
    const double nAccuracy = poModel->GetAccuracy();
    return {nModel, poModel->GetName(), nAccuracy < 0 ? std::nullopt : std::optional(nAccuracy)};
}

// A part that cannot be read is as if it were not there.
template <typename Part>
auto Attempt(const SourceFile& oFile, const char* pWhat, Part oPart)
{
    try
    {
        return oPart();
    }
    catch (const krv::Exception&)
    {
        krv::nspio::Warning::Warn(oFile.GetName() + ": " + pWhat + " cannot be read: " + CurrentMessage());
        return decltype(oPart())();
    }
}

// One that cannot be read is there all the same.
std::vector<MathModelFacts> FindModels(const SourceFile& oFile)
{
    std::vector<MathModelFacts> oList;
    auto* const poModels = dynamic_cast<IMathModelDataset*>(&oFile.GetDataset());
    if (poModels == nullptr)
        return oList;
    for (const unsigned int nModel : poModels->GetMathModelList())
    {
        oList.push_back(Attempt(oFile, "a sensor model", [&] { return DescribeModel(*poModels, nModel); }));
        oList.back().number = nModel;
    }
    return oList;
}

StorageFacts DescribeBlocks(krv::datasources::IEncodedBlocks& oBlocks)
{
    const EncodedForm oForm = oBlocks.GetEncodedForm(1);
    return {oForm.mnBlockWidth, oForm.mnBlockHeight, oForm.mbWholeBlocks, oForm.moCodec,
            oForm.mbLossy,      oForm.mnPredictor,   oForm.mbSeparate,    oForm.mbBigEndian};
}

void DescribeStorage(const SourceFile& oFile, FileInfo& oInfo)
{
    IDataset& oDataset = oFile.GetDataset();
    std::error_code oError;
    const std::uintmax_t nBytes = std::filesystem::file_size(oFile.GetName(), oError);
    if (!oError)
        oInfo.fileBytes = nBytes;
    if (auto* const poBlocks = dynamic_cast<IEncodedBlocks*>(&oDataset))
        oInfo.storage =
            Attempt(oFile, "how its blocks are stored", [&] { return std::optional(DescribeBlocks(*poBlocks)); });
    if (auto* const poLayout = dynamic_cast<ILayoutDataset*>(&oDataset))
    {
        oInfo.variant = poLayout->GetVariant();
        oInfo.cloudReasons = Attempt(oFile, "its layout", [&] { return poLayout->CheckCloudLayout(); });
    }
}

void DescribePlace(const SourceFile& oFile, FileInfo& oInfo)
{
    const std::optional<ImagePlace> oPlace = ImagePlace::Find(oFile);
    if (!oPlace)
        return;
    oInfo.placedBy = oPlace->GetKind();
    oInfo.geographic = oPlace->FindGeographicBounds();
    if (oPlace->GetKind() != PlacedBy::eTransform)
        return;
    const auto& oGeocoding = dynamic_cast<IGeocodedDataset&>(oFile.GetDataset()).GetGeocoding();
    oInfo.bounds = OutlineOf(oGeocoding, oInfo.width, oInfo.height);
    oInfo.pixelSize = PixelSize{oGeocoding.GetColumnSpacing(), oGeocoding.GetRowSpacing(),
                                oPlace->GetCRS() != nullptr ? oPlace->GetCRS()->GetUnitName() : std::string()};
}

} // namespace

FileInfo GatherInfo(const SourceFile& oFile)
{
    const IRasterDataset& oRaster = oFile.GetRaster();
    IDataset& oDataset = oFile.GetDataset();
    const AuxiliaryData& oMetadata = oFile.GetMetadata();
    const auto oGroups = oFile.GroupByType(oFile.CheckChannels({}));

    FileInfo oInfo;
    oInfo.file = oFile.GetName();
    if (const IFileFormat* const poFormat = oDataset.GetFileFormat(); poFormat != nullptr)
        oInfo.format = poFormat->GetShortName();
    oInfo.width = oRaster.GetWidth();
    oInfo.height = oRaster.GetHeight();
    if (!oGroups.empty()) // a file may hold other things than channels
    {
        const LevelReader oReader = oFile.Read(oGroups.front().channels);
        oInfo.tileWidth = oReader.Get().GetTileWidth();
        oInfo.tileHeight = oReader.Get().GetTileHeight();
        oInfo.overviews = Attempt(oFile, "the levels", [&] { return FindLevels(oReader.Get()); });
    }
    for (unsigned int i = 1; i <= oRaster.GetChanCount(); ++i)
        oInfo.channels.push_back(DescribeChannel(oFile, i));
    oInfo.metadata = oMetadata.GetFileMetadata();
    oInfo.crs = Attempt(oFile, "the reference system", [&] { return FindCrs(oFile); });
    oInfo.geocoding = FindGeocoding(oFile, oInfo.crs.has_value());
    DescribeStorage(oFile, oInfo);
    Attempt(oFile, "its place on the ground",
            [&]
            {
                DescribePlace(oFile, oInfo);
                return true;
            });
    oInfo.bitmaps = Attempt(oFile, "the bitmaps", [&] { return FindBitmaps(oFile); });
    oInfo.mathModels = FindModels(oFile);
    if (const auto* const poLinked = dynamic_cast<ILinkedDataset*>(&oDataset))
        oInfo.linkedFiles = poLinked->GetLinkedFiles();
    oInfo.colourTables = Attempt(oFile, "the colour tables", [&] { return FindTables(oFile); });
    oInfo.displayDefaults = {GetDefaultRed(oMetadata), GetDefaultGreen(oMetadata), GetDefaultBlue(oMetadata),
                             GetDefaultGrey(oMetadata)};
    if (auto* const poStorage = dynamic_cast<IStorageDataset*>(&oDataset))
        oInfo.unusedBytes = poStorage->GetUnusedBytes();
    if (auto* const poSidecars = dynamic_cast<ISidecarDataset*>(&oDataset))
        oInfo.sidecars = Attempt(oFile, "the files beside it", [&] { return poSidecars->ListSidecars(); });
    // Levels of the file itself come first.
    const std::unique_ptr<IOverviewManager> poOwn(oFile.GetRaster().GetOverviewManager());
    for (Sidecar& oSidecar : oInfo.sidecars)
        if (oSidecar.moSays == "levels")
            oSidecar.mbUsed = !oInfo.overviews.empty() && (poOwn == nullptr || poOwn->GetLevels().empty());
    if (const auto* const poPages = dynamic_cast<IPagedDataset*>(&oDataset))
        oInfo.furtherImages = poPages->CountFurtherImages();
    return oInfo;
}

} // namespace krv::operations
