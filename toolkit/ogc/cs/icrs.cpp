#include "toolkit/ogc/cs/icrs.h"

namespace krv::ogc::cs
{

ICRS::~ICRS() = default;

} // namespace krv::ogc::cs
