#pragma once

#include "gobs/raster/datatype.h"

#include <cstddef>
#include <vector>

#include <openjpeg.h>

namespace krv::plugins::jp2
{

// The samples of a decoded component for a rectangle of pixels.
struct Samples
{
    const opj_image_comp_t* mpComponent = nullptr;
    std::vector<std::size_t> moColumns; // of each pixel; empty when samples are pixels
    std::vector<std::size_t> moRows;

    static Samples OfPixels(const opj_image_comp_t& oComponent) { return {&oComponent, {}, {}}; }
};

// Interleaves components as channels of a type of whole bytes, rows nPitch bytes apart. Samples fit the type.
void CopySamples(const std::vector<Samples>& oComponents, const krv::gobs::DataType& oType, std::size_t nWidth,
                 std::size_t nHeight, unsigned char* pTarget, std::size_t nPitch);

} // namespace krv::plugins::jp2
