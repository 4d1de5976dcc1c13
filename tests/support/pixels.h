#pragma once

#include "gobs/raster/raster.h"

#include <memory>
#include <string>

namespace krv::test
{

// The whole buffer.
inline std::string PixelsOf(const krv::gobs::Raster& oRaster)
{
    return {reinterpret_cast<const char*>(oRaster.GetBuffer()), oRaster.GetBufferSize()};
}

// The whole image of an IRasterReader.
template <class Reader>
std::string ReadPixels(Reader&& oReader)
{
    const std::unique_ptr<krv::gobs::Raster> oRaster(oReader.ReadRaster(0, 0, oReader.GetWidth(), oReader.GetHeight()));
    return PixelsOf(*oRaster);
}

} // namespace krv::test
