#pragma once

#include <cstddef>

namespace krv::plugins::codec
{

// The part of a block that a function works on. A row holds mnWidth pixels of mnChannels samples of mnSampleBytes bytes
// each, without gaps; the distance from one row to the next (the pitch, in bytes) is passed beside each pointer.
// No pointer needs any alignment. The functions touch exactly the bytes of the rows, never what lies between them.
// A plain value. Sizes are checked by whoever took them from a file: products here do not overflow then.
struct BlockShape
{
    std::size_t mnWidth = 0; // pixels
    std::size_t mnRows = 0;
    std::size_t mnChannels = 1;
    std::size_t mnSampleBytes = 1; // of one part of a complex value, which counts as two samples

    std::size_t GetRowSamples() const { return mnWidth * mnChannels; }

    // The least pitch of its rows.
    std::size_t GetRowBytes() const { return mnWidth * mnChannels * mnSampleBytes; }
};

} // namespace krv::plugins::codec
