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

} // namespace
