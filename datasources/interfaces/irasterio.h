#pragma once

#include "datasources/api.h"

namespace krv::datasources
{

// Windowed pixel transfer over a fixed list of channels, all of one data type. Positions count whole pixels from the
// top left corner. Buffers are pixel interleaved, rows top to bottom, no padding, channels in the order of the list.
// The order of the virtual operations is public and fixed. One thread at a time.
// Example: a window of 256 x 256 pixels of 3 channels of 16 bits:
//   std::vector<unsigned char> oPixels(256 * 256 * 3 * 2);
//   poRasterIO->ReadWindow(1024u, 512u, 256u, 256u, oPixels.data());
// Nothing need be aligned.
class KRV_DATASOURCES_API IRasterIO
{
public:
    virtual ~IRasterIO();

    // The columns of the image, or of the level, in pixels.
    virtual unsigned int GetFileWidth() const = 0;
    // The rows.
    virtual unsigned int GetFileHeight() const = 0;

    // The columns of the block of pixels that the format transfers best, at least 1; readers take it as their tile.
    virtual unsigned int GetTileWidth() const = 0;
    // Its rows.
    virtual unsigned int GetTileHeight() const = 0;

    // Reads a part of a window whose origin may lie outside the image. The buffer holds nWidth * nHeight pixels; the
    // part starts at column nPartX and row nPartY of the buffer and is nPartWidth by nPartHeight pixels. What of the
    // part lies inside the image is read; every other byte of the buffer stays untouched, and what lies outside is no
    // error. Throws krv::IOException or krv::FileFormatException when the file cannot be read; the part is then
    // undefined.
    virtual void ReadWindow(int nX, int nY, unsigned int nWidth, unsigned int nHeight, unsigned int nPartX,
                            unsigned int nPartY, unsigned int nPartWidth, unsigned int nPartHeight,
                            unsigned char* pBuffer) = 0;

    // Reads a window that lies inside the image, else krv::DataException, into a buffer of exactly its size.
    virtual void ReadWindow(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight,
                            unsigned char* pBuffer) = 0;

    // The counterpart of the long form: stores the part of the buffer. All of it lies inside the image, else
    // krv::DataException before anything is stored: nothing of it would be found again. The buffer stays the caller's
    // and is not kept. Throws krv::DataException for a dataset that is not open for updating.
    virtual void WriteWindow(int nX, int nY, unsigned int nWidth, unsigned int nHeight, unsigned int nPartX,
                             unsigned int nPartY, unsigned int nPartWidth, unsigned int nPartHeight,
                             unsigned char* const pBuffer) = 0;
    // Stores a whole window, under the same conditions.
    virtual void WriteWindow(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight,
                             unsigned char* const pBuffer) = 0;
};

} // namespace krv::datasources
