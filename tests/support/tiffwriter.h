#pragma once

#include <tiffio.h>

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

namespace krv::test
{

struct CloseTiff
{
    void operator()(TIFF* poFile) const { TIFFClose(poFile); }
};
using TiffFile = std::unique_ptr<TIFF, CloseTiff>;

// How libtiff is to lay out a page.
struct TiffForm
{
    std::uint32_t mnWidth;
    std::uint32_t mnHeight;
    std::uint16_t mnChannels = 1;
    std::uint16_t mnBits = 8; // of a sample, both parts of a complex one
    std::uint16_t mnFormat = SAMPLEFORMAT_UINT;
    std::uint16_t mnCompression = COMPRESSION_NONE;
    std::uint16_t mnPredictor = PREDICTOR_NONE;
    std::uint16_t mnPhotometric = PHOTOMETRIC_MINISBLACK;
    bool mbSeparate = false;
    std::uint32_t mnRows = 16;     // of a strip or tile
    std::uint32_t mnTileWidth = 0; // 0: strips
};

// A file to write, in one of libtiff's modes; throws when it cannot be opened.
TiffFile NewTiff(const std::string& fileName, const std::string& mode = "w");
void SetForm(TIFF* poFile, const TiffForm& oForm);
// Throws when libtiff does not take the block.
void WriteBlock(TIFF* poFile, std::uint32_t nBlock, std::vector<unsigned char> oBytes);
// All blocks of the page, of bytes that count upwards.
void WriteBlocks(TIFF* poFile);

} // namespace krv::test
