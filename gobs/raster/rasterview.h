#pragma once

#include "gobs/raster/pixelvalue.h"
#include "gobs/raster/raster.h"

#include <cstddef>
#include <span>
#include <type_traits>

namespace krv::gobs
{

namespace detail
{

// Throws DataException, see RasterView.
KRV_GOBS_API void CheckView(const Raster& oRaster, NativeDataTypeCode eViewed, std::size_t nAlignment,
                            const Place& oPlace);

} // namespace detail

// The values of a raster as what they are: RasterView<const float> reads a raster of 32R, RasterView<Complex<float>>
// reads and writes one of C32R. Rows and columns count from the first pixel of the centre, as Raster has it; margins
// have negative numbers before it and numbers from the width and height on behind. Positions are not checked.
// Borrows the raster: the raster lives longer, its buffer stays the raster's. As cheap to make as a pointer.
// Example: sums of the rows of a reader's tile of 32R:
//   RasterView<const float> oView(*poTile);
//   for (unsigned int y = 0; y < poTile->GetHeight(); ++y) nSum += std::accumulate(oView.GetRow(y).begin(), ...);
template <class Value>
class RasterView
{
public:
    using Target = std::conditional_t<std::is_const_v<Value>, const Raster, Raster>;

    // Throws DataException, which names both types, for a raster whose values are not of this type (one-bit ones never
    // are), and for a wrapped buffer that does not begin at a multiple of the value's alignment.
    explicit RasterView(Target& oRaster, const Place& oPlace = Place::Current())
        : mnChannels(oRaster.GetChansCount()), mnRowValues(oRaster.GetFullWidth() * mnChannels),
          mnMarginValues(std::size_t{oRaster.GetXMargin()} * mnChannels),
          mpFirst(reinterpret_cast<Value*>(oRaster.GetBuffer()) + oRaster.GetYMargin() * mnRowValues)
    {
        detail::CheckView(oRaster, PIXEL_TYPE_OF<Value>, alignof(Value), oPlace);
    }

    // The width * channels values of a row between the margins, the channels of a pixel side by side.
    // The span is valid as long as the raster. Rows from -GetYMargin() to height + GetYMargin() - 1 exist.
    std::span<Value> GetRow(std::ptrdiff_t nY) const
    {
        return GetFullRow(nY).subspan(mnMarginValues, mnRowValues - 2 * mnMarginValues);
    }
    // The same with the margins left and right of it.
    std::span<Value> GetFullRow(std::ptrdiff_t nY) const
    {
        return {mpFirst + nY * static_cast<std::ptrdiff_t>(mnRowValues), mnRowValues};
    }
    // One value; channels count from 0.
    // Slower in loops than a row: the place is worked out for each value.
    Value& At(std::ptrdiff_t nX, std::ptrdiff_t nY, unsigned int nChannel) const
    {
        const auto nPixel = static_cast<std::ptrdiff_t>(mnMarginValues) + nX * static_cast<std::ptrdiff_t>(mnChannels);
        return GetFullRow(nY).data()[nPixel + nChannel];
    }

private:
    std::size_t mnChannels;     // of a pixel
    std::size_t mnRowValues;    // of a row with both margins
    std::size_t mnMarginValues; // of one side
    Value* mpFirst;             // of row 0, its left margin included
};

} // namespace krv::gobs
