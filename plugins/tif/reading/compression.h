#pragma once

#include "plugins/support/codec/blockcodec.h"

#include <cstdint>
#include <span>
#include <string_view>

namespace krv::plugins::tif
{

// A compression that the tag names by a number.
struct Compression
{
    std::uint16_t mnCode;
    std::string_view moName; // two have the name DEFLATE, of which the first one is written
    bool mbLossy;            // LERC and WebP may have kept every value; that shows in no tag
    bool mbPredictor;        // the tag Predictor belongs to these alone; for others libtiff's answer is undefined
    bool mbWritten;
    int mnMaximumLevel;               // of its encoder; 0: it has no levels
    const codec::BlockCodec* mpCodec; // that decodes it here, and may encode it; else libtiff does
};

std::span<const Compression> GetCompressions();
// Null for what is not known.
const Compression* FindCompression(std::uint64_t nCode);
const Compression* FindCompression(std::string_view name);

bool HasPredictor(std::uint64_t nCode);
// Whether blocks are decoded here, not by libtiff: none at all is a compression too.
bool IsOwnCompression(std::uint64_t nCode);
// Whether there is an encoder.
bool CanEncode(std::uint64_t nCode);

} // namespace krv::plugins::tif
