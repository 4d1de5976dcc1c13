#pragma once

#include "datasources/api.h"
#include "gobs/mask/maskdecision.h"
#include "gobs/mask/samplevalue.h"

#include <optional>
#include <string>

namespace krv::datasources
{

class AuxiliaryData;

// A no-data value as it was written: an integer of 64 bits exactly, or a real with NaN and the infinities.
using NoDataValue = krv::gobs::SampleValue;

// Reads a whole text, white space around it aside: decimal and hexadecimal integers and reals, "nan", "inf" and
// "infinity" in any letter case, with a sign or without. Integers of 64 bits are exact, larger ones become reals.
// Nothing for any other text: a comma, a unit or a number beyond a double included. No locale takes part.
KRV_DATASOURCES_API std::optional<NoDataValue> ParseNoData(const std::string& text);

// The text of a channel's no-data value (from 1) without the white space around it: the channel's own or, when that is
// empty, the file's. Empty when neither has one. Throws OutOfBoundsException "Out of bounds.".
KRV_DATASOURCES_API std::string GetNoDataText(const AuxiliaryData& oMetadata, unsigned int nChannel);

// The value of that text; nothing when there is none. Throws DataException for a text that ParseNoData does not take.
KRV_DATASOURCES_API std::optional<NoDataValue> GetTypedNoData(const AuxiliaryData& oMetadata, unsigned int nChannel);

// As GetNoDataMaskBuilder, from these values: exact for integers of 64 bits, and for NaN. On request NaN samples of the
// channels that have a value count as no-data beside it.
KRV_DATASOURCES_API krv::gobs::IMaskBuilder*
GetTypedNoDataMaskBuilder(const AuxiliaryData& oMetadata, krv::gobs::BkgdRule eRule, bool bNaNIsBackground = false);

} // namespace krv::datasources
