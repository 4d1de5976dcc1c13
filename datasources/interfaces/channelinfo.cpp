#include "datasources/interfaces/channelinfo.h"

namespace krv::datasources
{

namespace
{

// One-bit channels have no numeric limits of their own.
krv::gobs::DataTypeConstraints MakeConstraints(const krv::gobs::DataType& oType)
{
    krv::gobs::NativeDataTypeCode eCode;
    return oType.FindNativeCode(eCode) && eCode != krv::gobs::eDT_BIT ? krv::gobs::DataTypeConstraints(oType)
                                                                      : krv::gobs::DataTypeConstraints();
}

} // namespace

ChannelInfo::ChannelInfo(const krv::gobs::DataType& oNativeType, const krv::gobs::DataType& oType)
    : moNativeType(oNativeType), moType(oType), moConstraints(MakeConstraints(oType))
{
}

ChannelInfo::~ChannelInfo() = default;

} // namespace krv::datasources
