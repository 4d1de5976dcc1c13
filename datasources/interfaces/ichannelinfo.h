#pragma once

#include "datasources/api.h"

namespace krv::gobs
{
class DataType;
class DataTypeConstraints;
} // namespace krv::gobs

namespace krv::datasources
{

// The description of one channel. The order of the virtual operations is public and fixed.
// References that it gives live as long as it. Any thread.
class KRV_DATASOURCES_API IChannelInfo
{
public:
    virtual ~IChannelInfo();

    // The type as the file stores it; it may be narrower than the one that is handed out (12 bits in 16).
    virtual const krv::gobs::DataType& GetNativeDataType() const = 0;
    // The type of the values that are read and written.
    virtual const krv::gobs::DataType& GetDataType() const = 0;
    // The limits of the stored values.
    virtual const krv::gobs::DataTypeConstraints& GetConstraints() const = 0;
};

} // namespace krv::datasources
