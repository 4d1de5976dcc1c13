#pragma once

#include "datasources/interfaces/windowedio.h"
#include "datasources/reader/basicreader.h"
#include "gobs/raster/datatype.h"

#include <cstring>
#include <memory>
#include <string>
#include <utility>
#include <vector>

namespace krv::test
{

// Pixels in memory, interleaved.
class MemoryIO : public krv::datasources::WindowedIO<krv::datasources::IRasterIO>
{
public:
    MemoryIO(unsigned int nWidth, unsigned int nHeight, unsigned int nTile, std::string pixels)
        : mnWidth(nWidth), mnHeight(nHeight), mnTile(nTile), moPixels(std::move(pixels))
    {
    }

    unsigned int GetFileWidth() const override { return mnWidth; }
    unsigned int GetFileHeight() const override { return mnHeight; }
    unsigned int GetTileWidth() const override { return mnTile; }
    unsigned int GetTileHeight() const override { return mnTile; }

private:
    std::size_t GetPixelBytes() const override { return moPixels.size() / mnWidth / mnHeight; }
    void ReadPixels(const krv::datasources::PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch) override
    {
        for (std::size_t nRow = 0; nRow < oRect.mnHeight; ++nRow)
            std::memcpy(pTarget + nRow * nPitch,
                        moPixels.data() + ((oRect.mnY + nRow) * mnWidth + oRect.mnX) * GetPixelBytes(),
                        oRect.mnWidth * GetPixelBytes());
    }
    void WritePixels(const krv::datasources::PixelRect&, const unsigned char*, std::size_t) override {}

    unsigned int mnWidth;
    unsigned int mnHeight;
    unsigned int mnTile;
    std::string moPixels;
};

// A reader of them; record, geocoding and bitmaps are those of a dataset, which outlives it.
class MemoryReader : public krv::datasources::BasicReader
{
public:
    MemoryReader(krv::datasources::IDataset& oDataset, unsigned int nWidth, unsigned int nHeight,
                 const std::vector<unsigned int>& oChannels, const krv::gobs::DataType& oType, std::string pixels,
                 unsigned int nTile = 16)
    {
        SetDataset(&oDataset, oChannels, false);
        SetRasterIO(std::make_unique<MemoryIO>(nWidth, nHeight, nTile, std::move(pixels)), oType);
    }
};

} // namespace krv::test
