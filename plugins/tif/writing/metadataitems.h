#pragma once

#include "plugins/tif/reading/metadata.h"

#include <map>
#include <string>

namespace krv::plugins::tif
{

// The text of tag 42112 after some of its values changed: oWanted has what an item shall say from now on under a key,
// "" where no item is wanted. Items that did not change, and whatever else stands there, are kept as they are. Every
// byte of keys and values can be read again; what XML cannot hold, and a key that an item's name and role cannot say,
// stand there as hexadecimal digits beside a likeness for other programs. nChannels: of the image. "" when nothing is
// left to be said. Throws DataException for a text that is no XML.
std::string EditItems(const std::string& text, const std::map<MetadataKey, std::string>& oWanted,
                      unsigned int nChannels);

} // namespace krv::plugins::tif
