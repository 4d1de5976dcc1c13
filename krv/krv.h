#pragma once

// The common names of the library in one namespace, for programs that read and write rasters:
//     #include <krv/krv.h>
//     const auto poReader = krv::OpenHaloReader("scene.tif", {1}, 8);
//     for (const std::unique_ptr<krv::Raster> poTile : krv::RasterRange(*poReader)) ...
// Each name is also what its own header calls it; both may be mixed. Pointers that callers own are std::unique_ptr here
// (datasources/utils/open.h). Authors of formats include what they use of datasources/interfaces instead.

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/typednodata.h"
#include "datasources/overviews/overviewbuilder.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/derived/transformrasterreader.h"
#include "datasources/reader/exacthaloreader.h"
#include "datasources/reader/ioverviewaccessor.h"
#include "datasources/reader/rasterrange.h"
#include "datasources/reader/readervalidity.h"
#include "datasources/reader/tilework.h"
#include "datasources/utils/open.h"
#include "datasources/writer/basicwriter.h"
#include "datasources/writer/copyallbutpixels.h"
#include "datasources/writer/replacingwriter.h"
#include "datasources/writer/tilewriting.h"
#include "gobs/mask/mask.h"
#include "gobs/pct/pct.h"
#include "gobs/raster/raster.h"
#include "gobs/raster/rasterview.h"
#include "gobs/resampling/gridmap.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/ogc/cs/coordinatetransformation.h"
#include "toolkit/ogc/cs/crsfactory.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/ogc/cs/mapwindow.h"
#include "toolkit/threading/threadpool.h"

namespace krv
{

// Files: eReadOnly, eUpdate. DatasetManager opens and creates them, IDataset is an open one, and IRasterDataset the
// part of it that has pixels.
// eReadOnly is what a file is opened with unless somebody asks for more. A file that is updated is one writer's at a
// time;
// readers of it go on.
using ::AccessMode;
using enum ::AccessMode;

// DatasetManager::GetInstance() is the process's one manager; any thread may ask for it.
using datasources::DatasetManager;

// Facets beside pixels (bitmaps, colour tables, sensor models) are reached by dynamic_cast from an IDataset.
using datasources::IDataset;
using datasources::IRasterDataset;

// Rasters: pixels in memory with their place in the image. Mask has a bit for each pixel, PCT is a colour table,
// RasterView gives typed rows. eMirror and the other behaviours of margins, eDT_8U and the other types.
// eException, eReplicate, eMirror, eMirror101, eConstant, eNoData, eWrap (gobs/raster/margins.h).
using ::eMarginBehaviour;
using enum ::eMarginBehaviour;

// RasterView<const Complex<float>> reads a raster of C32R.
using gobs::Complex;
using gobs::DataType;

// krv::ReadBitmap reads one of a file; WriteMask (datasources/maskbuilder/maskio.h) stores one.
using gobs::Mask;
using gobs::NativeDataTypeCode;
using gobs::PCT;

// RasterInfo says size, channels and type of one, RasterContext its place and margins.
using gobs::Raster;
using gobs::RasterContext;
using gobs::RasterInfo;
using gobs::RasterView;

// The number is the bits of a part: U and S are unsigned and signed integers, R a real, C a complex value of two parts.
using enum gobs::NativeDataTypeCode;

// Readers: BasicReader for tiles and windows, ExactHaloReader where neighbours count, TransformRasterReader for another
// grid, ReaderValidity for which pixels count. RasterRange walks the tiles, ForEachTile does so on all cores.
// krv::OpenReader and krv::OpenHaloReader choose and own; a reader is one thread's at a time.
using datasources::BasicReader;
using datasources::ExactHaloReader;

// TileJob lends it a pool, and tells how far it is.
using datasources::ForEachTile;
using datasources::IRasterReader;
using datasources::RasterRange;
using datasources::ReaderValidity;
using datasources::TileJob;

// Its request says size and method; AffineMap or a map of one's own says where pixels come from.
using datasources::TransformRasterReader;
using datasources::TransformRequest;
using gobs::AffineMap;
using gobs::Resampling;

// Threads are the program's: it makes one pool and lends it to jobs by their executor.
using threading::ThreadPool;

// Writers: BasicWriter for a new file or parts of one, ReplacingWriter for a file that appears whole or not at all,
// WriteTiles for tiles that come from all cores. Levels and what else belongs to an image come last.
using datasources::BasicWriter;

// GetDefaultLevels gives the usual reduction factors, Resampling names how a level's pixels are made.
using datasources::BuildOverviews;

// For a new image of the same size and place: tags, geocoding, reference system, colour tables, sensor models.
using datasources::CopyAllButPixels;
using datasources::GetDefaultLevels;

// What was written is the file's after Synchronize, which reports every failure.
using datasources::IRasterWriter;
using datasources::ReplacingWriter;

// Tiles are read, worked on and encoded on all cores, and stored in order by the calling thread.
using datasources::WriteTiles;

// What belongs to an image: its record of tags and no-data values, where it lies on the map, and in which system.
using datasources::AuxiliaryData;

// Typed by the call: SetNoData(oRecord, -9999.0, 1) and GetNoData<float>(oRecord, 1). SetFileNoData is for all
// channels.
using datasources::GetNoData;
using datasources::NoDataValue;
using datasources::SetFileNoData;
using datasources::SetNoData;

// x is easting or longitude and y northing or latitude, whatever order of axes an authority gives a system.
using ogc::cs::CoordinateTransformation;
using ogc::cs::CreateCRSFromEPSG;
using ogc::cs::CreateCRSFromWKT;

// (0, 0) is the outer corner of the first pixel, (0.5, 0.5) its centre.
using ogc::cs::GeocodingInfo;

// krv::GetCRS gives that of a reader; CreateCRSFromEPSG and CreateCRSFromWKT make one.
using ogc::cs::ICRS;

// A rectangle on the map and a rectangle of pixels: krv::Read and krv::FindWindow take the one and give the other.
using ogc::cs::MapBounds;
using ogc::cs::PixelWindow;

} // namespace krv
