#pragma once

#include "datasources/metadata/auxiliarydata.h"
#include "operations/copy/detail/copyplan.h"
#include "operations/copy/detail/target.h"

namespace krv::operations::detail
{

// The tag of rational polynomials in the metadata of files whose format has no other place for them.
inline constexpr char POLYNOMIALS[] = "RPC";

// The sensor models of the first file, moved with the window, in their order: the last one counts in the copy as it
// does in the file. Warns of those that the copy does not hold. After the record is written, which may hold one too.
void CopyModels(const CopyPlan& oPlan, const Target& oTarget);

// Puts the model that counts into the record of a target that keeps no models.
void RecordModel(const CopyPlan& oPlan, const Target& oTarget, krv::datasources::AuxiliaryData& oRecord);

} // namespace krv::operations::detail
