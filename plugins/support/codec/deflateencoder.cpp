#include "plugins/support/codec/deflateencoder.h"

#include <libdeflate.h>

#include <algorithm>
#include <new>

namespace krv::plugins::codec
{

DeflateEncoder::DeflateEncoder(int nLevel)
    : mpoCompressor(libdeflate_alloc_compressor(std::clamp(nLevel, 1, MAXIMUM_LEVEL)))
{
    if (!mpoCompressor)
        throw std::bad_alloc();
}

void DeflateEncoder::Free::operator()(libdeflate_compressor* poCompressor) const
{
    libdeflate_free_compressor(poCompressor);
}

std::size_t DeflateEncoder::GetBound(std::size_t nInput) const
{
    return libdeflate_zlib_compress_bound(mpoCompressor.get(), nInput);
}

std::size_t DeflateEncoder::Encode(const unsigned char* input, std::size_t nInput, unsigned char* output,
                                   std::size_t nOutput)
{
    return libdeflate_zlib_compress(mpoCompressor.get(), input, nInput, output, nOutput);
}

} // namespace krv::plugins::codec
