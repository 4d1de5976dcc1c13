#pragma once

#include <string>
#include <vector>

namespace krv::tool
{

// The word of a list that a misspelt one is meant to be: the one that the fewest letters, inserted, left out, changed
// or swapped with their neighbour, lead to; empty when that takes more than a third of its letters and one.
std::string FindNearestWord(const std::string& word, const std::vector<std::string>& oWords);

} // namespace krv::tool
