#pragma once

#include "plugins/support/codec/blockcodec.h"

#include <memory>

namespace krv::plugins::codec
{

// LZ4 blocks, without a frame around them.
// Files name it LZ4.
class Lz4Decoder : public BlockDecoder
{
public:
    // Decodes one block into at most nOutput bytes. Bytes behind its end are corrupt: nothing in a block tells where it
    // ends but its size.
    Result Decode(const unsigned char* input, std::size_t nInput, unsigned char* output, std::size_t nOutput) override;
};

// Higher levels cost the encoder alone.
class Lz4Encoder : public BlockEncoder
{
public:
    static constexpr int DEFAULT_LEVEL = 1;
    static constexpr int MAXIMUM_LEVEL = 12;

    // nLevel: 1 is the fast search, those above the thorough one. Throws std::bad_alloc.
    explicit Lz4Encoder(int nLevel = DEFAULT_LEVEL);

    std::size_t GetBound(std::size_t nInput) const override;
    std::size_t Encode(const unsigned char* input, std::size_t nInput, unsigned char* output,
                       std::size_t nOutput) override;

private:
    int mnLevel;
    std::unique_ptr<unsigned char[]> mpoState; // the codec's working memory
};

} // namespace krv::plugins::codec
