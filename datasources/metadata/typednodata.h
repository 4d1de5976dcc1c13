#pragma once

#include "datasources/api.h"
#include "gobs/mask/maskdecision.h"
#include "gobs/mask/samplematch.h"
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
// Examples: "-9999", "0x7fff", "1e20", "nan".
KRV_DATASOURCES_API std::optional<NoDataValue> ParseNoData(const std::string& text);

// The text of a channel's no-data value (from 1) without the white space around it: the channel's own or, when that is
// empty, the file's. Empty when neither has one. Throws OutOfBoundsException "Out of bounds.".
KRV_DATASOURCES_API std::string GetNoDataText(const AuxiliaryData& oMetadata, unsigned int nChannel);

// The value of that text; nothing when there is none. Throws DataException for a text that ParseNoData does not take.
KRV_DATASOURCES_API std::optional<NoDataValue> GetTypedNoData(const AuxiliaryData& oMetadata, unsigned int nChannel);

// Records the value of a channel (from 1), which counts before the file's; SetFileNoData that of all channels without
// one of their own. Throw OutOfBoundsException "Out of bounds.".
KRV_DATASOURCES_API void SetTypedNoData(AuxiliaryData& oMetadata, const NoDataValue& oValue, unsigned int nChannel);
KRV_DATASOURCES_API void SetFileNoData(AuxiliaryData& oMetadata, const NoDataValue& oValue);

// The same as a number of the program's: 8- to 64-bit integers, float or double. NaN and 64-bit integers are exact.
template <class Number>
void SetNoData(AuxiliaryData& oMetadata, Number nValue, unsigned int nChannel)
{
    SetTypedNoData(oMetadata, NoDataValue::From(nValue), nChannel);
}
// The sample of that type that equals the channel's value; nothing when there is no value, or when no sample can equal
// it: then no pixel of the type is no-data by its value. Throws what GetTypedNoData throws.
template <class Number>
std::optional<Number> GetNoData(const AuxiliaryData& oMetadata, unsigned int nChannel)
{
    const std::optional<NoDataValue> oValue = GetTypedNoData(oMetadata, nChannel);
    return oValue ? krv::gobs::ToSample<Number>(*oValue) : std::nullopt;
}

// As GetNoDataMaskBuilder, from these values: exact for integers of 64 bits, and for NaN. On request NaN samples of the
// channels that have a value count as no-data beside it.
// The builder is the caller's. Throws DataException for a text that is no value.
KRV_DATASOURCES_API krv::gobs::IMaskBuilder*
GetTypedNoDataMaskBuilder(const AuxiliaryData& oMetadata, krv::gobs::BkgdRule eRule, bool bNaNIsBackground = false);

} // namespace krv::datasources
