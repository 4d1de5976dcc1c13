#pragma once

#include "datasources/interfaces/ichannelinfo.h"
#include "gobs/raster/datatypeconstraints.h"

namespace krv::datasources
{

// The plain description of a channel that is stored as it is handed out.
class KRV_DATASOURCES_API ChannelInfo : public IChannelInfo
{
public:
    explicit ChannelInfo(const krv::gobs::DataType& oType);
    ~ChannelInfo() override;

    const krv::gobs::DataType& GetNativeDataType() const override { return moNativeType; }
    const krv::gobs::DataType& GetDataType() const override { return moType; }
    const krv::gobs::DataTypeConstraints& GetConstraints() const override { return moConstraints; }

private:
    krv::gobs::DataType moNativeType;
    krv::gobs::DataType moType;
    krv::gobs::DataTypeConstraints moConstraints;
};

} // namespace krv::datasources
