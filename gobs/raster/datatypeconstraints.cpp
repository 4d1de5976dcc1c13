#include "gobs/raster/datatypeconstraints.h"

#include "toolkit/exceptions/exceptions.h"

#include <cmath>
#include <limits>

namespace krv::gobs
{

namespace
{

const DataType& CheckInTable(const DataType& oType, const Place& oPlace)
{
    NativeDataTypeCode eCode{};
    if (!oType.FindNativeCode(eCode) || eCode == eDT_BIT)
        throw ParameterException("There are no limits for the data type (" + oType.Describe() + ")",
                                 ParameterException::eInvalidValue, "oType", oPlace);
    return oType;
}

} // namespace

DataTypeConstraints::DataTypeConstraints(const DataType& oType)
    : moType(CheckInTable(oType, Place::Current())), mbInteger(!oType.IsReal())
{
    if (mbInteger)
    {
        const std::uint32_t nSignBits = oType.IsSigned() ? 1 : 0;
        mnIntegerMaximum = ~std::uint64_t(0) >> (64 - oType.GetBits() + nSignBits);
        mnIntegerMinimum = oType.IsSigned() ? -static_cast<std::int64_t>(mnIntegerMaximum) - 1 : 0;
        mnMinimum = static_cast<double>(mnIntegerMinimum);
        mnMaximum = static_cast<double>(mnIntegerMaximum);
        mnEpsilon = 1;
        return;
    }
    const bool bSingle = oType.GetBits() == 32;
    mnMaximum = bSingle ? std::numeric_limits<float>::max() : std::numeric_limits<double>::max();
    mnMinimum = -mnMaximum;
    mnEpsilon = bSingle ? std::numeric_limits<float>::epsilon() : std::numeric_limits<double>::epsilon();
}

bool DataTypeConstraints::Holds(double nValue) const
{
    if (moType == DataType())
        return false;
    if (!mbInteger)
        return moType.GetBits() == 64 || !std::isfinite(nValue) ||
               (std::fabs(nValue) <= mnMaximum && static_cast<double>(static_cast<float>(nValue)) == nValue);
    if (!std::isfinite(nValue) || nValue != std::trunc(nValue))
        return false;
    const double nEnd = std::ldexp(1.0, static_cast<int>(moType.GetBits()) - (moType.IsSigned() ? 1 : 0));
    return nValue >= mnMinimum && nValue < nEnd;
}

} // namespace krv::gobs
