#pragma once

#include "datasources/reader/derived/derivedreader.h"

#include <vector>

namespace krv::datasources
{

class BasicReader;

// Reads through another reader with margins of any width that are exact: a raster is the crop of the whole image
// extended beyond its borders by the margin behaviour, whatever its window, its margins and the tile size. Where
// BasicReader makes a margin from the pixels of one tile, this one takes the pixels of the image. Windows may lie
// partly or wholly outside the image. It has tiles and margins of its own; the source's are not touched. Its levels are
// read so too, each by a reader with margins and values of its own. One thread at a time.
// Example: tiles for a filter of 7 x 7 pixels, whose results do not show where tiles meet:
//   BasicReader oSource("scene.tif");
//   ExactHaloReader oReader(&oSource, false);
//   oReader.SetMargins(3, 3, eMirror);
// Costs the pixels of the margins beside those of the tiles; blocks that neighbours share are decoded once.
class KRV_DATASOURCES_API ExactHaloReader : public DerivedReader
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
    // They count when SetMargins is told eConstant.
    void SetConstant(const std::vector<double>& oValues);

    // Any width with any behaviour. eException: a raster that reaches outside the image throws DataException. eNoData:
    // a channel without a no-data value that its type holds does. Throws ParameterException for an unknown behaviour
    // and keeps the former one.
    void SetMargins(unsigned int nXMargin, unsigned int nYMargin, eMarginBehaviour eBehaviour) override;

    using DerivedReader::ReadRaster;
    void ReadRaster(krv::gobs::Raster* poRaster) override;
    // Whether a raster with its margins lies in the image.
    bool IsInside(const krv::gobs::Raster& oRaster) const;
    // Pixels that are made of the constant or the no-data value are not valid.
    std::unique_ptr<krv::gobs::Mask> ReadValid(krv::gobs::Raster& oRaster) override;

private:
    class ValidityChannel;

    LevelWrapper GetLevelWrapper() const override;
    void ReadInside(krv::gobs::Raster& oRaster);
    void ReadScattered(krv::gobs::Raster& oRaster);
    std::vector<unsigned char> MakeOutsidePixel() const;

    BasicReader* mpoPlainSource = nullptr; // the source, when it is a BasicReader that nobody derived from
    std::vector<double> moConstant;
    std::unique_ptr<ExactHaloReader> mpoValidity; // of the source as a channel; made when margins ask for it
    std::size_t mnPixelBytes = 0;
};

} // namespace krv::datasources
