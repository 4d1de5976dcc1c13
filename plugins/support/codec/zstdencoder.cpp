#include "plugins/support/codec/zstdencoder.h"

#include <zstd.h>

#include <algorithm>
#include <new>

namespace krv::plugins::codec
{

ZstdEncoder::ZstdEncoder(int nLevel) : mpoContext(ZSTD_createCCtx())
{
    if (!mpoContext)
        throw std::bad_alloc();
    ZSTD_CCtx_setParameter(mpoContext.get(), ZSTD_c_compressionLevel, std::clamp(nLevel, 1, MAXIMUM_LEVEL));
}

void ZstdEncoder::Free::operator()(ZSTD_CCtx_s* poContext) const
{
    ZSTD_freeCCtx(poContext);
}

std::size_t ZstdEncoder::GetBound(std::size_t nInput) const
{
    return ZSTD_compressBound(nInput);
}

std::size_t ZstdEncoder::Encode(const unsigned char* input, std::size_t nInput, unsigned char* output,
                                std::size_t nOutput)
{
    const std::size_t nBytes = ZSTD_compress2(mpoContext.get(), output, nOutput, input, nInput);
    if (ZSTD_isError(nBytes))
        throw std::bad_alloc();
    return nBytes;
}

} // namespace krv::plugins::codec
