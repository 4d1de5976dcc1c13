#pragma once

#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/ipageddataset.h"
#include "datasources/metadata/auxiliarydata.h"
#include "plugins/gdball/pictures/vips/picturesource.h"
#include "plugins/gdball/pictures/vips/picturewriter.h"
#include "plugins/support/dataset.h"
#include "plugins/support/facetsbeside.h"
#include "toolkit/ogc/cs/geocodinginfo.h"

#include <memory>
#include <optional>

namespace krv::plugins::gdball
{

// A picture, read by libvips or written by it. Whatever is no pixel lies in files beside it.
class PictureDataset : public support::Dataset,
                       public krv::datasources::IGeocodedDataset,
                       public krv::datasources::IPagedDataset,
                       public support::FacetsBeside
{
public:
    PictureDataset(const std::string& fileName, Picture oPicture, krv::datasources::IFileFormat* poFormat);
    // A new one, which Create makes.
    PictureDataset(krv::datasources::IFileFormat* poFormat, std::shared_ptr<PictureWriter> poWriter);
    ~PictureDataset() override;

    void Create(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes) override;
    using support::Dataset::Create;
    bool KeepsPixels() const override;
    krv::datasources::AuxiliaryData ReadAuxiliaryData() override;
    void WriteAuxiliaryData(const krv::datasources::AuxiliaryData& oData) override;
    krv::ogc::cs::ICRS* ReadCRS() const override;
    void UpdateCRS(const krv::ogc::cs::ICRS& oCRS) const override;
    void Synchronize() override;
    void Close() override;

    const krv::ogc::cs::GeocodingInfo& GetGeocoding() const override;
    void SetGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo) override;

    unsigned int CountFurtherImages() const override { return mnFurther; }

private:
    support::Sidecars::Needs GetNeeds() const override { return {true, true, true, true}; }
    support::AuxXml GetBeside(const char* pWhat, const Place& oPlace) const;
    void StoreBeside(support::AuxXml oAuxXml) const;

    std::shared_ptr<PictureWriter> mpoWriter; // null when the file is only read
    krv::datasources::AuxiliaryData moTags;   // of the picture itself
    unsigned int mnFurther = 0;               // pages
    // Of the file of a later page: that lies where the first one does unless what lies beside it says otherwise.
    std::unique_ptr<support::Sidecars> mpoOfFile;
    bool mbOpacityMeant = false; // by whoever writes a channel of it
    mutable std::optional<krv::ogc::cs::GeocodingInfo> moGeocoding;
};

} // namespace krv::plugins::gdball
