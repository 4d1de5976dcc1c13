#include "plugins/support/writing/heldblocks.h"

#include "toolkit/raster/interleave.h"

#include <algorithm>
#include <utility>

namespace krv::plugins::support
{

PixelRect Intersect(const PixelRect& oFirst, const PixelRect& oSecond)
{
    const unsigned int nX = std::max(oFirst.mnX, oSecond.mnX);
    const unsigned int nY = std::max(oFirst.mnY, oSecond.mnY);
    const unsigned int nRight = std::min(oFirst.mnX + oFirst.mnWidth, oSecond.mnX + oSecond.mnWidth);
    const unsigned int nBottom = std::min(oFirst.mnY + oFirst.mnHeight, oSecond.mnY + oSecond.mnHeight);
    if (nRight <= nX || nBottom <= nY)
        return {};
    return {nX, nY, nRight - nX, nBottom - nY};
}

HeldBlocks::HeldBlocks(std::size_t nBound, std::size_t nPixelBytes, StoreBlock oStore, SettlePixels oSettle)
    : mnBound(nBound), mnPixelBytes(nPixelBytes), moSettle(std::move(oSettle)), moStore(std::move(oStore))
{
}

void HeldBlocks::SettleBits(unsigned char* pPixels, std::size_t nBytes)
{
    std::transform(pPixels, pPixels + nBytes, pPixels,
                   [](unsigned char nByte) { return static_cast<unsigned char>(nByte != 0); });
}

void HeldBlocks::Write(const Block& oBlock, const PixelRect& oPart, const unsigned char* pSource, std::size_t nPitch,
                       const ReadBlock& oRead)
{
    const std::size_t nHeldPitch = GetPitch(oBlock);
    unsigned char* const pHeld = Hold(oBlock, oRead).moPixels.data() + (oPart.mnY - oBlock.moRect.mnY) * nHeldPitch +
                                 (oPart.mnX - oBlock.moRect.mnX) * mnPixelBytes;
    const std::size_t nRowBytes = oPart.mnWidth * mnPixelBytes;
    raster::CopyRows(pSource, nPitch, pHeld, nHeldPitch, nRowBytes, oPart.mnHeight);
    for (unsigned int nRow = 0; moSettle && nRow < oPart.mnHeight; ++nRow)
        moSettle(pHeld + nRow * nHeldPitch, nRowBytes);
}

void HeldBlocks::Overlay(std::uint64_t nBlock, const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch) const
{
    const auto oFound = moIndex.find(nBlock);
    if (oFound == moIndex.end())
        return;
    const PixelRect& oHeld = oFound->second->moBlock.moRect;
    const PixelRect oShared = Intersect(oRect, oHeld);
    const std::size_t nHeldPitch = GetPitch(oFound->second->moBlock);
    raster::CopyRows(oFound->second->moPixels.data() + (oShared.mnY - oHeld.mnY) * nHeldPitch +
                         (oShared.mnX - oHeld.mnX) * mnPixelBytes,
                     nHeldPitch,
                     pTarget + (oShared.mnY - oRect.mnY) * nPitch + (oShared.mnX - oRect.mnX) * mnPixelBytes, nPitch,
                     oShared.mnWidth * mnPixelBytes, oShared.mnHeight);
}

HeldBlocks::Held& HeldBlocks::Hold(const Block& oBlock, const ReadBlock& oRead)
{
    const auto oFound = moIndex.find(oBlock.mnNumber);
    if (oFound != moIndex.end())
    {
        moHeld.splice(moHeld.begin(), moHeld, oFound->second);
        return moHeld.front();
    }
    const std::size_t nBytes = GetPitch(oBlock) * oBlock.moRect.mnHeight;
    while (!moHeld.empty() && mnHeldBytes + nBytes > mnBound)
        StoreOldest();
    Held oHeld{oBlock, std::vector<unsigned char>(nBytes)};
    oRead(oHeld.moPixels.data(), GetPitch(oBlock));
    moHeld.push_front(std::move(oHeld));
    moIndex[oBlock.mnNumber] = moHeld.begin();
    mnHeldBytes += nBytes;
    return moHeld.front();
}

void HeldBlocks::StoreOldest()
{
    const Held& oHeld = moHeld.back();
    moStore(oHeld.moBlock, oHeld.moPixels.data());
    Forget(oHeld.moBlock.mnNumber);
}

void HeldBlocks::Forget(std::uint64_t nBlock)
{
    const auto oFound = moIndex.find(nBlock);
    if (oFound == moIndex.end())
        return;
    mnHeldBytes -= oFound->second->moPixels.size();
    moHeld.erase(oFound->second);
    moIndex.erase(oFound);
}

void HeldBlocks::StoreAll()
{
    while (!moHeld.empty())
        StoreOldest();
}

void HeldBlocks::Clear()
{
    moHeld.clear();
    moIndex.clear();
    mnHeldBytes = 0;
}

} // namespace krv::plugins::support
