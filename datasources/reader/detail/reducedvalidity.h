#pragma once

#include "datasources/interfaces/irasterio.h"
#include "datasources/interfaces/windowedio.h"

#include <memory>

namespace krv::gobs
{
class IMaskBuilder;
}

namespace krv::datasources
{

class BasicReader;
class IDataset;

namespace detail
{

// The pixels of a mask or of an alpha channel for a level of the image, from those at full size: 1 where any pixel of
// the box that a pixel of the level stands for is valid, else 0, as levels themselves are made. 8-bit unsigned.
class ReducedValidity : public WindowedIO<IRasterIO>
{
public:
    // poFull: one channel, not valid where it is 0 or not a number. nFactor: of the level, 0 when it is not known.
    ReducedValidity(std::unique_ptr<BasicReader> poFull, unsigned int nWidth, unsigned int nHeight,
                    unsigned int nFactor);
    ~ReducedValidity() override;

    unsigned int GetFileWidth() const override { return mnWidth; }
    unsigned int GetFileHeight() const override { return mnHeight; }
    unsigned int GetTileWidth() const override { return mnWidth; }
    unsigned int GetTileHeight() const override { return 1; }

private:
    std::size_t GetPixelBytes() const override { return 1; }
    void ReadPixels(const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch) override;
    void WritePixels(const PixelRect& oRect, const unsigned char* pSource, std::size_t nPitch) override;

    std::unique_ptr<BasicReader> mpoFull;
    std::unique_ptr<const krv::gobs::IMaskBuilder> mpoBackground;
    unsigned int mnWidth;
    unsigned int mnHeight;
    unsigned int mnFactor;
};

// A reader of the level of a bitmap that the dataset holds in that size; null when there is none that is up to date.
std::unique_ptr<BasicReader> ReadStoredLevel(IDataset& oDataset, unsigned int nBitmap, unsigned int nWidth,
                                             unsigned int nHeight);

// A reader of it, with margins.
std::unique_ptr<BasicReader> ReadReduced(IDataset& oDataset, std::unique_ptr<BasicReader> poFull, unsigned int nWidth,
                                         unsigned int nHeight);

// Marks the values of one channel that are 0 or not a number.
std::unique_ptr<const krv::gobs::IMaskBuilder> ZeroOrNaN(unsigned int nChannel);

} // namespace detail

} // namespace krv::datasources
