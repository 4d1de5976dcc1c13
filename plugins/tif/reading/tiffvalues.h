#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include <tiffio.h>

namespace krv::plugins::tif
{

// The values of a tag of doubles or of 16-bit numbers; empty when the directory has no such tag or holds another type.
std::vector<double> ReadDoubles(TIFF* poTiff, std::uint32_t nTag);
std::vector<std::uint16_t> ReadShorts(TIFF* poTiff, std::uint32_t nTag);

// A text of a tag, up to its first NUL; empty when it is absent.
std::string ReadText(TIFF* poTiff, std::uint32_t nTag);

} // namespace krv::plugins::tif
