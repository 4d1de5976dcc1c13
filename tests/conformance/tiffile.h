#pragma once

#include "tests/conformance/formattraits.h"

namespace krv::conformance
{

// Writes an image as TIFF, by the TIFF library alone. The variants are byte orders, strips and tiles, interleavings and
// compressions.
void WriteTifFile(const std::string& fileName, const Image& oImage);
std::vector<const char*> TifVariants();

} // namespace krv::conformance
