#include "datasources/metadata/imetadatatfm.h"

namespace krv::qrfutils
{

IMetaDataTfm::~IMetaDataTfm() = default;

} // namespace krv::qrfutils
