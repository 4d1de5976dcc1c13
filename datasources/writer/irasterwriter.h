#pragma once

#include "datasources/reader/irasterreader.h"

namespace krv::gobs
{
class RasterInfo;
}

namespace krv::datasources
{

class IOverviewWriterAccessor;

// Tile-oriented write access to some channels of an image, which reads what it wrote as well. What was written counts
// from Synchronize on, which reports every failure: a writer that goes without it drops what came after the last one,
// and a new file that never got that far. One thread at a time.
// The order of the virtual operations is fixed.
// Tiles may be written in any order and more than once; whole blocks of the format, row by row, are quickest.
class KRV_DATASOURCES_API IRasterWriter : public virtual IRasterIterable, public virtual IRasterReader
{
public:
    // Stores the raster's centre at the raster's position; margins never reach the file, and nothing is clipped here.
    // Channel count and type are those of the writer, else DataException before anything is written.
    // The raster stays the caller's and may be used again at once. Throws IOException when it cannot be written.
    virtual void WriteRaster(const krv::gobs::Raster* poRaster) = 0;
    // Whether there is an image to write to: a file under the name, or a new one from CreateNewFile on.
    virtual bool FileExists() = 0;
    // Lays out the image of a new file. Throws DataException when the file has one already and when the channel count
    // differs from the writer's list.
    virtual void CreateNewFile(const krv::gobs::RasterInfo& oInfo) = 0;
    // Replaces the file metadata, and metadata and description of each written channel: channel n of the record is the
    // n-th written channel. The file's other channels keep theirs.
    virtual void SetAuxiliaryData(const AuxiliaryData& oData) = 0;
    // Throws DataException for a null reference system.
    virtual void SetCRS(const krv::ogc::cs::ICRS* poCRS) = 0;
    // Does nothing for a format without georeferencing, intended: callers carry it over where it can go.
    virtual void SetGeocodingInfo(const krv::ogc::cs::GeocodingInfo& oInfo) = 0;
    // A new object owned by the caller, or null for bitmaps and overview levels.
    virtual IOverviewWriterAccessor* GetOverviewWriterAccessor() = 0;
    // Makes what was written the file's; failures to write show here at the latest. To be called before the writer
    // goes.
    virtual void Synchronize() = 0;
};

} // namespace krv::datasources
