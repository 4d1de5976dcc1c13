#pragma once

#include "datasources/metadata/auxiliarydata.h"
#include "gobs/raster/datatype.h"

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace krv::plugins::demo
{

// What stands before the pixels, as text:
//     DEMO1
//     640 480             width and height
//     8U 8U 32R           a data type for each channel
//     scene=alps          any number of tags of the file,
//     [2]band=red         and of channels;
//     [2]=Red             the description of a channel
// and an empty line. Other lines without "=" mean nothing. In keys and values %XX stands for the byte of that
// hexadecimal number: a key has none of %, = and control characters otherwise, nor a [ at its beginning, and a value
// none of % and control characters. While a file is written its first line says DEMO- instead.
struct DemoHeader
{
    static constexpr std::string_view SIGNATURE = "DEMO1\n";
    static constexpr std::string_view UNFINISHED = "DEMO-\n";
    static constexpr std::size_t MAX_BYTES = 65536;

    unsigned int mnWidth = 0;
    unsigned int mnHeight = 0;
    std::vector<krv::gobs::DataType> moTypes;
    krv::datasources::AuxiliaryData moTags;

    // bytes: the first MAX_BYTES of a file, or all. nLength: the length of the header, the empty line counted.
    // Throws krv::FileFormatException for anything but a whole header of a finished file.
    static DemoHeader Parse(const std::string& fileName, const std::string& bytes, std::uint64_t& nLength);

    // The text of MAX_BYTES bytes, filled up with blanks. Throws krv::DataException when the tags are too many.
    std::string ToText(const std::string& fileName) const;

    // Of all pixels; throws krv::DataException above 2^63 - 1.
    std::uint64_t GetPixelBytes() const;
};

} // namespace krv::plugins::demo
