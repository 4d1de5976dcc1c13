#pragma once

#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/ipctdataset.h"
#include "datasources/interfaces/iplaceremoval.h"
#include "plugins/raw/rawimage.h"
#include "plugins/raw/rawwriter.h"
#include "plugins/support/dataset.h"
#include "plugins/support/facetsbeside.h"
#include "plugins/support/image/plainsource.h"
#include "plugins/support/writing/options.h"

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
// others are not changed; what a header does not say stands in the file ".aux.xml" beside it.
class RawDataset : public support::Dataset,
                   public krv::datasources::IGeocodedDataset,
                   public krv::datasources::IPCTDataset,
                   public krv::datasources::IPlaceRemoval,
                   public support::FacetsBeside
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

protected:
    support::Sidecars::Needs GetNeeds() const override;

private:
    void ShowImage(std::shared_ptr<support::File> poFile);
    bool HasHeader() const { return moImage.moFiles.meKind == RawKind::eEnvi; }
    std::unique_ptr<krv::ogc::cs::ICRS> ReadOwnCRS() const;
    void StoreBeside(support::AuxXml oAuxXml) const;
    void StoreCRS(const krv::ogc::cs::ICRS* poCRS, const char* pRefusal, const Place& oPlace) const;
    void StoreGeocoding(const krv::ogc::cs::GeocodingInfo* poInfo, const char* pRefusal, const Place& oPlace);
    HeaderText& GetHeader(const char* pWhat, const Place& oPlace) const;
    void StoreHeader() const;
    void StorePCT(const krv::gobs::PCT& oTable, const Place& oPlace);
    void CheckPCT(unsigned int nPCT, const Place& oPlace) const;

    mutable RawImage moImage;
    RawOptions moOptions;
    std::shared_ptr<RawWriter> mpoWriter; // null when the file is only read
    std::shared_ptr<support::PlainSource> mpoSource;
    mutable std::optional<krv::ogc::cs::GeocodingInfo> moGeocoding;
};

} // namespace krv::plugins::raw
