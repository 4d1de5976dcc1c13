#pragma once

#include "plugins/support/codec/blockcodec.h"

namespace krv::plugins::codec
{

// PackBits: runs and stretches of bytes, each behind its length.
// TIFF's compression 32773.
class PackBitsDecoder : public BlockDecoder
{
public:
    // Decodes one block into exactly nOutput bytes. There is no end mark; bytes behind the last one that is wanted are
    // ignored, a run that reaches beyond it counts as more. Any input is safe: nothing outside of the two buffers is
    // read or written.
    Result Decode(const unsigned char* input, std::size_t nInput, unsigned char* output, std::size_t nOutput) override;
};

} // namespace krv::plugins::codec
