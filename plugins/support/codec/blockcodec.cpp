#include "plugins/support/codec/blockcodec.h"

#include "plugins/support/codec/deflate.h"
#include "plugins/support/codec/lz4.h"
#include "plugins/support/codec/lzw.h"
#include "plugins/support/codec/packbits.h"
#include "plugins/support/codec/zstd.h"

#include <algorithm>
#include <iterator>

namespace krv::plugins::codec
{

namespace
{

template <typename Decoder>
std::unique_ptr<BlockDecoder> Make()
{
    return std::make_unique<Decoder>();
}

template <typename Encoder>
std::unique_ptr<BlockEncoder> MakeWithLevel(std::optional<int> oLevel)
{
    return std::make_unique<Encoder>(oLevel.value_or(Encoder::DEFAULT_LEVEL));
}

std::unique_ptr<BlockEncoder> MakeLzw(std::optional<int>)
{
    return std::make_unique<LzwEncoder>();
}

constexpr BlockCodec CODECS[] = {
    {"DEFLATE", DeflateEncoder::MAXIMUM_LEVEL, &Make<DeflateDecoder>, &MakeWithLevel<DeflateEncoder>},
    {"LZ4", Lz4Encoder::MAXIMUM_LEVEL, &Make<Lz4Decoder>, &MakeWithLevel<Lz4Encoder>},
    {"LZW", 0, &Make<LzwDecoder>, &MakeLzw},
    {"PACKBITS", 0, &Make<PackBitsDecoder>, nullptr},
    {"ZSTD", ZstdEncoder::MAXIMUM_LEVEL, &Make<ZstdDecoder>, &MakeWithLevel<ZstdEncoder>}};

} // namespace

BlockDecoder::~BlockDecoder() = default;
BlockEncoder::~BlockEncoder() = default;

const BlockCodec* FindBlockCodec(std::string_view name)
{
    const auto* const pFound = std::find_if(std::begin(CODECS), std::end(CODECS),
                                            [name](const BlockCodec& oCodec) { return oCodec.moName == name; });
    return pFound == std::end(CODECS) ? nullptr : pFound;
}

} // namespace krv::plugins::codec
