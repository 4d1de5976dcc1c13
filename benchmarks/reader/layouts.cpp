#include "benchmarks/reader/layouts.h"

#include "benchmarks/reader/passes.h"

#include <tiffio.h>

#include <algorithm>
#include <cstring>
#include <stdexcept>

namespace krv::benchmarks
{

namespace
{

const Layout LAYOUTS[] = {{"3x8U none strips", 3, 8, COMPRESSION_NONE, 0, false},
                          {"3x8U deflate strips", 3, 8, COMPRESSION_ADOBE_DEFLATE, 0, false},
                          {"3x8U none planes", 3, 8, COMPRESSION_NONE, 256, true},
                          {"3x8U deflate planes", 3, 8, COMPRESSION_ADOBE_DEFLATE, 256, true},
                          {"3x8U JPEG", 3, 8, COMPRESSION_JPEG, 256, false},
                          {"1 bit none", 1, 1, COMPRESSION_NONE, 0, false},
                          {"1 bit none tiles", 1, 1, COMPRESSION_NONE, 256, false},
                          {"1 bit CCITT 4", 1, 1, COMPRESSION_CCITTFAX4, 0, false}};

// libtiff's decoding, mapping off, one reused buffer, and a plain loop to the order of the pixels.
class Blocks
{
public:
    Blocks(const std::string& path, const Layout& oLayout)
        : moLayout(oLayout), mpoTiff(TIFFOpen(path.c_str(), "rm"), &TIFFClose)
    {
        if (mpoTiff == nullptr)
            throw std::runtime_error("cannot read " + path);
        if (moLayout.mnCompression == COMPRESSION_JPEG)
            TIFFSetField(mpoTiff.get(), TIFFTAG_JPEGCOLORMODE, JPEGCOLORMODE_RGB);
        const bool bTiled = TIFFIsTiled(mpoTiff.get()) != 0;
        mnPlanes = moLayout.mbSeparate ? moLayout.mnChannels : 1;
        mnBlocks = (bTiled ? TIFFNumberOfTiles(mpoTiff.get()) : TIFFNumberOfStrips(mpoTiff.get())) / mnPlanes;
        moStored.resize(static_cast<std::size_t>(bTiled ? TIFFTileSize(mpoTiff.get()) : TIFFStripSize(mpoTiff.get())));
        moPixels.resize(moStored.size() * (moLayout.mnBits == 1 ? 8 : mnPlanes));
    }

    unsigned int GetCount() const { return mnBlocks; }
    std::size_t GetBytes() const { return NeedsLoop() ? moPixels.size() : moStored.size(); }

    const unsigned char* ReadTile(unsigned int nBlock)
    {
        if (!NeedsLoop())
            return Decode(nBlock);
        for (unsigned int nPlane = 0; nPlane < mnPlanes; ++nPlane)
        {
            const unsigned char* const pStored = Decode(nPlane * mnBlocks + nBlock);
            if (moLayout.mnBits == 1)
                for (std::size_t n = 0; n < moPixels.size(); ++n)
                    moPixels[n] = pStored[n / 8] >> (7 - n % 8) & 1;
            else
                for (std::size_t n = 0; n < moStored.size(); ++n)
                    moPixels[n * mnPlanes + nPlane] = pStored[n];
        }
        return moPixels.data();
    }

private:
    bool NeedsLoop() const { return mnPlanes > 1 || moLayout.mnBits == 1; }

    const unsigned char* Decode(unsigned int nBlock)
    {
        const auto Read = TIFFIsTiled(mpoTiff.get()) != 0 ? &TIFFReadEncodedTile : &TIFFReadEncodedStrip;
        if (Read(mpoTiff.get(), nBlock, moStored.data(), static_cast<tmsize_t>(moStored.size())) < 0)
            throw std::runtime_error("libtiff cannot decode");
        return moStored.data();
    }

    Layout moLayout;
    std::unique_ptr<TIFF, decltype(&TIFFClose)> mpoTiff;
    unsigned int mnPlanes = 1;
    unsigned int mnBlocks = 0;
    std::vector<unsigned char> moStored;
    std::vector<unsigned char> moPixels;
};

void MeasureLayout(const std::string& path, const Layout& oLayout)
{
    krv::datasources::BasicReader oReader(path);
    Blocks oBlocks(path, oLayout);
    const bool bStrips = oLayout.mnTile == 0;
    oReader.SetTileSize(bStrips ? oReader.GetWidth() : oLayout.mnTile, bStrips ? 16 : oLayout.mnTile);
    if (oReader.GetTileCount() != oBlocks.GetCount())
        throw std::runtime_error("not the blocks of " + path);
    for (const unsigned int nBlock : {0U, oBlocks.GetCount() - 1})
    {
        const std::unique_ptr<krv::gobs::Raster> oRaster(oReader.GetRaster(nBlock));
        if (oRaster->GetBufferSize() != oBlocks.GetBytes() ||
            std::memcmp(oRaster->GetBuffer(), oBlocks.ReadTile(nBlock), oBlocks.GetBytes()) != 0)
            throw std::runtime_error("the candidates differ over " + path);
    }
    const unsigned int nTileWidth = oReader.GetTileWidth(), nTileHeight = oReader.GetTileHeight();
    const auto oTimes = MedianSeconds({{"reader",
                                        [&]
                                        {
                                            ForgetTiles();
                                            krv::datasources::BasicReader oFresh(path);
                                            oFresh.SetTileSize(nTileWidth, nTileHeight);
                                            ReadTiles(oFresh, 0, oBlocks.GetCount());
                                        }},
                                       {"libtiff",
                                        [&]
                                        {
                                            Blocks oFresh(path, oLayout);
                                            ReadTilesOf(oFresh, oBlocks.GetCount());
                                        }}},
                                      5);
    PrintRow(oLayout.moName, oTimes[1] / oTimes[0], oLayout.mnBits == 1 ? 0.9 : 0.95,
             Rate(static_cast<double>(oBlocks.GetBytes()) * oBlocks.GetCount(), oTimes[0]));
}

} // namespace

void MeasureLayouts(const std::string& folder, unsigned int nSize, const std::string& match)
{
    for (const Layout& oLayout : LAYOUTS)
        if (oLayout.moName.find(match) != std::string::npos)
            MeasureLayout(MakeLayout(folder, oLayout, nSize / 256 * 256), oLayout);
}

} // namespace krv::benchmarks
