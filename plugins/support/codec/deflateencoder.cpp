#include "plugins/support/codec/deflateencoder.h"

#include <libdeflate.h>

#include <algorithm>
#include <new>

namespace krv::plugins::codec
{

struct DeflateEncoder::State
{
    libdeflate_compressor* mpoCompressor;

    explicit State(int nLevel) : mpoCompressor(libdeflate_alloc_compressor(nLevel))
    {
        if (mpoCompressor == nullptr)
            throw std::bad_alloc();
    }
    State(const State&) = delete;
    State& operator=(const State&) = delete;
    ~State() { libdeflate_free_compressor(mpoCompressor); }
};

DeflateEncoder::DeflateEncoder(int nLevel) : mpoState(std::make_unique<State>(std::clamp(nLevel, 1, MAXIMUM_LEVEL))) {}
DeflateEncoder::~DeflateEncoder() = default;
DeflateEncoder::DeflateEncoder(DeflateEncoder&&) noexcept = default;
DeflateEncoder& DeflateEncoder::operator=(DeflateEncoder&&) noexcept = default;

std::size_t DeflateEncoder::GetBound(std::size_t nInput) const
{
    return libdeflate_zlib_compress_bound(mpoState->mpoCompressor, nInput);
}

std::size_t DeflateEncoder::Encode(const unsigned char* input, std::size_t nInput, unsigned char* output,
                                   std::size_t nOutput)
{
    return libdeflate_zlib_compress(mpoState->mpoCompressor, input, nInput, output, nOutput);
}

} // namespace krv::plugins::codec
