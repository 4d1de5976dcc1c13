#pragma once

#include "datasources/interfaces/ichannelinfo.h"
#include "gobs/raster/datatypeconstraints.h"

namespace krv::datasources
{

// The plain description of a channel.
// For plug-ins and synthetic datasets, whose GetChannelInfo gives a new one to the caller.
class KRV_DATASOURCES_API ChannelInfo : public IChannelInfo
{
public:
    // A channel that is stored as it is handed out.
    explicit ChannelInfo(const krv::gobs::DataType& oType) : ChannelInfo(oType, oType) {}
    // A channel that the file stores in a type of its own and hands out as oType.
    // Throws ParameterException for a type outside the table: it has no limits.
    ChannelInfo(const krv::gobs::DataType& oNativeType, const krv::gobs::DataType& oType);
    ~ChannelInfo() override;

    const krv::gobs::DataType& GetNativeDataType() const override { return moNativeType; }
    const krv::gobs::DataType& GetDataType() const override { return moType; }

    // Those of oType.
    const krv::gobs::DataTypeConstraints& GetConstraints() const override { return moConstraints; }

private:
    krv::gobs::DataType moNativeType;
    krv::gobs::DataType moType;
    krv::gobs::DataTypeConstraints moConstraints;
};

} // namespace krv::datasources
