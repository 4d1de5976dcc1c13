#pragma once

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/iblockencoding.h"
#include "datasources/interfaces/iblocktransfer.h"
#include "datasources/interfaces/iencodedblocks.h"
#include "datasources/interfaces/iephemerisdataset.h"
#include "datasources/interfaces/ihistoryio.h"
#include "datasources/interfaces/ilayoutdataset.h"
#include "datasources/interfaces/ilinkeddataset.h"
#include "datasources/interfaces/ilutdataset.h"
#include "datasources/interfaces/imathmodeldataset.h"
#include "datasources/interfaces/ipctdataset.h"
#include "datasources/interfaces/istoragedataset.h"
#include "datasources/interfaces/iverifieddataset.h"
#include "plugins/krvdsk/link/link.h"
#include "plugins/krvdsk/pixels/tilesource.h"
#include "plugins/krvdsk/store/storewriter.h"
#include "plugins/support/overviewmanager.h"
#include "plugins/support/recorddataset.h"

#include <algorithm>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace krv::plugins::krvdsk
{

// A native file. Bitmaps, tables and whatever else stands beside the channels are segments with one range of numbers.
// An operation that changes the structure changes the catalogue in memory, after all that may fail; the file follows
// with Synchronize.
class KrvdskDataset : public support::RecordDataset,
                      public krv::datasources::IBitmapDataset,
                      public krv::datasources::IPCTDataset,
                      public krv::datasources::ILUTDataset,
                      public krv::datasources::IMathModelDataset,
                      public krv::datasources::IEphemerisDataset,
                      public krv::datasources::IEphemerisRecords,
                      public krv::datasources::ILinkedDataset,
                      public krv::datasources::IStorageDataset,
                      public krv::datasources::ILayoutDataset,
                      public krv::datasources::IVerifiedDataset,
                      public krv::datasources::IEncodedBlocks,
                      public krv::datasources::IBlockEncoding,
                      public krv::datasources::IBlockTransfer
{
public:
    // Throws krv::FileException kinds that name file and cause; nothing stays open then.
    KrvdskDataset(const std::string& fileName, krv::datasources::IFileFormat* poFormat);
    // A file to be updated, or a new one, whose image Create lays out.
    KrvdskDataset(krv::datasources::IFileFormat* poFormat, std::shared_ptr<StoreWriter> poWriter);
    ~KrvdskDataset() override;

    // No types: an image without channels.
    void Create(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes) override;
    using support::RecordDataset::Create;
    // After both of these, I/O objects made before are of no more use.
    void AddNewChannel(const krv::gobs::RasterInfo& oInfo) override;
    void DeleteChannel(unsigned int nChannel) override;
    // Levels that the other file's changes made outdated are told as such.
    krv::datasources::AuxiliaryData ReadAuxiliaryData() override;
    // Of a linked channel as the other file has it stored, while that can be had.
    krv::datasources::IChannelInfo* GetChannelInfo(unsigned int nChannel) const override;
    krv::datasources::IHistoryIO* GetHistoryIO(unsigned int nChannel) override;
    void Close() override;
    bool IsLinked() const override { return !GetCatalogue().moLinkPath.empty(); }
    krv::datasources::IRasterIO* GetRasterIO(const std::vector<unsigned int>& oChannels) override;
    krv::datasources::IOverviewManager* GetOverviewManager() override;
    std::vector<std::string> GetLinkedFiles() const override;

    // What the linked file has of these is seen too, under the numbers that it has there, unless the file has its own
    // under them. It is not changed from here.
    std::vector<unsigned int> GetBitmapList() const override;
    krv::datasources::IRasterIO* GetBitmapIO(const std::vector<unsigned int>& oBitmaps) override;
    void DeleteBitmap(unsigned int nBitmap) override;
    unsigned int CreateBitmap() override;
    std::string GetBitmapDescription(unsigned int nBitmap) const override;
    void SetBitmapDescription(unsigned int nBitmap, const std::string& oDescription) override;
    krv::datasources::MetadataMap GetBitmapMetadata(unsigned int nBitmap) const override;
    void SetBitmapMetadata(unsigned int nBitmap, const krv::datasources::MetadataMap& oMetadata) override;
    krv::datasources::IOverviewManager* GetBitmapOverviewManager() override;

    std::vector<unsigned int> GetPCTList() const override;
    krv::gobs::PCT* GetPCT(unsigned int nPCT) const override;
    unsigned int GetPCTChannel(unsigned int nPCT) const override;
    std::string GetPCTDescription(unsigned int nPCT) const override;
    unsigned int CreatePCT(const krv::gobs::PCT& oTable, unsigned int nChannel) override;
    void UpdatePCT(unsigned int nPCT, const krv::gobs::PCT& oTable) override;
    void SetPCTDescription(unsigned int nPCT, const std::string& oDescription) override;
    void DeletePCT(unsigned int nPCT) override;

    std::vector<unsigned int> GetLUTList() const override;
    krv::datasources::LookupTable GetLUT(unsigned int nLUT) const override;
    unsigned int GetLUTChannel(unsigned int nLUT) const override;
    std::string GetLUTDescription(unsigned int nLUT) const override;
    unsigned int CreateLUT(const krv::datasources::LookupTable& oTable, unsigned int nChannel) override;
    void UpdateLUT(unsigned int nLUT, const krv::datasources::LookupTable& oTable) override;
    void SetLUTDescription(unsigned int nLUT, const std::string& oDescription) override;
    void DeleteLUT(unsigned int nLUT) override;

    bool HasMathModel() const override { return !GetMathModelList().empty(); }
    std::vector<unsigned int> GetMathModelList() const override;
    krv::mathmodel::IMathModel* GetMathModel(unsigned int nSegment) override;
    // Throws DataException for any other than a rational polynomial one.
    unsigned int CreateMathModel(const krv::mathmodel::IMathModel& oModel) override;
    void DeleteMathModel(unsigned int nSegment) override;

    int HasEphemeris() const override { return GetEphemerisList().empty() ? 0 : 1; }
    std::vector<unsigned int> GetEphemerisList() const override;
    void DeleteEphemeris(unsigned int nSegment) override;
    // Of the linked file's orbits alone: what kinds there are and how models come from them is not known here.
    krv::mathmodel::IMathModel* BuildMathModel(unsigned int nEphemeris, unsigned int nSegment) override;
    unsigned int CreateEphemeris(const std::string& kind, const std::vector<unsigned char>& oRecords) override;
    krv::datasources::EphemerisRecords ReadEphemeris(unsigned int nSegment) const override;

    std::optional<std::uint64_t> GetUnusedBytes() override;
    std::string GetVariant() override;
    std::optional<std::vector<std::string>> CheckCloudLayout() override { return std::nullopt; }
    std::vector<std::string> Verify(const Progress& oProgress) override;

    // Of files whose channels are stored in one way: of one type, all together or each by itself, none of them deleted
    // or linked. Others say so by mbReadable and take no blocks. Checksums are compared with what is read. A linked
    // file that shows all channels of the other one, and no others, hands out the blocks of that.
    krv::datasources::EncodedForm GetEncodedForm(unsigned int nLevel) override;
    bool ReadEncoded(unsigned int nLevel, const krv::datasources::BlockNumber& oBlock,
                     std::vector<unsigned char>& oBytes) override;
    bool SetEncodedForm(unsigned int nLevel, const krv::datasources::EncodedForm& oForm) override;
    void StoreEncoded(unsigned int nLevel, const krv::datasources::BlockNumber& oBlock, const unsigned char* pBytes,
                      std::size_t nBytes) override;
    krv::datasources::IBlockEncoder* MakeBlockEncoder(unsigned int nLevel) override;
    bool TakeBlocks(unsigned int nLevel, krv::datasources::IDataset& oSource,
                    const std::vector<krv::datasources::BlockNumber>& oBlocks) override;

protected:
    void StoreRecord(const support::RecordText& oRecord) const override;
    std::uint64_t MakeRoom(unsigned int nLevel) override { return nLevel; }
    Level DescribeLevel(unsigned int nLevel) const override;
    std::shared_ptr<support::IBlockSource> MakeLevelSource(unsigned int nLevel, std::uint64_t nPlace) override;

private:
    class BitmapLevels;
    class History;
    struct CodedTile
    {
        std::shared_ptr<TileTable> mpoTable;
        std::uint64_t mnTile;
        bool mbPlain;
        std::size_t mnMost; // bytes
    };

    const Catalogue& GetCatalogue() const { return mpoWriter ? mpoWriter->GetCatalogue() : moCatalogue; }
    // The bitmaps of the file and of the linked one, and what one of them is called.
    std::vector<unsigned int> ListInside() const;
    std::string DescribeInside(unsigned int nBitmap) const;
    // The mask beside the file that a bitmap is, which there is where those inside do not say it; else 0.
    unsigned int FindBeside(unsigned int nBitmap) const;
    // The model beside it that a segment is, where there are no others; else 0.
    unsigned int FindModelBeside(unsigned int nSegment) const;
    // Of a file that is changed; throws DataException for any other.
    StoreWriter& GetWriter(const char* pWhat, const Place& oPlace) const;
    void ShowFile();
    void ShowLink();
    void LinkChannels(Catalogue& oCatalogue, const std::vector<krv::gobs::DataType>& oTypes, const Place& oPlace) const;
    // The number of a channel in the linked file, 0 for one of the file's own.
    unsigned int FindLinked(unsigned int nChannel) const;
    // The channel by which a channel of the linked file is seen; 0 when it is not.
    unsigned int FindOwnChannel(unsigned int nTheirs) const;
    const krv::datasources::IPCTDataset* FindLinkedPCT(unsigned int nPCT) const;
    const krv::datasources::ILUTDataset* FindLinkedLUT(unsigned int nLUT) const;
    krv::datasources::IBitmapDataset* FindLinkedBitmap(unsigned int nBitmap) const;
    // The numbers of segments of a kind, and those that the linked file has.
    template <class Facet>
    std::vector<unsigned int> ListWithLinked(const std::string& kind,
                                             std::vector<unsigned int> (Facet::*pList)() const) const;
    // The linked file's facet when it has that number and the file itself has not; else null.
    template <class Facet>
    Facet* FindLinkedSegment(const std::string& kind, unsigned int nNumber,
                             std::vector<unsigned int> (Facet::*pList)() const) const;
    // Whether the other file changed since a level was made of it.
    bool IsOutdated(unsigned int nChannel, unsigned int nLevel) const;
    void NoteMadeOf(unsigned int nChannel, unsigned int nLevel);
    void TakeLevel(unsigned int nLevel, krv::datasources::IOverviewManager& oTheirs);
    void TakeBitmap(unsigned int nBitmap);
    // Of a bitmap that comes, none of whose levels is valid.
    krv::datasources::MetadataMap MakeBitmapTags(const krv::datasources::MetadataMap& oMetadata) const;
    void ShowImage();
    std::shared_ptr<support::IBlockSource> MakeSource(std::vector<std::shared_ptr<Plane>> oPlanes, unsigned int nLevel,
                                                      const ImageSize& oSize, std::function<void()> oBeforeWrite) const;
    void AddPlanes(Catalogue& oCatalogue, const std::vector<krv::gobs::DataType>& oTypes, const Place& oPlace) const;
    void ChangeChannels(const std::vector<unsigned int>& oSources);
    // Everything that the state names, but for its root.
    void ForEachPiece(const std::function<void(const Entry& oEntry, const std::string& what)>& oAction,
                      const TileTable::Complain& oComplain);
    krv::datasources::IEncodedBlocks* FindLinkedBlocks(unsigned int nLevel) const;
    // Throws DataException for a level that does not exist.
    ImageSize GetLevelSize(unsigned int nLevel, const Place& oPlace) const;
    CodedTile FindTile(unsigned int nLevel, const krv::datasources::BlockNumber& oBlock, const Place& oPlace) const;
    static std::string DescribeTile(const CodedTile& oAt, const krv::datasources::BlockNumber& oBlock);
    // Where a tile lies, after its place was checked.
    Entry FindEntry(const CodedTile& oAt, const krv::datasources::BlockNumber& oBlock) const;
    void StoreTiles(unsigned int nLevel, const std::function<void(StoreWriter& oWriter)>& oStore, const Place& oPlace);
    bool TakesStorage(const krv::datasources::EncodedForm& oForm, unsigned int nLevel) const;
    std::unique_ptr<Catalogue> MakeCatalogue(const krv::datasources::EncodedForm& oForm, const Place& oPlace) const;
    // A level of which nothing is stored gets another size.
    void LayOutLevel(unsigned int nLevel, const ImageSize& oSize);
    std::shared_ptr<support::BlockImage> OpenBitmap(unsigned int nBitmap, unsigned int nLevel);

    // Segments. Those of a kind, ascending; one of them, or a DataException when there is none of that kind.
    std::vector<unsigned int> ListSegments(const std::string& kind) const;
    const Segment& GetSegment(const std::string& kind, unsigned int nNumber, const Place& oPlace) const;
    Segment& EditSegment(const std::string& kind, unsigned int nNumber, const Place& oPlace);
    unsigned int AddSegment(Segment oSegment, const Place& oPlace);
    unsigned int AddSegment(const std::string& kind, std::vector<unsigned char> oBytes, unsigned int nChannel,
                            const Place& oPlace);
    std::vector<unsigned char> ReadSegment(const std::string& kind, unsigned int nNumber, const Place& oPlace) const;
    void SetSegmentBytes(const std::string& kind, unsigned int nNumber, std::vector<unsigned char> oBytes,
                         const Place& oPlace);
    void DeleteSegment(const std::string& kind, unsigned int nNumber, const Place& oPlace);

    std::shared_ptr<StoreWriter> mpoWriter; // null when the file is only read
    std::shared_ptr<StoreFile> mpoStore;
    std::shared_ptr<Link> mpoLink; // null when all channels are the file's own
    Catalogue moCatalogue;         // of a file that is only read
    std::vector<std::vector<std::string>> moHistories;
    std::map<unsigned int, std::unique_ptr<History>> moHistoryFacets;
    std::shared_ptr<BitmapLevels> mpoBitmapLevels;
    std::map<std::pair<unsigned int, unsigned int>, std::shared_ptr<support::BlockImage>> moBitmaps; // number, level
};

template <class Facet>
std::vector<unsigned int> KrvdskDataset::ListWithLinked(const std::string& kind,
                                                        std::vector<unsigned int> (Facet::*pList)() const) const
{
    std::vector<unsigned int> oList = ListSegments(kind);
    if (const Facet* const poTheirs = mpoLink ? mpoLink->Find<Facet>() : nullptr)
    {
        const std::vector<unsigned int> oTheirs = (poTheirs->*pList)();
        oList.insert(oList.end(), oTheirs.begin(), oTheirs.end());
        std::sort(oList.begin(), oList.end());
        oList.erase(std::unique(oList.begin(), oList.end()), oList.end());
    }
    return oList;
}

template <class Facet>
Facet* KrvdskDataset::FindLinkedSegment(const std::string& kind, unsigned int nNumber,
                                        std::vector<unsigned int> (Facet::*pList)() const) const
{
    Facet* const poTheirs = mpoLink ? mpoLink->Find<Facet>() : nullptr;
    if (poTheirs == nullptr)
        return nullptr;
    const std::vector<unsigned int> oOwn = ListSegments(kind);
    const std::vector<unsigned int> oTheirs = (poTheirs->*pList)();
    const auto Has = [nNumber](const std::vector<unsigned int>& oList)
    {
        return std::find(oList.begin(), oList.end(), nNumber) != oList.end();
    };
    return Has(oTheirs) && !Has(oOwn) ? poTheirs : nullptr;
}

} // namespace krv::plugins::krvdsk
