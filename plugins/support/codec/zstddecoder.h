#pragma once

#include "plugins/support/codec/status.h"

#include <cstddef>
#include <memory>

struct ZSTD_DCtx_s;

namespace krv::plugins::codec
{

// Zstandard frames. An object keeps its decompression context between blocks; one thread at a time.
class ZstdDecoder
{
public:
    // Decodes one block into at most nOutput bytes, and on to the end of the frame: a wrong check sum means corrupt. A
    // whole block whose end mark alone is cut off counts as done. Bytes behind the first frame are ignored.
    Result Decode(const unsigned char* input, std::size_t nInput, unsigned char* output, std::size_t nOutput);

private:
    struct Free
    {
        void operator()(ZSTD_DCtx_s* poContext) const;
    };
    std::unique_ptr<ZSTD_DCtx_s, Free> mpoContext;
};

} // namespace krv::plugins::codec
