#pragma once

#include <string>

namespace krv::benchmarks
{

// Images in strips, in planes, of one bit and of JPEG blocks: all blocks in their order against libtiff with a plain
// loop where samples have to be put in order.
void MeasureLayouts(const std::string& folder, unsigned int nSize, const std::string& match);

} // namespace krv::benchmarks
