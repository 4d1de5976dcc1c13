#pragma once

#include "datasources/reader/irasteriterable.h"
#include "gobs/raster/margins.h"

namespace krv::gobs
{
class DataType;
}

namespace krv::ogc::cs
{
class GeocodingInfo;
class ICRS;
} // namespace krv::ogc::cs

namespace krv::datasources
{

class AuxiliaryData;
class IFileFormat;
class IOverviewReaderAccessor;

// Tile-oriented read access to some channels of an image, all handed out in one data type. One thread at a time.
// The order of the virtual operations is fixed.
// Threads use readers of their own, over datasets of their own (ForEachTile makes them), or fronts of a RasterCache.
class KRV_DATASOURCES_API IRasterReader : public virtual IRasterIterable
{
public:
    // Owned by the format's builder; null for synthetic datasets.
    virtual IFileFormat* GetFileFormat() const = 0;
    // The margins of rasters that are made from now on, in pixels. Margins of more than half the image are accepted
    // with eReplicate alone, else DataException; the behaviour is stored even then.
    virtual void SetMargins(unsigned int nXMargin, unsigned int nYMargin, eMarginBehaviour eBehaviour) = 0;
    // The columns of the margin on each side, in pixels; 0 until they are set.
    virtual unsigned int GetXMargin() const = 0;
    // The rows of the margin above and below.
    virtual unsigned int GetYMargin() const = 0;
    // How margins beyond the image are made; eMirror until it is set.
    virtual eMarginBehaviour GetMarginBehaviour() const = 0;
    // Fills the caller's raster: its own position, size and margins say which pixels. Channel count and type are those
    // of the reader, else DataException before anything is read. Contents are undefined after an exception.
    virtual void ReadRaster(krv::gobs::Raster* poRaster) = 0;
    // A new raster of any window with the current margins, owned by the caller.
    virtual krv::gobs::Raster* ReadRaster(unsigned int nX, unsigned int nY, unsigned int nWidth,
                                          unsigned int nHeight) = 0;
    // File metadata, and metadata and description of each channel of this reader: channel n of the result is the n-th
    // channel of its rasters.
    virtual AuxiliaryData GetAuxiliaryData() const = 0;
    // A new object owned by the caller, or null.
    virtual krv::ogc::cs::ICRS* GetCRS() const = 0;
    // The transform for the pixels of this reader, a level's larger ones included; a new object owned by the caller, or
    // null.
    virtual krv::ogc::cs::GeocodingInfo* GetGeocodingInfo() const = 0;
    // A new object owned by the caller, or null. The reader's dataset outlives it.
    virtual IOverviewReaderAccessor* GetOverviewReaderAccessor() = 0;
    // The columns of the image, in pixels.
    virtual unsigned int GetWidth() const = 0;
    // The rows of the image.
    virtual unsigned int GetHeight() const = 0;
    // The channels of every raster.
    virtual unsigned int GetChansCount() const = 0;
    // The type of every raster, which need not be that of the file. Lives as long as the reader.
    virtual const krv::gobs::DataType& GetDataType() const = 0;
};

} // namespace krv::datasources
