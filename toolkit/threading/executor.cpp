#include "toolkit/threading/executor.h"

namespace krv::threading
{

IExecutor::~IExecutor() = default;

} // namespace krv::threading
