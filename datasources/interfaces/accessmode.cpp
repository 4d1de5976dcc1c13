#include "datasources/interfaces/accessmode.h"

namespace krv::datasources
{

AccessCapabilities::AccessCapabilities(bool bReadable, bool bWritable, bool bUpdatable)
    : mbReadable(bReadable), mbWritable(bWritable), mbUpdatable(bUpdatable)
{
}

AccessCapabilities::~AccessCapabilities() = default;

void AccessCapabilities::Copy(const AccessCapabilities& oOther)
{
    *this = oOther;
}

} // namespace krv::datasources
