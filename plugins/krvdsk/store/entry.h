#pragma once

#include <cstddef>
#include <cstdint>

namespace krv::plugins::krvdsk
{

// Bytes that lie in the file in one piece, and what they are checked by.
struct Entry
{
    static constexpr std::size_t BYTES = 16;

    std::uint64_t mnOffset = 0; // 0: nothing is stored
    std::uint32_t mnBytes = 0;
    std::uint32_t mnChecksum = 0;

    bool IsStored() const { return mnOffset != 0; }
    friend bool operator==(const Entry&, const Entry&) = default;
};

} // namespace krv::plugins::krvdsk
