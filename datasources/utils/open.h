#pragma once

#include "datasources/api.h"
#include "datasources/interfaces/accessmode.h"
#include "gobs/raster/margins.h"
#include "toolkit/ogc/cs/mapwindow.h"

#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace krv::datasources
{
class ExactHaloReader;
class IBitmapDataset;
class IDataset;
class IOverviewAccessor;
class IOverviewReaderAccessor;
class IRasterIterable;
class IRasterReader;
class IRasterWriter;
} // namespace krv::datasources

namespace krv::gobs
{
class Mask;
class Raster;
class RasterInfo;
} // namespace krv::gobs

namespace krv::ogc::cs
{
class GeocodingInfo;
class ICRS;
} // namespace krv::ogc::cs

// What the interfaces hand out as raw pointers that the caller owns, as std::unique_ptr. A result is null only where
// that is said. Exceptions are those of the operations behind these, and DataException, which names the file, where one
// of them gives nothing.
namespace krv
{

// An existing file, as DatasetManager::Open.
// Throws FileNotFoundException and FileFormatException, whose what() names the file and the cause.
// Example: const auto poFile = krv::Open("scene.tif", eUpdate);
KRV_DATASOURCES_API std::unique_ptr<datasources::IDataset> Open(const std::string& fileName,
                                                                AccessMode eMode = eReadOnly);
// A new file of a format, as DatasetManager::NewDataset; it has neither size nor channels yet.
KRV_DATASOURCES_API std::unique_ptr<datasources::IDataset>

// options: KEY=VALUE separated by blanks, such as "COMPRESS=ZSTD".
Create(const std::string& fileName, const std::string& format, const std::string& options = {});

// Channels of a file or dataset, from 1, as one image; an empty list is all of them. Channels of several types are
// promoted to one that holds them (CreateDefaultReader). The reader owns the file; the dataset stays the caller's and
// outlives the reader. Margins at the edges of tiles may be made up: see BasicReader.
KRV_DATASOURCES_API std::unique_ptr<datasources::IRasterReader>

// Example: const auto poReader = krv::OpenReader("scene.tif", {4, 3, 2});
OpenReader(const std::string& fileName, const std::vector<unsigned int>& oChannels = {});
KRV_DATASOURCES_API std::unique_ptr<datasources::IRasterReader>
OpenReader(datasources::IDataset& oDataset, const std::vector<unsigned int>& oChannels = {});
// The same for work on neighbourhoods: every tile comes with nMargin pixels around it, those of the image wherever
// these lie inside, made by the behaviour beyond its borders.
KRV_DATASOURCES_API std::unique_ptr<datasources::ExactHaloReader>
OpenHaloReader(const std::string& fileName, const std::vector<unsigned int>& oChannels, unsigned int nMargin,
               eMarginBehaviour eBehaviour = eMirror);

// Channels of an existing file, to be updated; an empty list is all of them (CreateDefaultWriter).
KRV_DATASOURCES_API std::unique_ptr<datasources::IRasterWriter>

// What is written is the file's after Synchronize of the writer.
OpenWriter(const std::string& fileName, const std::vector<unsigned int>& oChannels = {});
// A new file with an image of that size, type and number of channels, laid out; it is there after Synchronize. A name
// that is taken is a DataException.
KRV_DATASOURCES_API std::unique_ptr<datasources::IRasterWriter> CreateWriter(const std::string& fileName,
                                                                             const gobs::RasterInfo& oInfo,
                                                                             const std::string& format = "TIF",
                                                                             const std::string& options = {});

// A window, with the current margins of the reader; or the pixels that a rectangle in the map coordinates of the
// reader's own reference system touches. Throws DataException for a rectangle that holds no pixel.
KRV_DATASOURCES_API std::unique_ptr<gobs::Raster> Read(datasources::IRasterReader& oReader,
                                                       const ogc::cs::PixelWindow& oWindow);
KRV_DATASOURCES_API std::unique_ptr<gobs::Raster> Read(datasources::IRasterReader& oReader,
                                                       const ogc::cs::MapBounds& oBounds);
// Those pixels; nothing when there are none, or when the image has no place on the ground.
KRV_DATASOURCES_API std::optional<ogc::cs::PixelWindow> FindWindow(const datasources::IRasterReader& oReader,
                                                                   const ogc::cs::MapBounds& oBounds);
// A tile, from 0, with the current margins. RasterRange goes through all of them.
// Throws OutOfBoundsException for an index beyond the last tile.
KRV_DATASOURCES_API std::unique_ptr<gobs::Raster> ReadTile(datasources::IRasterIterable& oTiles, unsigned int nIndex);
// A bitmap (from 1) of a dataset; its set bits are the bitmap's. Throws DataException for a dataset without bitmaps.
KRV_DATASOURCES_API std::unique_ptr<gobs::Mask> ReadBitmap(datasources::IDataset& oDataset, unsigned int nBitmap,
                                                           const ogc::cs::PixelWindow& oWindow);

// Null and nothing where the image has none.
KRV_DATASOURCES_API std::unique_ptr<ogc::cs::ICRS> GetCRS(const datasources::IRasterReader& oReader);
KRV_DATASOURCES_API std::optional<ogc::cs::GeocodingInfo> GetGeocoding(const datasources::IRasterReader& oReader);

// The reduction factors of the levels that are up to date in every channel, ascending.
KRV_DATASOURCES_API std::vector<unsigned int> GetLevels(datasources::IRasterReader& oReader);
// A level as an image of its own; oReader outlives it. Shared, since it goes with an accessor that has to outlive it.
// Throws DataException for a level that is not there.
KRV_DATASOURCES_API std::shared_ptr<datasources::IRasterReader> OpenLevel(datasources::IRasterReader& oReader,
                                                                          unsigned int nLevel);

} // namespace krv
