#pragma once

#include "datasources/metadata/auxiliarydata.h"
#include "operations/copy/detail/copyplan.h"
#include "toolkit/ogc/cs/geocodinginfo.h"

#include <map>
#include <string>

namespace krv::operations::detail
{

// For each file, the numbers that its colour tables have in the copy, by the numbers that they have in the file.
using TableNumbers = std::map<std::pair<std::size_t, unsigned int>, unsigned int>;

// The metadata of the copy. Tags of the file are those of the first one; each channel brings its own, and its no-data
// value where the first file's does not hold for it. Display defaults get the numbers of the copied channels,
// references to colour tables of the file itself those of the copied tables. Ground control points and rational
// polynomials move with the window. Bookkeeping of levels stays behind, and so do statistics that no longer hold.
// bPixelsChange: the copy is encoded with loss. bWithoutNoData: its values do not say which pixels are valid.
krv::datasources::AuxiliaryData MakeRecord(const CopyPlan& oPlan, const std::string& target,
                                           const TableNumbers& oTables, bool bPixelsChange, bool bWithoutNoData);

// Of the file and of all channels.
void DropNoData(krv::datasources::AuxiliaryData& oRecord);

// The transform of an image that begins at a pixel of another one.
krv::ogc::cs::GeocodingInfo ShiftGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo, unsigned int nX, unsigned int nY);

} // namespace krv::operations::detail
