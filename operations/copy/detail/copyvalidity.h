#pragma once

#include "operations/copy/detail/copyplan.h"
#include "operations/copy/detail/target.h"

namespace krv::operations::detail
{

// Whether the sources say of single pixels that they hold no data in a way that a lossy codec does not keep: by values
// of the channels or by alpha.
bool HasValidityInValues(const CopyPlan& oPlan);

// Warns that a target whose pixels change keeps no no-data values. Throws DataException for one without bitmaps, which
// could not say which pixels are valid.
void CheckLossyValidity(const Target& oTarget);

// Writes which pixels of the copy hold data into its validity mask, the bitmap nBitmap, or a new one when that is 0. A
// pixel of several files is valid where one of them says so. The target has bitmaps.
void WriteValidity(const CopyPlan& oPlan, const Target& oTarget, unsigned int nBitmap);

} // namespace krv::operations::detail
