#pragma once

#include "toolkit/xml/xmltree.h"

#include <string>

namespace krv::datasources::detail
{

// A format's description or the registry, by the library's own reader: enough for a document that is as it should be.
// Throws krv::DataException for any other; what is wrong with it is said by libkrvxml.
krv::xml::Element ReadDescription(const std::string& path);

// Without the white space of XML at both ends.
std::string Trimmed(const std::string& text);

} // namespace krv::datasources::detail
