#include "datasources/writer/ioverviewwriteraccessor.h"

namespace krv::datasources
{

IOverviewWriterAccessor::~IOverviewWriterAccessor() = default;

} // namespace krv::datasources
