#include "plugins/support/image/plainsource.h"

#include "toolkit/exceptions/exceptions.h"

#include <utility>

namespace krv::plugins::support
{

PlainSource::PlainSource(std::shared_ptr<File> poFile, std::uint64_t nOffset, ImageLayout oLayout,
                         std::function<void()> oBeforeWrite)
    : mpoFile(std::move(poFile)), moLayout(std::move(oLayout)), moBeforeWrite(std::move(oBeforeWrite))
{
    for (unsigned int nPlane = 0; nPlane < moLayout.GetPlaneCount(); ++nPlane)
    {
        moOffsets.push_back(nOffset);
        if (nOffset > mpoFile->GetSize() || GetRowBytes(nPlane) > (mpoFile->GetSize() - nOffset) / moLayout.GetHeight())
            throw FileFormatException(GetName(), GetName() + " is shorter than its header says");
        nOffset += GetRowBytes(nPlane) * moLayout.GetHeight();
    }
}

PlainSource::~PlainSource() = default;

std::uint64_t PlainSource::CountBytes(const ImageLayout& oLayout)
{
    constexpr std::uint64_t MOST = std::uint64_t{1} << 62;
    const std::uint64_t nPixels = std::uint64_t{oLayout.GetWidth()} * oLayout.GetHeight();
    std::uint64_t nPixelBytes = 0;
    for (unsigned int nPlane = 0; nPlane < oLayout.GetPlaneCount(); ++nPlane)
        nPixelBytes += oLayout.GetPixelBytes(nPlane);
    if (nPixels > MOST / nPixelBytes)
        throw DataException("The image of " + std::to_string(oLayout.GetWidth()) + " x " +
                            std::to_string(oLayout.GetHeight()) + " pixels and " +
                            std::to_string(oLayout.GetChannelCount()) + " channels is too large");
    return nPixels * nPixelBytes;
}

std::uint64_t PlainSource::GetOffset(const BlockAddress& oBlock, const PixelRect& oPart) const
{
    const std::uint64_t nX = std::uint64_t{oBlock.mnColumn} * moLayout.GetBlockWidth() + oPart.mnX;
    const std::uint64_t nY = std::uint64_t{oBlock.mnRow} * moLayout.GetBlockHeight() + oPart.mnY;
    return moOffsets[oBlock.mnPlane] + (nY * moLayout.GetWidth() + nX) * moLayout.GetPixelBytes(oBlock.mnPlane);
}

void PlainSource::ReadBlock(const BlockAddress& oBlock, const PixelRect& oPart, unsigned char* pTarget,
                            std::size_t nPitch)
{
    mpoFile->ReadRows(GetOffset(oBlock, oPart), GetRowBytes(oBlock.mnPlane),
                      oPart.mnWidth * moLayout.GetPixelBytes(oBlock.mnPlane), oPart.mnHeight, pTarget, nPitch,
                      moScratch);
}

void PlainSource::WriteBlock(const BlockAddress& oBlock, const PixelRect& oPart, const unsigned char* pSource,
                             std::size_t nPitch)
{
    if (!moBeforeWrite)
        return IBlockSource::WriteBlock(oBlock, oPart, pSource, nPitch);
    moBeforeWrite();
    mpoFile->WriteRows(GetOffset(oBlock, oPart), GetRowBytes(oBlock.mnPlane),
                       oPart.mnWidth * moLayout.GetPixelBytes(oBlock.mnPlane), oPart.mnHeight, pSource, nPitch);
}

} // namespace krv::plugins::support
