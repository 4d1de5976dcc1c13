#include "plugins/support/codec/zstddecoder.h"

#include <zstd.h>
#include <zstd_errors.h>

#include <array>

namespace krv::plugins::codec
{

namespace
{

Status FromZstd(std::size_t nCode)
{
    if (ZSTD_isError(nCode) == 0)
        return Status::eTruncated;
    return ZSTD_getErrorCode(nCode) == ZSTD_error_memory_allocation ? Status::eNoMemory : Status::eCorrupt;
}

// Piece by piece: says how many bytes are good. Goes on behind the last byte that is wanted to the end of the frame,
// where its check sum may be, but not for ever.
Result DecodeStream(ZSTD_DCtx* context, const unsigned char* input, std::size_t nInput, unsigned char* output,
                    std::size_t nOutput)
{
    constexpr std::size_t ENOUGH = std::size_t{1} << 20;
    std::array<unsigned char, 4096> oUnwanted;
    ZSTD_inBuffer oInput{input, nInput, 0};
    ZSTD_outBuffer oOutput{output, nOutput, 0};
    ZSTD_DCtx_reset(context, ZSTD_reset_session_only);
    std::size_t nCode = 1;
    std::size_t nMore = 0;
    bool bMoved = true;
    while (nCode != 0 && ZSTD_isError(nCode) == 0 && bMoved && nMore <= nOutput + ENOUGH)
    {
        ZSTD_outBuffer oBehind{oUnwanted.data(), oUnwanted.size(), 0};
        ZSTD_outBuffer& oTarget = oOutput.pos < nOutput ? oOutput : oBehind;
        const std::size_t nBefore = oInput.pos + oTarget.pos;
        nCode = ZSTD_decompressStream(context, &oTarget, &oInput);
        nMore += oBehind.pos;
        bMoved = nBefore != oInput.pos + oTarget.pos;
    }
    const bool bEnded = nCode == 0 || bMoved || nMore == 0; // else the input ended somewhere in what is too much
    if (oOutput.pos == nOutput && ZSTD_isError(nCode) == 0 && bEnded)
        return {Status::eDone, nOutput, nMore != 0};
    return {oOutput.pos == nOutput && ZSTD_isError(nCode) == 0 ? Status::eCorrupt : FromZstd(nCode), oOutput.pos};
}

} // namespace

void ZstdDecoder::Free::operator()(ZSTD_DCtx_s* poContext) const
{
    ZSTD_freeDCtx(poContext);
}

Result ZstdDecoder::Decode(const unsigned char* input, std::size_t nInput, unsigned char* output, std::size_t nOutput)
{
    if (!mpoContext)
        mpoContext.reset(ZSTD_createDCtx());
    ZSTD_DCtx* const context = mpoContext.get();
    if (context == nullptr)
        return {Status::eNoMemory, 0};
    const std::size_t nFrame = ZSTD_findFrameCompressedSize(input, nInput);
    if (ZSTD_isError(nFrame) == 0)
    {
        const std::size_t nBytes = ZSTD_decompressDCtx(context, output, nOutput, input, nFrame);
        if (nBytes == nOutput)
            return {Status::eDone, nBytes};
    }
    return DecodeStream(context, input, nInput, output, nOutput);
}

} // namespace krv::plugins::codec
