#include "tests/support/tiffwriter.h"

#include <algorithm>
#include <numeric>
#include <stdexcept>

namespace krv::test
{

TiffFile NewTiff(const std::string& fileName, const std::string& mode)
{
    TiffFile poFile(TIFFOpen(fileName.c_str(), mode.c_str()));
    if (poFile == nullptr)
        throw std::runtime_error("cannot write " + fileName);
    return poFile;
}

void SetForm(TIFF* poFile, const TiffForm& oForm)
{
    TIFFSetField(poFile, TIFFTAG_IMAGEWIDTH, oForm.mnWidth);
    TIFFSetField(poFile, TIFFTAG_IMAGELENGTH, oForm.mnHeight);
    TIFFSetField(poFile, TIFFTAG_SAMPLESPERPIXEL, oForm.mnChannels);
    TIFFSetField(poFile, TIFFTAG_BITSPERSAMPLE, oForm.mnBits);
    TIFFSetField(poFile, TIFFTAG_SAMPLEFORMAT, oForm.mnFormat);
    TIFFSetField(poFile, TIFFTAG_PHOTOMETRIC, oForm.mnPhotometric);
    TIFFSetField(poFile, TIFFTAG_PLANARCONFIG, oForm.mbSeparate ? PLANARCONFIG_SEPARATE : PLANARCONFIG_CONTIG);
    TIFFSetField(poFile, TIFFTAG_COMPRESSION, oForm.mnCompression);
    if (oForm.mnPredictor != PREDICTOR_NONE)
        TIFFSetField(poFile, TIFFTAG_PREDICTOR, oForm.mnPredictor);
    if (oForm.mnTileWidth != 0)
        TIFFSetField(poFile, TIFFTAG_TILEWIDTH, oForm.mnTileWidth);
    TIFFSetField(poFile, oForm.mnTileWidth != 0 ? TIFFTAG_TILELENGTH : TIFFTAG_ROWSPERSTRIP, oForm.mnRows);
}

void WriteBlock(TIFF* poFile, std::uint32_t nBlock, std::vector<unsigned char> oBytes)
{
    const auto nBytes = static_cast<tmsize_t>(oBytes.size());
    const auto Write = TIFFIsTiled(poFile) != 0 ? &TIFFWriteEncodedTile : &TIFFWriteEncodedStrip;
    if (Write(poFile, nBlock, oBytes.data(), nBytes) != nBytes)
        throw std::runtime_error("libtiff cannot write a block");
}

void WriteBlocks(TIFF* poFile)
{
    const bool bTiled = TIFFIsTiled(poFile) != 0;
    std::uint32_t nHeight = 0, nRows = 0;
    TIFFGetField(poFile, TIFFTAG_IMAGELENGTH, &nHeight);
    TIFFGetField(poFile, bTiled ? TIFFTAG_TILELENGTH : TIFFTAG_ROWSPERSTRIP, &nRows);
    const std::uint32_t nBlocks = bTiled ? TIFFNumberOfTiles(poFile) : TIFFNumberOfStrips(poFile);
    for (std::uint32_t nBlock = 0; nBlock < nBlocks; ++nBlock)
    {
        const std::uint32_t nLeft = nHeight - nBlock % ((nHeight + nRows - 1) / nRows) * nRows;
        const tmsize_t nBytes = bTiled ? TIFFTileSize(poFile) : TIFFVStripSize(poFile, std::min(nRows, nLeft));
        std::vector<unsigned char> oBytes(static_cast<std::size_t>(nBytes));
        std::iota(oBytes.begin(), oBytes.end(), static_cast<unsigned char>(7 * nBlock));
        WriteBlock(poFile, nBlock, oBytes);
    }
}

} // namespace krv::test
