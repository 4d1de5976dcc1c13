#include "datasources/datasets/memorydataset.h"

#include "datasources/datasets/detail/channellist.h"
#include "datasources/datasets/detail/memorytiles.h"
#include "datasources/datasets/detail/recordparts.h"
#include "datasources/interfaces/channelinfo.h"
#include "datasources/metadata/droppedtags.h"
#include "datasources/metadata/levelbook.h"
#include "datasources/metadata/levelmanager.h"
#include "gobs/pct/pct.h"
#include "gobs/raster/rasterinfo.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <climits>
#include <map>
#include <utility>

namespace krv::datasources
{

namespace
{

using detail::MemoryChannel;
using detail::MemoryTiles;
using Channels = std::vector<MemoryChannel>;

struct Bitmap
{
    std::shared_ptr<MemoryTiles> mpoTiles;
    std::string moDescription;
    MetadataMap moMetadata;
};

struct Table
{
    krv::gobs::PCT moTable;
    unsigned int mnChannel;
    std::string moDescription;
};

// The channels of an image, a level or a mask; those of one type lie together.
Channels MakeChannels(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes,
                      const std::shared_ptr<detail::MemoryBudget>& poBudget, double nFill)
{
    std::map<krv::gobs::DataType, unsigned int> oCounts;
    Channels oChannels(oTypes.size());
    for (std::size_t n = 0; n < oTypes.size(); ++n)
        oChannels[n].mnIndex = oCounts[oTypes[n]]++;
    std::map<krv::gobs::DataType, std::shared_ptr<MemoryTiles>> oTiles;
    for (const auto& [oType, nCount] : oCounts)
        oTiles[oType] = std::make_shared<MemoryTiles>(nWidth, nHeight, oType, nCount, poBudget, nFill);
    for (std::size_t n = 0; n < oTypes.size(); ++n)
        oChannels[n].mpoTiles = oTiles[oTypes[n]];
    return oChannels;
}

Channels WithoutChannel(const Channels& oChannels, std::size_t nGone)
{
    const MemoryChannel& oGone = oChannels[nGone];
    Channels oKept = oChannels;
    oKept.erase(oKept.begin() + static_cast<std::ptrdiff_t>(nGone));
    if (oGone.mpoTiles->GetChannels() == 1)
        return oKept;
    const std::shared_ptr<MemoryTiles> poTiles = oGone.mpoTiles->Without(oGone.mnIndex);
    for (MemoryChannel& oChannel : oKept)
    {
        if (oChannel.mpoTiles != oGone.mpoTiles)
            continue;
        oChannel.mpoTiles = poTiles;
        oChannel.mnIndex -= oChannel.mnIndex > oGone.mnIndex ? 1 : 0;
    }
    return oKept;
}

AuxiliaryData SelectChannels(const AuxiliaryData& oFrom, const std::vector<unsigned int>& oChannels)
{
    AuxiliaryData oData(static_cast<unsigned int>(oChannels.size()));
    oData.SetFileMetadata(oFrom.GetFileMetadata());
    unsigned int nPosition = 0;
    for (const unsigned int nChannel : oChannels)
    {
        ++nPosition;
        if (nChannel == 0)
            continue;
        oData.SetChanMetadata(oFrom.GetChanMetadata(nChannel), nPosition);
        oData.SetChannelDescription(oFrom.GetChannelDescription(nChannel), nPosition);
    }
    return oData;
}

} // namespace

struct MemoryDataset::Contents
{
    // The levels of the image, or of the validity mask, whose book is a record of its own with one channel.
    class Pyramid : public LevelStore
    {
    public:
        Pyramid(Contents& oContents, bool bMask) : moContents(oContents), mbMask(bMask), moMaskBook(1) {}

        std::vector<Level> GetLevels() const override
        {
            std::vector<Level> oLevels;
            for (const auto& [nLevel, oChannels] : moLevels)
                oLevels.push_back(
                    {nLevel, oChannels.front().mpoTiles->GetWidth(), oChannels.front().mpoTiles->GetHeight()});
            return oLevels;
        }
        unsigned int FindChannel(unsigned int nChannel) const override
        {
            if (mbMask)
                return nChannel != 0 && nChannel == mnMask ? 1 : 0;
            return LevelStore::FindChannel(nChannel);
        }
        const AuxiliaryData& GetBook() const override { return mbMask ? moMaskBook : moContents.moRecord.moTags; }
        void MakeLevel(const Level& oLevel, const AuxiliaryData& oBook, const Place& oPlace) override
        {
            moLevels[oLevel.mnNumber] =
                MakeChannels(oLevel.mnWidth, oLevel.mnHeight,
                             mbMask ? std::vector<krv::gobs::DataType>{krv::gobs::eDT_8U} : moContents.GetTypes(),
                             moContents.mpoBudget, mbMask ? 0 : moContents.mnFill);
            WriteBook(oBook, false, oPlace);
        }
        void DropLevel(unsigned int nLevel, const AuxiliaryData& oBook, const Place& oPlace) override
        {
            moLevels.erase(nLevel);
            WriteBook(oBook, false, oPlace);
        }
        void WriteBook(const AuxiliaryData& oBook, bool bValid, const Place&) override
        {
            (mbMask ? moMaskBook : moContents.moRecord.moTags) = oBook;
            moContents.mbWatched |= bValid;
        }

        void Outdate()
        {
            for (const auto& [nLevel, oChannels] : moLevels)
                SetLevelInvalid(mbMask ? moMaskBook : moContents.moRecord.moTags, nLevel);
        }
        // The mask whose levels these are; those of another one go.
        void SetMask(unsigned int nMask)
        {
            if (nMask == mnMask)
                return;
            moLevels.clear();
            moMaskBook = AuxiliaryData(1);
            mnMask = nMask;
        }

        std::map<unsigned int, Channels> moLevels;

    private:
        Contents& moContents;
        bool mbMask;
        unsigned int mnMask = 0;
        AuxiliaryData moMaskBook;
    };

    explicit Contents(const MemoryOptions& oOptions, const std::string& name)
        : mpoBudget(std::make_shared<detail::MemoryBudget>(detail::MemoryBudget{name, oOptions.mnCeiling})),
          mnFill(oOptions.mnFill)
    {
    }

    std::vector<krv::gobs::DataType> GetTypes() const
    {
        std::vector<krv::gobs::DataType> oTypes;
        for (const MemoryChannel& oChannel : moChannels)
            oTypes.push_back(oChannel.mpoTiles->GetType());
        return oTypes;
    }

    // Pixels of the image or of its mask are about to change.
    void Outdate()
    {
        if (!mbWatched)
            return;
        mbWatched = false;
        moLevels.Outdate();
        moMaskLevels.Outdate();
        if (mbSettled)
            DropStatistics(moRecord.moTags);
    }

    const std::shared_ptr<detail::MemoryBudget> mpoBudget;
    const double mnFill;
    unsigned int mnWidth = 0;
    unsigned int mnHeight = 0;
    Channels moChannels; // none before there is an image
    detail::RecordParts moRecord;
    std::map<unsigned int, Bitmap> moBitmaps;
    std::map<unsigned int, Table> moTables;
    Pyramid moLevels{*this, false};
    Pyramid moMaskLevels{*this, true};
    bool mbWatched = false; // the record says something that a change of pixels belies
    bool mbSettled = false;
};

class MemoryDataset::Manager : public LevelManager
{
public:
    Manager(const MemoryDataset& oDataset, bool bMask)
        : LevelManager(bMask ? oDataset.mpoContents->moMaskLevels : oDataset.mpoContents->moLevels),
          mpoContents(oDataset.mpoContents), mbMask(bMask)
    {
    }

private:
    std::string GetImageName() const override { return mpoContents->mpoBudget->moName; }
    unsigned int GetImageWidth() const override { return mpoContents->mnWidth; }
    unsigned int GetImageHeight() const override { return mpoContents->mnHeight; }
    void CheckWriting(const char*, const Place&) const override {}
    IRasterIO* OpenLevelIO(unsigned int nLevel, const std::vector<unsigned int>& oChannels) override
    {
        const Channels& oLevel = (mbMask ? mpoContents->moMaskLevels : mpoContents->moLevels).moLevels.at(nLevel);
        if (!mbMask)
            static_cast<void>(
                detail::CheckChannelList(oChannels, mpoContents->GetTypes(), GetImageName(), Place::Current()));
        Channels oListed;
        for (const unsigned int nChannel : oChannels)
            oListed.push_back(oLevel.at(nChannel - 1));
        if (oListed.empty())
            throw krv::DataException(GetImageName() + ": no bitmaps were given");
        return new detail::MemoryLevelIO(nLevel, std::move(oListed), mbMask);
    }

    std::shared_ptr<Contents> mpoContents;
    bool mbMask;
};

MemoryDataset::MemoryDataset(const MemoryOptions& oOptions)
    : FilelessDataset(oOptions.moName.empty() ? "<memory>" : "<memory: " + oOptions.moName + ">"),
      mpoContents(std::make_shared<Contents>(oOptions, MemoryDataset::GetName()))
{
}

MemoryDataset::MemoryDataset(const MemoryDataset& oOther) = default;
MemoryDataset::~MemoryDataset() = default;

std::unique_ptr<IDataset> MemoryDataset::Share() const
{
    CheckOpen();
    return std::make_unique<MemoryDataset>(*this);
}

std::uint64_t MemoryDataset::GetBytes() const
{
    return mpoContents->mpoBudget->mnUsed;
}

MemoryDataset::Contents& MemoryDataset::Get(const Place& oPlace) const
{
    CheckOpen(oPlace);
    if (mpoContents->moChannels.empty())
        Refuse("the dataset has no image yet", oPlace);
    return *mpoContents;
}

bool MemoryDataset::Exists() const
{
    return !mpoContents->moChannels.empty();
}

AuxiliaryData MemoryDataset::ReadAuxiliaryData()
{
    return Get().moRecord.moTags;
}

void MemoryDataset::WriteAuxiliaryData(const AuxiliaryData& oData)
{
    Contents& oContents = Get();
    CheckRecord(oData);
    AuxiliaryData oTags = oData;
    for (const auto& [nLevel, oChannels] : oContents.moLevels.moLevels)
        CopyLevel(oContents.moRecord.moTags, oTags, nLevel);
    oContents.moRecord.moTags = std::move(oTags);
    oContents.mbWatched = true;
}

krv::ogc::cs::ICRS* MemoryDataset::ReadCRS() const
{
    return Get().moRecord.CloneCRS();
}

void MemoryDataset::UpdateCRS(const krv::ogc::cs::ICRS& oCRS) const
{
    Get().moRecord.mpoCRS.reset(oCRS.Clone());
}

void MemoryDataset::Synchronize()
{
    Get().mbSettled = true;
}

IRasterIO* MemoryDataset::GetRasterIO(const std::vector<unsigned int>& oChannels)
{
    const Place oPlace = Place::Current();
    const Contents& oContents = Get(oPlace);
    static_cast<void>(detail::CheckChannelList(oChannels, oContents.GetTypes(), GetName(), oPlace));
    Channels oListed;
    for (const unsigned int nChannel : oChannels)
        oListed.push_back(oContents.moChannels[nChannel - 1]);
    return new detail::MemoryIO<IRasterIO>(std::move(oListed), [poContents = mpoContents] { poContents->Outdate(); });
}

void MemoryDataset::Create(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes)
{
    const Place oPlace = Place::Current();
    CheckOpen(oPlace);
    if (Exists())
        Refuse("an image exists already", oPlace);
    detail::CheckImageSize(nWidth, nHeight, oTypes.size(), GetName(), oPlace);
    for (std::size_t n = 0; n < oTypes.size(); ++n)
        detail::CheckChannelType(oTypes[n], static_cast<unsigned int>(n) + 1, GetName(), oPlace);
    mpoContents->moRecord.moTags = AuxiliaryData(static_cast<unsigned int>(oTypes.size()));
    Channels oChannels = MakeChannels(nWidth, nHeight, oTypes, mpoContents->mpoBudget, mpoContents->mnFill);
    mpoContents->mnWidth = nWidth;
    mpoContents->mnHeight = nHeight;
    mpoContents->moChannels = std::move(oChannels);
}

// New channels lie together and apart from the old ones; levels get them too, outdated.
void MemoryDataset::AddNewChannel(const krv::gobs::RasterInfo& oInfo)
{
    const Place oPlace = Place::Current();
    Contents& oContents = Get(oPlace);
    if (oInfo.GetWidth() != oContents.mnWidth || oInfo.GetHeight() != oContents.mnHeight)
        Refuse("a channel of another size cannot be added", oPlace);
    const std::size_t nOld = oContents.moChannels.size();
    detail::CheckImageSize(oInfo.GetWidth(), oInfo.GetHeight(), nOld + oInfo.GetChansCount(), GetName(), oPlace);
    detail::CheckChannelType(oInfo.GetDataType(), static_cast<unsigned int>(nOld) + 1, GetName(), oPlace);
    const std::vector<krv::gobs::DataType> oTypes(oInfo.GetChansCount(), oInfo.GetDataType());
    const auto Extend = [&](Channels& oChannels)
    {
        const MemoryTiles& oFirst = *oChannels.front().mpoTiles;
        const Channels oNew =
            MakeChannels(oFirst.GetWidth(), oFirst.GetHeight(), oTypes, oContents.mpoBudget, oContents.mnFill);
        oChannels.insert(oChannels.end(), oNew.begin(), oNew.end());
    };
    std::vector<unsigned int> oSources(nOld + oTypes.size());
    for (unsigned int n = 0; n < nOld; ++n)
        oSources[n] = n + 1;
    AuxiliaryData oTags = SelectChannels(oContents.moRecord.moTags, oSources);
    for (auto& [nLevel, oChannels] : oContents.moLevels.moLevels)
    {
        Extend(oChannels);
        for (auto nChannel = static_cast<unsigned int>(nOld) + 1; nChannel <= oTags.GetChannelCount(); ++nChannel)
            SetLevelValid(oTags, nChannel, nLevel, false, {});
    }
    Extend(oContents.moChannels);
    oContents.moRecord.moTags = std::move(oTags);
}

void MemoryDataset::DeleteChannel(unsigned int nChannel)
{
    const Place oPlace = Place::Current();
    Contents& oContents = Get(oPlace);
    const auto nCount = static_cast<unsigned int>(oContents.moChannels.size());
    if (nChannel == 0 || nChannel > nCount)
        Refuse("channel " + std::to_string(nChannel) + " does not exist; there are " + std::to_string(nCount), oPlace);
    if (nCount == 1)
        Refuse("the only channel cannot be deleted", oPlace);
    std::vector<unsigned int> oKept;
    for (unsigned int n = 1; n <= nCount; ++n)
        if (n != nChannel)
            oKept.push_back(n);
    AuxiliaryData oTags = SelectChannels(oContents.moRecord.moTags, oKept);
    std::map<unsigned int, Channels> oLevels;
    for (const auto& [nLevel, oChannels] : oContents.moLevels.moLevels)
        oLevels[nLevel] = WithoutChannel(oChannels, nChannel - 1);
    oContents.moChannels = WithoutChannel(oContents.moChannels, nChannel - 1);
    oContents.moLevels.moLevels = std::move(oLevels);
    oContents.moRecord.moTags = std::move(oTags);
    for (auto& [nNumber, oTable] : oContents.moTables)
    {
        if (oTable.mnChannel == nChannel)
            oTable.mnChannel = 0;
        else if (oTable.mnChannel > nChannel)
            --oTable.mnChannel;
    }
}

unsigned int MemoryDataset::GetWidth() const
{
    return Get().mnWidth;
}

unsigned int MemoryDataset::GetHeight() const
{
    return Get().mnHeight;
}

unsigned int MemoryDataset::GetChanCount() const
{
    return static_cast<unsigned int>(Get().moChannels.size());
}

IChannelInfo* MemoryDataset::GetChannelInfo(unsigned int nChannel) const
{
    const Place oPlace = Place::Current();
    const std::vector<krv::gobs::DataType> oTypes = Get(oPlace).GetTypes();
    return new ChannelInfo(detail::CheckChannelList({nChannel}, oTypes, mpoContents->mpoBudget->moName, oPlace));
}

IOverviewManager* MemoryDataset::GetOverviewManager()
{
    Get();
    return new Manager(*this, false);
}

const krv::ogc::cs::GeocodingInfo& MemoryDataset::GetGeocoding() const
{
    return mpoContents->moRecord.moGeocoding;
}

void MemoryDataset::SetGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo)
{
    const Place oPlace = Place::Current();
    Contents& oContents = Get(oPlace);
    if (!oInfo.IsInvertible())
        Refuse("a geocoding without an inverse cannot be written", oPlace);
    oContents.moRecord.moGeocoding = oInfo;
}

namespace
{

template <typename Map>
std::vector<unsigned int> KeysOf(const Map& oMap)
{
    std::vector<unsigned int> oKeys;
    for (const auto& oEntry : oMap)
        oKeys.push_back(oEntry.first);
    return oKeys;
}

template <typename Map>
unsigned int NextKey(const Map& oMap)
{
    return oMap.empty() ? 1 : oMap.rbegin()->first + 1;
}

template <typename Map>
auto& EntryOf(Map& oMap, unsigned int nKey, const char* pWhat, const std::string& name, const Place& oPlace)
{
    const auto oFound = oMap.find(nKey);
    if (oFound == oMap.end())
        throw krv::DataException(name + ": " + pWhat + " " + std::to_string(nKey) + " does not exist", oPlace);
    return oFound->second;
}

} // namespace

std::vector<unsigned int> MemoryDataset::GetBitmapList() const
{
    return KeysOf(Get().moBitmaps);
}

IRasterIO* MemoryDataset::GetBitmapIO(const std::vector<unsigned int>& oBitmaps)
{
    const Place oPlace = Place::Current();
    const Contents& oContents = Get(oPlace);
    if (oBitmaps.empty())
        Refuse("no bitmaps were given", oPlace);
    Channels oListed;
    bool bMask = false;
    for (const unsigned int nBitmap : oBitmaps)
    {
        oListed.push_back({EntryOf(oContents.moBitmaps, nBitmap, "bitmap", GetName(), oPlace).mpoTiles, 0});
        bMask = bMask || nBitmap == FindValidityMask(*this);
    }
    const auto Outdate = [poContents = mpoContents]
    {
        poContents->Outdate();
    };
    return new detail::MemoryIO<IRasterIO>(std::move(oListed), bMask ? Outdate : std::function<void()>(), true);
}

void MemoryDataset::DeleteBitmap(unsigned int nBitmap)
{
    const Place oPlace = Place::Current();
    Contents& oContents = Get(oPlace);
    EntryOf(oContents.moBitmaps, nBitmap, "bitmap", GetName(), oPlace);
    if (nBitmap == FindValidityMask(*this))
        oContents.Outdate();
    oContents.moBitmaps.erase(nBitmap);
    oContents.moMaskLevels.SetMask(FindValidityMask(*this));
}

unsigned int MemoryDataset::CreateBitmap()
{
    Contents& oContents = Get();
    const unsigned int nNumber = NextKey(oContents.moBitmaps);
    oContents.moBitmaps[nNumber] = {std::make_shared<MemoryTiles>(oContents.mnWidth, oContents.mnHeight,
                                                                  krv::gobs::eDT_8U, 1, oContents.mpoBudget, 0.0),
                                    "Bitmap " + std::to_string(nNumber),
                                    {}};
    return nNumber;
}

std::string MemoryDataset::GetBitmapDescription(unsigned int nBitmap) const
{
    const Place oPlace = Place::Current();
    return EntryOf(Get(oPlace).moBitmaps, nBitmap, "bitmap", mpoContents->mpoBudget->moName, oPlace).moDescription;
}

void MemoryDataset::SetBitmapDescription(unsigned int nBitmap, const std::string& oDescription)
{
    const Place oPlace = Place::Current();
    Contents& oContents = Get(oPlace);
    Bitmap& oBitmap = EntryOf(oContents.moBitmaps, nBitmap, "bitmap", GetName(), oPlace);
    const unsigned int nMask = FindValidityMask(*this);
    oBitmap.moDescription = oDescription;
    if (FindValidityMask(*this) != nMask)
        oContents.Outdate();
    oContents.moMaskLevels.SetMask(FindValidityMask(*this));
}

MetadataMap MemoryDataset::GetBitmapMetadata(unsigned int nBitmap) const
{
    const Place oPlace = Place::Current();
    return EntryOf(Get(oPlace).moBitmaps, nBitmap, "bitmap", mpoContents->mpoBudget->moName, oPlace).moMetadata;
}

void MemoryDataset::SetBitmapMetadata(unsigned int nBitmap, const MetadataMap& oMetadata)
{
    const Place oPlace = Place::Current();
    EntryOf(Get(oPlace).moBitmaps, nBitmap, "bitmap", GetName(), oPlace).moMetadata = oMetadata;
}

IOverviewManager* MemoryDataset::GetBitmapOverviewManager()
{
    Contents& oContents = Get();
    const unsigned int nMask = FindValidityMask(*this);
    oContents.moMaskLevels.SetMask(nMask);
    return nMask != 0 ? new Manager(*this, true) : nullptr;
}

std::vector<unsigned int> MemoryDataset::GetPCTList() const
{
    return KeysOf(Get().moTables);
}

krv::gobs::PCT* MemoryDataset::GetPCT(unsigned int nPCT) const
{
    const Place oPlace = Place::Current();
    return new krv::gobs::PCT(
        EntryOf(Get(oPlace).moTables, nPCT, "colour table", mpoContents->mpoBudget->moName, oPlace).moTable);
}

unsigned int MemoryDataset::GetPCTChannel(unsigned int nPCT) const
{
    const Place oPlace = Place::Current();
    return EntryOf(Get(oPlace).moTables, nPCT, "colour table", mpoContents->mpoBudget->moName, oPlace).mnChannel;
}

std::string MemoryDataset::GetPCTDescription(unsigned int nPCT) const
{
    const Place oPlace = Place::Current();
    return EntryOf(Get(oPlace).moTables, nPCT, "colour table", mpoContents->mpoBudget->moName, oPlace).moDescription;
}

unsigned int MemoryDataset::CreatePCT(const krv::gobs::PCT& oTable, unsigned int nChannel)
{
    const Place oPlace = Place::Current();
    Contents& oContents = Get(oPlace);
    if (nChannel > oContents.moChannels.size())
        Refuse("channel " + std::to_string(nChannel) + " does not exist", oPlace);
    const unsigned int nNumber = NextKey(oContents.moTables);
    oContents.moTables[nNumber] = {oTable, nChannel, {}};
    return nNumber;
}

void MemoryDataset::UpdatePCT(unsigned int nPCT, const krv::gobs::PCT& oTable)
{
    const Place oPlace = Place::Current();
    EntryOf(Get(oPlace).moTables, nPCT, "colour table", GetName(), oPlace).moTable = oTable;
}

void MemoryDataset::SetPCTDescription(unsigned int nPCT, const std::string& oDescription)
{
    const Place oPlace = Place::Current();
    EntryOf(Get(oPlace).moTables, nPCT, "colour table", GetName(), oPlace).moDescription = oDescription;
}

void MemoryDataset::DeletePCT(unsigned int nPCT)
{
    const Place oPlace = Place::Current();
    Contents& oContents = Get(oPlace);
    EntryOf(oContents.moTables, nPCT, "colour table", GetName(), oPlace);
    oContents.moTables.erase(nPCT);
}

} // namespace krv::datasources
