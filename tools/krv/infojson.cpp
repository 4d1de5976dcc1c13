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
    return {{"level", oLevel.level}, {"width", oLevel.width}, {"height", oLevel.height}};
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

template <typename Facts>
Json ListToJson(const std::vector<Facts>& oFacts)
{
    Json oList = Json::array();
    for (const Facts& oEntry : oFacts)
        oList.push_back(ToJson(oEntry));
    return oList;
}

} // namespace

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
            {"blockWidth", oInfo.blockWidth},
            {"blockHeight", oInfo.blockHeight},
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
            {"linkedFiles", oInfo.linkedFiles}};
}

} // namespace krv::tool
