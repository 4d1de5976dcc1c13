#include "gobs/raster/buffertype.h"

#include "toolkit/exceptions/exceptions.h"

namespace krv::gobs
{

raster::BufferType QRFDataType2RasterBufferType(const DataType& oType)
{
    using namespace raster;
    constexpr BufferType TYPES[] = {eBT_8U,  eBT_8S,  eBT_16U,  eBT_16S,  eBT_32U,  eBT_32S,  eBT_32R, eBT_64U,
                                    eBT_64S, eBT_64R, eBT_C16U, eBT_C16S, eBT_C32S, eBT_C32R, eBT_C64R};
    NativeDataTypeCode eCode{};
    if (!oType.FindNativeCode(eCode) || eCode == eDT_BIT)
        throw ParameterException("There is no buffer type for the data type (" + oType.Describe() + ")",
                                 ParameterException::eInvalidValue, "oType");
    return TYPES[eCode];
}

} // namespace krv::gobs
