#pragma once

#include "datasources/reader/derived/derivedreader.h"

#include <cstdint>
#include <functional>
#include <memory>

namespace krv::datasources
{

// The defaults suit windows that a viewer asks for.
struct CacheOptions
{
    // Pixels of a cached tile; 0: the source's tile.
    unsigned int mnTileWidth = 0;
    unsigned int mnTileHeight = 0;
    // The most bytes that this cache keeps; 0: as the process's budget has room.
    std::uint64_t mnCeiling = 0;
    // Margins of any width that are those of the whole image, as ExactHaloReader has them, in place of the source's.
    bool mbExactMargins = false;
    // Tiles that GetRaster has handed out once go first: for a pass in order beside other work.
    bool mbPassing = false;
};

// Numbers of a cache since it was made, all of its fronts and levels together.
// Hits over hits and misses is the share of tiles that cost nothing.
struct CacheStatistics
{
    std::uint64_t mnHits = 0;   // tiles that were there, or that another thread was making
    std::uint64_t mnMisses = 0; // tiles that were read from the source
    std::uint64_t mnPassed = 0; // rasters that the source filled itself, for their margins
};

// Keeps tiles of what another reader makes, so that windows that overlap are made once. It pays above work on pixels:
// mixed types, colours, power, transforms; blocks of files have a cache of their own below it. The answers are those of
// the source, margins included: a raster whose margins reach the border of the image is filled by the source itself.
// All tiles count into the process's one budget (krv::cache::TileStore); the least recently used go first.
//
// The one reader with a lock. A copy is another front over the same tiles: margins and tile grid belong to a front, and
// each thread uses a front of its own. The source is read under a lock, or, when a factory makes one for each front,
// without. A tile that several threads want is read once; who waits gets the exception of a failed reading, which
// leaves nothing behind.
// Example: four threads over one transformed image, each with its own source:
//   RasterCache oCache([] { return MakeTransformed("scene.tif"); });
//   RasterCache oFront(oCache);   // in each thread
class KRV_DATASOURCES_API RasterCache : public DerivedReader
{
public:
    using Factory = std::function<std::unique_ptr<IRasterReader>()>;

    // The source outlives the last front unless bTakeOwnership says that it goes with it; on failure it stays the
    // caller's. Nobody else uses it meanwhile. Throws DataException for a null source, one without pixels and one of
    // one-bit type.
    RasterCache(IRasterReader* poSource, bool bTakeOwnership, const CacheOptions& oOptions = {});
    // A source for each front, made by the front's thread when it first needs one. All are of one image. Throws
    // DataException for an empty factory and one that makes nothing, or something of another size, type or channels,
    // here and when a front reads.
    explicit RasterCache(Factory oMake, const CacheOptions& oOptions = {});
    // Another front, with the margins and grid that the other one has now.
    RasterCache(const RasterCache& oOther);
    RasterCache& operator=(const RasterCache&) = delete;
    ~RasterCache() override;

    void SetOptimalTileSize() override;
    void SetMargins(unsigned int nXMargin, unsigned int nYMargin, eMarginBehaviour eBehaviour) override;
    using DerivedReader::ReadRaster;
    krv::gobs::Raster* GetRaster(unsigned int nIndex) override;
    void ReadRaster(krv::gobs::Raster* poRaster) override;
    const std::vector<IChannelInfo*>& GetChannelsInfo() const override;
    IFileFormat* GetFileFormat() const override;
    AuxiliaryData GetAuxiliaryData() const override;
    krv::ogc::cs::ICRS* GetCRS() const override;
    krv::ogc::cs::GeocodingInfo* GetGeocodingInfo() const override;
    // The levels of the source, whose tiles are kept with the others.
    IOverviewReaderAccessor* GetOverviewReaderAccessor() override;
    unsigned int GetWidth() const override;
    unsigned int GetHeight() const override;
    unsigned int GetChansCount() const override;
    const krv::gobs::DataType& GetDataType() const override;
    IDataset* GetDataset() const override { return nullptr; }
    const std::vector<unsigned int>& GetChannels() const override;

    bool HasValidity() override;
    std::unique_ptr<krv::gobs::Mask> ReadValid(krv::gobs::Raster& oRaster) override;

    // Forget tiles of pixels that changed: those of a rectangle of the image, and all levels; or everything. Any front.
    void Invalidate(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight);
    void InvalidateAll();

    // A copy of one moment. Any front.
    CacheStatistics GetStatistics() const;

private:
    friend class CachedLevels;
    struct Core;
    struct Image;
    class Front;

    RasterCache(std::shared_ptr<Core> poCore, unsigned int nLevel, std::unique_ptr<IRasterReader> poLevel);
    void UseSourceGrid();

    std::shared_ptr<Image> mpoImage;
    std::unique_ptr<Front> mpoFront;
    bool mbPassing = false; // while GetRaster runs
};

} // namespace krv::datasources
