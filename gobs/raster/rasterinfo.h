#pragma once

#include "gobs/raster/datatype.h"

namespace krv::gobs
{

// What a raster is: the size of its centre in pixels, its channel count and its type. Margins are not counted.
// A plain value. Example: RasterInfo(512, 512, 3, eDT_8U) describes 768 KiB of pixels.
class RasterInfo
{
public:
    RasterInfo() = default;
    // nWidth, nHeight: pixels. Nothing is checked here; whoever allocates by it does.
    RasterInfo(unsigned int nWidth, unsigned int nHeight, unsigned int nChannels, const DataType& oType)
        : mnWidth(nWidth), mnHeight(nHeight), mnChannels(nChannels), moType(oType)
    {
    }

    // Pixels, as the constructor got them.
    unsigned int GetWidth() const { return mnWidth; }
    unsigned int GetHeight() const { return mnHeight; }
    // Channels, which lie pixel interleaved.
    unsigned int GetChansCount() const { return mnChannels; }
    // The type of every channel: a raster has one type.
    const DataType& GetDataType() const { return moType; }

    friend bool operator==(const RasterInfo&, const RasterInfo&) = default;

private:
    unsigned int mnWidth = 0;
    unsigned int mnHeight = 0;
    unsigned int mnChannels = 0; // of a pixel
    DataType moType;
};

// Where a raster is: the image position of its centre's first pixel (it may lie outside the image) and the margins
// around the centre, in pixels, the same left and right, and the same above and below.
// A plain value. Without margins: RasterContext(nX, nY).
class RasterContext
{
public:
    RasterContext() = default;
    RasterContext(int nX, int nY, unsigned int nXMargin = 0, unsigned int nYMargin = 0)
        : mnX(nX), mnY(nY), mnXMargin(nXMargin), mnYMargin(nYMargin)
    {
    }

    // Column and row in the image, from its top left pixel on. The margins lie before them.
    int GetX() const { return mnX; }
    int GetY() const { return mnY; }
    // Pixels on each side, so that the full width is the width and twice this.
    unsigned int GetXMargin() const { return mnXMargin; }
    unsigned int GetYMargin() const { return mnYMargin; }

    friend bool operator==(const RasterContext&, const RasterContext&) = default;

private:
    int mnX = 0; // of the centre, in the image
    int mnY = 0;
    unsigned int mnXMargin = 0;
    unsigned int mnYMargin = 0;
};

} // namespace krv::gobs
