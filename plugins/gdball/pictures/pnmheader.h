#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>

namespace krv::plugins::gdball
{

// The head of a portable any-map (PBM, PGM, PPM, PFM): numbers between white space, with comments from "#" to the end
// of a line.
struct PnmHeader
{
    char mnKind = 0; // behind the P: 1 to 6, f, F
    std::uint64_t mnWidth = 0;
    std::uint64_t mnHeight = 0;
    std::string moMaximum;   // as it stands: of PFM a scale; empty for bits
    std::size_t mnBytes = 0; // up to the pixels

    bool IsText() const { return mnKind >= '1' && mnKind <= '3'; }
    bool IsBits() const { return mnKind == '1' || mnKind == '4'; }
    bool IsReal() const { return mnKind == 'f' || mnKind == 'F'; }
    unsigned int GetChannels() const { return mnKind == '3' || mnKind == '6' || mnKind == 'F' ? 3 : 1; }
    // The fewest bytes that its pixels can take in a file; the largest number when that is more than it tells.
    std::uint64_t CountPixelBytes() const;
    // The same without comments, as every reader understands it.
    std::string Write() const;
};

// No value when the bytes do not begin with a whole one.
std::optional<PnmHeader> ParsePnmHeader(const unsigned char* pBytes, std::size_t nBytes);

} // namespace krv::plugins::gdball
