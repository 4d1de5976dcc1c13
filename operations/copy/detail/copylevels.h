#pragma once

#include "operations/copy/detail/copyplan.h"
#include "operations/copy/detail/target.h"

#include <map>

namespace krv::operations::detail
{

// The numbers in the copy of the first file's bitmaps, by those that they have there.
using BitmapNumbers = std::map<unsigned int, unsigned int>;

// Moves the blocks of the image, or of a level, from the only source to a target that has taken over their form.
// Nothing is encoded, and decoded only when the copy is to be checked, so that what is damaged is not passed on.
void MoveBlocks(const CopyPlan& oPlan, const Target& oTarget, unsigned int nLevel);

// The levels of the first file. Those that are up to date are copied with the levels of their mask when the copy is of
// the whole image in its type and bSame says that its pixels are just the same; others are made anew by their own
// method, or by the usual one, which is told. bWanted: a file without levels gets the default ones.
void CopyLevels(const CopyPlan& oPlan, const Target& oTarget, const BitmapNumbers& oBitmaps, bool bSame, bool bWanted);

} // namespace krv::operations::detail
