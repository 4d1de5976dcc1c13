#pragma once

#include <cstddef>
#include <memory>

struct ZSTD_CCtx_s;

namespace krv::plugins::codec
{

// Zstandard frames. An object keeps its compression context between blocks; one thread at a time.
class ZstdEncoder
{
public:
    static constexpr int DEFAULT_LEVEL = 3;
    static constexpr int MAXIMUM_LEVEL = 22;

    // nLevel: 1 (fast) to 22 (small). Throws std::bad_alloc.
    explicit ZstdEncoder(int nLevel = DEFAULT_LEVEL);

    // Room that the code of nInput bytes takes at most.
    std::size_t GetBound(std::size_t nInput) const;

    // Encodes one block and returns its bytes; nOutput is at least GetBound(nInput). Throws std::bad_alloc.
    std::size_t Encode(const unsigned char* input, std::size_t nInput, unsigned char* output, std::size_t nOutput);

private:
    struct Free
    {
        void operator()(ZSTD_CCtx_s* poContext) const;
    };
    std::unique_ptr<ZSTD_CCtx_s, Free> mpoContext;
};

} // namespace krv::plugins::codec
