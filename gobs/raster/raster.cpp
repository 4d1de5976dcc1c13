#include "gobs/raster/raster.h"

#include "toolkit/exceptions/exceptions.h"

namespace krv::gobs
{

namespace
{

std::uint64_t FullBytes(const RasterInfo& oInfo, const RasterContext& oContext, const Place& oPlace)
{
    return BufferBytes(oInfo.GetWidth() + 2ull * oContext.GetXMargin(),
                       oInfo.GetHeight() + 2ull * oContext.GetYMargin(), oInfo.GetChansCount(), oInfo.GetDataType(),
                       oPlace);
}

} // namespace

Raster::Raster(const RasterInfo& oInfo, const RasterContext& oContext)
    : moInfo(oInfo), moContext(oContext), mnBufferSize(FullBytes(oInfo, oContext, Place::Current())),
      mpBuffer(static_cast<unsigned char*>(HMalloc(mnBufferSize)), {true})
{
}

Raster::Raster(const RasterInfo& oInfo, const RasterContext& oContext, unsigned char* pBuffer, bool bTakeOwnership)
    : moInfo(oInfo), moContext(oContext), mnBufferSize(0), mpBuffer(pBuffer, {bTakeOwnership})
{
    if (pBuffer == nullptr)
        throw DataException("pBuffer is NULL, cannot create a Raster on NULL", Place::AtLine(52));
    mnBufferSize = FullBytes(oInfo, oContext, Place::Current());
}

Raster::~Raster() = default;

} // namespace krv::gobs
