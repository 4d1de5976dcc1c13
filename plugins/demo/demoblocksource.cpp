#include "plugins/demo/demoblocksource.h"

#include "toolkit/exceptions/exceptions.h"

#include <bit>

namespace krv::plugins::demo
{

static_assert(std::endian::native == std::endian::little, "values would have to be swapped");

support::ImageLayout DemoBlockSource::MakeLayout(const DemoHeader& oHeader)
{
    std::vector<support::Plane> oPlanes;
    for (const krv::gobs::DataType& oType : oHeader.moTypes)
        oPlanes.push_back({oType, 1, {}});
    return support::ImageLayout(oHeader.mnWidth, oHeader.mnHeight, BLOCK_SIZE, BLOCK_SIZE, std::move(oPlanes));
}

DemoBlockSource::DemoBlockSource(std::shared_ptr<DemoFile> poFile)
    : mpoFile(std::move(poFile)), moLayout(MakeLayout(mpoFile->GetHeader()))
{
    std::uint64_t nOffset = mpoFile->GetPixelOffset();
    for (unsigned int nPlane = 0; nPlane < moLayout.GetPlaneCount(); ++nPlane)
    {
        moOffsets.push_back(nOffset);
        const std::uint64_t nRowBytes = moLayout.GetWidth() * moLayout.GetPixelBytes(nPlane);
        if (nRowBytes > (mpoFile->GetFile().GetSize() - nOffset) / moLayout.GetHeight())
            throw krv::FileFormatException(GetName(), GetName() + " is shorter than its header says");
        nOffset += nRowBytes * moLayout.GetHeight();
    }
}

std::uint64_t DemoBlockSource::OffsetOf(const support::BlockAddress& oBlock, const support::PixelRect& oPart) const
{
    const std::uint64_t nX = std::uint64_t{oBlock.mnColumn} * moLayout.GetBlockWidth() + oPart.mnX;
    const std::uint64_t nY = std::uint64_t{oBlock.mnRow} * moLayout.GetBlockHeight() + oPart.mnY;
    return moOffsets[oBlock.mnPlane] + (nY * moLayout.GetWidth() + nX) * moLayout.GetPixelBytes(oBlock.mnPlane);
}

void DemoBlockSource::ReadBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart,
                                unsigned char* pTarget, std::size_t nPitch)
{
    const std::size_t nPixelBytes = moLayout.GetPixelBytes(oBlock.mnPlane);
    mpoFile->GetFile().ReadRows(OffsetOf(oBlock, oPart), moLayout.GetWidth() * nPixelBytes, oPart.mnWidth * nPixelBytes,
                                oPart.mnHeight, pTarget, nPitch, moScratch);
}

void DemoBlockSource::WriteBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart,
                                 const unsigned char* pSource, std::size_t nPitch)
{
    const std::size_t nPixelBytes = moLayout.GetPixelBytes(oBlock.mnPlane);
    mpoFile->WriteRows(OffsetOf(oBlock, oPart), moLayout.GetWidth() * nPixelBytes, oPart.mnWidth * nPixelBytes,
                       oPart.mnHeight, pSource, nPitch);
}

} // namespace krv::plugins::demo
