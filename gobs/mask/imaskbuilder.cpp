#include "gobs/mask/imaskbuilder.h"

namespace krv::gobs
{

IMaskBuilder::~IMaskBuilder() = default;

} // namespace krv::gobs
