#pragma once

#include "datasources/api.h"
#include "datasources/metadata/auxiliarydata.h"

#include <map>
#include <optional>
#include <string>

namespace krv::datasources
{

// What the values of a classified channel are called. A name is the channel's tag "CLASS_NAME_<value>". Where a channel
// has none, and the image has no other, the file's tag "class names" counts: "{water, forest}", from value 0.

// The tag of a value.
// "CLASS_NAME_7" for 7.
KRV_DATASOURCES_API std::string MakeClassNameKey(unsigned int nValue);
// The value that a tag names; nothing for any other tag.
KRV_DATASOURCES_API std::optional<unsigned int> ParseClassNameKey(const std::string& key);
// Those that are not empty, by their values; none for a channel that the record does not have.
// nChannel: from 1. Looks through the tags of the channel, which takes time in their number.
KRV_DATASOURCES_API std::map<unsigned int, std::string> GetClassNames(const AuxiliaryData& oRecord,
                                                                      unsigned int nChannel);

} // namespace krv::datasources
