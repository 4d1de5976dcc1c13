#include "plugins/support/image/imagelayout.h"

#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <climits>
#include <string>

namespace krv::plugins::support
{

namespace
{

void CheckSize(unsigned int nSize, const char* pWhat, const Place& oPlace)
{
    if (nSize == 0 || nSize > static_cast<unsigned int>(INT_MAX))
        throw DataException(std::string("The ") + pWhat + " " + std::to_string(nSize) + " is out of range", oPlace);
}

} // namespace

ImageLayout::ImageLayout(unsigned int nWidth, unsigned int nHeight, unsigned int nBlockWidth, unsigned int nBlockHeight,
                         std::vector<Plane> oPlanes, const Place& oPlace)
    : mnWidth(nWidth), mnHeight(nHeight), mnBlockWidth(nBlockWidth), mnBlockHeight(nBlockHeight),
      mnPreferredWidth(nBlockWidth), mnPreferredHeight(nBlockHeight), moPlanes(std::move(oPlanes))
{
    CheckSize(nWidth, "image width", oPlace);
    CheckSize(nHeight, "image height", oPlace);
    CheckSize(nBlockWidth, "block width", oPlace);
    CheckSize(nBlockHeight, "block height", oPlace);
    mnBlocksAcross = (nWidth - 1) / nBlockWidth + 1;
    moFirstChannels.reserve(moPlanes.size() + 1);
    moPixelBytes.reserve(moPlanes.size());
    std::uint64_t nChannels = 0;
    for (Plane& oPlane : moPlanes)
    {
        oPlane.moType.GetNativeCode(oPlace);
        if (oPlane.moType.GetBits() < 8)
            throw DataException("Channels of less than a byte are handed out as bytes", oPlace);
        if (oPlane.moNativeType == krv::gobs::DataType())
            oPlane.moNativeType = oPlane.moType;
        moFirstChannels.push_back(static_cast<unsigned int>(nChannels));
        moPixelBytes.push_back(GetValueBytes(oPlane.moType) * oPlane.mnChannels);
        nChannels += oPlane.mnChannels;
        CheckSize(oPlane.mnChannels, "channel count", oPlace);
    }
    if (nChannels > static_cast<unsigned int>(INT_MAX))
        throw DataException("The image has too many channels", oPlace);
    moFirstChannels.push_back(static_cast<unsigned int>(nChannels));
}

void ImageLayout::SetPreferredBlock(unsigned int nWidth, unsigned int nHeight)
{
    mnPreferredWidth = nWidth;
    mnPreferredHeight = nHeight;
}

ChannelPlace ImageLayout::GetChannelPlace(unsigned int nChannel, const Place& oPlace) const
{
    if (nChannel == 0 || nChannel > GetChannelCount())
        throw DataException("Channel " + std::to_string(nChannel) + " does not exist; there are " +
                                std::to_string(GetChannelCount()),
                            oPlace);
    const auto oNext = std::upper_bound(moFirstChannels.begin(), moFirstChannels.end(), nChannel - 1);
    const auto nPlane = static_cast<unsigned int>(oNext - moFirstChannels.begin()) - 1;
    return {nPlane, nChannel - 1 - moFirstChannels[nPlane]};
}

const Plane& ImageLayout::GetChannelPlane(unsigned int nChannel, const Place& oPlace) const
{
    return moPlanes[GetChannelPlace(nChannel, oPlace).mnPlane];
}

PixelRect ImageLayout::GetBlockRect(unsigned int nColumn, unsigned int nRow) const
{
    const unsigned int nX = nColumn * mnBlockWidth;
    const unsigned int nY = nRow * mnBlockHeight;
    return {nX, nY, std::min(mnBlockWidth, mnWidth - nX), std::min(mnBlockHeight, mnHeight - nY)};
}

} // namespace krv::plugins::support
