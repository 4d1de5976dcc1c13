#include "gobs/raster/rasterview.h"

#include "toolkit/exceptions/exceptions.h"

#include <cstdint>

namespace krv::gobs::detail
{

void CheckView(const Raster& oRaster, NativeDataTypeCode eViewed, std::size_t nAlignment, const Place& oPlace)
{
    if (oRaster.GetDataType() != eViewed)
        throw DataException("The raster has values of type " + oRaster.GetDataType().Describe() + ", not " +
                                DataType(eViewed).Describe(),
                            oPlace);
    if (reinterpret_cast<std::uintptr_t>(oRaster.GetBuffer()) % nAlignment != 0)
        throw DataException("The raster's buffer is not aligned for values of type " + DataType(eViewed).Describe(),
                            oPlace);
}

} // namespace krv::gobs::detail
