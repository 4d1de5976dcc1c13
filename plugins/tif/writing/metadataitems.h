#pragma once

#include "datasources/metadata/auxiliarydata.h"

#include <set>
#include <string>
#include <utility>

namespace krv::plugins::tif
{

// A tag of the file (channel 0) or of a channel.
using MetadataKey = std::pair<unsigned int, std::string>;
// The key under which a channel's description counts here.
extern const std::string DESCRIPTION_KEY;

// The text of tag 42112 after some of its values changed. Items that did not change, and whatever else stands there,
// are kept as they are. oNew: the record to store; oChanged: what of it differs from the text; oElsewhere: what of that
// needs no item. "" when nothing is left to be said. Throws DataException for a text that is no XML.
std::string EditItems(const std::string& text, const krv::datasources::AuxiliaryData& oNew,
                      const std::set<MetadataKey>& oChanged, const std::set<MetadataKey>& oElsewhere);

} // namespace krv::plugins::tif
