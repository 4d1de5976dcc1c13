#pragma once

#include "plugins/support/file/file.h"
#include "plugins/support/file/space.h"

#include <cstdint>
#include <optional>
#include <vector>

namespace krv::plugins::support
{

// What this library knows of a file that it wrote, kept behind the root of a state (for TIFF its first directory),
// where no other reader looks: which parts others wrote, who may rely on bytes that no tag known here names. In all of
// the rest, what nothing in the file names is unused. The record belongs to one state: it names the place of its root
// and the size of the file. Whoever rewrites the file leaves no record that says the truth of itself, and all bytes are
// somebody else's again.
struct RoomRecord
{
    std::uint64_t mnFileBytes = 0; // the size of the file that it is of
    std::vector<Extent> moForeign; // ascending, apart from each other

    // More parts than this become one.
    static constexpr std::size_t MAXIMUM_FOREIGN = 64;

    // Of the record with so many parts.
    static std::size_t GetBytes(std::size_t nForeign);
    // The bytes that go behind the root at nRoot.
    std::vector<unsigned char> Make(std::uint64_t nRoot) const;
    // nEnd: where the root ends. No value when there is no record, or one of another state.
    static std::optional<RoomRecord> Read(const File& oFile, std::uint64_t nRoot, std::uint64_t nEnd);

    std::size_t GetBytes() const { return GetBytes(moForeign.size()); }
    // Whether two of the pieces, which ascend, have bytes in common that this library wrote. It never does that:
    // somebody else was here.
    bool SharesOwn(const std::vector<Extent>& oPieces) const;
    // Adds a part behind all others.
    void AddForeign(std::uint64_t nOffset, std::uint64_t nBytes);
};

} // namespace krv::plugins::support
