#pragma once

#include "toolkit/core/gdbvertex.h"

#include <functional>
#include <vector>

namespace krv::benchmarks
{

using Rings = std::vector<std::vector<GDBVertex>>;

// Each returns a function that fills the rings even-odd into a cleared plane of nSize x nSize bits, from the vertices
// to the last bit; an empty function where the library was not there at build time.

// cairo's image surface of one bit per pixel without antialiasing.
std::function<void()> CairoFill(const Rings& oRings, int nSize);
// AGG's scan lines without coverage over its coverage cells, its spans written as bits.
std::function<void()> AggFill(const Rings& oRings, int nSize);

} // namespace krv::benchmarks
