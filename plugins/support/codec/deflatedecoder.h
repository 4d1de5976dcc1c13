#pragma once

#include "plugins/support/codec/status.h"

#include <cstddef>
#include <memory>

namespace krv::plugins::codec
{

// Deflate in its zlib wrapping. An object keeps its decompressor between blocks; one thread at a time.
class DeflateDecoder
{
public:
    DeflateDecoder();
    ~DeflateDecoder();
    DeflateDecoder(DeflateDecoder&&) noexcept;
    DeflateDecoder& operator=(DeflateDecoder&&) noexcept;

    // Decodes one block into at most nOutput bytes. A stream that would give more fills the output and counts as done,
    // and so does one that lacks its check sum; a wrong check sum means corrupt. Bytes behind the end of the stream are
    // ignored.
    Result Decode(const unsigned char* input, std::size_t nInput, unsigned char* output, std::size_t nOutput);

private:
    struct State;
    std::unique_ptr<State> mpoState;
};

} // namespace krv::plugins::codec
