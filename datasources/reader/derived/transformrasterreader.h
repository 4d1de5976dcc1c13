#pragma once

#include "datasources/reader/derived/derivedreader.h"
#include "gobs/resampling/resampling.h"
#include "toolkit/ogc/cs/geocodinginfo.h"

#include <memory>
#include <optional>
#include <vector>

namespace krv::gobs
{
class IGridMap;
}

namespace krv::datasources
{

// How an image is made of another one.
// Example: {.mnWidth = 500, .mnHeight = 500, .meMethod = krv::gobs::Resampling::eBilinear}.
struct TransformRequest
{
    unsigned int mnWidth = 0;  // of the result
    unsigned int mnHeight = 0; // rows of the result
    // eNearest, eBilinear, eCubic, eLanczos, eAverage or eMode, see InterpolationRule.
    krv::gobs::Resampling meMethod = krv::gobs::Resampling::eNearest;
    // What pixels without a source become, one for all channels or one for each; none: the source's no-data value,
    // else NaN for real types and 0 for integers.
    std::vector<double> moBackground = {};
    bool mbExact = false; // never from levels of the source
    bool mbClamp = true;  // cubic and lanczos keep to the range of the pixels that they reach
    // Of the result, for maps that are not affine; the others carry that of the source along.
    std::optional<krv::ogc::cs::GeocodingInfo> moGeocoding = {};
};

// Shows an image in another grid: every pixel is made of those of the source around the place that a map gives its
// centre. Channels, type and reference system are the source's; the result does not depend on windows and tiles.
//
// Where the result is coarser than the source, pixels come from the coarsest level of the source that is not coarser
// than the result, unless it was made by a method that does not fit, and kernels are stretched by what is left; nearest
// takes single pixels of the image. The source is read in windows of at most some 64 MiB.
//
// Samples that are not valid in the source (its validity, its channels' no-data values, NaN) and places outside of it
// take no part; a value is valid when valid samples have half of the weight (kernels) or there is one (others).
// Otherwise it is the background. A valid one that equals the no-data value of the result becomes its neighbour. The
// no-data value of the result is the background that was asked for, else the source's, else, for real types, "nan" when
// a pixel of the result can be invalid. IValidityReader tells which pixels are valid: those with a valid value in a
// channel that has a no-data value, or in any channel when none has.
//
// Margins of any width and behaviour are those of the whole result extended beyond its borders. There are no levels:
// another request gives a smaller image. It shows no dataset: its pixels are not those of one.
// Example: half of an image's size:
//   const auto poMap = std::make_shared<AffineMap>(GeocodingInfo(0, 2, 0, 0, 0, 2));
//   TransformRasterReader oHalf(poReader, poMap, {poReader->GetWidth() / 2, poReader->GetHeight() / 2}, false);
class KRV_DATASOURCES_API TransformRasterReader : public DerivedReader
{
public:
    // The source outlives this reader unless bTakeOwnership says that it goes with it; on failure it stays the
    // caller's. The map leads from pixels of the result to those of the source. Throws DataException for a null source
    // or map, one without pixels, a result without pixels or with too many tiles, and a wrong number of background
    // values, ParameterException for another method.
    TransformRasterReader(IRasterReader* poSource, std::shared_ptr<const krv::gobs::IGridMap> poMap,
                          const TransformRequest& oRequest, bool bTakeOwnership);
    TransformRasterReader(const TransformRasterReader&) = delete;
    TransformRasterReader& operator=(const TransformRasterReader&) = delete;
    ~TransformRasterReader() override;

    void SetOptimalTileSize() override;
    // Any width with any behaviour, as ExactHaloReader has it.
    void SetMargins(unsigned int nXMargin, unsigned int nYMargin, eMarginBehaviour eBehaviour) override;
    using DerivedReader::ReadRaster;
    void ReadRaster(krv::gobs::Raster* poRaster) override;
    AuxiliaryData GetAuxiliaryData() const override;
    krv::ogc::cs::GeocodingInfo* GetGeocodingInfo() const override;
    IOverviewReaderAccessor* GetOverviewReaderAccessor() override { return nullptr; }
    unsigned int GetWidth() const override;
    unsigned int GetHeight() const override;
    IDataset* GetDataset() const override { return nullptr; }
    const std::vector<unsigned int>& GetChannels() const override;

    bool HasValidity() override;
    std::unique_ptr<krv::gobs::Mask> ReadValid(krv::gobs::Raster& oRaster) override;

private:
    class Implementation;

    std::unique_ptr<Implementation> mpoImplementation;
};

} // namespace krv::datasources
