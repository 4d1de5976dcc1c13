#pragma once

#include "plugins/support/codec/blockcodec.h"

struct ZSTD_CCtx_s;
struct ZSTD_DCtx_s;

namespace krv::plugins::codec
{

// Zstandard frames.
// TIFF's compression 50000, and native files.
class ZstdDecoder : public BlockDecoder
{
public:
    // Decodes one block into at most nOutput bytes, and on to the end of the frame: a wrong check sum means corrupt. A
    // whole block whose end mark alone is cut off counts as done. Bytes behind the first frame are ignored.
    Result Decode(const unsigned char* input, std::size_t nInput, unsigned char* output, std::size_t nOutput) override;

private:
    Handle<ZSTD_DCtx_s> mpoContext{nullptr, nullptr}; // made when it is wanted
};

// Higher levels cost the encoder alone: decoding is about as quick for all of them.
class ZstdEncoder : public BlockEncoder
{
public:
    // Taken unless somebody asks for another.
    static constexpr int DEFAULT_LEVEL = 3;
    static constexpr int MAXIMUM_LEVEL = 22;

    // nLevel: 1 (fast) to 22 (small). Throws std::bad_alloc.
    explicit ZstdEncoder(int nLevel = DEFAULT_LEVEL);

    // A little more than nInput, for what does not compress.
    std::size_t GetBound(std::size_t nInput) const override;
    std::size_t Encode(const unsigned char* input, std::size_t nInput, unsigned char* output,
                       std::size_t nOutput) override;

private:
    Handle<ZSTD_CCtx_s> mpoContext;
};

} // namespace krv::plugins::codec
