#pragma once

#include "gobs/pct/pct.h"
#include "operations/picture/picturewriter.h"

namespace krv::operations
{

// Add a strip below a picture that tells what its levels stand for. The picture becomes as wide as the strip needs, and
// opaque in the strip.

// A wedge from the value of black to that of white with both numbers; bInverted: from that of white to that of black.
void AddGreyLegend(double nBlack, double nWhite, bool bInverted, Picture& oPicture);

// The entries of a table whose colours the picture has, the first 64, as fields with their values.
void AddColourLegend(const krv::gobs::PCT& oTable, Picture& oPicture);

} // namespace krv::operations
