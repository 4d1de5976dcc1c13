#pragma once

#include "datasources/metadata/auxiliarydata.h"
#include "plugins/jp2/geo/geoboxes.h"

#include <string>
#include <vector>

namespace krv::plugins::jp2
{

// The box of this library's own: metadata of the file and of its channels, and descriptions, as lines of text
// (plugins/support/writing/recordtext.h).
constexpr Uuid RECORD_UUID = {0x5f, 0x3a, 0x1c, 0x0e, 0x8b, 0x2d, 0x4e, 0x67,
                              0x9a, 0x41, 0x6c, 0x0d, 0x2b, 0xe7, 0xf5, 0x18};

// Empty for a record that says nothing.
std::string WriteRecordBox(const krv::datasources::AuxiliaryData& oRecord);
// Lays what the box says over a record.
void ReadRecordBox(const std::string& text, krv::datasources::AuxiliaryData& oRecord);

// What the box of channels says of a channel.
struct ChannelUse
{
    unsigned int mnUse = 0;    // 0 colour, 1 opacity, 2 opacity of premultiplied colours, 65535 neither
    unsigned int mnColour = 0; // from 1; 0: of all, 65535: none
};

// By "ColorInterp" and "AlphaKind" of the channels. bColours: the first three are red, green and blue unless channels
// say otherwise.
std::vector<ChannelUse> FindUses(const krv::datasources::AuxiliaryData& oRecord, bool bColours);

} // namespace krv::plugins::jp2
