#pragma once

#include "toolkit/ogc/cs/geocodinginfo.h"

#include <optional>
#include <string>
#include <vector>

namespace krv::plugins::support
{

// Six numbers in lines: x per column, y per column, x per row, y per row, and the centre of the first pixel. No value
// for any other text and for a transform without an inverse.
// The result is for the outer corner: half a pixel is taken off.
std::optional<krv::ogc::cs::GeocodingInfo> ParseWorldFile(const std::string& text);

// The endings that such a file of an image may have: for ".tif" ".tfw" (first and last letter), ".tifw" and ".wld".
// In the order in which they are looked for, with their dots.
std::vector<std::string> ListWorldEndings(const std::string& fileName);

} // namespace krv::plugins::support
