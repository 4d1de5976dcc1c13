#include "plugins/support/stackedio.h"

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

// Each part reads a window of its own that is just the part of the caller's that lies in the image, since what lies
// outside has to stay as it is.
void StackedIO::ReadWindow(int nX, int nY, unsigned int nWidth, unsigned int nHeight, unsigned int nPartX,
                           unsigned int nPartY, unsigned int nPartWidth, unsigned int nPartHeight,
                           unsigned char* pBuffer)
{
    if (moParts.size() == 1)
        return moParts.front()->ReadWindow(nX, nY, nWidth, nHeight, nPartX, nPartY, nPartWidth, nPartHeight, pBuffer);
    if (pBuffer == nullptr)
        throw DataException("The buffer is NULL");
    if (std::uint64_t{nPartX} + nPartWidth > nWidth || std::uint64_t{nPartY} + nPartHeight > nHeight)
        throw DataException("The part is not inside its window");
    const std::int64_t nLeft = std::max<std::int64_t>(0, std::int64_t{nX} + nPartX);
    const std::int64_t nTop = std::max<std::int64_t>(0, std::int64_t{nY} + nPartY);
    const std::int64_t nRight = std::min<std::int64_t>(GetFileWidth(), std::int64_t{nX} + nPartX + nPartWidth);
    const std::int64_t nBottom = std::min<std::int64_t>(GetFileHeight(), std::int64_t{nY} + nPartY + nPartHeight);
    if (nLeft >= nRight || nTop >= nBottom)
        return;
    const auto nCutWidth = static_cast<unsigned int>(nRight - nLeft);
    const std::size_t nPlanePitch = std::size_t{nCutWidth} * mnValueBytes;
    const std::size_t nPitch = std::size_t{nWidth} * mnValueBytes * moParts.size();
    const auto nSlice = static_cast<std::int64_t>(std::max<std::size_t>(1, (std::size_t{1} << 20) / nPlanePitch));
    for (std::int64_t nRow = nTop; nRow < nBottom; nRow += nSlice)
    {
        const auto nRows = static_cast<unsigned int>(std::min(nSlice, nBottom - nRow));
        unsigned char* pPlane = moScratch.Get(nPlanePitch * nRows);
        unsigned char* pTarget = pBuffer + static_cast<std::size_t>(nRow - nY) * nPitch +
                                 static_cast<std::size_t>(nLeft - nX) * mnValueBytes * moParts.size();
        for (std::size_t nAt = 0; nAt < moParts.size(); ++nAt)
        {
            moParts[nAt]->ReadWindow(static_cast<unsigned int>(nLeft), static_cast<unsigned int>(nRow), nCutWidth,
                                     nRows, pPlane);
            codec::PlaceChannel(pPlane, nPlanePitch, pTarget, nPitch, nAt, moParts.size(),
                                {nCutWidth, nRows, mnValueBytes});
        }
    }
}

void StackedIO::ReadWindow(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight,
                           unsigned char* pBuffer)
{
    if (moParts.size() == 1)
        return moParts.front()->ReadWindow(nX, nY, nWidth, nHeight, pBuffer);
    if (std::uint64_t{nX} + nWidth > GetFileWidth() || std::uint64_t{nY} + nHeight > GetFileHeight())
        throw DataException("The window is not inside the image");
    ReadWindow(static_cast<int>(nX), static_cast<int>(nY), nWidth, nHeight, 0, 0, nWidth, nHeight, pBuffer);
}

void StackedIO::WriteWindow(int, int, unsigned int, unsigned int, unsigned int, unsigned int, unsigned int,
                            unsigned int, unsigned char* const)
{
    throw DataException("Bitmaps cannot be written");
}

void StackedIO::WriteWindow(unsigned int, unsigned int, unsigned int, unsigned int, unsigned char* const)
{
    throw DataException("Bitmaps cannot be written");
}

} // namespace krv::plugins::support
