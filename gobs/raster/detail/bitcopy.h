#pragma once

#include <cstdint>

namespace krv::gobs::detail
{

// Moves and clears runs of packed bits, most significant bit first; positions and counts are in bits. Bits outside the
// run keep their values. Source and target runs do not overlap, but may share bytes.
void CopyBits(const unsigned char* pSource, std::uint64_t nSource, unsigned char* pTarget, std::uint64_t nTarget,
              std::uint64_t nCount);
void ClearBits(unsigned char* pTarget, std::uint64_t nTarget, std::uint64_t nCount);

} // namespace krv::gobs::detail
