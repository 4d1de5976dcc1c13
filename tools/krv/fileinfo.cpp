#include "tools/krv/fileinfo.h"

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/ifileformat.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/imathmodeldataset.h"
#include "datasources/interfaces/ipageddataset.h"
#include "datasources/interfaces/ipctdataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/istoragedataset.h"
#include "datasources/metadata/displaydefaults.h"
#include "datasources/metadata/referencetag.h"
#include "datasources/reader/ioverviewaccessor.h"
#include "datasources/reader/irasterreader.h"
#include "gobs/pct/pct.h"
#include "operations/source/sourcefile.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/ogc/cs/icrs.h"
#include "tools/krv/errors.h"

#include <memory>
#include <optional>

namespace krv::tool
{

using namespace krv::operations;

using namespace krv::datasources;

namespace
{

Json MapToJson(const MetadataMap& oMap)
{
    // The keys differ, so none is searched for: an ordered object would compare it with all before.
    Json oJson = Json::object();
    auto& oEntries = oJson.get_ref<Json::object_t&>();
    oEntries.reserve(oMap.size());
    for (const auto& [key, value] : oMap)
        oEntries.emplace_back(key, value);
    return oJson;
}

Json ReferenceToJson(bool bFound, const std::string& file, const std::string& layer, unsigned int nNumber)
{
    return bFound ? Json{{"file", file}, {"layer", TextOrNull(layer)}, {"number", nNumber}} : Json(nullptr);
}

// The tables that the channel's tags refer to.
void AddReferences(const AuxiliaryData& oMetadata, unsigned int nChannel, Json& oJson)
{
    std::string file, layer;
    unsigned int nNumber = 0;
    const bool bLut =
        ParseRefMetadataTag(oMetadata.GetChanMetadataValue("DEFAULT_LUT_REF", nChannel), file, layer, nNumber);
    oJson["defaultLUT"] = ReferenceToJson(bLut, file, layer, nNumber);
    const bool bPct =
        ParseRefMetadataTag(oMetadata.GetChanMetadataValue("DEFAULT_PCT_REF", nChannel), file, layer, nNumber);
    oJson["defaultPCT"] = ReferenceToJson(bPct, file, layer, nNumber);
}

Json ChannelToJson(const SourceFile& oFile, unsigned int nChannel)
{
    const AuxiliaryData& oMetadata = oFile.GetMetadata();
    const std::unique_ptr<IChannelInfo> poInfo(oFile.GetRaster().GetChannelInfo(nChannel));
    const bool bKnown = nChannel <= oMetadata.GetChannelCount();
    Json oJson;
    oJson["number"] = nChannel;
    oJson["type"] = poInfo->GetDataType().Describe();
    oJson["description"] = bKnown ? TextOrNull(oMetadata.GetChannelDescription(nChannel)) : Json(nullptr);
    oJson["noData"] = TextOrNull(oFile.GetNoDataText(nChannel));
    oJson["metadata"] = bKnown ? MapToJson(oMetadata.GetChanMetadata(nChannel)) : Json::object();
    oJson["storedType"] = poInfo->GetNativeDataType().Describe();
    if (bKnown)
        AddReferences(oMetadata, nChannel, oJson);
    return oJson;
}

// The identity means that there is no geocoding, unless the file names a reference system: then the image lies in it by
// that transform, or else by ground control points.
Json GeocodingToJson(const SourceFile& oFile, bool bHasCrs)
{
    const auto* const poGeocoded = dynamic_cast<IGeocodedDataset*>(&oFile.GetDataset());
    const bool bPlaced = bHasCrs && oFile.GetMetadata().GetFileMetadataValue("GroundControlPoints").empty();
    if (poGeocoded == nullptr || (poGeocoded->GetGeocoding().IsIdentity() && !bPlaced))
        return nullptr;
    Json oTerms = Json::array();
    for (const double nTerm : poGeocoded->GetGeocoding().GetTerms())
        oTerms.push_back(nTerm);
    return oTerms;
}

Json CrsToJson(const SourceFile& oFile)
{
    const std::unique_ptr<krv::ogc::cs::ICRS> poCrs(oFile.GetDataset().ReadCRS());
    if (poCrs == nullptr)
        return nullptr;
    const int nEpsg = poCrs->GetEPSG();
    return {{"name", poCrs->GetName()}, {"epsg", nEpsg != 0 ? Json(nEpsg) : Json(nullptr)}, {"wkt", poCrs->GetWKT()}};
}

// A part that cannot be read leaves the others to be shown.
template <typename Part>
Json Attempt(const SourceFile& oFile, const char* pWhat, Json oOtherwise, Part oPart)
{
    try
    {
        return oPart();
    }
    catch (const krv::Exception&)
    {
        krv::nspio::Warning::Warn(oFile.GetName() + ": " + pWhat + " cannot be read: " + CurrentMessage(),
                                  "tools/krv/fileinfo", 0);
        return oOtherwise;
    }
}

// Null where the format has no such files.
Json FurtherImagesToJson(const SourceFile& oFile)
{
    const auto* const poPages = dynamic_cast<IPagedDataset*>(&oFile.GetDataset());
    return poPages != nullptr ? Json(poPages->CountFurtherImages()) : Json(nullptr);
}

Json OverviewsToJson(IRasterReader& oReader)
{
    Json oLevels = Json::array();
    const std::unique_ptr<IOverviewReaderAccessor> poAccessor(oReader.GetOverviewReaderAccessor());
    if (poAccessor == nullptr)
        return oLevels;
    for (const unsigned int nLevel : poAccessor->GetLevels())
    {
        const std::unique_ptr<IRasterReader> poLevel(poAccessor->CreateRasterReader(nLevel));
        oLevels.push_back({{"level", nLevel}, {"width", poLevel->GetWidth()}, {"height", poLevel->GetHeight()}});
    }
    return oLevels;
}

Json BitmapsToJson(const SourceFile& oFile)
{
    Json oList = Json::array();
    const auto* const poBitmaps = dynamic_cast<IBitmapDataset*>(&oFile.GetDataset());
    if (poBitmaps == nullptr)
        return oList;
    const unsigned int nMask = krv::datasources::FindValidityMask(*poBitmaps);
    for (const unsigned int nBitmap : poBitmaps->GetBitmapList())
        oList.push_back({{"number", nBitmap},
                         {"description", TextOrNull(poBitmaps->GetBitmapDescription(nBitmap))},
                         {"validity", nBitmap == nMask}});
    return oList;
}

Json TablesToJson(const SourceFile& oFile)
{
    Json oList = Json::array();
    const auto* const poTables = dynamic_cast<IPCTDataset*>(&oFile.GetDataset());
    if (poTables == nullptr)
        return oList;
    for (const unsigned int nTable : poTables->GetPCTList())
    {
        const std::unique_ptr<krv::gobs::PCT> poTable(poTables->GetPCT(nTable));
        oList.push_back({{"number", nTable},
                         {"channel", poTables->GetPCTChannel(nTable)},
                         {"description", TextOrNull(poTables->GetPCTDescription(nTable))},
                         {"entries", poTable != nullptr ? poTable->GetEntries().size() : 0}});
    }
    return oList;
}

Json MathModelsToJson(const SourceFile& oFile)
{
    const auto* const poModels = dynamic_cast<IMathModelDataset*>(&oFile.GetDataset());
    return poModels != nullptr ? Json(poModels->GetMathModelList()) : Json::array();
}

Json UnusedToJson(const SourceFile& oFile)
{
    auto* const poStorage = dynamic_cast<IStorageDataset*>(&oFile.GetDataset());
    const std::optional<std::uint64_t> oBytes = poStorage != nullptr ? poStorage->GetUnusedBytes() : std::nullopt;
    return oBytes ? Json(*oBytes) : Json(nullptr);
}

Json DisplayToJson(const SourceFile& oFile)
{
    const AuxiliaryData& oMetadata = oFile.GetMetadata();
    const auto OrNull = [](unsigned int nChannel)
    {
        return nChannel != 0 ? Json(nChannel) : Json(nullptr);
    };
    return {{"red", OrNull(GetDefaultRed(oMetadata))},
            {"green", OrNull(GetDefaultGreen(oMetadata))},
            {"blue", OrNull(GetDefaultBlue(oMetadata))},
            {"gray", OrNull(GetDefaultGrey(oMetadata))}};
}

} // namespace

Json GatherInfo(const SourceFile& oFile)
{
    const IRasterDataset& oRaster = oFile.GetRaster();
    const auto oGroups = oFile.GroupByType(oFile.CheckChannels({}));
    const LevelReader oReader = oFile.Read(oGroups.front().channels);
    const IFileFormat* const poFormat = oFile.GetDataset().GetFileFormat();

    Json oJson;
    oJson["file"] = oFile.GetName();
    oJson["format"] = poFormat != nullptr ? Json(poFormat->GetShortName()) : Json(nullptr);
    oJson["width"] = oRaster.GetWidth();
    oJson["height"] = oRaster.GetHeight();
    oJson["blockWidth"] = oReader.Get().GetTileWidth();
    oJson["blockHeight"] = oReader.Get().GetTileHeight();
    oJson["channels"] = Json::array();
    for (unsigned int i = 1; i <= oRaster.GetChanCount(); ++i)
        oJson["channels"].push_back(ChannelToJson(oFile, i));
    oJson["metadata"] = MapToJson(oFile.GetMetadata().GetFileMetadata());
    const Json oCrs = Attempt(oFile, "the reference system", nullptr, [&] { return CrsToJson(oFile); });
    oJson["geocoding"] = GeocodingToJson(oFile, !oCrs.is_null());
    oJson["crs"] = oCrs;
    oJson["overviews"] = Attempt(oFile, "the levels", Json::array(), [&] { return OverviewsToJson(oReader.Get()); });
    oJson["bitmaps"] = Attempt(oFile, "the bitmaps", Json::array(), [&] { return BitmapsToJson(oFile); });
    oJson["mathModels"] = MathModelsToJson(oFile);
    oJson["colourTables"] = Attempt(oFile, "the colour tables", Json::array(), [&] { return TablesToJson(oFile); });
    oJson["displayDefaults"] = DisplayToJson(oFile);
    oJson["unusedBytes"] = UnusedToJson(oFile);
    oJson["furtherImages"] = FurtherImagesToJson(oFile);
    return oJson;
}

} // namespace krv::tool
