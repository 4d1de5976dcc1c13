#pragma once

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/metadata/auxiliarydata.h"
#include "gobs/raster/datatype.h"
#include "toolkit/ogc/cs/geocodinginfo.h"

#include <functional>
#include <map>
#include <memory>
#include <set>
#include <string>
#include <utility>
#include <vector>

namespace krv::test
{

// What a synthetic dataset is made of. Its pixels are those of the recipe; bitmaps hold the lowest bit of its 8U values
// with the bitmap's number for the channel, levels the values of channel + 1000 * level.
struct ImageModel
{
    std::string moName = "synthetic";
    unsigned int mnWidth = 21;
    unsigned int mnHeight = 17;
    unsigned int mnTileWidth = 8;
    unsigned int mnTileHeight = 6;
    std::vector<krv::gobs::DataType> moTypes = {krv::gobs::eDT_16U, krv::gobs::eDT_16U, krv::gobs::eDT_16U};
    krv::datasources::IFileFormat* mpoFormat = nullptr;
    krv::datasources::AuxiliaryData moAuxiliary = krv::datasources::AuxiliaryData(3);
    krv::ogc::cs::GeocodingInfo moGeocoding;
    std::function<krv::ogc::cs::ICRS*()> moMakeCRS;
    bool mbOverviewManager = true;
    std::vector<unsigned int> moLevels;                         // each level is ceil(size / level)
    std::set<std::pair<unsigned int, unsigned int>> moOutdated; // channel, level
    std::map<unsigned int, std::string> moBitmaps;              // number, description

    unsigned int LevelWidth(unsigned int nLevel) const { return (mnWidth + nLevel - 1) / nLevel; }
    unsigned int LevelHeight(unsigned int nLevel) const { return (mnHeight + nLevel - 1) / nLevel; }
};
using ImageModelPtr = std::shared_ptr<ImageModel>;

// The facets one by one; Synthetic puts a dataset together from those that a test wants.
class DatasetPart : public krv::datasources::IDataset
{
public:
    explicit DatasetPart(ImageModelPtr poModel) : mpoModel(std::move(poModel)) {}

    krv::datasources::IFileFormat* GetFileFormat() const override { return mpoModel->mpoFormat; }
    krv::datasources::FileAccessState Delete() override { return krv::datasources::eDone; }
    bool Exists() const override { return true; }
    std::string GetName() override { return mpoModel->moName; }
    krv::datasources::AuxiliaryData ReadAuxiliaryData() override { return mpoModel->moAuxiliary; }
    void WriteAuxiliaryData(const krv::datasources::AuxiliaryData& oData) override { mpoModel->moAuxiliary = oData; }
    krv::ogc::cs::ICRS* ReadCRS() const override { return mpoModel->moMakeCRS ? mpoModel->moMakeCRS() : nullptr; }
    void UpdateCRS(const krv::ogc::cs::ICRS&) const override {}
    bool IsLinked() const override { return false; }
    void Synchronize() override {}
    bool IsOpen() const override { return mbOpen; }
    void Close() override { mbOpen = false; }

private:
    ImageModelPtr mpoModel;
    bool mbOpen = true;
};

class RasterPart : public krv::datasources::IRasterDataset
{
public:
    explicit RasterPart(ImageModelPtr poModel) : mpoModel(std::move(poModel)) {}

    krv::datasources::IRasterIO* GetRasterIO(const std::vector<unsigned int>& oChannels) override;
    void AddNewChannel(const krv::gobs::RasterInfo&) override {}
    void DeleteChannel(unsigned int) override {}
    void Create(unsigned int, unsigned int, const std::vector<krv::gobs::DataType>&) override {}
    void Create(const krv::gobs::RasterInfo&) override {}
    unsigned int GetWidth() const override { return mpoModel->mnWidth; }
    unsigned int GetHeight() const override { return mpoModel->mnHeight; }
    unsigned int GetChanCount() const override { return static_cast<unsigned int>(mpoModel->moTypes.size()); }
    krv::datasources::IChannelInfo* GetChannelInfo(unsigned int nChannel) const override;
    krv::datasources::IHistoryIO* GetHistoryIO(unsigned int) override { return nullptr; }
    krv::datasources::IOverviewManager* GetOverviewManager() override;
    krv::datasources::AccessCapabilities GetRasterCapabilities() override { return {true, false, false}; }

private:
    ImageModelPtr mpoModel;
};

class GeocodedPart : public krv::datasources::IGeocodedDataset
{
public:
    explicit GeocodedPart(ImageModelPtr poModel) : mpoModel(std::move(poModel)) {}

    const krv::ogc::cs::GeocodingInfo& GetGeocoding() const override { return mpoModel->moGeocoding; }
    void SetGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo) override { mpoModel->moGeocoding = oInfo; }

private:
    ImageModelPtr mpoModel;
};

class BitmapPart : public krv::datasources::IBitmapDataset
{
public:
    explicit BitmapPart(ImageModelPtr poModel) : mpoModel(std::move(poModel)) {}

    std::vector<unsigned int> GetBitmapList() const override;
    krv::datasources::IRasterIO* GetBitmapIO(const std::vector<unsigned int>& oBitmaps) override;
    void DeleteBitmap(unsigned int nBitmap) override { mpoModel->moBitmaps.erase(nBitmap); }
    unsigned int CreateBitmap() override;
    std::string GetBitmapDescription(unsigned int nBitmap) const override { return mpoModel->moBitmaps.at(nBitmap); }
    void SetBitmapDescription(unsigned int nBitmap, const std::string& oDescription) override;
    krv::datasources::MetadataMap GetBitmapMetadata(unsigned int nBitmap) const override;
    void SetBitmapMetadata(unsigned int, const krv::datasources::MetadataMap&) override {}
    krv::datasources::IOverviewManager* GetBitmapOverviewManager() override { return nullptr; }

private:
    ImageModelPtr mpoModel;
};

template <class... Parts>
class Synthetic : public Parts...
{
public:
    explicit Synthetic(const ImageModelPtr& poModel) : Parts(poModel)... {}
};

using SyntheticDataset = Synthetic<DatasetPart, RasterPart, GeocodedPart, BitmapPart>;
using DatasetWithoutRaster = Synthetic<DatasetPart>;

// The recipe's pixels of a synthetic bitmap or level, as its I/O objects deliver them.
std::string BitmapImage(const ImageModel& oModel, const std::vector<unsigned int>& oBitmaps);
std::string LevelImage(const ImageModel& oModel, unsigned int nLevel, const std::vector<unsigned int>& oChannels);

} // namespace krv::test
