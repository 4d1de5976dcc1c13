#pragma once

#include <cstddef>

namespace krv::plugins::codec
{

// How the decoding of one block ended.
// Formats make exceptions of it, which name the file and the block.
enum class Status
{
    eDone,      // the output is full and nothing was found wrong up to the end of the coded data
    eTruncated, // the input ended, with or without its end mark, before the output was full
    eCorrupt,   // the input breaks the rules of its coding
    eNoMemory   // the codec could not get its working memory
};

// A short English text without full stop, for messages such as "file: tile 7: <text>".
// Such as "the data end too early". A constant; never to be freed.
const char* StatusText(Status oStatus);

// What a decoder gave. The first mnBytes bytes of the output are good whatever the status; bytes behind them are
// undefined after a failure, and never touched beyond the given size.
struct Result
{
    Status moStatus = Status::eDone;
    std::size_t mnBytes = 0; // of the output
    // Done, but the input would give more than the output holds, and no check sum vouches for it. Some writers fill the
    // last strip of an image up to its nominal height; elsewhere it is a sign of damage.
    bool mbMore = false;

    // Also when there was more; formats that know no such writers look at mbMore.
    bool IsDone() const { return moStatus == Status::eDone; }
};

} // namespace krv::plugins::codec
