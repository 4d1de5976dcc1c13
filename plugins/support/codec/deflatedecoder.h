#pragma once

#include "plugins/support/codec/status.h"

#include <cstddef>
#include <memory>

struct libdeflate_decompressor;

namespace krv::plugins::codec
{

// Deflate in its zlib wrapping. An object keeps its decompressor between blocks; one thread at a time.
class DeflateDecoder
{
public:
    // Decodes one block into at most nOutput bytes, and on to the end of the stream: a wrong check sum means corrupt,
    // also that of a stream that gives more. A whole block whose end mark alone is cut off (check sum, end code, an
    // empty last part) counts as done. Bytes behind the end of the stream are ignored.
    Result Decode(const unsigned char* input, std::size_t nInput, unsigned char* output, std::size_t nOutput);

private:
    struct Free
    {
        void operator()(libdeflate_decompressor* poDecompressor) const;
    };
    std::unique_ptr<libdeflate_decompressor, Free> mpoDecompressor;
};

} // namespace krv::plugins::codec
