#pragma once

#include <cstddef>

namespace krv::raster::detail
{

// Copies nRuns runs of nRunBytes from one spacing to another. A source stride of 0 repeats one run. Bytes between the
// runs of the target keep their values.
void MoveRuns(const unsigned char* pSource, std::size_t nSourceStride, unsigned char* pTarget,
              std::size_t nTargetStride, std::size_t nRunBytes, std::size_t nRuns);

} // namespace krv::raster::detail
