#include "operations/edit/editing.h"

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/iplaceremoval.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/metadata/droppedtags.h"
#include "datasources/metadata/typednodata.h"
#include "gobs/mask/samplematch.h"
#include "operations/job/exceptions.h"
#include "operations/source/referencesystem.h"
#include "operations/source/sourcefile.h"
#include "toolkit/core/lettercase.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"

#include <fmt/format.h>

#include <algorithm>
#include <memory>
#include <set>

namespace krv::operations
{

using krv::datasources::AuxiliaryData;
using krv::datasources::IGeocodedDataset;
using krv::datasources::MetadataMap;
using krv::ogc::cs::GeocodingInfo;
using krv::ogc::cs::ICRS;
using CrsPointer = std::unique_ptr<ICRS>;

namespace
{

constexpr char NO_DATA[] = "NO_DATA_VALUE";
constexpr char COLOUR[] = "ColorInterp";
constexpr const char* DISPLAY[] = {"DefaultRed", "DefaultGreen", "DefaultBlue", "DefaultGray"};
constexpr const char* PLACES[] = {"GroundControlPoints", "RPC"};
// What a tag of that name says holds for the pixels of its own file alone.
constexpr const char* STORAGE[] = {"Photometric", "Orientation"};
constexpr const char* COLOURS[] = {"Gray", "Palette", "Red",    "Green", "Blue",     "Alpha",
                                   "Cyan", "Magenta", "Yellow", "Black", "Undefined"};

template <std::size_t N>
bool IsAmong(const std::string& key, const char* const (&aKeys)[N])
{
    return std::any_of(std::begin(aKeys), std::end(aKeys),
                       [&](const char* pKey) { return krv::ToUpper(key) == krv::ToUpper(pKey); });
}

bool IsTag(const std::string& key)
{
    return key != NO_DATA && !IsAmong(key, DISPLAY) && !IsAmong(key, PLACES) && !IsAmong(key, STORAGE) &&
           !IsAmong(key, {COLOUR});
}

// The record of a file as it is to be: what it says, and what changes about it.
class Record
{
public:
    explicit Record(const SourceFile& oFile) : moFile(oFile), moRecord(oFile.GetMetadata()) {}

    const AuxiliaryData& Get() const { return moRecord; }

    // Channel 0 is the file.
    bool Has(unsigned int nChannel, const std::string& key) const
    {
        return (nChannel == 0 ? moRecord.GetFileMetadata() : moRecord.GetChanMetadata(nChannel)).contains(key);
    }

    void Set(unsigned int nChannel, const std::string& key, const std::string& value)
    {
        if (nChannel == 0 && !value.empty())
            moRecord.SetFileMetadataValue(key, value);
        else if (nChannel == 0)
            moRecord.RemoveFileMetadataValue(key);
        else if (!value.empty())
            moRecord.SetChanMetadataValue(key, value, nChannel);
        else if (moRecord.GetChanMetadata(nChannel).contains(key))
            moRecord.RemoveChanMetadataValue(key, nChannel);
    }

    void SetNoData(const std::string& value, const std::vector<unsigned int>& oChannels)
    {
        for (const unsigned int nChannel : oChannels)
            Set(nChannel, NO_DATA, value);
        if (!oChannels.empty())
            return;
        Set(0, NO_DATA, value);
        for (unsigned int i = 1; i <= moRecord.GetChannelCount(); ++i)
            Set(i, NO_DATA, {});
    }

    void SetDescription(unsigned int nChannel, const std::string& text)
    {
        CheckChannel(nChannel);
        moRecord.SetChannelDescription(text, nChannel);
    }

    void SetColour(unsigned int nChannel, const std::string& name)
    {
        CheckChannel(nChannel);
        const auto pFound =
            std::find_if(std::begin(COLOURS), std::end(COLOURS),
                         [&](const char* pColour) { return krv::ToUpper(pColour) == krv::ToUpper(name); });
        if (!name.empty() && pFound == std::end(COLOURS))
            throw RequestException(
                fmt::format("\"{}\" is none of what a channel can show: {}", name, fmt::join(COLOURS, ", ")));
        Set(nChannel, COLOUR, name.empty() ? name : *pFound);
    }

    void SetDisplay(const std::vector<unsigned int>& oNumbers)
    {
        for (const char* const pKey : DISPLAY)
            Set(0, pKey, {});
        for (std::size_t i = 0; i < oNumbers.size(); ++i)
        {
            CheckChannel(oNumbers[i]);
            Set(0, DISPLAY[oNumbers.size() == 1 ? 3 : i], std::to_string(oNumbers[i]));
        }
    }

    void Copy(const SourceFile& oOther, unsigned int nParts)
    {
        const AuxiliaryData oTheirs = oOther.GetMetadata().GetCleanedMeta();
        CopyMap(oTheirs.GetFileMetadata(), 0, nParts);
        const unsigned int nChannels = std::min(moRecord.GetChannelCount(), oTheirs.GetChannelCount());
        for (unsigned int i = 1; i <= nChannels; ++i)
        {
            CopyMap(oTheirs.GetChanMetadata(i), i, nParts);
            if ((nParts & eEditDescriptions) != 0 && !oTheirs.GetChannelDescription(i).empty())
                moRecord.SetChannelDescription(oTheirs.GetChannelDescription(i), i);
        }
    }

    // Statistics of values that count no longer, or count anew, say nothing.
    void ForgetStatistics() { krv::datasources::DropStatistics(moRecord); }

private:
    void CheckChannel(unsigned int nChannel) const { (void)moFile.CheckChannels({nChannel}); }

    void CopyMap(MetadataMap oMap, unsigned int nChannel, unsigned int nParts)
    {
        krv::datasources::DropStatistics(oMap);
        const auto Wants = [nParts](const std::string& key)
        {
            if (krv::ToUpper(key) == NO_DATA)
                return (nParts & eEditNoData) != 0;
            if (IsAmong(key, DISPLAY))
                return (nParts & eEditDisplay) != 0;
            if (IsAmong(key, PLACES))
                return (nParts & eEditGeocoding) != 0;
            if (IsAmong(key, {COLOUR}))
                return (nParts & eEditColours) != 0;
            return IsTag(key) && (nParts & eEditTags) != 0;
        };
        for (const auto& [key, value] : oMap)
            if (!value.empty() && Wants(key))
                Set(nChannel, key, value);
    }

    const SourceFile& moFile;
    AuxiliaryData moRecord;
};

// What the file is to say of its place; nothing where that stays.
struct NewPlace
{
    std::optional<CrsPointer> crs; // null removes it
    std::optional<GeocodingInfo> geocoding;
};

GeocodingInfo PlaceOn(const PlacedBounds& oBounds, const SourceFile& oFile)
{
    if (!(oBounds.west < oBounds.east) || !(oBounds.south < oBounds.north))
        throw RequestException("the bounds are west,south,east,north: west is to be below east, south below north");
    const auto& oRaster = oFile.GetRaster();
    return {oBounds.west,
            (oBounds.east - oBounds.west) / oRaster.GetWidth(),
            0,
            oBounds.north,
            0,
            (oBounds.south - oBounds.north) / oRaster.GetHeight()};
}

void CopyPlace(const SourceFile& oFile, const SourceFile& oOther, unsigned int nParts, NewPlace& oPlace)
{
    CrsPointer poTheirs(oOther.GetDataset().ReadCRS());
    if ((nParts & eEditCrs) != 0 && poTheirs != nullptr)
        oPlace.crs = std::move(poTheirs);
    const auto* const poGeocoded = dynamic_cast<const IGeocodedDataset*>(&oOther.GetDataset());
    if ((nParts & eEditGeocoding) == 0 || poGeocoded == nullptr || poGeocoded->GetGeocoding().IsIdentity())
        return;
    const auto &oOurs = oFile.GetRaster(), &oRaster = oOther.GetRaster();
    if (oOurs.GetWidth() != oRaster.GetWidth() || oOurs.GetHeight() != oRaster.GetHeight())
        throw RequestException(
            fmt::format("{}: it is of {} x {} pixels, {} of {} x {}: the geocoding of one is not that of the other; "
                        "give the bounds",
                        oFile.GetName(), oOurs.GetWidth(), oOurs.GetHeight(), oOther.GetName(), oRaster.GetWidth(),
                        oRaster.GetHeight()));
    oPlace.geocoding = poGeocoded->GetGeocoding();
}

NewPlace FindPlace(const SourceFile& oFile, const SourceFile* poOther, const EditRequest& oRequest)
{
    NewPlace oPlace;
    if (poOther != nullptr)
        CopyPlace(oFile, *poOther, oRequest.parts, oPlace);
    if (oRequest.crs)
        oPlace.crs = oRequest.crs->empty() ? nullptr : ParseReferenceSystem(*oRequest.crs);
    if (oRequest.geocoding)
        oPlace.geocoding = oRequest.geocoding;
    if (oRequest.bounds)
        oPlace.geocoding = PlaceOn(*oRequest.bounds, oFile);
    if (oPlace.geocoding && !oPlace.geocoding->IsInvertible())
        throw RequestException("the geocoding lays all pixels on one line or point");
    return oPlace;
}

// A value that no pixel can have is stored all the same: it may be meant for another reader.
void WarnOfNoData(const SourceFile& oFile, const std::string& text, const std::vector<unsigned int>& oChannels)
{
    const auto oValue = krv::datasources::ParseNoData(text);
    for (const unsigned int nChannel : oFile.CheckChannels(oChannels))
    {
        const krv::gobs::DataType oType = oFile.GetType(nChannel);
        unsigned char aSample[16] = {};
        if (!oValue || oType.GetBits() == 1 || krv::gobs::StoreSample(*oValue, oType, aSample))
            continue;
        return krv::nspio::Warning::Warn(fmt::format("{}: no pixel of channel {} can have the no-data value {}: its "
                                                     "type is {}",
                                                     oFile.GetName(), nChannel, text, oType.Describe()));
    }
}

void EditRecord(Record& oRecord, const SourceFile& oFile, const SourceFile* poOther, const EditRequest& oRequest)
{
    const std::vector<unsigned int> oChannels =
        oRequest.channels.empty() ? oRequest.channels : oFile.CheckChannels(oRequest.channels);
    if (poOther != nullptr)
        oRecord.Copy(*poOther, oRequest.parts);
    if (oRequest.noData)
    {
        if (!oRequest.noData->empty() && !krv::datasources::ParseNoData(*oRequest.noData))
            throw RequestException(fmt::format("the no-data value \"{}\" is no number", *oRequest.noData));
        WarnOfNoData(oFile, *oRequest.noData, oChannels);
        oRecord.SetNoData(*oRequest.noData, oChannels);
    }
    for (const TagEdit& oTag : oRequest.tags)
    {
        if (oTag.key.empty())
            throw RequestException("a tag has a name in front of its value");
        for (const unsigned int nChannel : oChannels.empty() ? std::vector<unsigned int>{0} : oChannels)
        {
            if (!oTag.value && !oRecord.Has(nChannel, oTag.key))
                krv::nspio::Warning::Warn(fmt::format("{}: there is no tag {} to remove", oFile.GetName(), oTag.key));
            oRecord.Set(nChannel, oTag.key, oTag.value.value_or(""));
        }
    }
    for (const auto& [nChannel, text] : oRequest.descriptions)
        oRecord.SetDescription(nChannel, text);
    for (const auto& [nChannel, name] : oRequest.colours)
        oRecord.SetColour(nChannel, name);
    if (oRequest.display)
    {
        const std::size_t nNumbers = oRequest.display->size();
        if (nNumbers > 1 && nNumbers != 3)
            throw RequestException("a display is one channel as grey, or three as red, green and blue");
        oRecord.SetDisplay(*oRequest.display);
    }
}

// What a user calls that which a key says.
const char* KindOf(const std::string& key)
{
    if (krv::ToUpper(key) == NO_DATA)
        return "no-data";
    if (krv::ToUpper(key).starts_with("STATISTICS_"))
        return "statistics";
    if (IsAmong(key, {COLOUR}))
        return "colours";
    return IsAmong(key, DISPLAY) ? "display" : IsAmong(key, PLACES) ? "geocoding" : "tags";
}

// Keys without a value are as good as absent.
void AddMissing(const MetadataMap& oOne, const MetadataMap& oOther, std::set<std::string>& oKinds)
{
    for (const auto& [key, value] : oOne)
    {
        const auto oFound = oOther.find(key);
        if (oFound != oOther.end() ? oFound->second != value : !value.empty())
            oKinds.insert(KindOf(key));
    }
}

// In what two records differ.
std::set<std::string> ListDifferences(const AuxiliaryData& oOne, const AuxiliaryData& oOther)
{
    std::set<std::string> oKinds;
    AddMissing(oOne.GetFileMetadata(), oOther.GetFileMetadata(), oKinds);
    AddMissing(oOther.GetFileMetadata(), oOne.GetFileMetadata(), oKinds);
    for (unsigned int i = 1; i <= oOne.GetChannelCount(); ++i)
    {
        AddMissing(oOne.GetChanMetadata(i), oOther.GetChanMetadata(i), oKinds);
        AddMissing(oOther.GetChanMetadata(i), oOne.GetChanMetadata(i), oKinds);
        if (oOne.GetChannelDescription(i) != oOther.GetChannelDescription(i))
            oKinds.insert("descriptions");
    }
    return oKinds;
}

template <class Facet>
Facet& Require(const SourceFile& oFile, const char* pWhat)
{
    auto* const poFacet = dynamic_cast<Facet*>(&oFile.GetDataset());
    if (poFacet == nullptr)
        throw krv::DataException(
            fmt::format("{}: {} in a file of this format; convert it to TIF first", oFile.GetName(), pWhat));
    return *poFacet;
}

bool StoreCrs(const SourceFile& oFile, const CrsPointer& poCrs)
{
    const CrsPointer poOld(oFile.GetDataset().ReadCRS());
    if (poCrs == nullptr ? poOld == nullptr
                         : poOld != nullptr && poOld->IsEquivalent(*poCrs) && poOld->GetEPSG() == poCrs->GetEPSG())
        return false;
    if (poCrs != nullptr)
        oFile.GetDataset().UpdateCRS(*poCrs);
    else
        Require<krv::datasources::IPlaceRemoval>(oFile, "the reference system cannot be removed").RemoveCRS();
    return true;
}

bool StoreGeocoding(const SourceFile& oFile, const GeocodingInfo& oInfo)
{
    auto& oGeocoded = Require<IGeocodedDataset>(oFile, "the place cannot be written");
    if (oGeocoded.GetGeocoding() == oInfo)
        return false;
    if (oInfo.IsIdentity())
        Require<krv::datasources::IPlaceRemoval>(oFile, "the geocoding cannot be removed").RemoveGeocoding();
    else
        oGeocoded.SetGeocoding(oInfo);
    return true;
}

bool IsRemoval(const EditRequest& oRequest, const NewPlace& oPlace)
{
    return (oRequest.noData && oRequest.noData->empty()) || (oPlace.crs && *oPlace.crs == nullptr) ||
           (oPlace.geocoding && oPlace.geocoding->IsIdentity()) ||
           std::any_of(oRequest.tags.begin(), oRequest.tags.end(), [](const TagEdit& oTag) { return !oTag.value; });
}

// What was removed and is there all the same: a file may say it by other means than a tag, or another file beside it.
// oTags and oPlaced: what the record changed about, and the place; afterwards what changed indeed.
void TellWhatStays(const std::string& file, const EditRequest& oRequest, const NewPlace& oPlace,
                   const AuxiliaryData& oBefore, std::set<std::string>& oTags, std::set<std::string>& oPlaced)
{
    const SourceFile oNow(file);
    const AuxiliaryData& oRecord = oNow.GetMetadata();
    const auto Tell = [&file](const std::string& what)
    {
        krv::nspio::Warning::Warn(fmt::format("{}: {} stays: the file says it by other means than a tag of its own, or "
                                              "another file beside it says it",
                                              file, what));
    };
    const auto TellTag = [&](const std::string& key, const std::string& what)
    {
        std::vector<unsigned int> oChannels = oRequest.channels;
        if (oChannels.empty())
            oChannels.push_back(0);
        for (const unsigned int nChannel : oChannels)
        {
            const MetadataMap& oMap = nChannel == 0 ? oRecord.GetFileMetadata() : oRecord.GetChanMetadata(nChannel);
            if (const auto oFound = oMap.find(key); oFound != oMap.end() && !oFound->second.empty())
                return Tell(what);
        }
    };
    for (const TagEdit& oTag : oRequest.tags)
        if (!oTag.value)
            TellTag(oTag.key, "the tag " + oTag.key);
    if (oRequest.noData && oRequest.noData->empty())
        TellTag(NO_DATA, "the no-data value");
    oTags = ListDifferences(oRecord, oBefore);
    const auto CheckRemoved = [&](const char* pKind, bool bGone, const char* pWhat)
    {
        if (bGone)
            return;
        Tell(pWhat);
        oPlaced.erase(pKind);
    };
    if (oPlace.crs && *oPlace.crs == nullptr)
        CheckRemoved("crs", CrsPointer(oNow.GetDataset().ReadCRS()) == nullptr, "the reference system");
    const auto* const poGeocoded = dynamic_cast<const IGeocodedDataset*>(&oNow.GetDataset());
    if (oPlace.geocoding && oPlace.geocoding->IsIdentity())
        CheckRemoved("geocoding", poGeocoded == nullptr || poGeocoded->GetGeocoding().IsIdentity(), "the geocoding");
}

} // namespace

EditResult EditFile(const std::string& file, const EditRequest& oRequest)
{
    const std::unique_ptr<const SourceFile> poOther(oRequest.like.empty() ? nullptr : new SourceFile(oRequest.like));
    const SourceFile oFile(file, eUpdate);
    (void)oFile.GetRaster();
    Record oRecord(oFile);
    EditRecord(oRecord, oFile, poOther.get(), oRequest);
    const NewPlace oPlace = FindPlace(oFile, poOther.get(), oRequest);
    EditResult oResult;
    const auto HasOtherNoData = [&](unsigned int nChannel)
    {
        return krv::datasources::GetNoDataText(oRecord.Get(), nChannel) != oFile.GetNoDataText(nChannel);
    };
    const auto oAll = oFile.CheckChannels({});
    if (std::any_of(oAll.begin(), oAll.end(), HasOtherNoData))
    {
        oRecord.ForgetStatistics();
        const std::unique_ptr<krv::datasources::IOverviewManager> poLevels(oFile.GetRaster().GetOverviewManager());
        oResult.levels = poLevels != nullptr && !poLevels->GetLevels().empty();
    }
    // The record comes first: it may hold control points, which a geocoding takes the place of.
    const AuxiliaryData oBefore = oFile.GetMetadata();
    std::set<std::string> oKinds = ListDifferences(oRecord.Get(), oBefore);
    if (!oKinds.empty())
        oFile.GetDataset().WriteAuxiliaryData(oRecord.Get());
    std::set<std::string> oPlaced;
    if (oPlace.crs && StoreCrs(oFile, *oPlace.crs))
        oPlaced.insert("crs");
    if (oPlace.geocoding && StoreGeocoding(oFile, *oPlace.geocoding))
        oPlaced.insert("geocoding");
    oFile.GetDataset().Close();
    if (IsRemoval(oRequest, oPlace))
        TellWhatStays(file, oRequest, oPlace, oBefore, oKinds, oPlaced);
    oKinds.merge(oPlaced);
    oResult.changed.assign(oKinds.begin(), oKinds.end());
    return oResult;
}

} // namespace krv::operations
