#pragma once

#include <cstddef>
#include <memory>

struct libdeflate_compressor;

namespace krv::plugins::codec
{

// Deflate in its zlib wrapping. An object keeps its compressor between blocks; one thread at a time.
class DeflateEncoder
{
public:
    static constexpr int DEFAULT_LEVEL = 6;
    static constexpr int MAXIMUM_LEVEL = 12;

    // nLevel: 1 (fast) to 12 (small). Throws std::bad_alloc.
    explicit DeflateEncoder(int nLevel = DEFAULT_LEVEL);

    // Room that the code of nInput bytes takes at most.
    std::size_t GetBound(std::size_t nInput) const;

    // Encodes one block and returns its bytes; nOutput is at least GetBound(nInput).
    std::size_t Encode(const unsigned char* input, std::size_t nInput, unsigned char* output, std::size_t nOutput);

private:
    struct Free
    {
        void operator()(libdeflate_compressor* poCompressor) const;
    };
    std::unique_ptr<libdeflate_compressor, Free> mpoCompressor;
};

} // namespace krv::plugins::codec
