#include "plugins/demo/demoblocksource.h"

#include "toolkit/exceptions/exceptions.h"

#include <bit>

namespace krv::plugins::demo
{

static_assert(std::endian::native == std::endian::little, "values would have to be swapped");

DemoBlockSource::DemoBlockSource(std::unique_ptr<support::File> poFile, const support::ImageLayout& oLayout,
                                 std::uint64_t nOffset)
    : mpoFile(std::move(poFile)), moLayout(oLayout)
{
    for (unsigned int nPlane = 0; nPlane < moLayout.GetPlaneCount(); ++nPlane)
    {
        moOffsets.push_back(nOffset);
        const std::uint64_t nRowBytes = moLayout.GetWidth() * moLayout.GetPixelBytes(nPlane);
        if (nRowBytes > (mpoFile->GetSize() - nOffset) / moLayout.GetHeight())
            throw krv::FileFormatException(GetName(), GetName() + " is shorter than its header says");
        nOffset += nRowBytes * moLayout.GetHeight();
    }
}

void DemoBlockSource::ReadBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart,
                                unsigned char* pTarget, std::size_t nPitch)
{
    const std::size_t nPixelBytes = moLayout.GetPixelBytes(oBlock.mnPlane);
    const std::uint64_t nX = std::uint64_t{oBlock.mnColumn} * moLayout.GetBlockWidth() + oPart.mnX;
    const std::uint64_t nY = std::uint64_t{oBlock.mnRow} * moLayout.GetBlockHeight() + oPart.mnY;
    mpoFile->ReadRows(moOffsets[oBlock.mnPlane] + (nY * moLayout.GetWidth() + nX) * nPixelBytes,
                      moLayout.GetWidth() * nPixelBytes, oPart.mnWidth * nPixelBytes, oPart.mnHeight, pTarget, nPitch,
                      moScratch);
}

} // namespace krv::plugins::demo
