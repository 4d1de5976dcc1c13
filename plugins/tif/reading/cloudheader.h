#pragma once

#include "plugins/support/file/file.h"
#include "plugins/tif/reading/rawdirectory.h"

#include <cstdint>
#include <optional>
#include <string>

namespace krv::plugins::tif
{

// The text behind the header of a file that is laid out for reading over a network. It tells a client what it may rely
// on, so that it asks for less: directories before pixels, blocks in the order of their rows, in front of each block
// its bytes as a little-endian number of 32 bits, behind it its last four bytes once more. The form is public: a first
// line with the number of bytes that follow it, then KEY=VALUE lines, the last of which has room for either answer.
// Readers that do not know it skip it, since no directory names it.
struct CloudHeader
{
    static constexpr std::uint64_t LEADER_BYTES = 4;
    static constexpr std::uint64_t TRAILER_BYTES = 4;

    std::string moText; // all of it; it begins behind the header
    bool mbRowMajor = false;
    bool mbLeaders = false;
    bool mbTrailers = false;
    bool mbChanged = false; // by a program that did not keep to it, so that none of it holds

    // None for a file without one, or with one that is damaged.
    static std::optional<CloudHeader> Read(const support::File& oFile, const FileHeader& oHeader);
    // Of a new file, with leaders and trailers. bMasked: behind each block stands that of its mask.
    static std::string Make(bool bRowMajor, bool bMasked);
    // The same text, saying that the file was changed; the text itself where it has no room for that.
    static std::string MarkChanged(const std::string& text);
};

} // namespace krv::plugins::tif
