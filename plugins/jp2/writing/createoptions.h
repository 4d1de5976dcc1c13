#pragma once

#include "plugins/support/writing/options.h"
#include "toolkit/exceptions/place.h"

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace krv::plugins::jp2
{

// How a new file is laid out. Lossless unless a quality or a ratio is asked for.
struct CreateOptions
{
    std::uint32_t mnTileWidth = 1024;
    std::uint32_t mnTileHeight = 1024;
    std::optional<unsigned int> moLevels;  // resolutions below the full one; as suits the image unless given
    std::optional<unsigned int> moQuality; // of each tile, as a peak signal-to-noise ratio in decibels
    std::optional<unsigned int> moRatio;   // of each tile's bytes before and after
    unsigned int mnProgression = 0;        // OpenJPEG's number: LRCP, RLCP, RPCL, PCRL, CPRL
    std::optional<bool> moColourTransform; // for three channels of 8 bits and up to one more unless given
    unsigned int mnSampleBits = 0;         // stored; 0: as many as the type has
    std::optional<bool> moBoxes;           // a JP2 file, or a bare codestream; by the file's extension unless given

    bool IsLossless() const { return !moQuality && !moRatio; }

    // options: KEY=VALUE, separated by blanks, in any letter case. Throws DataException naming a key or a value that is
    // not known.
    static CreateOptions Parse(const std::string& options, const Place& oPlace = Place::Current());
    // The keys as users are told of them.
    static std::vector<support::Options::Description> Describe();
};

} // namespace krv::plugins::jp2
