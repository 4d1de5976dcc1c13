#pragma once

#include "datasources/metadata/auxiliarydata.h"
#include "operations/copy/detail/copyplan.h"
#include "operations/copy/detail/target.h"

namespace krv::operations::detail
{

// Adds to the record of a copy what its values are like, by a level of it, where the record does not say so yet:
// viewers in a browser read no more of a file than they show, and choose its brightness by that. The record is stored
// then.
void AddStatistics(const CopyPlan& oPlan, const Target& oTarget, krv::datasources::AuxiliaryData oRecord);

} // namespace krv::operations::detail
