#include "plugins/support/image/storedchannelinfo.h"

namespace krv::plugins::support
{

StoredChannelInfo::StoredChannelInfo(const Plane& oPlane)
    : moNativeType(oPlane.moNativeType), moType(oPlane.moType), moConstraints(oPlane.moType)
{
}

StoredChannelInfo::~StoredChannelInfo() = default;

} // namespace krv::plugins::support
