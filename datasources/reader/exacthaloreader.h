#pragma once

#include "datasources/reader/irasterreader.h"
#include "gobs/tile/tileiterator.h"

#include <memory>
#include <vector>

namespace krv::datasources
{

// Reads through another reader with margins of any width that are exact: a raster is the crop of the whole image
// extended beyond its borders by the margin behaviour, whatever its window, its margins and the tile size. Where
// BasicReader makes a margin from the pixels of one tile, this one takes the pixels of the image. Windows may lie
// partly or wholly outside the image. It has tiles and margins of its own; the source's are not touched. One thread at
// a time.
class KRV_DATASOURCES_API ExactHaloReader : public IRasterReader
{
public:
    // The source outlives this reader unless bTakeOwnership says that it goes with it; on failure it stays the
    // caller's. Throws DataException for a null source, one without pixels, and one of one-bit type.
    ExactHaloReader(IRasterReader* poSource, bool bTakeOwnership);
    ExactHaloReader(const ExactHaloReader&) = delete;
    ExactHaloReader& operator=(const ExactHaloReader&) = delete;
    ~ExactHaloReader() override;

    // The values of eConstant, one per channel in the order of the reader, converted to its type; 0 when never set.
    // Throws DataException for another number of values.
    void SetConstant(const std::vector<double>& oValues);

    // Any width with any behaviour. eException: a raster that reaches outside the image throws DataException. eNoData:
    // a channel without a no-data value that its type holds does. Throws ParameterException for an unknown behaviour
    // and keeps the former one.
    void SetMargins(unsigned int nXMargin, unsigned int nYMargin, eMarginBehaviour eBehaviour) override;

    krv::gobs::Raster* GetRaster(unsigned int nIndex) override;
    void ReadRaster(krv::gobs::Raster* poRaster) override;
    krv::gobs::Raster* ReadRaster(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight) override;
    RasterIterator FindRaster(unsigned int nX, unsigned int nY) override;
    RasterIterator Begin() override;
    RasterIterator End() override;
    unsigned int GetTileCount() const override;
    void SetOptimalTileSize() override;
    void SetTileSize(unsigned int nWidth, unsigned int nHeight) override;
    unsigned int GetTileWidth() const override { return mnTileWidth; }
    unsigned int GetTileHeight() const override { return mnTileHeight; }
    unsigned int GetXMargin() const override { return mnXMargin; }
    unsigned int GetYMargin() const override { return mnYMargin; }
    eMarginBehaviour GetMarginBehaviour() const override { return meMarginBehaviour; }

    // These are the source's.
    const std::vector<IChannelInfo*>& GetChannelsInfo() const override;
    IFileFormat* GetFileFormat() const override;
    AuxiliaryData GetAuxiliaryData() const override;
    krv::ogc::cs::ICRS* GetCRS() const override;
    krv::ogc::cs::GeocodingInfo* GetGeocodingInfo() const override;
    IOverviewReaderAccessor* GetOverviewReaderAccessor() override;
    unsigned int GetWidth() const override;
    unsigned int GetHeight() const override;
    unsigned int GetChansCount() const override;
    const krv::gobs::DataType& GetDataType() const override;

private:
    void ReadAcrossBorder(krv::gobs::Raster& oRaster);
    std::vector<unsigned char> MakeOutsidePixel() const;

    std::unique_ptr<IRasterReader> mpoOwnedSource;
    IRasterReader* mpoSource; // borrowed, or mpoOwnedSource
    krv::gobs::TileIterator moTiles;
    unsigned int mnTileWidth = 0;
    unsigned int mnTileHeight = 0;
    unsigned int mnXMargin = 0;
    unsigned int mnYMargin = 0;
    eMarginBehaviour meMarginBehaviour = eMirror;
    std::vector<double> moConstant;
    std::size_t mnPixelBytes = 0;
};

} // namespace krv::datasources
