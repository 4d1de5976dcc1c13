#pragma once

#include "datasources/api.h"
#include "gobs/mask/maskdecision.h"

// No-data values are texts under the key "NO_DATA_VALUE" of a channel or, for the channels that have none, of the file.
// The functions here take the number at the front of the text and know neither NaN nor infinities nor 64-bit integers
// beyond a double; typednodata.h has stricter ones. Numbers are read in the classic locale.

namespace krv::datasources
{
class AuxiliaryData;
class IRasterReader;
} // namespace krv::datasources

namespace krv::qrfutils
{

// The no-data value of a channel (from 1) of the reader. False, and the value untouched, when there is none. A text
// that is no number gives true and 0, intended: callers learn that one is recorded. White space alone counts as none
// for a channel, and for the file gives true with the value untouched. Throws OutOfBoundsException "Out of bounds." for
// a channel that the reader lacks.
// oReader: borrowed, its record is read with each call. nValue: in the unit of the channel's values, unscaled.
KRV_DATASOURCES_API bool GetNoDataValue(const krv::datasources::IRasterReader& oReader, float& nValue,
                                        unsigned int nChannel);

} // namespace krv::qrfutils

namespace krv::datasources
{

// A new builder, owned by the caller, of masks whose set bits are no-data: pixels of rasters of all channels of the
// record, compared with the recorded values and combined by the rule; nothing when none is recorded. Throws
// krv::Exception for a text that does not begin with a number, white space alone included.
// oMetadata: of the rasters that masks are built of, channel n for channel n. It is not kept.
KRV_DATASOURCES_API krv::gobs::IMaskBuilder* GetNoDataMaskBuilder(const AuxiliaryData& oMetadata,
                                                                  krv::gobs::BkgdRule eRule);

} // namespace krv::datasources
