#pragma once

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/ipctdataset.h"
#include "datasources/interfaces/iplaceremoval.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/isidecardataset.h"
#include "plugins/gdball/levelsbeside.h"
#include "toolkit/ogc/cs/geocodinginfo.h"

#include <cstdio>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace krv::plugins::gdball
{

// An image with its levels beside it, shared by the datasets over it. One that is open for update stands in the table
// of open files, so that a second opening finds it.
class SharedImage
{
public:
    // Takes over the image. Throws DataException when it has no raster facet.
    SharedImage(const std::string& fileName, std::unique_ptr<krv::datasources::IDataset> poImage, AccessMode eMode);
    ~SharedImage();
    SharedImage(const SharedImage&) = delete;
    SharedImage& operator=(const SharedImage&) = delete;

    // The one that stands in the table under a name and a mode; null when there is none. Throws FileFormatException for
    // an entry that is somebody else's, or of one that goes this moment.
    static std::shared_ptr<SharedImage> Find(const std::string& fileName, AccessMode eMode);
    // Puts it there.
    static void Enter(const std::shared_ptr<SharedImage>& poImage);

    const std::string& GetName() const { return moName; }
    krv::datasources::IDataset& GetImage() const { return *mpoImage; }
    krv::datasources::IRasterDataset& GetRaster() const { return *mpoRaster; }
    LevelsBeside& GetLevels() { return *mpoLevels; }
    // The image's own facet of a kind, or null.
    template <typename Facet>
    Facet* Find() const
    {
        return dynamic_cast<Facet*>(mpoImage.get());
    }

    // Where the image's file is only read, though it was to be updated: what keeps beside it what it does not say. Else
    // null.
    krv::datasources::ISidecarWriting* GetBeside() const { return mpoBeside; }
    // What was set beside it, which the image's own dataset may have answered otherwise before.
    const std::optional<krv::ogc::cs::GeocodingInfo>& GetGeocoding() const { return moGeocoding; }
    void SetGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo) { moGeocoding = oInfo; }

    void Synchronize();

    // The datasets over it are counted, whatever else keeps it. The last one closes the files when it is closed itself,
    // and takes them out of the table in any case.
    void AddDataset() { ++mnDatasets; }
    void RemoveDataset(bool bClose);

private:
    void Leave();

    std::string moName;
    unsigned int mnDatasets = 0;
    std::unique_ptr<krv::datasources::IDataset> mpoImage;
    krv::datasources::IRasterDataset* mpoRaster;
    std::unique_ptr<LevelsBeside> mpoLevels;
    krv::datasources::ISidecarWriting* mpoBeside = nullptr;
    std::optional<krv::ogc::cs::GeocodingInfo> moGeocoding;
    AccessMode meMode;
    std::FILE* mpToken = nullptr; // what stands in the table
};

// A dataset over it: what the image has, with the levels beside it in place of its own, and with what else can be kept
// beside it where its file cannot be changed. A change of its pixels makes the levels outdated. The last of several
// that goes, or is closed, closes the files.
class GenericDataset : public krv::datasources::IDataset,
                       public krv::datasources::IRasterDataset,
                       public krv::datasources::IGeocodedDataset,
                       public krv::datasources::IPlaceRemoval,
                       public krv::datasources::IBitmapDataset,
                       public krv::datasources::IPCTDataset
{
public:
    explicit GenericDataset(std::shared_ptr<SharedImage> poImage);
    ~GenericDataset() override;

    krv::datasources::IFileFormat* GetFileFormat() const override;
    krv::datasources::FileAccessState Delete() override;
    bool Exists() const override;
    std::string GetName() override { return moName; }
    krv::datasources::AuxiliaryData ReadAuxiliaryData() override;
    void WriteAuxiliaryData(const krv::datasources::AuxiliaryData& oData) override;
    krv::ogc::cs::ICRS* ReadCRS() const override;
    void UpdateCRS(const krv::ogc::cs::ICRS& oCRS) const override;
    bool IsLinked() const override;
    void Synchronize() override;
    bool IsOpen() const override { return mpoImage != nullptr; }
    void Close() override;

    krv::datasources::IRasterIO* GetRasterIO(const std::vector<unsigned int>& oChannels) override;
    void AddNewChannel(const krv::gobs::RasterInfo& oInfo) override;
    void DeleteChannel(unsigned int nChannel) override;
    void Create(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes) override;
    void Create(const krv::gobs::RasterInfo& oInfo) override;
    unsigned int GetWidth() const override;
    unsigned int GetHeight() const override;
    unsigned int GetChanCount() const override;
    krv::datasources::IChannelInfo* GetChannelInfo(unsigned int nChannel) const override;
    krv::datasources::IHistoryIO* GetHistoryIO(unsigned int nChannel) override;
    krv::datasources::IOverviewManager* GetOverviewManager() override;
    krv::datasources::AccessCapabilities GetRasterCapabilities() override;

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
    // Of the image's own; none made here.
    krv::datasources::IOverviewManager* GetBitmapOverviewManager() override;

    std::vector<unsigned int> GetPCTList() const override;
    krv::gobs::PCT* GetPCT(unsigned int nPCT) const override;
    unsigned int GetPCTChannel(unsigned int nPCT) const override;
    std::string GetPCTDescription(unsigned int nPCT) const override;
    unsigned int CreatePCT(const krv::gobs::PCT& oTable, unsigned int nChannel) override;
    void UpdatePCT(unsigned int nPCT, const krv::gobs::PCT& oTable) override;
    void SetPCTDescription(unsigned int nPCT, const std::string& oDescription) override;
    void DeletePCT(unsigned int nPCT) override;

private:
    SharedImage& Get(const Place& oPlace = Place::Current()) const;
    // The facet; DataException that the image has none.
    template <typename Facet>
    Facet& Need(const char* pWhat, const Place& oPlace = Place::Current()) const;

    std::string moName;
    std::shared_ptr<SharedImage> mpoImage; // null when closed
    krv::ogc::cs::GeocodingInfo moIdentity;
};

} // namespace krv::plugins::gdball
