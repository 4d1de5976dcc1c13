#pragma once

#include "datasources/datasets/filelessdataset.h"
#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/ipctdataset.h"

#include <cstdint>
#include <limits>
#include <memory>
#include <string>
#include <vector>

namespace krv::datasources
{

// Example: {"mosaic", std::uint64_t{4} << 30, -9999} for at most 4 GiB, and -9999 where nothing is written.
struct MemoryOptions
{
    static constexpr std::uint64_t NO_CEILING = std::numeric_limits<std::uint64_t>::max();

    std::string moName;                   // what messages call it; none is made up
    std::uint64_t mnCeiling = NO_CEILING; // of the bytes of all pixels, those of levels and bitmaps too
    double mnFill = 0;                    // the value of pixels that nobody wrote, as conversion makes it a sample
};

// An image in memory with all that a file would have: channels of any types, geocoding, reference system, record,
// bitmaps, colour tables and levels. Channels of one type that are laid out together lie pixel interleaved in tiles of
// 256 x 256 pixels. A tile takes memory from its first writing on; what was never written is the fill value. There is
// no image until Create.
//
// Copies, and the datasets of Share, are further accesses to the same contents, which stay until the last of them and
// of their I/O objects goes: so results are handed on without a copy of pixels. Several threads may read through
// accesses of their own as long as nobody writes.
//
// Writing that needs more bytes than the ceiling allows throws DataException before any pixel changes. The first
// Synchronize makes the image settled: from then on statistics in the record go with the first change of pixels. Levels
// are outdated by every change.
class KRV_DATASOURCES_API MemoryDataset : public FilelessDataset, public IBitmapDataset, public IPCTDataset
{
public:
    // The options are copied. Allocates no pixels.
    explicit MemoryDataset(const MemoryOptions& oOptions = {});

    // Another access to the same contents, as Share.
    MemoryDataset(const MemoryDataset& oOther);
    ~MemoryDataset() override;

    // A new access to the same contents.
    // For those who take an IDataset and know nothing of its kind. What one access writes the others read.
    std::unique_ptr<IDataset> Share() const;
    // The bytes of all pixels that there are.
    // Of tiles that were written, of the image, its levels and bitmaps. It is what the ceiling bounds.
    std::uint64_t GetBytes() const;

    // From Create on.
    bool Exists() const override;
    AuxiliaryData ReadAuxiliaryData() override;
    // Which levels are valid is not taken from the record: their manager keeps that.
    void WriteAuxiliaryData(const AuxiliaryData& oData) override;
    krv::ogc::cs::ICRS* ReadCRS() const override;
    void UpdateCRS(const krv::ogc::cs::ICRS& oCRS) const override;
    void Synchronize() override;

    // Blocks of 256 x 256 pixels. It keeps the contents alive by itself.
    IRasterIO* GetRasterIO(const std::vector<unsigned int>& oChannels) override;
    void AddNewChannel(const krv::gobs::RasterInfo& oInfo) override;
    void DeleteChannel(unsigned int nChannel) override;
    using FilelessDataset::Create;
    void Create(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes) override;
    unsigned int GetWidth() const override;
    unsigned int GetHeight() const override;
    unsigned int GetChanCount() const override;
    IChannelInfo* GetChannelInfo(unsigned int nChannel) const override;
    IOverviewManager* GetOverviewManager() override;

    // All that can be done with a raster.
    AccessCapabilities GetRasterCapabilities() override { return {true, true, true}; }

    const krv::ogc::cs::GeocodingInfo& GetGeocoding() const override;
    void SetGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo) override;

    // Bitmaps, as IBitmapDataset has them; a byte for each pixel of a tile that was written.
    std::vector<unsigned int> GetBitmapList() const override;
    IRasterIO* GetBitmapIO(const std::vector<unsigned int>& oBitmaps) override;
    void DeleteBitmap(unsigned int nBitmap) override;
    unsigned int CreateBitmap() override;
    std::string GetBitmapDescription(unsigned int nBitmap) const override;
    void SetBitmapDescription(unsigned int nBitmap, const std::string& oDescription) override;
    MetadataMap GetBitmapMetadata(unsigned int nBitmap) const override;
    void SetBitmapMetadata(unsigned int nBitmap, const MetadataMap& oMetadata) override;
    // Levels of the validity mask; null without one.
    IOverviewManager* GetBitmapOverviewManager() override;

    // Colour tables, as IPCTDataset has them: any number, each of a channel or of none.
    std::vector<unsigned int> GetPCTList() const override;
    krv::gobs::PCT* GetPCT(unsigned int nPCT) const override;
    unsigned int GetPCTChannel(unsigned int nPCT) const override;
    std::string GetPCTDescription(unsigned int nPCT) const override;
    unsigned int CreatePCT(const krv::gobs::PCT& oTable, unsigned int nChannel) override;
    void UpdatePCT(unsigned int nPCT, const krv::gobs::PCT& oTable) override;
    void SetPCTDescription(unsigned int nPCT, const std::string& oDescription) override;
    void DeletePCT(unsigned int nPCT) override;

private:
    struct Contents;
    class Manager;

    Contents& Get(const Place& oPlace = Place::Current()) const;

    std::shared_ptr<Contents> mpoContents;
};

} // namespace krv::datasources
