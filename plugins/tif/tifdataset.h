#pragma once

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/iblockencoding.h"
#include "datasources/interfaces/iblocktransfer.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/ilayoutdataset.h"
#include "datasources/interfaces/imathmodeldataset.h"
#include "datasources/interfaces/ipageddataset.h"
#include "datasources/interfaces/ipctdataset.h"
#include "datasources/interfaces/iplaceremoval.h"
#include "datasources/interfaces/istoragedataset.h"
#include "datasources/metadata/auxiliarydata.h"
#include "plugins/support/dataset.h"
#include "plugins/support/overviewmanager.h"
#include "plugins/tif/reading/page.h"
#include "plugins/tif/reading/pagelist.h"
#include "plugins/tif/reading/strilesource.h"
#include "plugins/tif/writing/fileeditor.h"
#include "toolkit/ogc/cs/geocodinginfo.h"

#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <vector>

namespace krv::plugins::tif
{

// A TIFF file: the image is its first page. Reduced pages are its levels, mask pages its bitmaps, the colour map its
// pseudocolour table (number 1, of channel 1), tag 50844 its sensor model (number 3, behind those that lie beside the
// file). Opening for reading reads the first page only; the rest is looked at
// when it is asked for. With an editor the file can be changed.
class TifDataset : public support::Dataset,
                   public krv::datasources::IGeocodedDataset,
                   public krv::datasources::IBitmapDataset,
                   public krv::datasources::IPCTDataset,
                   public krv::datasources::IMathModelDataset,
                   public krv::datasources::IStorageDataset,
                   public krv::datasources::IPagedDataset,
                   public krv::datasources::IPlaceRemoval,
                   public krv::datasources::ILayoutDataset,
                   public krv::datasources::IEncodedBlocks,
                   public krv::datasources::IBlockEncoding,
                   public krv::datasources::IBlockTransfer
{
public:
    // Throws krv::FileException kinds that name file and cause; nothing stays open then.
    TifDataset(const std::string& fileName, krv::datasources::IFileFormat* poFormat);
    // A file to be updated, or a new one, whose image Create lays out.
    TifDataset(krv::datasources::IFileFormat* poFormat, std::shared_ptr<FileEditor> poEditor);
    ~TifDataset() override;

    void Synchronize() override;
    // Types that differ throw DataException: a TIFF image has one.
    void Create(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes) override;
    using support::Dataset::Create;
    void AddNewChannel(const krv::gobs::RasterInfo& oInfo) override;
    // Both make new pages of the image and its levels; I/O objects made before are of no more use.
    void DeleteChannel(unsigned int nChannel) override;

    krv::datasources::AuxiliaryData ReadAuxiliaryData() override;
    // Which levels are valid is not taken from the record: their manager keeps that.
    void WriteAuxiliaryData(const krv::datasources::AuxiliaryData& oData) override;
    void UpdateCRS(const krv::ogc::cs::ICRS& oCRS) const override;
    krv::ogc::cs::ICRS* ReadCRS() const override;
    void Close() override;
    krv::datasources::IOverviewManager* GetOverviewManager() override;

    // The identity when the file has no geocoding.
    const krv::ogc::cs::GeocodingInfo& GetGeocoding() const override;
    void SetGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo) override;
    void RemoveCRS() override;
    void RemoveGeocoding() override;

    std::vector<unsigned int> GetBitmapList() const override;
    krv::datasources::IRasterIO* GetBitmapIO(const std::vector<unsigned int>& oBitmaps) override;
    void DeleteBitmap(unsigned int nBitmap) override;
    unsigned int CreateBitmap() override;
    std::string GetBitmapDescription(unsigned int nBitmap) const override;
    void SetBitmapDescription(unsigned int nBitmap, const std::string& oDescription) override;
    krv::datasources::MetadataMap GetBitmapMetadata(unsigned int nBitmap) const override;
    void SetBitmapMetadata(unsigned int nBitmap, const krv::datasources::MetadataMap& oMetadata) override;
    // Reduced masks belong to the validity mask; where there is none, to a zone that is stored as a mask. They go when
    // it becomes another bitmap.
    krv::datasources::IOverviewManager* GetBitmapOverviewManager() override;

    std::vector<unsigned int> GetPCTList() const override;
    krv::gobs::PCT* GetPCT(unsigned int nPCT) const override;
    unsigned int GetPCTChannel(unsigned int nPCT) const override;
    std::string GetPCTDescription(unsigned int nPCT) const override;
    unsigned int CreatePCT(const krv::gobs::PCT& oTable, unsigned int nChannel) override;
    void UpdatePCT(unsigned int nPCT, const krv::gobs::PCT& oTable) override;
    void SetPCTDescription(unsigned int nPCT, const std::string& oDescription) override;
    void DeletePCT(unsigned int nPCT) override;

    bool HasMathModel() const override { return !GetMathModelList().empty(); }
    std::vector<unsigned int> GetMathModelList() const override;
    krv::mathmodel::IMathModel* GetMathModel(unsigned int nSegment) override;
    // The file has one place for a model: a new one takes it. Throws DataException for any other than a rational
    // polynomial one.
    unsigned int CreateMathModel(const krv::mathmodel::IMathModel& oModel) override;
    // Models beside the file stay.
    void DeleteMathModel(unsigned int nSegment) override;

    unsigned int CountFurtherImages() const override;

    std::optional<std::uint64_t> GetUnusedBytes() override;
    std::string GetVariant() override;
    std::optional<std::vector<std::string>> CheckCloudLayout() override;

    krv::datasources::EncodedForm GetEncodedForm(unsigned int nLevel) override;
    bool KeepsPixels() const override;
    bool ReadEncoded(unsigned int nLevel, const krv::datasources::BlockNumber& oBlock,
                     std::vector<unsigned char>& oBytes) override;
    bool SetEncodedForm(unsigned int nLevel, const krv::datasources::EncodedForm& oForm) override;
    void StoreEncoded(unsigned int nLevel, const krv::datasources::BlockNumber& oBlock, const unsigned char* pBytes,
                      std::size_t nBytes) override;
    krv::datasources::IBlockEncoder* MakeBlockEncoder(unsigned int nLevel) override;
    bool TakeBlocks(unsigned int nLevel, krv::datasources::IDataset& oSource,
                    const std::vector<krv::datasources::BlockNumber>& oBlocks) override;

protected:
    support::Sidecars::Needs GetNeeds() const override;

private:
    class Levels;

    // The other pages by what they are to the first one.
    struct PageTable
    {
        std::vector<PageLevel> moLevels;
        std::vector<PageSummary> moMasks;
        std::vector<PageLevel> moMaskLevels;
        unsigned int mnFurtherImages = 0;
    };

    // The levels of the image or of its mask, and the pixels of a page.
    const std::vector<PageLevel>& GetLevels(PixelUse eUse) const;
    std::unique_ptr<support::LevelStore> MakeLevels(PixelUse eUse);
    // The number of the bitmap that the mask levels belong to; 0 when there is none.
    unsigned int GetLevelBitmap() const;
    std::shared_ptr<support::BlockImage> OpenPage(std::uint64_t nDirectory, PixelUse eUse);
    krv::datasources::AuxiliaryData ReadPageMetadata(std::uint64_t nDirectory) const;
    void OpenImage();
    void ChangeChannels(const std::vector<unsigned int>& oSources, const Place& oPlace);
    std::uint64_t GetFullPage(PixelUse eUse) const;
    const krv::datasources::AuxiliaryData& GetBook(PixelUse eUse) const;
    void WatchImage();
    void ForgetOldPixels();
    void StorePCT(const krv::gobs::PCT& oTable, const Place& oPlace);
    std::shared_ptr<support::IBlockSource> MakeSource(const std::shared_ptr<PageModel>& poModel, PixelUse eUse);
    FileEditor& GetEditor(const char* pWhat, const Place& oPlace) const;
    // An operation that changes the structure of the file: all of it, or nothing when it throws.
    void Edit(const std::function<void()>& oAction) const;
    void AddPage(const std::shared_ptr<PageModel>& poPage, const Place& oPlace);
    void ForgetPages() const;
    void ShowImage(std::shared_ptr<support::IBlockSource> poSource);
    Page& GetPage(const Place& oPlace = Place::Current()) const;
    const PageTable& GetPages() const;
    bool HasOwnMask() const;
    // The mask beside the file that a bitmap is, which there is where the file has no validity mask of its own; else 0.
    unsigned int FindBeside(unsigned int nBitmap) const;
    const PageSummary& GetMask(unsigned int nBitmap, const Place& oPlace) const;
    void CheckPCT(unsigned int nPCT, const Place& oPlace) const;
    krv::datasources::AuxiliaryData ReadRecord() const;
    // Says once what is wrong with the file and does not keep it from being read.
    void Complain(const std::string& trouble) const;
    // What a level's page is known by, and the page as its blocks are read.
    std::uint64_t FindLevelPage(unsigned int nLevel, const Place& oPlace) const;
    std::shared_ptr<Page> GetCodedPage(unsigned int nLevel, const Place& oPlace);
    // Where the bytes of a block lie in the file; none are there of one that is not stored.
    CodedStrile FindCoded(Page& oPage, const krv::datasources::BlockNumber& oBlock, const Place& oPlace) const;
    // Has the page of a level store blocks as bytes.
    void StoreCoded(unsigned int nLevel, const std::function<void(PageWriter& oWriter)>& oStore, const Place& oPlace);

    std::unique_ptr<support::LevelStore> mpoLevels;
    std::unique_ptr<support::LevelStore> mpoMaskLevels;
    std::shared_ptr<FileEditor> mpoEditor; // null when the file is only read
    std::shared_ptr<support::File> mpoFile;
    mutable std::shared_ptr<Page> mpoPage;
    std::weak_ptr<PageWriter> mpoImageWriter;
    std::map<std::uint64_t, std::weak_ptr<PageWriter>> moWriters;        // of the pages that were opened, by number
    mutable std::map<std::uint64_t, std::shared_ptr<Page>> moCodedPages; // whose blocks are read as bytes
    std::string moResampling;
    mutable std::map<PixelUse, krv::datasources::AuxiliaryData> moBooks;
    mutable std::unique_ptr<PageTable> mpoPages;
    mutable std::optional<krv::ogc::cs::GeocodingInfo> moGeocoding;
    mutable std::set<std::string> moComplaints; // what was said already
    std::map<std::pair<std::uint64_t, PixelUse>, std::shared_ptr<support::BlockImage>> moImages;
};

} // namespace krv::plugins::tif
