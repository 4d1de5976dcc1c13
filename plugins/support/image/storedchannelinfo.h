#pragma once

#include "datasources/interfaces/ichannelinfo.h"
#include "gobs/raster/datatypeconstraints.h"
#include "plugins/support/image/imagelayout.h"

namespace krv::plugins::support
{

// The description of a channel that the file may store in another type than the one handed out.
class StoredChannelInfo : public krv::datasources::IChannelInfo
{
public:
    explicit StoredChannelInfo(const Plane& oPlane);
    ~StoredChannelInfo() override;

    const krv::gobs::DataType& GetNativeDataType() const override { return moNativeType; }
    const krv::gobs::DataType& GetDataType() const override { return moType; }
    const krv::gobs::DataTypeConstraints& GetConstraints() const override { return moConstraints; }

private:
    krv::gobs::DataType moNativeType;
    krv::gobs::DataType moType;
    krv::gobs::DataTypeConstraints moConstraints;
};

} // namespace krv::plugins::support
