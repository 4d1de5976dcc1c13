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
using ::AccessMode;
using enum ::AccessMode;
using datasources::DatasetManager;
using datasources::IDataset;
using datasources::IRasterDataset;

// Rasters: pixels in memory with their place in the image. Mask has a bit for each pixel, PCT is a colour table,
// RasterView gives typed rows. eMirror and the other behaviours of margins, eDT_8U and the other types.
using ::eMarginBehaviour;
using enum ::eMarginBehaviour;
using gobs::Complex;
using gobs::DataType;
using gobs::Mask;
using gobs::NativeDataTypeCode;
using gobs::PCT;
using gobs::Raster;
using gobs::RasterContext;
using gobs::RasterInfo;
using gobs::RasterView;
using enum gobs::NativeDataTypeCode;

// Readers: BasicReader for tiles and windows, ExactHaloReader where neighbours count, TransformRasterReader for another
// grid, ReaderValidity for which pixels count. RasterRange walks the tiles, ForEachTile does so on all cores.
using datasources::BasicReader;
using datasources::ExactHaloReader;
using datasources::ForEachTile;
using datasources::IRasterReader;
using datasources::RasterRange;
using datasources::ReaderValidity;
using datasources::TileJob;
using datasources::TransformRasterReader;
using datasources::TransformRequest;
using gobs::AffineMap;
using gobs::Resampling;
using threading::ThreadPool;

// Writers: BasicWriter for a new file or parts of one, ReplacingWriter for a file that appears whole or not at all,
// WriteTiles for tiles that come from all cores. Levels and what else belongs to an image come last.
using datasources::BasicWriter;
using datasources::BuildOverviews;
using datasources::CopyAllButPixels;
using datasources::GetDefaultLevels;
using datasources::IRasterWriter;
using datasources::ReplacingWriter;
using datasources::WriteTiles;

// What belongs to an image: its record of tags and no-data values, where it lies on the map, and in which system.
using datasources::AuxiliaryData;
using datasources::GetNoData;
using datasources::NoDataValue;
using datasources::SetFileNoData;
using datasources::SetNoData;
using ogc::cs::CoordinateTransformation;
using ogc::cs::CreateCRSFromEPSG;
using ogc::cs::CreateCRSFromWKT;
using ogc::cs::GeocodingInfo;
using ogc::cs::ICRS;
using ogc::cs::MapBounds;
using ogc::cs::PixelWindow;

} // namespace krv
