#pragma once

#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/ilayoutdataset.h"
#include "datasources/interfaces/ipctdataset.h"
#include "datasources/metadata/auxiliarydata.h"
#include "plugins/jp2/geo/geoboxes.h"
#include "plugins/jp2/reading/boxes.h"
#include "plugins/jp2/reading/codestream.h"
#include "plugins/jp2/reading/imageheader.h"
#include "plugins/jp2/writing/jp2writer.h"
#include "plugins/support/dataset.h"
#include "plugins/support/facetsbeside.h"
#include "plugins/support/overviewmanager.h"

#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <vector>

namespace krv::plugins::jp2
{

// A JPEG 2000 image. Its resolutions are its levels, which are always valid; a palette is its pseudocolour table
// (number 1). A new file has levels when it is opened again.
class Jp2Dataset : public support::Dataset,
                   public krv::datasources::IGeocodedDataset,
                   public krv::datasources::IPCTDataset,
                   public krv::datasources::ILayoutDataset,
                   public support::FacetsBeside,
                   private support::LevelStore
{
public:
    // Throws krv::FileException kinds that name file and cause; nothing stays open then.
    Jp2Dataset(const std::string& fileName, krv::datasources::IFileFormat* poFormat);
    // A new one, which Create makes.
    Jp2Dataset(krv::datasources::IFileFormat* poFormat, std::shared_ptr<Jp2Writer> poWriter);
    ~Jp2Dataset() override;

    // Throws DataException for types that differ or that JPEG 2000 does not hold.
    void Create(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes) override;
    using support::Dataset::Create;
    bool KeepsPixels() const override;
    krv::datasources::AuxiliaryData ReadAuxiliaryData() override;
    void WriteAuxiliaryData(const krv::datasources::AuxiliaryData& oData) override;
    void UpdateCRS(const krv::ogc::cs::ICRS& oCRS) const override;
    krv::datasources::IChannelInfo* GetChannelInfo(unsigned int nChannel) const override;
    // Null for a new file.
    krv::datasources::IOverviewManager* GetOverviewManager() override;
    void Close() override;

    krv::ogc::cs::ICRS* ReadCRS() const override;
    // The identity when the file has no geocoding.
    const krv::ogc::cs::GeocodingInfo& GetGeocoding() const override;
    void SetGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo) override;

    std::vector<unsigned int> GetPCTList() const override;
    krv::gobs::PCT* GetPCT(unsigned int nPCT) const override;
    unsigned int GetPCTChannel(unsigned int nPCT) const override;
    std::string GetPCTDescription(unsigned int nPCT) const override;
    unsigned int CreatePCT(const krv::gobs::PCT& oTable, unsigned int nChannel) override;
    void UpdatePCT(unsigned int nPCT, const krv::gobs::PCT& oTable) override;
    void SetPCTDescription(unsigned int nPCT, const std::string& oDescription) override;
    void DeletePCT(unsigned int nPCT) override;

    std::string GetVariant() override;
    std::optional<std::vector<std::string>> CheckCloudLayout() override { return std::nullopt; }

protected:
    support::Sidecars::Needs GetNeeds() const override;

private:
    // As a store of levels.
    std::vector<Level> GetLevels() const override;
    std::shared_ptr<support::BlockImage> OpenLevel(unsigned int nLevel) override;
    const krv::datasources::AuxiliaryData& GetBook() const override;
    void MakeLevel(const Level& oLevel, const krv::datasources::AuxiliaryData& oBook, const Place& oPlace) override;
    void DropLevel(unsigned int nLevel, const krv::datasources::AuxiliaryData& oBook, const Place& oPlace) override;
    void WriteBook(const krv::datasources::AuxiliaryData& oBook, bool bValid, const Place& oPlace) override;

    void FindCodestream(const std::shared_ptr<support::File>& poFile);
    const GeoPlace& GetPlace() const;
    // What a bare codestream has no place for stands in ".aux.xml": oAdd puts it there.
    void KeepBeside(const std::function<void(support::AuxXml&)>& oAdd) const;
    const std::optional<krv::gobs::PCT>& GetPalette() const;
    void CheckPCT(unsigned int nPCT, const Place& oPlace) const;
    krv::datasources::AuxiliaryData ReadRecord() const;
    void DescribeChannels(krv::datasources::AuxiliaryData& oData) const;
    void Complain(const std::string& trouble) const;

    std::shared_ptr<Codestream> mpoStream; // null for a new file
    std::shared_ptr<Jp2Writer> mpoWriter;  // null when the file is only read
    std::vector<Box> moBoxes;              // of the file
    ImageHeader moHeader;
    std::map<unsigned int, std::shared_ptr<support::BlockImage>> moLevels; // that are open
    krv::datasources::AuxiliaryData moBook;                                // empty: no level is invalid
    mutable std::unique_ptr<GeoPlace> mpoPlace;                            // looked for when it is asked for
    mutable std::optional<krv::ogc::cs::GeocodingInfo> moGeocoding;        // the file's or that of a file beside it
    mutable std::set<std::string> moComplaints;
};

} // namespace krv::plugins::jp2
