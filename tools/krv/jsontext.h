#pragma once

#include <nlohmann/json.hpp>

#include <string>

namespace krv::tool
{

// JSON whose members keep the order in which they were set.
using Json = nlohmann::ordered_json;

// Indented text with a line break at the end. Bytes that are not UTF-8 become the replacement character; numbers that
// JSON cannot hold (NaN, infinities) become null.
std::string ToText(const Json& oJson);

// The text, or null for an empty one.
Json TextOrNull(const std::string& text);

// Writes to the standard output. Throws krv::OSException when that fails, so that a full disk is not taken for success.
void Print(const std::string& text);

} // namespace krv::tool
