#include "toolkit/mathmodel/imathmodel.h"

namespace krv::mathmodel
{

IMathModel::~IMathModel() = default;

} // namespace krv::mathmodel
