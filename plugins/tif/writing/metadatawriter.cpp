#include "plugins/tif/writing/metadatawriter.h"

#include "plugins/tif/geo/geowriter.h"
#include "plugins/tif/reading/metadata.h"
#include "plugins/tif/reading/tiffvalues.h"
#include "plugins/tif/writing/metadataitems.h"
#include "toolkit/core/numbertext.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/mathmodel/rpccoefficients.h"

#include <algorithm>
#include <cmath>
#include <functional>
#include <map>
#include <optional>
#include <set>
#include <sstream>
#include <string_view>
#include <utility>
#include <vector>

#include <tiff.h>

namespace krv::plugins::tif
{

namespace
{

using krv::datasources::AuxiliaryData;
using krv::datasources::MetadataMap;

constexpr std::size_t DATE_CHARACTERS = 19;
// Eleven such texts, the items and what else a page has stay below what is read of one.
constexpr std::size_t MAXIMUM_TEXT_BYTES = std::size_t{6} << 20;
constexpr std::size_t POINT_VALUES = 5;

// Numbers separated by blanks that read back as the same text; no value for anything else.
std::optional<std::vector<double>> ParseNumbers(const std::string& text)
{
    std::vector<double> oNumbers;
    std::string again;
    std::istringstream oWords(text);
    for (std::string word; oWords >> word;)
    {
        const std::optional<double> oNumber = ParseNumber<double>(word);
        if (!oNumber)
            return std::nullopt;
        oNumbers.push_back(*oNumber);
        again += (again.empty() ? "" : " ") + NumberText(*oNumber);
    }
    return again == text ? std::optional(oNumbers) : std::nullopt;
}

class MetadataWriter
{
public:
    // The editor outlives it.
    MetadataWriter(FileEditor& oEditor, const std::shared_ptr<PageModel>& poPage)
        : moEditor(oEditor), mpoPage(poPage), moGeography(oEditor, poPage)
    {
    }

    void Write(const AuxiliaryData& oNew, const Place& oPlace)
    {
        moEditor.LoadTags(*mpoPage);
        const AuxiliaryData oOld = ReadMetadata(*moEditor.OpenPage(mpoPage));
        if (oNew.GetChannelCount() != oOld.GetChannelCount())
            throw DataException(moEditor.GetFileName() + ": the metadata are of " +
                                    std::to_string(oNew.GetChannelCount()) + " channels, the image has " +
                                    std::to_string(oOld.GetChannelCount()),
                                oPlace);
        FindChanges(oOld, oNew);
        const MetadataKey oUnit{0, "ResolutionUnit"};
        for (const MetadataKey& oKey : moChanged)
            if (oKey.mnChannel == 0 && StoreInTag(oKey.moKey, oNew.GetFileMetadataValue(oKey.moKey)))
                SayElsewhere(oKey);
        // It goes with the resolutions, which come first.
        if (moChanged.contains(oUnit) && StoreUnit(oNew.GetFileMetadataValue(oUnit.moKey)))
            SayElsewhere(oUnit);
        StoreColours(oNew);
        StoreItems(oNew, oPlace);
    }

private:
    // Only a key in the very letters of its tag.
    void SayElsewhere(const MetadataKey& oKey)
    {
        const auto oFound = moChanged.find(oKey);
        if (oFound != moChanged.end() && oFound->moKey == oKey.moKey)
            moElsewhere.insert(oKey);
    }

    void Compare(unsigned int nChannel, const MetadataMap& oOld, const MetadataMap& oNew)
    {
        for (const auto& [key, value] : oOld)
            if (!value.empty() && !oNew.contains(key))
                moChanged.insert({nChannel, key});
        for (const auto& [key, value] : oNew)
        {
            const auto oFound = oOld.find(key);
            const bool bOther = oFound != oOld.end() && (oFound->second != value || oFound->first != key);
            if (bOther || (oFound == oOld.end() && !value.empty()))
                moChanged.insert({nChannel, key});
        }
    }

    void FindChanges(const AuxiliaryData& oOld, const AuxiliaryData& oNew)
    {
        Compare(0, oOld.GetFileMetadata(), oNew.GetFileMetadata());
        for (unsigned int nChannel = 1; nChannel <= oNew.GetChannelCount(); ++nChannel)
        {
            Compare(nChannel, oOld.GetChanMetadata(nChannel), oNew.GetChanMetadata(nChannel));
            if (oOld.GetChannelDescription(nChannel) != oNew.GetChannelDescription(nChannel))
                moChanged.insert({nChannel, {}, true});
        }
    }

    // Whether the key's tag says the value now, so that no item has to.
    bool StoreInTag(const std::string& key, const std::string& value)
    {
        for (const TextTag& oText : TEXTS)
            if (IsSameKey(key, oText.mpKey))
                return StoreText(oText.mnTag, value) && key == oText.mpKey; // else an item says how it is written
        const std::pair<const char*, std::function<bool()>> oOthers[] = {
            {"XResolution",
             [&]
             {
                 return StoreResolution(TIFFTAG_XRESOLUTION, value);
             }},
            {"YResolution",
             [&]
             {
                 return StoreResolution(TIFFTAG_YRESOLUTION, value);
             }},
            {"Orientation",
             [&]
             {
                 return StoreNumber(TIFFTAG_ORIENTATION, value, 2, 8);
             }},
            {"Photometric",
             [&]
             {
                 return StorePhotometric(value);
             }},
            {"RasterType",
             [&]
             {
                 return StoreRasterType(value);
             }},
            {"RPC",
             [&]
             {
                 return StoreRpc(value);
             }},
            {"GroundControlPoints", [&]
             {
                 return StorePoints(value);
             }}};
        for (const auto& [pKey, oStore] : oOthers)
            if (IsSameKey(key, pKey))
                return oStore() && key == pKey;
        return false;
    }

    bool StoreText(std::uint16_t nTag, const std::string& value)
    {
        const bool bDate = nTag == TIFFTAG_DATETIME && !value.empty() && value.size() != DATE_CHARACTERS;
        const bool bLong = value.size() > (nTag == TIFFTAG_XMLPACKET ? MAXIMUM_XMP_BYTES : MAXIMUM_TEXT_BYTES);
        if (bDate || bLong || value.find('\0') != std::string::npos)
        {
            mpoPage->moTags.Remove(nTag);
            return false;
        }
        if (nTag == TIFFTAG_XMLPACKET && !value.empty())
            mpoPage->moTags.SetBytes(nTag, TIFF_BYTE, value);
        else
            mpoPage->moTags.SetText(nTag, value);
        return true;
    }

    // A fraction that gives the same number as the text: whole, or over a power of two or ten.
    bool StoreResolution(std::uint16_t nTag, const std::string& value)
    {
        mpoPage->moTags.Remove(nTag);
        if (value.empty())
            return true;
        const std::optional<std::vector<double>> oNumbers = ParseNumbers(value);
        if (!oNumbers || oNumbers->size() != 1 || !(oNumbers->front() > 0))
            return false;
        for (const double nBase : {10.0, 2.0})
            for (double nBelow = 1; nBelow <= 1e9; nBelow *= nBase)
            {
                const double nAbove = std::nearbyint(oNumbers->front() * nBelow);
                if (nAbove > UINT32_MAX)
                    break;
                if (NumberText(static_cast<float>(nAbove / nBelow)) != value)
                    continue;
                Tag oTag{nTag, TIFF_RATIONAL, 1, {}, {}};
                AppendNumber(oTag.moBytes, static_cast<std::uint64_t>(nAbove), 4, mpoPage->moTags.IsBigEndian());
                AppendNumber(oTag.moBytes, static_cast<std::uint64_t>(nBelow), 4, mpoPage->moTags.IsBigEndian());
                mpoPage->moTags.Set(std::move(oTag));
                return true;
            }
        return false;
    }

    bool StoreUnit(const std::string& value)
    {
        mpoPage->moTags.Remove(TIFFTAG_RESOLUTIONUNIT);
        const bool bUsed = mpoPage->moTags.Find(TIFFTAG_XRESOLUTION) != nullptr ||
                           mpoPage->moTags.Find(TIFFTAG_YRESOLUTION) != nullptr;
        for (std::size_t nUnit = 1; bUsed && nUnit < std::size(RESOLUTION_UNITS); ++nUnit)
            if (value == RESOLUTION_UNITS[nUnit])
            {
                mpoPage->moTags.SetNumber(TIFFTAG_RESOLUTIONUNIT, TIFF_SHORT, nUnit);
                return true;
            }
        return value.empty();
    }

    bool StoreNumber(std::uint16_t nTag, const std::string& value, unsigned int nFrom, unsigned int nTo)
    {
        mpoPage->moTags.Remove(nTag);
        for (unsigned int nNumber = nFrom; nNumber <= nTo; ++nNumber)
            if (value == std::to_string(nNumber))
            {
                mpoPage->moTags.SetNumber(nTag, TIFF_SHORT, nNumber);
                return true;
            }
        return value.empty();
    }

    // How stored values are to be seen, as long as the colours keep their number: values themselves never change.
    bool StorePhotometric(const std::string& value)
    {
        TagList& oTags = mpoPage->moTags;
        const std::uint64_t nOld = oTags.GetNumber(TIFFTAG_PHOTOMETRIC, PHOTOMETRIC_MINISBLACK);
        const bool bGrey = nOld == PHOTOMETRIC_MINISBLACK || nOld == PHOTOMETRIC_MINISWHITE;
        if (!bGrey || (value != "MinIsWhite" && !value.empty()))
            return false;
        oTags.SetNumber(TIFFTAG_PHOTOMETRIC, TIFF_SHORT,
                        value.empty() ? PHOTOMETRIC_MINISBLACK : PHOTOMETRIC_MINISWHITE);
        return true;
    }

    bool StoreRasterType(const std::string& value)
    {
        if (value == "Area" || value == "Point")
            moGeography.SetRasterType(value == "Point");
        else
            moGeography.RemoveRasterType();
        return value == "Area" || value == "Point" || value.empty();
    }

    bool StoreRpc(const std::string& value)
    {
        mpoPage->moTags.Remove(TAG_RPC);
        const std::optional<std::vector<double>> oNumbers = ParseNumbers(value);
        if (value.empty() || !oNumbers || oNumbers->size() != krv::mathmodel::RpcCoefficients::COUNT)
            return value.empty();
        mpoPage->moTags.SetDoubles(TAG_RPC, *oNumbers);
        return true;
    }

    bool StorePoints(const std::string& value)
    {
        krv::ogc::cs::GeocodingInfo oInfo;
        if (ReadGeocoding(moEditor.OpenPage(mpoPage)->GetTiff(), oInfo))
            return value.empty();
        std::vector<TiePoint> oPoints;
        std::istringstream oParts(value);
        for (std::string part; std::getline(oParts, part, ';');)
        {
            const std::size_t nBlank = oPoints.empty() ? 0 : 1;
            const std::optional<std::vector<double>> oNumbers =
                ParseNumbers(part.size() >= nBlank ? part.substr(nBlank) : part);
            if (!oNumbers || oNumbers->size() != POINT_VALUES)
                return false;
            oPoints.push_back({(*oNumbers)[0], (*oNumbers)[1], (*oNumbers)[2], (*oNumbers)[3], (*oNumbers)[4]});
        }
        moGeography.SetTiePoints(oPoints);
        return ReadMetadata(*moEditor.OpenPage(mpoPage)).GetFileMetadataValue("GroundControlPoints") == value;
    }

    // Alpha is said by the kind of an extra channel; one channel has it at most.
    bool StoreAlpha(unsigned int nChannel, const std::string& colour, const std::string& kind)
    {
        TagList& oTags = mpoPage->moTags;
        std::vector<std::uint64_t> oExtra = oTags.GetNumbers(TIFFTAG_EXTRASAMPLES);
        const std::uint64_t nChannels = oTags.GetNumber(TIFFTAG_SAMPLESPERPIXEL, 1);
        if (oExtra.size() > nChannels || nChannel <= nChannels - oExtra.size())
            return false;
        std::uint64_t& nKind = oExtra[nChannel - 1 - (nChannels - oExtra.size())];
        const std::uint64_t nWanted = colour != "Alpha"         ? EXTRASAMPLE_UNSPECIFIED
                                      : kind == "Premultiplied" ? EXTRASAMPLE_ASSOCALPHA
                                                                : EXTRASAMPLE_UNASSALPHA;
        const bool bKnownKind = kind == "Premultiplied" || kind == "Straight";
        if (nKind == nWanted)
            return false;
        nKind = EXTRASAMPLE_UNSPECIFIED;
        for (const std::uint64_t nOther : oExtra)
            if (nOther != EXTRASAMPLE_UNSPECIFIED && nWanted != EXTRASAMPLE_UNSPECIFIED)
                return false;
        nKind = nWanted;
        oTags.SetNumbers(TIFFTAG_EXTRASAMPLES, TIFF_SHORT, oExtra);
        return colour == "Alpha" && bKnownKind;
    }

    // The colours that the record names, as the tags say them that other programs show an image by. Pixels stay as they
    // are: only how many channels count as colours changes.
    void StoreColourModel(const AuxiliaryData& oNew)
    {
        struct Model
        {
            std::string_view moPhotometric;
            std::string_view moFirst;
            std::uint16_t mnCode;
            std::size_t mnColours;
        };
        constexpr Model MODELS[] = {{"", "Red", PHOTOMETRIC_RGB, 3},
                                    {"", "Gray", PHOTOMETRIC_MINISBLACK, 1},
                                    {"MinIsWhite", "Gray", PHOTOMETRIC_MINISWHITE, 1},
                                    {"Separated", "", PHOTOMETRIC_SEPARATED, 4},
                                    {"CIELab", "", PHOTOMETRIC_CIELAB, 3},
                                    {"ICCLab", "", PHOTOMETRIC_ICCLAB, 3},
                                    {"ITULab", "", PHOTOMETRIC_ITULAB, 3}};
        TagList& oTags = mpoPage->moTags;
        const std::uint64_t nOld = oTags.GetNumber(TIFFTAG_PHOTOMETRIC, PHOTOMETRIC_MINISBLACK);
        const std::size_t nChannels = oNew.GetChannelCount();
        const std::vector<std::uint64_t> oOldExtra = oTags.GetNumbers(TIFFTAG_EXTRASAMPLES);
        const bool bPlain = oTags.GetNumber(TIFFTAG_COMPRESSION, COMPRESSION_NONE) != COMPRESSION_JPEG &&
                            oTags.Find(TIFFTAG_COLORMAP) == nullptr && nOld <= PHOTOMETRIC_RGB &&
                            oOldExtra.size() < nChannels;
        const auto Colour = [&oNew, nChannels](unsigned int nChannel)
        {
            return nChannel <= nChannels ? oNew.GetChanMetadataValue("ColorInterp", nChannel) : std::string();
        };
        for (const Model& oModel : MODELS)
        {
            const bool bMeant = oNew.GetFileMetadataValue("Photometric") == oModel.moPhotometric &&
                                Colour(1) == oModel.moFirst && nChannels >= oModel.mnColours;
            if (!bPlain || !bMeant || nOld == oModel.mnCode)
                continue;
            if (oModel.mnCode == PHOTOMETRIC_RGB && (Colour(2) != "Green" || Colour(3) != "Blue"))
                continue;
            std::vector<std::uint64_t> oExtra(nChannels - oModel.mnColours, EXTRASAMPLE_UNSPECIFIED);
            const std::size_t nKept = std::min(oExtra.size(), oOldExtra.size());
            std::copy(oOldExtra.end() - static_cast<std::ptrdiff_t>(nKept), oOldExtra.end(),
                      oExtra.end() - static_cast<std::ptrdiff_t>(nKept));
            oTags.SetNumber(TIFFTAG_PHOTOMETRIC, TIFF_SHORT, oModel.mnCode);
            if (oExtra.empty())
                oTags.Remove(TIFFTAG_EXTRASAMPLES);
            else
                oTags.SetNumbers(TIFFTAG_EXTRASAMPLES, TIFF_SHORT, oExtra);
            break;
        }
    }

    // What the tags say by themselves now needs no item.
    void NoteColours(const AuxiliaryData& oNew)
    {
        const AuxiliaryData oSaid = ReadMetadata(*moEditor.OpenPage(mpoPage));
        for (const MetadataKey& oKey : moChanged)
        {
            const auto& [nChannel, key, bDescription] = oKey;
            if (nChannel == 0 && IsSameKey(key, "Photometric") &&
                oSaid.GetFileMetadataValue(key) == oNew.GetFileMetadataValue(key))
                SayElsewhere({0, "Photometric"});
            if (nChannel != 0 && IsSameKey(key, "ColorInterp") &&
                oSaid.GetChanMetadataValue(key, nChannel) == oNew.GetChanMetadataValue(key, nChannel))
                SayElsewhere({nChannel, "ColorInterp"});
        }
    }

    void StoreColours(const AuxiliaryData& oNew)
    {
        const bool bColours =
            std::any_of(moChanged.begin(), moChanged.end(),
                        [](const MetadataKey& oKey)
                        { return IsSameKey(oKey.moKey, "ColorInterp") || IsSameKey(oKey.moKey, "Photometric"); });
        if (bColours)
        {
            const std::uint64_t nOld = mpoPage->moTags.GetNumber(TIFFTAG_PHOTOMETRIC, PHOTOMETRIC_MINISBLACK);
            StoreColourModel(oNew);
            if (nOld != mpoPage->moTags.GetNumber(TIFFTAG_PHOTOMETRIC, PHOTOMETRIC_MINISBLACK))
                NoteColours(oNew);
        }
        for (unsigned int nChannel = 1; nChannel <= oNew.GetChannelCount(); ++nChannel)
        {
            const MetadataKey oColour{nChannel, "ColorInterp"};
            const MetadataKey oKind{nChannel, "AlphaKind"};
            if (!moChanged.contains(oColour) && !moChanged.contains(oKind))
                continue;
            if (StoreAlpha(nChannel, oNew.GetChanMetadataValue("ColorInterp", nChannel),
                           oNew.GetChanMetadataValue("AlphaKind", nChannel)))
            {
                SayElsewhere(oColour);
                SayElsewhere(oKind);
            }
        }
    }

    void StoreItems(const AuxiliaryData& oNew, const Place& oPlace)
    {
        if (moChanged.empty())
            return;
        // A text that is no XML was handed out as a value of its own and is taken back the same way.
        const std::string text = ReadText(moEditor.OpenPage(mpoPage)->GetTiff(), TAG_METADATA);
        const bool bForeign = !text.empty() && !WhyNoItems(text).empty();
        if (bForeign && oNew.GetFileMetadataValue("MetadataXML") == text && moChanged.size() == moElsewhere.size())
            return;
        std::map<MetadataKey, std::string> oWanted;
        for (const MetadataKey& oKey : moChanged)
            if (oKey.mbDescription)
                oWanted[oKey] = oNew.GetChannelDescription(oKey.mnChannel);
            else if (moElsewhere.contains(oKey))
                oWanted[oKey] = {};
            else
                oWanted[oKey] = oKey.mnChannel == 0 ? oNew.GetFileMetadataValue(oKey.moKey)
                                                    : oNew.GetChanMetadataValue(oKey.moKey, oKey.mnChannel);
        if (bForeign)
            oWanted[{0, "MetadataXML"}] = oNew.GetFileMetadataValue("MetadataXML");
        const std::string edited = EditItems(bForeign ? std::string() : text, oWanted, oNew.GetChannelCount());
        if (edited == text)
            return;
        const std::string why = edited.empty() ? std::string() : WhyNoItems(edited);
        if (!why.empty())
            throw DataException(moEditor.GetFileName() + ": the metadata are more than can be read again: " + why,
                                oPlace);
        mpoPage->moTags.SetText(TAG_METADATA, edited);
    }

    FileEditor& moEditor;
    std::shared_ptr<PageModel> mpoPage;
    GeoWriter moGeography;
    std::set<MetadataKey> moChanged;   // with the new record's keys
    std::set<MetadataKey> moElsewhere; // what of that needs no item
};

} // namespace

void WriteMetadata(FileEditor& oEditor, const std::shared_ptr<PageModel>& poPage, const AuxiliaryData& oNew,
                   const Place& oPlace)
{
    MetadataWriter(oEditor, poPage).Write(oNew, oPlace);
}

} // namespace krv::plugins::tif
