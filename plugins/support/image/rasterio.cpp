#include "plugins/support/image/rasterio.h"

#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <source_location>
#include <string>

namespace krv::plugins::support
{

namespace
{

constexpr double MAXIMUM_TILE_BYTES = 64 << 20;

// A window of the caller's buffer, and the part of it that is transferred, cut to the image.
struct Transfer
{
    PixelRect moRect;          // in the image; of width 0 when nothing is to be done
    std::uint64_t mnBegin = 0; // bytes before the first transferred pixel
    std::size_t mnPitch = 0;
};

std::string Text(std::int64_t nX, std::int64_t nY, std::uint64_t nWidth, std::uint64_t nHeight)
{
    return std::to_string(nWidth) + " x " + std::to_string(nHeight) + " at " + std::to_string(nX) + ", " +
           std::to_string(nY);
}

// Places are made only when something is thrown: the texts of a place cost memory.
using Location = std::source_location;

void CheckBuffer(const unsigned char* pBuffer, const Location& oLocation)
{
    if (pBuffer == nullptr)
        throw DataException("The buffer is NULL", Place::Current(oLocation));
}

std::size_t GetPitch(const ChannelSelection& oChannels, unsigned int nWidth, unsigned int nHeight,
                     const Location& oLocation)
{
    std::int64_t nPitch = 0;
    std::int64_t nBytes = 0;
    if (__builtin_mul_overflow(std::uint64_t{nWidth}, oChannels.GetPixelBytes(), &nPitch) ||
        __builtin_mul_overflow(nPitch, std::int64_t{nHeight}, &nBytes))
        throw DataException("A window of " + std::to_string(nWidth) + " x " + std::to_string(nHeight) +
                                " pixels does not fit into memory",
                            Place::Current(oLocation));
    return static_cast<std::size_t>(nPitch);
}

// The long form: part and image are intersected. What is written is held against the image besides.
Transfer Clip(const ImageLayout& oLayout, const ChannelSelection& oChannels, int nX, int nY, const PixelRect& oPart,
              unsigned int nWidth, unsigned int nHeight, const Location& oLocation)
{
    if (std::uint64_t{oPart.mnX} + oPart.mnWidth > nWidth || std::uint64_t{oPart.mnY} + oPart.mnHeight > nHeight)
        throw DataException("The part " + Text(oPart.mnX, oPart.mnY, oPart.mnWidth, oPart.mnHeight) +
                                " is not inside its window of " + std::to_string(nWidth) + " x " +
                                std::to_string(nHeight),
                            Place::Current(oLocation));
    Transfer oTransfer;
    oTransfer.mnPitch = GetPitch(oChannels, nWidth, nHeight, oLocation);
    const std::int64_t nLeft = std::max<std::int64_t>(0, std::int64_t{nX} + oPart.mnX);
    const std::int64_t nTop = std::max<std::int64_t>(0, std::int64_t{nY} + oPart.mnY);
    const std::int64_t nRight =
        std::min<std::int64_t>(oLayout.GetWidth(), std::int64_t{nX} + oPart.mnX + oPart.mnWidth);
    const std::int64_t nBottom =
        std::min<std::int64_t>(oLayout.GetHeight(), std::int64_t{nY} + oPart.mnY + oPart.mnHeight);
    if (nLeft >= nRight || nTop >= nBottom)
        return oTransfer;
    oTransfer.moRect = {static_cast<unsigned int>(nLeft), static_cast<unsigned int>(nTop),
                        static_cast<unsigned int>(nRight - nLeft), static_cast<unsigned int>(nBottom - nTop)};
    oTransfer.mnBegin = static_cast<std::uint64_t>(nTop - nY) * oTransfer.mnPitch +
                        static_cast<std::uint64_t>(nLeft - nX) * oChannels.GetPixelBytes();
    return oTransfer;
}

// The short form: the window lies inside the image.
Transfer Inside(const ImageLayout& oLayout, const ChannelSelection& oChannels, const PixelRect& oWindow,
                const Location& oLocation)
{
    CheckInside(oWindow.mnX, oWindow.mnY, oWindow.mnWidth, oWindow.mnHeight, oLayout.GetWidth(), oLayout.GetHeight(),
                oLocation);
    Transfer oTransfer;
    oTransfer.mnPitch = GetPitch(oChannels, oWindow.mnWidth, oWindow.mnHeight, oLocation);
    if (oWindow.mnHeight != 0)
        oTransfer.moRect = oWindow;
    return oTransfer;
}

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
void BlockRasterIO<Base>::ReadWindow(int nX, int nY, unsigned int nWidth, unsigned int nHeight, unsigned int nPartX,
                                     unsigned int nPartY, unsigned int nPartWidth, unsigned int nPartHeight,
                                     unsigned char* pBuffer)
{
    CheckBuffer(pBuffer, Location::current());
    const Transfer oTransfer = Clip(mpoImage->GetLayout(), moChannels, nX, nY,
                                    {nPartX, nPartY, nPartWidth, nPartHeight}, nWidth, nHeight, Location::current());
    if (oTransfer.moRect.mnWidth != 0)
        mpoImage->Read(moChannels, oTransfer.moRect, pBuffer + oTransfer.mnBegin, oTransfer.mnPitch);
}

template <typename Base>
void BlockRasterIO<Base>::ReadWindow(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight,
                                     unsigned char* pBuffer)
{
    CheckBuffer(pBuffer, Location::current());
    const Transfer oTransfer =
        Inside(mpoImage->GetLayout(), moChannels, {nX, nY, nWidth, nHeight}, Location::current());
    if (oTransfer.moRect.mnWidth != 0)
        mpoImage->Read(moChannels, oTransfer.moRect, pBuffer, oTransfer.mnPitch);
}

template <typename Base>
void BlockRasterIO<Base>::WriteWindow(int nX, int nY, unsigned int nWidth, unsigned int nHeight, unsigned int nPartX,
                                      unsigned int nPartY, unsigned int nPartWidth, unsigned int nPartHeight,
                                      unsigned char* const pBuffer)
{
    CheckBuffer(pBuffer, Location::current());
    const Transfer oTransfer = Clip(mpoImage->GetLayout(), moChannels, nX, nY,
                                    {nPartX, nPartY, nPartWidth, nPartHeight}, nWidth, nHeight, Location::current());
    CheckInside(std::int64_t{nX} + nPartX, std::int64_t{nY} + nPartY, nPartWidth, nPartHeight, GetFileWidth(),
                GetFileHeight(), Location::current());
    if (oTransfer.moRect.mnWidth != 0)
        mpoImage->Write(moChannels, oTransfer.moRect, pBuffer + oTransfer.mnBegin, oTransfer.mnPitch);
}

template <typename Base>
void BlockRasterIO<Base>::WriteWindow(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight,
                                      unsigned char* const pBuffer)
{
    CheckBuffer(pBuffer, Location::current());
    const Transfer oTransfer =
        Inside(mpoImage->GetLayout(), moChannels, {nX, nY, nWidth, nHeight}, Location::current());
    if (oTransfer.moRect.mnWidth != 0)
        mpoImage->Write(moChannels, oTransfer.moRect, pBuffer, oTransfer.mnPitch);
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
