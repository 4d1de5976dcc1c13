#pragma once

#include "datasources/metadata/auxiliarydata.h"
#include "plugins/tif/reading/page.h"
#include "toolkit/xml/xmltree.h"

#include <cstdint>
#include <optional>
#include <string>

namespace krv::plugins::tif
{

// What the tags of a page say beyond its pixels. Keys of the file: "NO_DATA_VALUE" (tag 42113, the text as it is);
// "ImageDescription", "DocumentName", "PageName", "Make", "Model", "Software", "DateTime", "Artist", "HostComputer",
// "Copyright", "XMP" (texts); "XResolution", "YResolution" (numbers), "ResolutionUnit" ("none", "inch", "centimetre");
// "Orientation" (the tag's number, unless 1: pixels are handed out as they are stored); "Photometric" (unless it says
// grey, colour or palette); "RasterType" ("Area" or "Point"); "RPC" (the 92 numbers of tag 50844, separated by blanks,
// exact); "GroundControlPoints" (column row x y z of each, separated by semicolons, for images without a geocoding).
// The items of tag 42112 stand under their names, with their domain before a colon when they have one, in the file's or
// a channel's map; of a channel the roles scale, offset, unittype and colorinterp give "Scale", "Offset", "UnitType"
// and "ColorInterp", and the role description its description. What XML cannot hold stands there as the hexadecimal
// digits of its bytes: encoding="hex" says so of an item's text, the attribute keyhex gives a key that the others
// cannot say. An item's key keeps its letter case. "ColorInterp" of a channel is otherwise "Red", "Green", "Blue",
// "Gray", "Palette", "Alpha" or absent; "AlphaKind" is "Premultiplied" or "Straight". A tag 42112 that is no XML is the
// value of "MetadataXML"; why it cannot be read goes to pTrouble.
krv::datasources::AuxiliaryData ReadMetadata(Page& oPage, std::string* pTrouble = nullptr);

constexpr std::uint16_t TAG_METADATA = 42112;
constexpr std::uint16_t TAG_RPC = 50844;
constexpr std::size_t MAXIMUM_XMP_BYTES = std::size_t{1} << 20;
constexpr const char* RESOLUTION_UNITS[] = {"", "none", "inch", "centimetre"}; // by the tag's number

// The keys whose values are the texts of tags.
struct TextTag
{
    const char* mpKey;
    std::uint16_t mnTag;
};

constexpr TextTag TEXTS[] = {{"ImageDescription", TIFFTAG_IMAGEDESCRIPTION},
                             {"DocumentName", TIFFTAG_DOCUMENTNAME},
                             {"PageName", TIFFTAG_PAGENAME},
                             {"Make", TIFFTAG_MAKE},
                             {"Model", TIFFTAG_MODEL},
                             {"Software", TIFFTAG_SOFTWARE},
                             {"DateTime", TIFFTAG_DATETIME},
                             {"Artist", TIFFTAG_ARTIST},
                             {"HostComputer", TIFFTAG_HOSTCOMPUTER},
                             {"Copyright", TIFFTAG_COPYRIGHT},
                             {"XMP", TIFFTAG_XMLPACKET},
                             {"NO_DATA_VALUE", 42113}};

// The keys of channels whose items have roles, and the names of such items.
struct ItemRole
{
    const char* mpKey;
    const char* mpName;
    const char* mpRole;
};

constexpr ItemRole ROLES[] = {{"Scale", "SCALE", "scale"},
                              {"Offset", "OFFSET", "offset"},
                              {"UnitType", "UNITTYPE", "unittype"},
                              {"ColorInterp", "COLORINTERP", "colorinterp"}};

// A place in the record: a tag of the file (channel 0) or of a channel, or a channel's description. Ordered as the
// record orders its keys, so that two that differ in letter case alone are one place.
struct MetadataKey
{
    unsigned int mnChannel = 0;
    std::string moKey;
    bool mbDescription = false;

    bool operator<(const MetadataKey& oOther) const;
};

// Whether the record takes two keys for one.
bool IsSameKey(const std::string& first, const std::string& second);

// The record's place of an item of tag 42112; no value for what is no item of the image.
std::optional<MetadataKey> FindItemKey(const krv::xml::Element& oItem, unsigned int nChannels);

// Why no items can be read from a text of tag 42112; empty when they can.
std::string WhyNoItems(const std::string& text);

} // namespace krv::plugins::tif
