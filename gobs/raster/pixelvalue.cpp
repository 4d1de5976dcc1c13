#include "gobs/raster/pixelvalue.h"

#include "toolkit/exceptions/exceptions.h"

namespace krv::gobs::detail
{

NativeDataTypeCode GetValueType(const DataType& oType, const Place& oPlace)
{
    const NativeDataTypeCode eType = oType.GetNativeCode(oPlace);
    if (eType == eDT_BIT)
        throw DataException("A value of type " + oType.Describe() + " has no bytes of its own", oPlace);
    return eType;
}

} // namespace krv::gobs::detail
