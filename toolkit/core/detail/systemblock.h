#pragma once

#include <cstddef>

namespace krv::core::detail
{

// Memory straight from the system, 64-byte aligned, contents undefined. From 4 MiB on it is mapped in large pages where
// the system has them, which halves the cost of touching it first.

// Null when there is none. nUsed <= nBytes: how much of it will be touched soon.
void* NewSystemBlock(std::size_t nBytes, std::size_t nUsed) noexcept;
// nBytes: as it was asked for.
void DeleteSystemBlock(void* pBlock, std::size_t nBytes) noexcept;

} // namespace krv::core::detail
