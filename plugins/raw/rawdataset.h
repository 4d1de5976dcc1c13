#pragma once

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/imathmodeldataset.h"
#include "datasources/interfaces/ipctdataset.h"
#include "datasources/interfaces/iplaceremoval.h"
#include "plugins/raw/rawimage.h"
#include "plugins/raw/rawwriter.h"
#include "plugins/support/dataset.h"
#include "plugins/support/image/plainsource.h"
#include "plugins/support/writing/options.h"
#include "toolkit/mathmodel/rpccoefficients.h"

#include <memory>
#include <string>
#include <vector>

namespace krv::plugins::raw
{

// What users may say of a new file.
struct RawOptions
{
    Interleave meInterleave = Interleave::eBand;
    bool mbBigEndian = false;

    // Adds the keys with their places here.
    void List(support::Options& oOptions);
};

// A plain file with its header. Pixels are read and written without blocks. A header of ENVI's is changed as a whole,
// others are not changed; what a header does not say stands in the file ".aux.xml" beside it. The validity mask, bitmap
// 1, is the file ".msk"; there are no zones.
class RawDataset : public support::Dataset,
                   public krv::datasources::IGeocodedDataset,
                   public krv::datasources::IPCTDataset,
                   public krv::datasources::IBitmapDataset,
                   public krv::datasources::IMathModelDataset,
                   public krv::datasources::IPlaceRemoval
{
public:
    // Files to be read. Throws krv::FileException kinds that name file and cause.
    RawDataset(RawFiles oFiles, krv::datasources::IFileFormat* poFormat);
    // Files to be updated.
    RawDataset(krv::datasources::IFileFormat* poFormat, RawFiles oFiles, std::shared_ptr<RawWriter> poWriter);
    // A new one, which Create makes.
    RawDataset(krv::datasources::IFileFormat* poFormat, const RawOptions& oOptions,
               std::shared_ptr<RawWriter> poWriter);
    ~RawDataset() override;

    // All channels have one type, which the header knows.
    void Create(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes) override;
    using support::Dataset::Create;
    krv::datasources::IRasterIO* GetRasterIO(const std::vector<unsigned int>& oChannels) override;
    krv::datasources::FileAccessState Delete() override;
    void Synchronize() override;
    void Close() override;

    krv::datasources::AuxiliaryData ReadAuxiliaryData() override;
    void WriteAuxiliaryData(const krv::datasources::AuxiliaryData& oData) override;
    krv::ogc::cs::ICRS* ReadCRS() const override;
    void UpdateCRS(const krv::ogc::cs::ICRS& oCRS) const override;
    const krv::ogc::cs::GeocodingInfo& GetGeocoding() const override;
    void SetGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo) override;
    void RemoveCRS() override { StoreCRS(nullptr, "the reference system cannot be removed", Place::Current()); }
    void RemoveGeocoding() override { StoreGeocoding(nullptr, "the geocoding cannot be removed", Place::Current()); }

    // The colours of classes are table 1, of channel 1.
    std::vector<unsigned int> GetPCTList() const override;
    krv::gobs::PCT* GetPCT(unsigned int nPCT) const override;
    unsigned int GetPCTChannel(unsigned int nPCT) const override;
    std::string GetPCTDescription(unsigned int nPCT) const override;
    unsigned int CreatePCT(const krv::gobs::PCT& oTable, unsigned int nChannel) override;
    void UpdatePCT(unsigned int nPCT, const krv::gobs::PCT& oTable) override;
    void SetPCTDescription(unsigned int nPCT, const std::string& oDescription) override;
    void DeletePCT(unsigned int nPCT) override;

    std::vector<unsigned int> GetBitmapList() const override;
    krv::datasources::IRasterIO* GetBitmapIO(const std::vector<unsigned int>& oBitmaps) override;
    void DeleteBitmap(unsigned int nBitmap) override;
    unsigned int CreateBitmap() override;
    std::string GetBitmapDescription(unsigned int nBitmap) const override;
    void SetBitmapDescription(unsigned int nBitmap, const std::string& oDescription) override;
    krv::datasources::MetadataMap GetBitmapMetadata(unsigned int nBitmap) const override;
    void SetBitmapMetadata(unsigned int nBitmap, const krv::datasources::MetadataMap& oMetadata) override;
    krv::datasources::IOverviewManager* GetBitmapOverviewManager() override { return nullptr; }

    // Those of the texts beside the file; a rational polynomial model is written to the first one.
    bool HasMathModel() const override { return !GetMathModelList().empty(); }
    std::vector<unsigned int> GetMathModelList() const override;
    krv::mathmodel::IMathModel* GetMathModel(unsigned int nSegment) override;
    unsigned int CreateMathModel(const krv::mathmodel::IMathModel& oModel) override;
    void DeleteMathModel(unsigned int nSegment) override;

protected:
    support::Sidecars::Needs GetNeeds() const override;

private:
    void ShowImage(std::shared_ptr<support::File> poFile);
    bool HasHeader() const { return moImage.moFiles.meKind == RawKind::eEnvi; }
    std::unique_ptr<krv::ogc::cs::ICRS> ReadOwnCRS() const;
    void StoreBeside(support::AuxXml oAuxXml) const;
    void StoreCRS(const krv::ogc::cs::ICRS* poCRS, const char* pRefusal, const Place& oPlace) const;
    void StoreGeocoding(const krv::ogc::cs::GeocodingInfo* poInfo, const char* pRefusal, const Place& oPlace);
    void CheckBitmap(unsigned int nBitmap, const Place& oPlace) const;
    HeaderText& GetHeader(const char* pWhat, const Place& oPlace) const;
    void StoreHeader() const;
    void StorePCT(const krv::gobs::PCT& oTable, const Place& oPlace);
    void CheckPCT(unsigned int nPCT, const Place& oPlace) const;

    mutable RawImage moImage;
    RawOptions moOptions;
    std::shared_ptr<RawWriter> mpoWriter; // null when the file is only read
    std::shared_ptr<support::PlainSource> mpoSource;
    mutable std::optional<krv::ogc::cs::GeocodingInfo> moGeocoding;
    std::optional<krv::mathmodel::RpcCoefficients> moModel; // to be written
    bool mbZone = false;                                    // the new mask has not been made one of validity
};

} // namespace krv::plugins::raw
