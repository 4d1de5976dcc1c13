#include "plugins/support/image/stackedio.h"

#include "toolkit/exceptions/exceptions.h"
#include "toolkit/raster/interleave.h"

#include <algorithm>

namespace krv::plugins::support
{

StackedIO::StackedIO(std::vector<std::unique_ptr<krv::datasources::IRasterIO>> oParts, unsigned int nValueBytes,
                     unsigned int nLevel)
    : moParts(std::move(oParts)), mnValueBytes(nValueBytes), mnLevel(nLevel)
{
    if (moParts.empty())
        throw DataException("The list of channels is empty");
    for (const auto& poPart : moParts)
        if (poPart->GetFileWidth() != GetFileWidth() || poPart->GetFileHeight() != GetFileHeight())
            throw DataException("Images of different sizes cannot be transferred together");
}

StackedIO::~StackedIO() = default;

unsigned int StackedIO::GetFileWidth() const
{
    return moParts.front()->GetFileWidth();
}

unsigned int StackedIO::GetFileHeight() const
{
    return moParts.front()->GetFileHeight();
}

unsigned int StackedIO::GetTileWidth() const
{
    return moParts.front()->GetTileWidth();
}

unsigned int StackedIO::GetTileHeight() const
{
    return moParts.front()->GetTileHeight();
}

// Slices of rows, whose planes one after the other pass through the scratch memory.
template <typename Action>
void StackedIO::ForEachSlice(const PixelRect& oRect, const Action& oAction)
{
    const std::size_t nPlanePitch = std::size_t{oRect.mnWidth} * mnValueBytes;
    const auto nSlice = static_cast<unsigned int>(std::max<std::size_t>(1, (std::size_t{1} << 20) / nPlanePitch));
    for (unsigned int nRow = 0; nRow < oRect.mnHeight; nRow += std::min(nSlice, oRect.mnHeight - nRow))
    {
        const unsigned int nRows = std::min(nSlice, oRect.mnHeight - nRow);
        for (std::size_t nAt = 0; nAt < moParts.size(); ++nAt)
            oAction(nAt, PixelRect{oRect.mnX, oRect.mnY + nRow, oRect.mnWidth, nRows},
                    moScratch.Get(nPlanePitch * nRows), nPlanePitch);
    }
}

void StackedIO::ReadPixels(const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch)
{
    if (moParts.size() == 1)
        return moParts.front()->ReadWindow(static_cast<int>(oRect.mnX), static_cast<int>(oRect.mnY),
                                           static_cast<unsigned int>(nPitch / mnValueBytes), oRect.mnHeight, 0, 0,
                                           oRect.mnWidth, oRect.mnHeight, pTarget);
    ForEachSlice(oRect,
                 [&](std::size_t nAt, const PixelRect& oSlice, unsigned char* pPlane, std::size_t nPlanePitch)
                 {
                     moParts[nAt]->ReadWindow(oSlice.mnX, oSlice.mnY, oSlice.mnWidth, oSlice.mnHeight, pPlane);
                     raster::PlaceChannel(pPlane, nPlanePitch, pTarget + (oSlice.mnY - oRect.mnY) * nPitch, nPitch, nAt,
                                          moParts.size(), {oSlice.mnWidth, oSlice.mnHeight, mnValueBytes});
                 });
}

void StackedIO::WritePixels(const PixelRect& oRect, const unsigned char* pSource, std::size_t nPitch)
{
    if (moParts.size() == 1)
        return moParts.front()->WriteWindow(static_cast<int>(oRect.mnX), static_cast<int>(oRect.mnY),
                                            static_cast<unsigned int>(nPitch / mnValueBytes), oRect.mnHeight, 0, 0,
                                            oRect.mnWidth, oRect.mnHeight, const_cast<unsigned char*>(pSource));
    ForEachSlice(oRect,
                 [&](std::size_t nAt, const PixelRect& oSlice, unsigned char* pPlane, std::size_t nPlanePitch)
                 {
                     raster::ExtractChannel(pSource + (oSlice.mnY - oRect.mnY) * nPitch, nPitch, nAt, moParts.size(),
                                            pPlane, nPlanePitch, {oSlice.mnWidth, oSlice.mnHeight, mnValueBytes});
                     moParts[nAt]->WriteWindow(oSlice.mnX, oSlice.mnY, oSlice.mnWidth, oSlice.mnHeight, pPlane);
                 });
}

} // namespace krv::plugins::support
