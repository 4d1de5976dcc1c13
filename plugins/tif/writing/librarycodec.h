#pragma once

#include "plugins/tif/reading/page.h"

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace krv::plugins::tif
{

// The stored bytes of a strip or tile of nRows rows as libtiff's codec for the page's compression makes them, predictor
// included, complete in themselves. pStored: rows as stored before any coding, in this machine's byte order.
// Throws IOException with libtiff's reason and the name of the file.
std::vector<unsigned char> EncodeByLibrary(const PageForm& oForm, std::optional<int> oLevel,
                                           const unsigned char* pStored, std::size_t nBytes, std::uint32_t nRows,
                                           const std::string& fileName);

} // namespace krv::plugins::tif
