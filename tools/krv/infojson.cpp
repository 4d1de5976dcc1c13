#include "tools/krv/infotext.h"

namespace krv::tool
{

using namespace krv::operations;

namespace
{

template <typename Value>
Json OrNull(const std::optional<Value>& oValue)
{
    return oValue ? Json(*oValue) : Json();
}

Json NumberOrNull(unsigned int nNumber)
{
    return nNumber != 0 ? Json(nNumber) : Json();
}

Json MapToJson(const krv::datasources::MetadataMap& oMap)
{
    // The keys differ, so none is searched for: an ordered object would compare it with all before.
    Json oJson = Json::object();
    auto& oEntries = oJson.get_ref<Json::object_t&>();
    oEntries.reserve(oMap.size());
    for (const auto& [key, value] : oMap)
        oEntries.emplace_back(key, value);
    return oJson;
}

Json ReferenceToJson(const std::optional<TableReference>& oTable)
{
    return oTable ? Json{{"file", oTable->file}, {"layer", TextOrNull(oTable->layer)}, {"number", oTable->number}}
                  : Json();
}

Json ChannelToJson(const ChannelFacts& oChannel)
{
    Json oJson{{"number", oChannel.number},
               {"type", oChannel.type.Describe()},
               {"description", TextOrNull(oChannel.description)},
               {"noData", TextOrNull(oChannel.noDataText)},
               {"metadata", MapToJson(oChannel.metadata)},
               {"storedType", oChannel.storedType.Describe()}};
    if (oChannel.recorded)
    {
        oJson["defaultLUT"] = ReferenceToJson(oChannel.defaultLut);
        oJson["defaultPCT"] = ReferenceToJson(oChannel.defaultPct);
    }
    return oJson;
}

Json CrsToJson(const std::optional<CrsFacts>& oCrs)
{
    return oCrs ? Json{{"name", oCrs->name}, {"epsg", oCrs->epsg != 0 ? Json(oCrs->epsg) : Json()}, {"wkt", oCrs->wkt}}
                : Json();
}

Json ToJson(const LevelFacts& oLevel)
{
    return {{"level", oLevel.level}, {"width", oLevel.width}, {"height", oLevel.height}, {"valid", oLevel.valid}};
}

Json ToJson(const BitmapFacts& oBitmap)
{
    return {
        {"number", oBitmap.number}, {"description", TextOrNull(oBitmap.description)}, {"validity", oBitmap.validity}};
}

Json ToJson(const ColourTableFacts& oTable)
{
    return {{"number", oTable.number},
            {"channel", oTable.channel},
            {"description", TextOrNull(oTable.description)},
            {"entries", oTable.entries}};
}

Json ToJson(const MathModelFacts& oModel)
{
    return {{"number", oModel.number}, {"kind", TextOrNull(oModel.kind)}, {"accuracy", OrNull(oModel.accuracy)}};
}

Json NumbersToJson(const std::vector<MathModelFacts>& oModels)
{
    Json oList = Json::array();
    for (const MathModelFacts& oModel : oModels)
        oList.push_back(oModel.number);
    return oList;
}

Json ToJson(const krv::datasources::Sidecar& oSidecar)
{
    return {{"file", oSidecar.moFile},
            {"says", oSidecar.moSays},
            {"used", oSidecar.mbUsed},
            {"trouble", TextOrNull(oSidecar.moTrouble)}};
}

// The file's own block; the preferred tile where the format does not tell.
Json StorageToJson(const FileInfo& oInfo)
{
    const auto& oStorage = oInfo.storage;
    Json oJson{{"variant", TextOrNull(oInfo.variant)}, {"bytes", OrNull(oInfo.fileBytes)}};
    oJson["layout"] = oStorage ? Json(oStorage->tiled ? "tiles" : "strips") : Json();
    oJson["compression"] = oStorage ? TextOrNull(oStorage->compression) : Json();
    oJson["lossy"] = oStorage ? Json(oStorage->lossy) : Json();
    oJson["predictor"] = oStorage ? Json(oStorage->predictor) : Json();
    oJson["interleave"] = oStorage ? Json(oStorage->separate ? "band" : "pixel") : Json();
    oJson["byteOrder"] = oStorage ? Json(oStorage->bigEndian ? "big" : "little") : Json();
    return oJson;
}

// West, south, east, north.
template <typename Bounds>
Json BoundsToJson(const std::optional<Bounds>& oBounds)
{
    return oBounds ? Json::array({oBounds->west, oBounds->south, oBounds->east, oBounds->north}) : Json();
}

Json PixelSizeToJson(const std::optional<PixelSize>& oSize)
{
    return oSize ? Json{{"x", oSize->x}, {"y", oSize->y}, {"unit", TextOrNull(oSize->unit)}} : Json();
}

Json CloudToJson(const std::optional<std::vector<std::string>>& oReasons)
{
    return oReasons ? Json{{"valid", oReasons->empty()}, {"reasons", *oReasons}} : Json();
}

template <typename Facts>
Json ListToJson(const std::vector<Facts>& oFacts)
{
    Json oList = Json::array();
    for (const Facts& oEntry : oFacts)
        oList.push_back(ToJson(oEntry));
    return oList;
}

// 2: blocks are the file's own, with what was not there before.
constexpr int INFO_VERSION = 2;

} // namespace

const char* PlacedByText(PlacedBy eKind)
{
    switch (eKind)
    {
    case PlacedBy::eModel:
        return "sensor model";
    case PlacedBy::ePoints:
        return "control points";
    default:
        return "transform";
    }
}

Json InfoToJson(const FileInfo& oInfo)
{
    Json oChannels = Json::array();
    for (const ChannelFacts& oChannel : oInfo.channels)
        oChannels.push_back(ChannelToJson(oChannel));
    const auto& oDisplay = oInfo.displayDefaults;
    return {{"file", oInfo.file},
            {"format", OrNull(oInfo.format)},
            {"width", oInfo.width},
            {"height", oInfo.height},
            {"blockWidth", oInfo.storage ? oInfo.storage->blockWidth : oInfo.tileWidth},
            {"blockHeight", oInfo.storage ? oInfo.storage->blockHeight : oInfo.tileHeight},
            {"channels", oChannels},
            {"metadata", MapToJson(oInfo.metadata)},
            {"geocoding", OrNull(oInfo.geocoding)},
            {"crs", CrsToJson(oInfo.crs)},
            {"overviews", ListToJson(oInfo.overviews)},
            {"bitmaps", ListToJson(oInfo.bitmaps)},
            {"mathModels", NumbersToJson(oInfo.mathModels)},
            {"colourTables", ListToJson(oInfo.colourTables)},
            {"displayDefaults",
             {{"red", NumberOrNull(oDisplay[0])},
              {"green", NumberOrNull(oDisplay[1])},
              {"blue", NumberOrNull(oDisplay[2])},
              {"gray", NumberOrNull(oDisplay[3])}}},
            {"unusedBytes", OrNull(oInfo.unusedBytes)},
            {"furtherImages", OrNull(oInfo.furtherImages)},
            {"sidecars", ListToJson(oInfo.sidecars)},
            {"models", ListToJson(oInfo.mathModels)},
            {"linkedFiles", oInfo.linkedFiles},
            {"version", INFO_VERSION},
            {"preferredTile", {{"width", oInfo.tileWidth}, {"height", oInfo.tileHeight}}},
            {"storage", StorageToJson(oInfo)},
            {"placedBy", oInfo.placedBy ? Json(PlacedByText(*oInfo.placedBy)) : Json()},
            {"bounds", BoundsToJson(oInfo.bounds)},
            {"boundsLonLat", BoundsToJson(oInfo.geographic)},
            {"pixelSize", PixelSizeToJson(oInfo.pixelSize)},
            {"cloudLayout", CloudToJson(oInfo.cloudReasons)}};
}

} // namespace krv::tool
