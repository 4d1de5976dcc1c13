#pragma once

#include "datasources/interfaces/windowedio.h"
#include "plugins/support/image/blockimage.h"

#include <memory>
#include <vector>

namespace krv::plugins::support
{

// The transfer of windows for a list of channels of a block image. Base is IRasterIO or IOverviewIO.
// Keeps the image, and by it the file, open: it may outlive its dataset as far as memory goes.
template <typename Base>
class BlockRasterIO : public krv::datasources::WindowedIO<Base>
{
public:
    // Throws as ChannelSelection.
    BlockRasterIO(std::shared_ptr<BlockImage> poImage, const std::vector<unsigned int>& oChannels,
                  const Place& oPlace = Place::Current());
    ~BlockRasterIO() override;

    // Pixels of the image, and of the tile that readers best take.
    unsigned int GetFileWidth() const override;
    unsigned int GetFileHeight() const override;
    unsigned int GetTileWidth() const override;
    unsigned int GetTileHeight() const override;

private:
    std::size_t GetPixelBytes() const override;
    void ReadPixels(const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch) override;
    void WritePixels(const PixelRect& oRect, const unsigned char* pSource, std::size_t nPitch) override;

    std::shared_ptr<BlockImage> mpoImage; // shared with the dataset
    ChannelSelection moChannels;          // that its pixels consist of
    // What readers are told to use: the layout's, but never more than 64 MiB for all channels together.
    unsigned int mnTileWidth;
    unsigned int mnTileHeight; // pixels, as the width
};

extern template class BlockRasterIO<krv::datasources::IRasterIO>;
extern template class BlockRasterIO<krv::datasources::IOverviewIO>;

using RasterIO = BlockRasterIO<krv::datasources::IRasterIO>;

// The same for one overview level.
class OverviewIO : public BlockRasterIO<krv::datasources::IOverviewIO>
{
public:
    // nLevel: what GetLevel answers; the size is the image's.
    OverviewIO(unsigned int nLevel, std::shared_ptr<BlockImage> poImage, const std::vector<unsigned int>& oChannels,
               const Place& oPlace = Place::Current());
    ~OverviewIO() override;

    unsigned int GetLevel() const override { return mnLevel; }

private:
    unsigned int mnLevel;
};

} // namespace krv::plugins::support
