#pragma once

#include "gobs/raster/datatype.h"
#include "plugins/raw/headertext.h"
#include "plugins/support/image/plainsource.h"

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace krv::plugins::raw
{

enum class Interleave
{
    eBand, // BSQ
    eLine, // BIL
    ePixel // BIP
};

// How the pixels of a file lie: what any of the headers says, or the rules of a kind without a header.
struct RawForm
{
    // More channels than any sensor has are a sign of damage.
    static constexpr unsigned int MOST_CHANNELS = 100000;

    unsigned int mnWidth = 0;
    unsigned int mnHeight = 0;
    unsigned int mnChannels = 1;
    krv::gobs::DataType moType;
    Interleave meInterleave = Interleave::eBand;
    bool mbBigEndian = false;
    std::uint64_t mnOffset = 0;
    // Of files with gaps: the bytes of a row of one channel, those from one row of a channel to the next, and those
    // between the channels of eBand. 0: none but the values.
    std::uint64_t mnChannelRowBytes = 0;
    std::uint64_t mnRowBytes = 0;
    std::uint64_t mnBandGap = 0;

    // Up to the end of the last value. No value for more than any file holds.
    std::optional<std::uint64_t> CountBytes() const;
    support::ImageLayout MakeLayout() const;
    std::vector<support::PlainSource::Placement> PlacePlanes() const;
    bool IsSwapped() const;
};

// The code of a data type, 0 for one that such headers do not have, and the other way.
int FindTypeCode(const krv::gobs::DataType& oType);
std::optional<krv::gobs::DataType> FindType(int nCode);

// What a header says. name: of the header, for messages. Throws FileFormatException that names the key and its value.
RawForm ReadForm(const HeaderText& oHeader, const std::string& name);
void WriteForm(const RawForm& oForm, HeaderText& oHeader);

// Whole numbers and reals of headers, with a sign or without; no value for any other text and for no finite number.
std::optional<double> ParseReal(const std::string& text);

} // namespace krv::plugins::raw
