#include "datasources/reader/detail/bitmapbackground.h"

#include "datasources/reader/basicreader.h"
#include "datasources/reader/detail/reducedvalidity.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/raster.h"

#include <utility>

namespace krv::datasources::detail
{

BitmapBackground::BitmapBackground(std::unique_ptr<BasicReader> poReader)
    : mpoReader(std::move(poReader)), mpoZero(ZeroOrNaN(1))
{
}

BitmapBackground::~BitmapBackground() = default;

void BitmapBackground::SetReader(std::unique_ptr<BasicReader> poReader)
{
    mpoReader = std::move(poReader);
}

krv::gobs::Mask* BitmapBackground::BuildMask(const krv::gobs::Raster& oRaster) const
{
    const krv::gobs::RasterInfo oInfo(oRaster.GetWidth(), oRaster.GetHeight(), 1, mpoReader->GetDataType());
    krv::gobs::Raster oBytes(oInfo, oRaster.GetContext());
    mpoReader->ReadRaster(&oBytes);
    return mpoZero->BuildMask(oBytes);
}

} // namespace krv::datasources::detail
