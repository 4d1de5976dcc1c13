#include "plugins/support/image/stackedio.h"

#include "plugins/support/codec/interleave.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <cstdint>

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

// What of the caller's part lies in the image is taken in slices: each channel as a window of just that slice, since
// what lies outside has to stay as it is.
template <typename Action>
void StackedIO::ForEachSlice(int nX, int nY, unsigned int nWidth, unsigned int nHeight, const PixelRect& oPart,
                             const unsigned char* pBuffer, Action oAction)
{
    if (pBuffer == nullptr)
        throw DataException("The buffer is NULL");
    if (std::uint64_t{oPart.mnX} + oPart.mnWidth > nWidth || std::uint64_t{oPart.mnY} + oPart.mnHeight > nHeight)
        throw DataException("The part is not inside its window");
    const std::int64_t nLeft = std::max<std::int64_t>(0, std::int64_t{nX} + oPart.mnX);
    const std::int64_t nTop = std::max<std::int64_t>(0, std::int64_t{nY} + oPart.mnY);
    const std::int64_t nRight = std::min<std::int64_t>(GetFileWidth(), std::int64_t{nX} + oPart.mnX + oPart.mnWidth);
    const std::int64_t nBottom = std::min<std::int64_t>(GetFileHeight(), std::int64_t{nY} + oPart.mnY + oPart.mnHeight);
    if (nLeft >= nRight || nTop >= nBottom)
        return;
    const auto nCutWidth = static_cast<unsigned int>(nRight - nLeft);
    const std::size_t nPlanePitch = std::size_t{nCutWidth} * mnValueBytes;
    const std::size_t nPitch = std::size_t{nWidth} * mnValueBytes * moParts.size();
    const auto nSlice = static_cast<std::int64_t>(std::max<std::size_t>(1, (std::size_t{1} << 20) / nPlanePitch));
    for (std::int64_t nRow = nTop; nRow < nBottom; nRow += nSlice)
    {
        const auto nRows = static_cast<unsigned int>(std::min(nSlice, nBottom - nRow));
        const std::size_t nBegin = static_cast<std::size_t>(nRow - nY) * nPitch +
                                   static_cast<std::size_t>(nLeft - nX) * mnValueBytes * moParts.size();
        for (std::size_t nAt = 0; nAt < moParts.size(); ++nAt)
            oAction(nAt, PixelRect{static_cast<unsigned int>(nLeft), static_cast<unsigned int>(nRow), nCutWidth, nRows},
                    moScratch.Get(nPlanePitch * nRows), nPlanePitch, nBegin, nPitch);
    }
}

void StackedIO::ReadWindow(int nX, int nY, unsigned int nWidth, unsigned int nHeight, unsigned int nPartX,
                           unsigned int nPartY, unsigned int nPartWidth, unsigned int nPartHeight,
                           unsigned char* pBuffer)
{
    if (moParts.size() == 1)
        return moParts.front()->ReadWindow(nX, nY, nWidth, nHeight, nPartX, nPartY, nPartWidth, nPartHeight, pBuffer);
    ForEachSlice(nX, nY, nWidth, nHeight, {nPartX, nPartY, nPartWidth, nPartHeight}, pBuffer,
                 [&](std::size_t nAt, const PixelRect& oRect, unsigned char* pPlane, std::size_t nPlanePitch,
                     std::size_t nBegin, std::size_t nPitch)
                 {
                     moParts[nAt]->ReadWindow(oRect.mnX, oRect.mnY, oRect.mnWidth, oRect.mnHeight, pPlane);
                     codec::PlaceChannel(pPlane, nPlanePitch, pBuffer + nBegin, nPitch, nAt, moParts.size(),
                                         {oRect.mnWidth, oRect.mnHeight, mnValueBytes});
                 });
}

void StackedIO::ReadWindow(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight,
                           unsigned char* pBuffer)
{
    CheckInside(nX, nY, nWidth, nHeight, GetFileWidth(), GetFileHeight(), std::source_location::current());
    ReadWindow(static_cast<int>(nX), static_cast<int>(nY), nWidth, nHeight, 0, 0, nWidth, nHeight, pBuffer);
}

void StackedIO::WriteWindow(int nX, int nY, unsigned int nWidth, unsigned int nHeight, unsigned int nPartX,
                            unsigned int nPartY, unsigned int nPartWidth, unsigned int nPartHeight,
                            unsigned char* const pBuffer)
{
    if (moParts.size() == 1)
        return moParts.front()->WriteWindow(nX, nY, nWidth, nHeight, nPartX, nPartY, nPartWidth, nPartHeight, pBuffer);
    CheckInside(std::int64_t{nX} + nPartX, std::int64_t{nY} + nPartY, nPartWidth, nPartHeight, GetFileWidth(),
                GetFileHeight(), std::source_location::current());
    ForEachSlice(nX, nY, nWidth, nHeight, {nPartX, nPartY, nPartWidth, nPartHeight}, pBuffer,
                 [&](std::size_t nAt, const PixelRect& oRect, unsigned char* pPlane, std::size_t nPlanePitch,
                     std::size_t nBegin, std::size_t nPitch)
                 {
                     codec::ExtractChannel(pBuffer + nBegin, nPitch, nAt, moParts.size(), pPlane, nPlanePitch,
                                           {oRect.mnWidth, oRect.mnHeight, mnValueBytes});
                     moParts[nAt]->WriteWindow(oRect.mnX, oRect.mnY, oRect.mnWidth, oRect.mnHeight, pPlane);
                 });
}

void StackedIO::WriteWindow(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight,
                            unsigned char* const pBuffer)
{
    CheckInside(nX, nY, nWidth, nHeight, GetFileWidth(), GetFileHeight(), std::source_location::current());
    WriteWindow(static_cast<int>(nX), static_cast<int>(nY), nWidth, nHeight, 0, 0, nWidth, nHeight, pBuffer);
}

} // namespace krv::plugins::support
