#include "datasources/metadata/iauxdatatfm.h"

namespace krv::qrfutils
{

IAuxDataTfm::~IAuxDataTfm() = default;

} // namespace krv::qrfutils
