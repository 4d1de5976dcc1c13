#pragma once

#include "plugins/support/geotiff/geokeylist.h"
#include "toolkit/ogc/cs/icrs.h"

#include <vector>

namespace krv::plugins::support
{

// Geographic keys that may express a reference system, the most common form first: its code in the EPSG database, its
// projection and ellipsoid as values, its definition as a text. Not each of them says the same as the system: whoever
// stores them reads them back.
// oCRS: asked, not kept. SetCRS of geotags.h is the one that tries them.
std::vector<GeoKeyList> ProposeKeys(const krv::ogc::cs::ICRS& oCRS);

} // namespace krv::plugins::support
