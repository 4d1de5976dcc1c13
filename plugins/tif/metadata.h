#pragma once

#include "datasources/metadata/auxiliarydata.h"
#include "plugins/tif/page.h"
#include "toolkit/xml/xmltree.h"

#include <cstdint>
#include <optional>
#include <string>
#include <utility>

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
// and "ColorInterp", and the role description its description. The attribute encoding="hex" says that an item's text
// holds the bytes of the value as hexadecimal digits. "ColorInterp" of a channel is otherwise "Red", "Green",
// "Blue", "Gray", "Palette", "Alpha" or absent; "AlphaKind" is "Premultiplied" or "Straight".
krv::datasources::AuxiliaryData ReadMetadata(Page& oPage);

// The record's place of an item of tag 42112: the channel (0: the file) and the key, "\nDescription" for a channel's
// description. No value for what is no item of the image.
std::optional<std::pair<unsigned int, std::string>> FindItemKey(const krv::xml::Element& oItem, unsigned int nChannels);

// Whether a text of tag 42112 is one that items are read from.
bool IsItemText(const std::string& text);

// The shortest text that reads back as the same number.
std::string NumberText(double nValue);

// A text of a tag, up to its first NUL; empty when it is absent.
std::string ReadText(TIFF* poTiff, std::uint32_t nTag);

} // namespace krv::plugins::tif
