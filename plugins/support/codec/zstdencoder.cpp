#include "plugins/support/codec/zstdencoder.h"

#include <zstd.h>

#include <algorithm>
#include <new>

namespace krv::plugins::codec
{

struct ZstdEncoder::State
{
    ZSTD_CCtx* mpoContext;

    explicit State(int nLevel) : mpoContext(ZSTD_createCCtx())
    {
        if (mpoContext == nullptr)
            throw std::bad_alloc();
        ZSTD_CCtx_setParameter(mpoContext, ZSTD_c_compressionLevel, nLevel);
    }
    State(const State&) = delete;
    State& operator=(const State&) = delete;
    ~State() { ZSTD_freeCCtx(mpoContext); }
};

ZstdEncoder::ZstdEncoder(int nLevel) : mpoState(std::make_unique<State>(std::clamp(nLevel, 1, MAXIMUM_LEVEL))) {}
ZstdEncoder::~ZstdEncoder() = default;
ZstdEncoder::ZstdEncoder(ZstdEncoder&&) noexcept = default;
ZstdEncoder& ZstdEncoder::operator=(ZstdEncoder&&) noexcept = default;

std::size_t ZstdEncoder::GetBound(std::size_t nInput) const
{
    return ZSTD_compressBound(nInput);
}

std::size_t ZstdEncoder::Encode(const unsigned char* input, std::size_t nInput, unsigned char* output,
                                std::size_t nOutput)
{
    const std::size_t nBytes = ZSTD_compress2(mpoState->mpoContext, output, nOutput, input, nInput);
    if (ZSTD_isError(nBytes))
        throw std::bad_alloc();
    return nBytes;
}

} // namespace krv::plugins::codec
