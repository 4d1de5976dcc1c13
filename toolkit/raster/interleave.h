#pragma once

#include "toolkit/api.h"

#include <cstddef>

namespace krv::raster
{

// Moving channels between pixel-interleaved blocks and planes. Samples have 1, 2, 4, 8 or 16 bytes; pitches are the
// bytes from one row to the next. Channels count from 0. Source and destination never overlap. Nothing is touched but
// the samples named, so a destination may be a part of a wider raster.

// A rectangle of pixels.
// Sizes of 0 are allowed and touch nothing.
struct PixelArea
{
    std::size_t mnWidth = 0; // pixels
    std::size_t mnRows = 0;
    std::size_t mnSampleBytes = 1; // both parts of a complex value count: 8 for C32R
};

// Copies rows of nRowBytes bytes. As fast as memory allows wherever the two lie; one memcpy of 2 KiB and more is many
// times slower on some processors when the destination lies 1 to 63 bytes behind the source modulo 4096.
// No pitch is less than nRowBytes. Throws nothing.
KRV_TOOLKIT_API void CopyRows(const unsigned char* source, std::size_t nSourcePitch, unsigned char* destination,
                              std::size_t nDestinationPitch, std::size_t nRowBytes, std::size_t nRows);

// Picks channels out of a block of nSourceChannels into one of nChannels: channel i of the result is channel
// channels[i] of the source. Repeats and any order are allowed; the straight list of all channels copies rows.
// channels: nChannels numbers below nSourceChannels, borrowed. Any thread.
KRV_TOOLKIT_API void GatherChannels(const unsigned char* source, std::size_t nSourcePitch, std::size_t nSourceChannels,
                                    unsigned char* destination, std::size_t nDestinationPitch,
                                    const std::size_t* channels, std::size_t nChannels, const PixelArea& oArea);

// Puts one plane into channel nChannel of a block of nChannels, leaving the others as they are.
// Who has all channels makes one pass of InterleavePlanes instead.
KRV_TOOLKIT_API void PlaceChannel(const unsigned char* plane, std::size_t nPlanePitch, unsigned char* destination,
                                  std::size_t nDestinationPitch, std::size_t nChannel, std::size_t nChannels,
                                  const PixelArea& oArea);

// Takes channel nChannel of a block of nChannels out into a plane.
// The counterpart of PlaceChannel. A loop over channels is slower than one GatherChannels.
KRV_TOOLKIT_API void ExtractChannel(const unsigned char* source, std::size_t nSourcePitch, std::size_t nChannel,
                                    std::size_t nChannels, unsigned char* plane, std::size_t nPlanePitch,
                                    const PixelArea& oArea);

// Makes one block of nChannels out of as many planes, all of one pitch, in one pass over the destination. A plane may
// stand in the list more than once.
// planes: nChannels pointers. Quicker than PlaceChannel for each: the destination is written once.
KRV_TOOLKIT_API void InterleavePlanes(const unsigned char* const* planes, std::size_t nPlanePitch,
                                      unsigned char* destination, std::size_t nDestinationPitch, std::size_t nChannels,
                                      const PixelArea& oArea);

} // namespace krv::raster
