#pragma once

#include <cstddef>
#include <cstdint>

namespace krv::gobs::detail
{

struct Colour
{
    std::uint8_t mnRed;
    std::uint8_t mnGreen;
    std::uint8_t mnBlue;
    std::uint8_t mnAlpha;
};
static_assert(sizeof(Colour) == 4);

// Writes the colours of values of one or two bytes, which are numbers in the list; nothing behind the last colour.
using ColourLoop = void (*)(const Colour* pList, const unsigned char* pValues, std::size_t nValues,
                            unsigned char* pColours);

// The loop for this processor: values of 1 or 2 bytes, colours of 4 bytes or, without alpha, of 3.
ColourLoop FindColourLoop(std::size_t nValueBytes, bool bAlpha);

#if defined(__x86_64__)
// For values of one byte, where a vector holds half of the list of one part. The caller asks the processor first.
ColourLoop FindAvx512ColourLoop(bool bAlpha);
#endif

} // namespace krv::gobs::detail
