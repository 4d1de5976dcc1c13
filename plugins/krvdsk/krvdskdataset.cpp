#include "plugins/krvdsk/krvdskdataset.h"

#include "gobs/raster/rasterinfo.h"
#include "plugins/krvdsk/link/linkedlevelsource.h"
#include "plugins/krvdsk/link/linkedsource.h"
#include "plugins/support/codec/checksum.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <numeric>
#include <utility>

namespace krv::plugins::krvdsk
{

namespace
{

// Channels that are stored together make tiles of at most this size in memory.
constexpr std::uint64_t SENSIBLE_TILE = std::uint64_t{16} << 20;

} // namespace

KrvdskDataset::KrvdskDataset(const std::string& fileName, krv::datasources::IFileFormat* poFormat)
    : RecordDataset(fileName, poFormat),
      mpoStore(StoreFile::Open(std::make_shared<support::File>(fileName, support::File::Mode::eRead)))
{
    moCatalogue = Catalogue::Read(*mpoStore, mpoStore->Read(mpoStore->GetRoot().moDirectory, "the directory"));
    ShowFile();
}

KrvdskDataset::KrvdskDataset(krv::datasources::IFileFormat* poFormat, std::shared_ptr<StoreWriter> poWriter)
    : RecordDataset(poFormat, poWriter), mpoWriter(std::move(poWriter))
{
    if (!mpoWriter->HasFile())
        return;
    mpoStore = mpoWriter->GetStore();
    ShowFile();
}

KrvdskDataset::~KrvdskDataset()
{
    Abandon();
}

StoreWriter& KrvdskDataset::GetWriter(const char* pWhat, const Place& oPlace) const
{
    CheckWriting(pWhat, oPlace);
    mpoWriter->CheckWritable(oPlace);
    return *mpoWriter;
}

void KrvdskDataset::ShowFile()
{
    const Catalogue& oCatalogue = GetCatalogue();
    TagRecord oTags = TagRecord::Read(*mpoStore, oCatalogue.moRecord.Get(*mpoStore, "the record of metadata"),
                                      oCatalogue.CountChannels());
    support::RecordText oRecord;
    oRecord.moTags = std::move(oTags.moTags);
    moHistories = std::move(oTags.moHistories);
    for (const auto& [nLevel, oSize] : oCatalogue.moLevels)
        oRecord.moLevels[nLevel] = nLevel;
    if (!oCatalogue.moCRS.empty())
        oRecord.SetDefinition(oCatalogue.moCRS);
    if (oCatalogue.mbPlaced)
        oRecord.SetGeocoding(oCatalogue.moGeocoding);
    ShowRecord(std::move(oRecord));
    ShowLink();
    ShowImage();
}

void KrvdskDataset::ShowImage()
{
    SetImage(MakeLevelSource(1, 1));
}

std::shared_ptr<support::IBlockSource> KrvdskDataset::MakeSource(std::vector<std::shared_ptr<Plane>> oPlanes,
                                                                 unsigned int nLevel, const ImageSize& oSize,
                                                                 std::function<void()> oBeforeWrite) const
{
    const auto poSource =
        std::make_shared<TileSource>(GetCatalogue(), TileSource::Origin{mpoStore, mpoWriter, std::move(oPlanes), nLevel,
                                                                        oSize, std::move(oBeforeWrite)});
    if (mpoWriter)
        mpoWriter->Register(poSource);
    return poSource;
}

void KrvdskDataset::Create(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes)
{
    const Place oPlace = Place::Current();
    CheckCreate(nWidth, nHeight, oTypes, oPlace, true);
    Catalogue& oCatalogue = mpoWriter->GetCatalogue();
    const Catalogue oDefaults = oCatalogue;
    try
    {
        oCatalogue.moSize = {nWidth, nHeight};
        if (oCatalogue.moLinkPath.empty())
            AddPlanes(oCatalogue, oTypes, oPlace);
        else
            LinkChannels(oCatalogue, oTypes, oPlace);
        oCatalogue.mnKeptBits = 0;
        mpoWriter->LayOut();
        mpoStore = mpoWriter->GetStore();
        ShowFile();
    }
    catch (...)
    {
        oCatalogue = oDefaults;
        mpoStore.reset();
        mpoWriter->Restart();
        throw;
    }
}

// Neighbours of one type make a plane, unless the file stores every channel by itself, or its tiles would be too large.
void KrvdskDataset::AddPlanes(Catalogue& oCatalogue, const std::vector<krv::gobs::DataType>& oTypes,
                              const Place& oPlace) const
{
    std::vector<std::shared_ptr<Plane>> oPlanes;
    for (std::size_t nFirst = 0, nEnd = 0; nFirst < oTypes.size(); nFirst = nEnd)
    {
        oTypes[nFirst].GetNativeCode(oPlace);
        if (oTypes[nFirst].GetBits() < 8)
            Refuse("channels of single bits cannot be laid out; bitmaps can", oPlace);
        const std::uint64_t nTile = std::uint64_t{std::min(oCatalogue.mnBlockWidth, oCatalogue.moSize.mnWidth)} *
                                    std::min(oCatalogue.mnBlockHeight, oCatalogue.moSize.mnHeight) *
                                    (oTypes[nFirst].GetValueBits() / 8);
        const std::size_t nMost = oCatalogue.mbSeparate ? 1 : std::max<std::uint64_t>(1, SENSIBLE_TILE / nTile);
        for (nEnd = nFirst + 1; nEnd < oTypes.size() && oTypes[nEnd] == oTypes[nFirst] && nEnd - nFirst < nMost;)
            ++nEnd;
        oPlanes.push_back(
            oCatalogue.MakePlane(oTypes[nFirst], static_cast<unsigned int>(nEnd - nFirst), GetFileName(), oPlace));
    }
    oCatalogue.moPlanes.insert(oCatalogue.moPlanes.end(), oPlanes.begin(), oPlanes.end());
}

std::shared_ptr<support::IBlockSource> KrvdskDataset::MakeLevelSource(unsigned int nLevel, std::uint64_t)
{
    const auto BeforeWrite = [this]
    {
        ForgetOldPixels();
    };
    const Catalogue& oCatalogue = GetCatalogue();
    const auto poOwn = nLevel == 1
                           ? MakeSource(oCatalogue.moPlanes, 1, oCatalogue.moSize, BeforeWrite)
                           : MakeSource(oCatalogue.GetLevelPlanes(), nLevel, oCatalogue.moLevels.at(nLevel), {});
    if (oCatalogue.moLinked.empty())
        return poOwn;
    if (nLevel == 1)
        return std::make_shared<LinkedSource>(mpoLink, oCatalogue.moLinked, poOwn);
    std::vector<LinkedLevelSource::Channel> oLinked;
    for (std::size_t nAt = 0; nAt < oCatalogue.moLinked.size(); ++nAt)
        oLinked.push_back({oCatalogue.moLinked[nAt].mnNumber, oCatalogue.moLinkedPlanes[nAt]->moTables.at(nLevel)});
    return std::make_shared<LinkedLevelSource>(mpoLink, std::move(oLinked), nLevel, poOwn);
}

support::LevelStore::Level KrvdskDataset::DescribeLevel(unsigned int nLevel) const
{
    const ImageSize& oSize = GetCatalogue().moLevels.at(nLevel);
    return {nLevel, oSize.mnWidth, oSize.mnHeight};
}

void KrvdskDataset::StoreRecord(const support::RecordText& oRecord) const
{
    Catalogue& oCatalogue = mpoWriter->GetCatalogue();
    TagRecord oTags(0);
    oTags.moTags = oRecord.moTags;
    oTags.moHistories = moHistories;
    Blob oBlob = oCatalogue.moRecord;
    oBlob.Set(oTags.Write());
    std::map<unsigned int, ImageSize> oLevels;
    for (const auto& [nLevel, nPlace] : oRecord.moLevels)
        oLevels[nLevel] =
            oCatalogue.moLevels.contains(nLevel) ? oCatalogue.moLevels[nLevel] : oCatalogue.GetUsualSize(nLevel);
    for (const auto& [nLevel, oSize] : oCatalogue.moLevels)
        if (!oLevels.contains(nLevel))
            for (const std::shared_ptr<Plane>& poPlane : oCatalogue.GetLevelPlanes())
            {
                mpoWriter->DropTable(*poPlane->moTables.at(nLevel));
                poPlane->moTables.erase(nLevel);
                poPlane->moMadeOf.erase(nLevel);
            }
    for (const auto& [nLevel, oSize] : oLevels)
        for (const std::shared_ptr<Plane>& poPlane : oCatalogue.GetLevelPlanes())
            if (!poPlane->moTables.contains(nLevel))
                poPlane->moTables[nLevel] = oCatalogue.MakeTable(oSize);
    oCatalogue.moLevels = std::move(oLevels);
    oCatalogue.moRecord = std::move(oBlob);
    oCatalogue.moCRS = oRecord.GetDefinition();
    oCatalogue.mbPlaced = oRecord.HasGeocoding();
    oCatalogue.moGeocoding = oRecord.GetGeocoding();
    oCatalogue.Describe();
    mpoWriter->Touch();
}

void KrvdskDataset::AddNewChannel(const krv::gobs::RasterInfo& oInfo)
{
    const Place oPlace = Place::Current();
    StoreWriter& oWriter = GetWriter("channels cannot be added", oPlace);
    if (oInfo.GetWidth() != GetWidth() || oInfo.GetHeight() != GetHeight())
        Refuse("a channel of another size cannot be added", oPlace);
    std::vector<unsigned int> oSources(GetChanCount());
    std::iota(oSources.begin(), oSources.end(), 1u);
    if (oInfo.GetChansCount() >
        Catalogue::MOST_CHANNELS - std::min<std::size_t>(oSources.size(), Catalogue::MOST_CHANNELS))
        Refuse("a file holds at most " + std::to_string(Catalogue::MOST_CHANNELS) + " channels", oPlace);
    oSources.resize(oSources.size() + oInfo.GetChansCount(), 0);
    oWriter.StoreHeld();
    AddPlanes(oWriter.GetCatalogue(), std::vector<krv::gobs::DataType>(oInfo.GetChansCount(), oInfo.GetDataType()),
              oPlace);
    ChangeChannels(oSources);
}

void KrvdskDataset::DeleteChannel(unsigned int nChannel)
{
    const Place oPlace = Place::Current();
    StoreWriter& oWriter = GetWriter("channels cannot be deleted", oPlace);
    const support::ChannelPlace oAt = GetLayout().GetChannelPlace(nChannel, oPlace);
    std::vector<unsigned int> oSources(GetChanCount());
    std::iota(oSources.begin(), oSources.end(), 1u);
    oSources.erase(oSources.begin() + (nChannel - 1));
    oWriter.StoreHeld();
    auto& oLinked = oWriter.GetCatalogue().moLinked;
    const unsigned int nLinkedPlanes = LinkedSource::CountPlanes(oLinked);
    if (oAt.mnPlane < nLinkedPlanes)
    {
        auto& oLevels = oWriter.GetCatalogue().moLinkedPlanes;
        oWriter.DropPlane(*oLevels[nChannel - 1]);
        oLevels.erase(oLevels.begin() + (nChannel - 1));
        oLinked.erase(oLinked.begin() + (nChannel - 1));
        return ChangeChannels(oSources);
    }
    auto& oPlanes = oWriter.GetCatalogue().moPlanes;
    const std::size_t nPlane = oAt.mnPlane - nLinkedPlanes;
    const std::shared_ptr<Plane> poOld = oPlanes[nPlane];
    if (poOld->GetChannels() == 1)
    {
        oWriter.DropPlane(*poOld);
        oPlanes.erase(oPlanes.begin() + static_cast<std::ptrdiff_t>(nPlane));
        return ChangeChannels(oSources);
    }
    std::size_t nStored = 0;
    for (unsigned int nLeft = oAt.mnPosition; nLeft > 0 || !poOld->moThere[nStored]; ++nStored)
        nLeft -= poOld->moThere[nStored] ? 1 : 0;
    poOld->moThere[nStored] = false;
    ChangeChannels(oSources);
}

// Whoever still holds an I/O object of before is refused: its channels are others now.
void KrvdskDataset::ChangeChannels(const std::vector<unsigned int>& oSources)
{
    Catalogue& oCatalogue = mpoWriter->GetCatalogue();
    for (auto* const pPlanes : {&oCatalogue.moLinkedPlanes, &oCatalogue.moPlanes})
        for (std::shared_ptr<Plane>& poPlane : *pPlanes)
        {
            const auto poNew = std::make_shared<Plane>(*poPlane);
            poPlane->mbGone = true;
            poPlane = poNew;
        }
    std::vector<std::vector<std::string>> oHistories;
    for (const unsigned int nSource : oSources)
        oHistories.push_back(nSource == 0 ? std::vector<std::string>() : moHistories[nSource - 1]);
    moHistories = std::move(oHistories);
    moHistoryFacets.clear();
    for (auto& [nNumber, oSegment] : oCatalogue.moSegments)
    {
        const auto oFound = std::find(oSources.begin(), oSources.end(), oSegment.mnChannel);
        if (oSegment.mnChannel != 0)
            oSegment.mnChannel =
                oFound == oSources.end() ? 0 : static_cast<unsigned int>(oFound - oSources.begin()) + 1;
    }
    ForgetOpened();
    TakeChannels(oSources);
    ShowImage();
}

// The history of a channel, in the record of metadata.
class KrvdskDataset::History : public krv::datasources::IHistoryIO
{
public:
    History(KrvdskDataset& oDataset, unsigned int nChannel) : moDataset(oDataset), mnAt(nChannel - 1) {}

    std::vector<std::string> ReadHistory() const override { return moDataset.moHistories[mnAt]; }

    void AppendHistory(const std::string& oEntry) override
    {
        std::vector<std::string> oEntries = ReadHistory();
        oEntries.push_back(oEntry);
        Store(std::move(oEntries), Place::Current());
    }

    void ClearHistory() override { Store({}, Place::Current()); }

private:
    void Store(std::vector<std::string> oEntries, const Place& oPlace)
    {
        moDataset.GetWriter("the history cannot be written", oPlace);
        std::swap(moDataset.moHistories[mnAt], oEntries);
        try
        {
            moDataset.StoreRecord(moDataset.GetRecord());
        }
        catch (...)
        {
            std::swap(moDataset.moHistories[mnAt], oEntries);
            throw;
        }
    }

    KrvdskDataset& moDataset;
    std::size_t mnAt;
};

krv::datasources::IHistoryIO* KrvdskDataset::GetHistoryIO(unsigned int nChannel)
{
    GetLayout().GetChannelPlace(nChannel, Place::Current());
    std::unique_ptr<History>& poFacet = moHistoryFacets[nChannel];
    if (!poFacet)
        poFacet = std::make_unique<History>(*this, nChannel);
    return poFacet.get();
}

void KrvdskDataset::Close()
{
    RecordDataset::Close();
    mpoLink.reset(); // I/O objects keep theirs
    ForgetOpened();
    moBitmaps.clear();
}

std::optional<std::uint64_t> KrvdskDataset::GetUnusedBytes()
{
    CheckOpen();
    if (!mpoStore)
        return std::nullopt;
    if (mpoWriter)
        return mpoWriter->CountUnused();
    std::uint64_t nUsed = Root::FIRST_PIECE;
    ForEachPiece([&nUsed](const Entry& oEntry, const std::string&) { nUsed += oEntry.mnBytes + oEntry.mnBytes % 2; },
                 {});
    return mpoStore->GetEnd() - std::min(nUsed, mpoStore->GetEnd());
}

std::string KrvdskDataset::GetVariant()
{
    if (!mpoStore)
        return {};
    const Root& oRoot = mpoStore->GetRoot();
    return "version " + std::to_string(oRoot.mnVersion) + "." + std::to_string(oRoot.mnRevision) +
           (IsLinked() ? ", linked" : "");
}

void KrvdskDataset::ForEachPiece(const std::function<void(const Entry& oEntry, const std::string& what)>& oAction,
                                 const TileTable::Complain& oComplain)
{
    const Catalogue& oCatalogue = GetCatalogue();
    oAction(mpoStore->GetRoot().moDirectory, "the directory");
    if (oCatalogue.moRecord.moEntry.IsStored())
        oAction(oCatalogue.moRecord.moEntry, "the record of metadata");
    const auto Walk = [&](const Plane& oPlane, const std::map<unsigned int, ImageSize>& oLevels)
    {
        for (const auto& [nLevel, poTable] : oPlane.moTables)
        {
            const ImageSize& oSize = nLevel == 1 ? oCatalogue.moSize : oLevels.at(nLevel);
            const std::uint64_t nAcross = (oSize.mnWidth - 1) / oCatalogue.mnBlockWidth + 1;
            poTable->ForEach(
                *mpoStore, false,
                [&](const TileTable::Tile& oTile, std::uint64_t nTile)
                {
                    oAction(oTile.moEntry, nTile == UINT64_MAX
                                               ? "the index of " + poTable->Describe()
                                               : poTable->Describe() + ", tile " + std::to_string(nTile % nAcross) +
                                                     ", " + std::to_string(nTile / nAcross));
                },
                oComplain);
        }
    };
    for (const std::shared_ptr<Plane>& poPlane : oCatalogue.GetLevelPlanes())
        Walk(*poPlane, oCatalogue.moLevels);
    for (const auto& [nNumber, oSegment] : oCatalogue.moSegments)
    {
        if (oSegment.mpoPlane)
            Walk(*oSegment.mpoPlane, oCatalogue.moBitmapLevels);
        else if (oSegment.moBytes.moEntry.IsStored())
            oAction(oSegment.moBytes.moEntry, oSegment.Describe(nNumber));
    }
}

// In pieces: a tile may be larger than a record.
std::vector<std::string> KrvdskDataset::Verify(const Progress& oProgress)
{
    CheckOpen();
    std::vector<std::string> oWrong;
    if (!mpoStore)
        return oWrong;
    std::uint64_t nDone = 0;
    std::vector<unsigned char> oBytes;
    const auto Check = [&](const Entry& oEntry, const std::string& what)
    {
        try
        {
            mpoStore->CheckPlace(oEntry, what);
            std::uint32_t nChecksum = 0;
            for (std::uint64_t nAt = 0; nAt < oEntry.mnBytes; nAt += oBytes.size())
            {
                oBytes.resize(std::min<std::uint64_t>(oEntry.mnBytes - nAt, std::uint64_t{1} << 20));
                mpoStore->GetFile().Read(oEntry.mnOffset + nAt, oBytes.data(), oBytes.size());
                nChecksum = codec::Checksum(nChecksum, oBytes.data(), oBytes.size());
            }
            if (nChecksum != oEntry.mnChecksum)
                oWrong.push_back(what + ": the checksum of " + std::to_string(oEntry.mnBytes) + " bytes at offset " +
                                 std::to_string(oEntry.mnOffset) + " is wrong");
        }
        catch (const krv::FileException& oError)
        {
            oWrong.push_back(oError.GetMessage());
        }
        nDone += oEntry.mnBytes;
        if (oProgress)
            oProgress(nDone, mpoStore->GetEnd());
    };
    ForEachPiece(Check, [&oWrong](const std::string& what) { oWrong.push_back(what); });
    return oWrong;
}

} // namespace krv::plugins::krvdsk
