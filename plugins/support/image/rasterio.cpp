#include "plugins/support/image/rasterio.h"

namespace krv::plugins::support
{

namespace
{

constexpr double MAXIMUM_TILE_BYTES = 64 << 20;

} // namespace

template <typename Base>
BlockRasterIO<Base>::BlockRasterIO(std::shared_ptr<BlockImage> poImage, const std::vector<unsigned int>& oChannels,
                                   const Place& oPlace)
    : mpoImage(std::move(poImage)), moChannels(mpoImage->GetLayout(), oChannels, oPlace),
      mnTileWidth(mpoImage->GetLayout().GetPreferredWidth()), mnTileHeight(mpoImage->GetLayout().GetPreferredHeight())
{
    const auto Bytes = [this]
    {
        return static_cast<double>(mnTileWidth) * mnTileHeight * moChannels.GetPixelBytes();
    };
    while (Bytes() > MAXIMUM_TILE_BYTES && mnTileHeight > 1)
        mnTileHeight = (mnTileHeight + 1) / 2;
    while (Bytes() > MAXIMUM_TILE_BYTES && mnTileWidth > 1)
        mnTileWidth = (mnTileWidth + 1) / 2;
}

template <typename Base>
BlockRasterIO<Base>::~BlockRasterIO() = default;

template <typename Base>
unsigned int BlockRasterIO<Base>::GetFileWidth() const
{
    return mpoImage->GetLayout().GetWidth();
}

template <typename Base>
unsigned int BlockRasterIO<Base>::GetFileHeight() const
{
    return mpoImage->GetLayout().GetHeight();
}

template <typename Base>
unsigned int BlockRasterIO<Base>::GetTileWidth() const
{
    return mnTileWidth;
}

template <typename Base>
unsigned int BlockRasterIO<Base>::GetTileHeight() const
{
    return mnTileHeight;
}

template <typename Base>
std::size_t BlockRasterIO<Base>::GetPixelBytes() const
{
    return moChannels.GetPixelBytes();
}

template <typename Base>
void BlockRasterIO<Base>::ReadPixels(const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch)
{
    mpoImage->Read(moChannels, oRect, pTarget, nPitch);
}

template <typename Base>
void BlockRasterIO<Base>::WritePixels(const PixelRect& oRect, const unsigned char* pSource, std::size_t nPitch)
{
    mpoImage->Write(moChannels, oRect, pSource, nPitch);
}

template class BlockRasterIO<krv::datasources::IRasterIO>;
template class BlockRasterIO<krv::datasources::IOverviewIO>;

OverviewIO::OverviewIO(unsigned int nLevel, std::shared_ptr<BlockImage> poImage,
                       const std::vector<unsigned int>& oChannels, const Place& oPlace)
    : BlockRasterIO<krv::datasources::IOverviewIO>(std::move(poImage), oChannels, oPlace), mnLevel(nLevel)
{
}

OverviewIO::~OverviewIO() = default;

} // namespace krv::plugins::support
