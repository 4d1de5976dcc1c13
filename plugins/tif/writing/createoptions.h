#pragma once

#include "plugins/support/writing/options.h"
#include "toolkit/exceptions/place.h"

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace krv::plugins::tif
{

// How a new file is laid out.
struct CreateOptions
{
    enum class Choice
    {
        eAutomatic,
        eNo,
        eYes
    };

    bool mbTiled = true;
    std::uint32_t mnBlockWidth = 0; // 0: as suits
    std::uint32_t mnBlockHeight = 0;
    std::uint16_t mnCompression = 1;
    std::optional<int> moLevel; // of the codec
    // 1 to 3, or 0: differences of integers, byte planes of reals, none for complex numbers.
    std::uint16_t mnPredictor = 0;
    unsigned int mnSampleBits = 0; // stored; 0: as many as the type has
    bool mbSeparate = false;
    bool mbCloud = false; // directories first, levels from small to large
    Choice meBigTiff = Choice::eAutomatic;
    std::optional<std::uint16_t> moPhotometric;
    std::uint16_t mnAlpha = 0; // ExtraSamples of the last channel

    // options: KEY=VALUE, separated by blanks, in any letter case. Throws DataException naming a key or a value that is
    // not known.
    static CreateOptions Parse(const std::string& options, const Place& oPlace = Place::Current());
    // The keys as users are told of them.
    static std::vector<support::Options::Description> Describe();
};

} // namespace krv::plugins::tif
