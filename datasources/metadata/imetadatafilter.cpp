#include "datasources/metadata/imetadatafilter.h"

namespace krv::qrfutils
{

IMetadataFilter::~IMetadataFilter() = default;

} // namespace krv::qrfutils
