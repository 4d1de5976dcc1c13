#pragma once

#include "datasources/metadata/auxiliarydata.h"
#include "plugins/support/dataset.h"

#include <string_view>

namespace krv::plugins::demo
{

// A file of text lines and, after an empty line, pixels:
//     DEMO1
//     640 480          width and height
//     8U 8U 32R        a data type for each channel
//     key=value        any number of tags
// Pixels are stored channel after channel, rows top to bottom, values little-endian without padding.
class DemoDataset : public support::Dataset
{
public:
    static constexpr std::string_view SIGNATURE = "DEMO1\n";

    // Throws krv::FileFormatException when the header is not as above or the file is shorter than it says.
    DemoDataset(const std::string& fileName, krv::datasources::IFileFormat* poFormat);

    krv::datasources::AuxiliaryData ReadAuxiliaryData() override;

private:
    static constexpr std::size_t MAX_HEADER_BYTES = 65536;
    static constexpr unsigned int BLOCK_SIZE = 256; // readers take it for their tiles
    krv::datasources::MetadataMap moTags;
};

} // namespace krv::plugins::demo
