#pragma once

#include "plugins/support/codec/blockcodec.h"

struct libdeflate_compressor;
struct libdeflate_decompressor;

namespace krv::plugins::codec
{

// Deflate in its zlib wrapping.
// TIFF's compressions 8 and 32946, and native files.
class DeflateDecoder : public BlockDecoder
{
public:
    // Decodes one block into at most nOutput bytes, and on to the end of the stream: a wrong check sum means corrupt,
    // also that of a stream that gives more. A whole block whose end mark alone is cut off (check sum, end code, an
    // empty last part) counts as done. Bytes behind the end of the stream are ignored.
    Result Decode(const unsigned char* input, std::size_t nInput, unsigned char* output, std::size_t nOutput) override;

private:
    Handle<libdeflate_decompressor> mpoDecompressor{nullptr, nullptr}; // made when it is wanted
};

// Higher levels cost the encoder alone: decoding is as quick for all of them.
class DeflateEncoder : public BlockEncoder
{
public:
    static constexpr int DEFAULT_LEVEL = 6;
    static constexpr int MAXIMUM_LEVEL = 12;

    // nLevel: 1 (fast) to 12 (small). Throws std::bad_alloc.
    explicit DeflateEncoder(int nLevel = DEFAULT_LEVEL);

    std::size_t GetBound(std::size_t nInput) const override;

    // Whole blocks in one call; the stream ends with its check sum.
    std::size_t Encode(const unsigned char* input, std::size_t nInput, unsigned char* output,
                       std::size_t nOutput) override;

private:
    Handle<libdeflate_compressor> mpoCompressor;
};

} // namespace krv::plugins::codec
