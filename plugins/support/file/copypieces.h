#pragma once

#include "plugins/support/file/file.h"
#include "plugins/support/file/scratch.h"

#include <cstdint>
#include <functional>
#include <vector>

namespace krv::plugins::support
{

// Bytes that go from one file to another.
struct CopiedPiece
{
    std::uint64_t mnFrom = 0; // offset in the source
    std::uint64_t mnTo = 0;   // offset in the target
    std::uint64_t mnBytes = 0;
};

// Copies pieces in few and large calls: those that lie side by side in both files go together. In the target a single
// byte between two pieces is filling, which may be written too. oCopied gets the bytes that were copied since the last
// time; may be empty. oScratch: working memory, a few mebibytes. The order of the pieces does not matter. Throws what
// reading, writing and oCopied throw.
using Copied = std::function<void(std::uint64_t nBytes)>;
void CopyPieces(const File& oFrom, File& oTo, std::vector<CopiedPiece> oPieces, Scratch& oScratch,
                const Copied& oCopied = {});

} // namespace krv::plugins::support
