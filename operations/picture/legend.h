#pragma once

#include "gobs/pct/pct.h"
#include "operations/picture/picturewriter.h"

#include <map>
#include <set>
#include <string>

namespace krv::operations
{

// Add a strip below a picture that tells what its levels stand for. The picture becomes as wide as the strip needs, and
// opaque in the strip.

// A wedge from the value of black to that of white with both numbers and their unit, which may be empty; bInverted:
// from that of white to that of black.
// nBlack, nWhite: values, in the unit that is written behind both.
void AddGreyLegend(double nBlack, double nWhite, const std::string& unit, bool bInverted, Picture& oPicture);

// The names of classes by their values.
using ClassNames = std::map<unsigned int, std::string>;

// The entries of a table for values that occur, the first 64, as fields with their values and names.
// Values without a name stand as numbers.
void AddColourLegend(const krv::gobs::PCT& oTable, const std::set<double>& oValues, const ClassNames& oNames,
                     Picture& oPicture);

} // namespace krv::operations
