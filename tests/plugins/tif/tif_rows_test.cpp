#include "tests/plugins/tif/tifsupport.h"

#include <gtest/gtest.h>
#include <tiffio.h>

namespace
{

using krv::test::OpenTif;
using krv::test::TemporaryFile;

constexpr unsigned int WIDTH = 20000;
constexpr unsigned int HEIGHT = 10200; // 194 MiB as handed out

// One compressed strip of one-bit pixels: the eight pixels of a byte are the bits of the row's number.
void MakeHugeStrip(const std::string& fileName)
{
    TIFF* poTiff = TIFFOpen(fileName.c_str(), "w");
    ASSERT_NE(poTiff, nullptr);
    TIFFSetField(poTiff, TIFFTAG_IMAGEWIDTH, WIDTH);
    TIFFSetField(poTiff, TIFFTAG_IMAGELENGTH, HEIGHT);
    TIFFSetField(poTiff, TIFFTAG_BITSPERSAMPLE, 1);
    TIFFSetField(poTiff, TIFFTAG_PHOTOMETRIC, PHOTOMETRIC_MINISBLACK);
    TIFFSetField(poTiff, TIFFTAG_COMPRESSION, COMPRESSION_ADOBE_DEFLATE);
    TIFFSetField(poTiff, TIFFTAG_ROWSPERSTRIP, HEIGHT);
    for (unsigned int nRow = 0; nRow < HEIGHT; ++nRow)
    {
        std::vector<unsigned char> oRow(WIDTH / 8, static_cast<unsigned char>(nRow));
        TIFFWriteScanline(poTiff, oRow.data(), nRow, 0);
    }
    TIFFClose(poTiff);
}

TEST(TifRows, StripThatIsTooLargeToDecodeAtOnceIsReadRowByRow)
{
    const TemporaryFile oName;
    MakeHugeStrip(oName.GetName());
    const OpenTif oFile(oName.GetName());
    const std::unique_ptr<krv::datasources::IRasterIO> poIO(oFile->GetRasterIO({1}));
    EXPECT_LT(poIO->GetTileHeight(), HEIGHT / 2);
    for (const unsigned int nY : {0u, 5000u, HEIGHT - 40, 17u, 90u})
    {
        std::vector<unsigned char> oPixels(100 * 40);
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
        const TemporaryFile oName;
        TIFF* poTiff = TIFFOpen(oName.GetName().c_str(), "w");
        ASSERT_NE(poTiff, nullptr);
        TIFFSetField(poTiff, TIFFTAG_IMAGEWIDTH, oCase.width);
        TIFFSetField(poTiff, TIFFTAG_IMAGELENGTH, oCase.height);
        TIFFSetField(poTiff, TIFFTAG_BITSPERSAMPLE, 8);
        TIFFSetField(poTiff, TIFFTAG_PHOTOMETRIC, PHOTOMETRIC_MINISBLACK);
        TIFFSetField(poTiff, TIFFTAG_COMPRESSION, oCase.compression);
        TIFFSetField(poTiff, TIFFTAG_ROWSPERSTRIP, oCase.rowsPerStrip);
        std::vector<unsigned char> oStrip(std::size_t{oCase.width} * oCase.rowsPerStrip);
        TIFFWriteEncodedStrip(poTiff, 0, oStrip.data(), static_cast<tmsize_t>(oStrip.size()));
        TIFFClose(poTiff);
        const OpenTif oFile(oName.GetName());
        const std::unique_ptr<krv::datasources::IRasterIO> poIO(oFile->GetRasterIO({1}));
        SCOPED_TRACE(oCase.width);
        EXPECT_EQ(poIO->GetTileWidth(), oCase.width);
        EXPECT_LT(poIO->GetTileHeight(), oCase.height);
        EXPECT_LE(poIO->GetTileHeight(), 512u);
        EXPECT_LE(std::size_t{poIO->GetTileWidth()} * poIO->GetTileHeight(), std::size_t{4} << 20);
        EXPECT_TRUE(oCase.rowsPerStrip > 256 || poIO->GetTileHeight() % oCase.rowsPerStrip == 0);
    }
}

} // namespace
