#include "tests/plugins/tif/tifsupport.h"
#include "tests/support/tiffwriter.h"

#include <gtest/gtest.h>

namespace
{

using namespace krv::test;

constexpr unsigned int WIDTH = 20000;
constexpr unsigned int HEIGHT = 10200; // 194 MiB as handed out

// One compressed strip of one-bit pixels: the eight pixels of a byte are the bits of the row's number.
void MakeHugeStrip(const std::string& fileName)
{
    const TiffFile poTiff = NewTiff(fileName);
    SetForm(poTiff.get(), {.mnWidth = WIDTH,
                           .mnHeight = HEIGHT,
                           .mnBits = 1,
                           .mnCompression = COMPRESSION_ADOBE_DEFLATE,
                           .mnRows = HEIGHT});
    for (unsigned int nRow = 0; nRow < HEIGHT; ++nRow)
    {
        Bytes oRow(WIDTH / 8, static_cast<unsigned char>(nRow));
        TIFFWriteScanline(poTiff.get(), oRow.data(), nRow, 0);
    }
}

TEST(TifRows, StripThatIsTooLargeToDecodeAtOnceIsReadRowByRow)
{
    const TempFolder oFolder;
    MakeHugeStrip(oFolder.File("strip.tif"));
    const TifPointer oFile = OpenTif(oFolder.File("strip.tif"));
    const IOPointer poIO(oFile->GetRasterIO({1}));
    EXPECT_LT(poIO->GetTileHeight(), HEIGHT / 2);
    for (const unsigned int nY : {0u, 5000u, HEIGHT - 40, 17u, 90u})
    {
        Bytes oPixels(100 * 40);
        poIO->ReadWindow(803u, nY, 100u, 40u, oPixels.data());
        for (unsigned int nRow = 0; nRow < 40; ++nRow)
            for (unsigned int nColumn = 0; nColumn < 100; ++nColumn)
                ASSERT_EQ(oPixels[nRow * 100 + nColumn], (nY + nRow) >> (7 - (803 + nColumn) % 8) & 1)
                    << nY + nRow << ", " << nColumn;
    }
}

TEST(TifRows, BlocksOfStripsAreSensibleAndNeverTheWholeImage)
{
    struct Case
    {
        unsigned int width, height, rowsPerStrip;
        std::uint16_t compression;
    };
    for (const Case& oCase : {Case{100, 80, 8, 1}, Case{8192, 8192, 1, 8}, Case{8192, 8192, 8192, 1},
                              Case{3000, 3000, 3000, 8}, Case{100, 20, 3, 8}})
    {
        const TempFolder oFolder;
        const std::string file = oFolder.File("strips.tif");
        {
            const TiffFile poTiff = NewTiff(file);
            SetForm(poTiff.get(), {.mnWidth = oCase.width,
                                   .mnHeight = oCase.height,
                                   .mnCompression = oCase.compression,
                                   .mnRows = oCase.rowsPerStrip});
            WriteBlock(poTiff.get(), 0, Bytes(std::size_t{oCase.width} * oCase.rowsPerStrip));
        }
        const TifPointer oFile = OpenTif(file);
        const IOPointer poIO(oFile->GetRasterIO({1}));
        SCOPED_TRACE(oCase.width);
        EXPECT_EQ(poIO->GetTileWidth(), oCase.width);
        EXPECT_LT(poIO->GetTileHeight(), oCase.height);
        EXPECT_LE(poIO->GetTileHeight(), 512u);
        EXPECT_LE(std::size_t{poIO->GetTileWidth()} * poIO->GetTileHeight(), std::size_t{4} << 20);
        EXPECT_TRUE(oCase.rowsPerStrip > 256 || poIO->GetTileHeight() % oCase.rowsPerStrip == 0);
    }
}

} // namespace
