#include "plugins/support/image/plainsource.h"

#include "plugins/support/codec/bits.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/raster/interleave.h"

#include <algorithm>
#include <utility>

namespace krv::plugins::support
{

namespace
{

constexpr std::uint64_t MOST_BYTES = std::uint64_t{1} << 62;
// What is picked apart piece by piece stays in the processor's second cache, beside what is made of it.
constexpr std::size_t SLICE_BYTES = std::size_t{128} << 10;
// What is turned round in its place has that cache for itself.
constexpr std::size_t SWAPPED_BYTES = std::size_t{384} << 10;
// A call to the system costs about as much as copying this many bytes.
constexpr std::uint64_t CALL_BYTES = 4096;
constexpr std::size_t TILE_BYTES = std::size_t{1} << 20;
constexpr unsigned int LEAST_TILE_ROWS = 16;
constexpr unsigned int MOST_TILE_ROWS = 512;

unsigned int CountSliceRows(std::size_t nRowBytes, std::size_t nSliceBytes = SLICE_BYTES)
{
    return static_cast<unsigned int>(std::max<std::size_t>(1, nSliceBytes / std::max<std::size_t>(1, nRowBytes)));
}

// Beyond MOST_BYTES no file reaches: sums and products stop there.
std::uint64_t Multiply(std::uint64_t nFirst, std::uint64_t nSecond)
{
    return nSecond != 0 && nFirst > MOST_BYTES / nSecond ? MOST_BYTES : nFirst * nSecond;
}

std::uint64_t Add(std::uint64_t nFirst, std::uint64_t nSecond)
{
    return std::min(std::min(nFirst, MOST_BYTES) + std::min(nSecond, MOST_BYTES), MOST_BYTES);
}

std::uint64_t GetRowBytes(const ImageLayout& oLayout, unsigned int nPlane)
{
    return Multiply(oLayout.GetWidth(), oLayout.GetPixelBytes(nPlane));
}

// The rectangle in pieces of few rows, each with the number of rows above it.
template <typename Action>
void ForEachSlice(const PixelRect& oRect, unsigned int nSliceRows, const Action& oAction)
{
    for (unsigned int nRow = 0; nRow < oRect.mnHeight; nRow += std::min(nSliceRows, oRect.mnHeight - nRow))
        oAction(PixelRect{oRect.mnX, oRect.mnY + nRow, oRect.mnWidth, std::min(nSliceRows, oRect.mnHeight - nRow)},
                std::size_t{nRow});
}

} // namespace

PlainSource::PlainSource(std::shared_ptr<File> poFile, std::uint64_t nOffset, ImageLayout oLayout,
                         std::function<void()> oBeforeWrite)
    : mpoFile(std::move(poFile)), moLayout(std::move(oLayout)), moBeforeWrite(std::move(oBeforeWrite)),
      moPlacements(PlacePlanes(moLayout, nOffset, Order::eBand))
{
    CheckEnd();
}

PlainSource::PlainSource(std::shared_ptr<File> poFile, std::vector<Placement> oPlacements, bool bSwap,
                         ImageLayout oLayout, std::function<void()> oBeforeWrite)
    : mpoFile(std::move(poFile)), moLayout(std::move(oLayout)), moBeforeWrite(std::move(oBeforeWrite)),
      moPlacements(std::move(oPlacements)), mbSwap(bSwap)
{
    CheckEnd();
}

PlainSource::~PlainSource() = default;

void PlainSource::CheckEnd() const
{
    for (unsigned int nPlane = 0; nPlane < moLayout.GetPlaneCount(); ++nPlane)
    {
        const auto& [nOffset, nRowPitch] = moPlacements[nPlane];
        const std::uint64_t nRowBytes = GetRowBytes(moLayout, nPlane);
        const std::uint64_t nSize = mpoFile->GetSize();
        if (nOffset > nSize || nRowBytes > nSize - nOffset ||
            (moLayout.GetHeight() > 1 && nRowPitch > (nSize - nOffset - nRowBytes) / (moLayout.GetHeight() - 1)))
            throw FileFormatException(GetName(), GetName() + " is shorter than its header says");
    }
}

std::uint64_t PlainSource::CountBytes(const ImageLayout& oLayout)
{
    const std::uint64_t nPixels = std::uint64_t{oLayout.GetWidth()} * oLayout.GetHeight();
    std::uint64_t nPixelBytes = 0;
    for (unsigned int nPlane = 0; nPlane < oLayout.GetPlaneCount(); ++nPlane)
        nPixelBytes += oLayout.GetPixelBytes(nPlane);
    if (nPixels > MOST_BYTES / nPixelBytes)
        throw DataException("The image of " + std::to_string(oLayout.GetWidth()) + " x " +
                            std::to_string(oLayout.GetHeight()) + " pixels and " +
                            std::to_string(oLayout.GetChannelCount()) + " channels is too large");
    return nPixels * nPixelBytes;
}

std::vector<PlainSource::Placement> PlainSource::PlacePlanes(const ImageLayout& oLayout, std::uint64_t nOffset,
                                                             Order eOrder)
{
    std::uint64_t nAllRows = 0;
    for (unsigned int nPlane = 0; nPlane < oLayout.GetPlaneCount(); ++nPlane)
        nAllRows = Add(nAllRows, GetRowBytes(oLayout, nPlane));
    std::vector<Placement> oPlacements;
    for (unsigned int nPlane = 0; nPlane < oLayout.GetPlaneCount(); ++nPlane)
    {
        const std::uint64_t nRowBytes = GetRowBytes(oLayout, nPlane);
        oPlacements.push_back({nOffset, eOrder == Order::eLine ? nAllRows : nRowBytes});
        nOffset = Add(nOffset, eOrder == Order::eLine ? nRowBytes : Multiply(nRowBytes, oLayout.GetHeight()));
    }
    return oPlacements;
}

// A complex value is turned round part by part.
void PlainSource::Swap(unsigned int nPlane, unsigned char* pRows, std::size_t nPitch, std::size_t nRowBytes,
                       std::size_t nRows) const
{
    const std::size_t nPartBytes = moLayout.GetPlane(nPlane).moType.GetBits() / 8;
    for (std::size_t nRow = 0; nRow < nRows; ++nRow)
        codec::SwapBytes(pRows + nRow * nPitch, pRows + nRow * nPitch, nRowBytes / nPartBytes, nPartBytes);
}

void PlainSource::ReadPlane(unsigned int nPlane, const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch)
{
    const std::size_t nRowBytes = oRect.mnWidth * moLayout.GetPixelBytes(nPlane);
    const auto ReadRows = [&](const PixelRect& oSlice, unsigned char* pRows)
    {
        mpoFile->ReadRows(GetOffset(nPlane, oSlice.mnX, oSlice.mnY), moPlacements[nPlane].mnRowPitch, nRowBytes,
                          oSlice.mnHeight, pRows, nPitch, moScratch);
    };
    if (!mbSwap)
        return ReadRows(oRect, pTarget);
    // Turned round where they were read to, while they are near.
    ForEachSlice(oRect, CountSliceRows(nRowBytes, SWAPPED_BYTES),
                 [&](const PixelRect& oSlice, std::size_t nRow)
                 {
                     ReadRows(oSlice, pTarget + nRow * nPitch);
                     Swap(nPlane, pTarget + nRow * nPitch, nPitch, nRowBytes, oSlice.mnHeight);
                 });
}

void PlainSource::WritePlane(unsigned int nPlane, const PixelRect& oRect, const unsigned char* pSource,
                             std::size_t nPitch)
{
    const std::size_t nRowBytes = oRect.mnWidth * moLayout.GetPixelBytes(nPlane);
    const auto WriteRows = [&](const PixelRect& oSlice, const unsigned char* pRows, std::size_t nRowsPitch)
    {
        mpoFile->WriteRows(GetOffset(nPlane, oSlice.mnX, oSlice.mnY), moPlacements[nPlane].mnRowPitch, nRowBytes,
                           oSlice.mnHeight, pRows, nRowsPitch);
    };
    if (!mbSwap)
        return WriteRows(oRect, pSource, nPitch);
    const std::size_t nPartBytes = moLayout.GetPlane(nPlane).moType.GetBits() / 8;
    ForEachSlice(oRect, CountSliceRows(nRowBytes),
                 [&](const PixelRect& oSlice, std::size_t nRow)
                 {
                     unsigned char* const pRows = moScratch.Get(nRowBytes * oSlice.mnHeight);
                     for (std::size_t nAt = 0; nAt < oSlice.mnHeight; ++nAt)
                         codec::SwapBytes(pSource + (nRow + nAt) * nPitch, pRows + nAt * nRowBytes,
                                          nRowBytes / nPartBytes, nPartBytes);
                     WriteRows(oSlice, pRows, nRowBytes);
                 });
}

void PlainSource::ReadBlock(const BlockAddress& oBlock, const PixelRect& oPart, unsigned char* pTarget,
                            std::size_t nPitch)
{
    const PixelRect oRect = moLayout.GetBlockRect(oBlock.mnColumn, oBlock.mnRow);
    ReadPlane(oBlock.mnPlane, {oRect.mnX + oPart.mnX, oRect.mnY + oPart.mnY, oPart.mnWidth, oPart.mnHeight}, pTarget,
              nPitch);
}

void PlainSource::WriteBlock(const BlockAddress& oBlock, const PixelRect& oPart, const unsigned char* pSource,
                             std::size_t nPitch)
{
    if (!moBeforeWrite)
        return IBlockSource::WriteBlock(oBlock, oPart, pSource, nPitch);
    moBeforeWrite();
    const PixelRect oRect = moLayout.GetBlockRect(oBlock.mnColumn, oBlock.mnRow);
    WritePlane(oBlock.mnPlane, {oRect.mnX + oPart.mnX, oRect.mnY + oPart.mnY, oPart.mnWidth, oPart.mnHeight}, pSource,
               nPitch);
}

void PlainSource::Read(const ChannelSelection& oChannels, const PixelRect& oRect, unsigned char* pTarget,
                       std::size_t nPitch)
{
    const unsigned int nPlane = oChannels.GetPlaces().front().mnPlane;
    if (oChannels.IsWholePlane())
        return ReadPlane(nPlane, oRect, pTarget, nPitch);
    if (oChannels.IsOnePlane())
        return ReadChosen(oChannels, oRect, pTarget, nPitch);
    if (!ReadSpan(oChannels, oRect, pTarget, nPitch))
        ReadPlanes(oChannels, oRect, pTarget, nPitch);
}

// Some channels of pixels that hold more.
void PlainSource::ReadChosen(const ChannelSelection& oChannels, const PixelRect& oRect, unsigned char* pTarget,
                             std::size_t nPitch)
{
    const unsigned int nPlane = oChannels.GetPlaces().front().mnPlane;
    const std::size_t nStoredBytes = oRect.mnWidth * moLayout.GetPixelBytes(nPlane);
    ForEachSlice(oRect, CountSliceRows(nStoredBytes),
                 [&](const PixelRect& oSlice, std::size_t nRow)
                 {
                     unsigned char* const pStored = moPlanes.Get(nStoredBytes * oSlice.mnHeight);
                     mpoFile->ReadRows(GetOffset(nPlane, oSlice.mnX, oSlice.mnY), moPlacements[nPlane].mnRowPitch,
                                       nStoredBytes, oSlice.mnHeight, pStored, nStoredBytes, moScratch);
                     unsigned char* const pRows = pTarget + nRow * nPitch;
                     raster::GatherChannels(pStored, nStoredBytes, moLayout.GetPlane(nPlane).mnChannels, pRows, nPitch,
                                            oChannels.GetPositions().data(), oChannels.GetCount(),
                                            {oSlice.mnWidth, oSlice.mnHeight, oChannels.GetValueBytes()});
                     if (mbSwap)
                         Swap(nPlane, pRows, nPitch, oSlice.mnWidth * oChannels.GetPixelBytes(), oSlice.mnHeight);
                 });
}

void PlainSource::Interleave(const ChannelSelection& oChannels, const std::vector<const unsigned char*>& oPlanes,
                             std::size_t nPlanePitch, const PixelRect& oSlice, unsigned char* pTarget,
                             std::size_t nPitch) const
{
    raster::InterleavePlanes(oPlanes.data(), nPlanePitch, pTarget, nPitch, oPlanes.size(),
                             {oSlice.mnWidth, oSlice.mnHeight, oChannels.GetValueBytes()});
    if (mbSwap)
        Swap(oChannels.GetPlaces().front().mnPlane, pTarget, nPitch, oSlice.mnWidth * oChannels.GetPixelBytes(),
             oSlice.mnHeight);
}

// Channels whose rows lie in turn are read together, from the first to the last one, where that costs less than to go
// for each of them. False when it does not.
bool PlainSource::ReadSpan(const ChannelSelection& oChannels, const PixelRect& oRect, unsigned char* pTarget,
                           std::size_t nPitch)
{
    std::uint64_t nFirst = UINT64_MAX, nLast = 0;
    const std::uint64_t nRowPitch = moPlacements[oChannels.GetPlaces().front().mnPlane].mnRowPitch;
    for (const ChannelPlace& oPlace : oChannels.GetPlaces())
    {
        if (moPlacements[oPlace.mnPlane].mnRowPitch != nRowPitch)
            return false;
        nFirst = std::min(nFirst, moPlacements[oPlace.mnPlane].mnOffset);
        nLast = std::max(nLast, moPlacements[oPlace.mnPlane].mnOffset);
    }
    const std::size_t nRowBytes = oRect.mnWidth * oChannels.GetValueBytes();
    const std::uint64_t nSpan = nLast - nFirst + nRowBytes;
    if (!oChannels.IsSinglePlanes() || nSpan > nRowPitch ||
        nSpan + CALL_BYTES > oChannels.GetCount() * (nRowBytes + CALL_BYTES))
        return false;
    const std::uint64_t nOffset = nFirst + oRect.mnX * oChannels.GetValueBytes();
    ForEachSlice(oRect, CountSliceRows(nSpan),
                 [&](const PixelRect& oSlice, std::size_t nRow)
                 {
                     unsigned char* const pSpan = moPlanes.Get(nSpan * oSlice.mnHeight);
                     mpoFile->ReadRows(nOffset + oSlice.mnY * nRowPitch, nRowPitch, nSpan, oSlice.mnHeight, pSpan,
                                       nSpan, moScratch);
                     std::vector<const unsigned char*> oPlanes;
                     for (const ChannelPlace& oPlace : oChannels.GetPlaces())
                         oPlanes.push_back(pSpan + (moPlacements[oPlace.mnPlane].mnOffset - nFirst));
                     Interleave(oChannels, oPlanes, nSpan, oSlice, pTarget + nRow * nPitch, nPitch);
                 });
    return true;
}

void PlainSource::ReadPlanes(const ChannelSelection& oChannels, const PixelRect& oRect, unsigned char* pTarget,
                             std::size_t nPitch)
{
    const std::size_t nRowBytes = oRect.mnWidth * oChannels.GetValueBytes();
    ForEachSlice(oRect, CountSliceRows(nRowBytes * oChannels.GetCount()),
                 [&](const PixelRect& oSlice, std::size_t nRow)
                 {
                     const std::size_t nPlaneBytes = nRowBytes * oSlice.mnHeight;
                     unsigned char* pPlane = moPlanes.Get(nPlaneBytes * oChannels.GetCount());
                     std::vector<const unsigned char*> oPlanes;
                     for (const ChannelPlace& oPlace : oChannels.GetPlaces())
                     {
                         mpoFile->ReadRows(GetOffset(oPlace.mnPlane, oSlice.mnX, oSlice.mnY),
                                           moPlacements[oPlace.mnPlane].mnRowPitch, nRowBytes, oSlice.mnHeight, pPlane,
                                           nRowBytes, moScratch);
                         oPlanes.push_back(pPlane);
                         pPlane += nPlaneBytes;
                     }
                     Interleave(oChannels, oPlanes, nRowBytes, oSlice, pTarget + nRow * nPitch, nPitch);
                 });
}

void PlainSource::Write(const ChannelSelection& oChannels, const PixelRect& oRect, const unsigned char* pSource,
                        std::size_t nPitch)
{
    if (!moBeforeWrite)
        return IBlockSource::WriteBlock({}, oRect, pSource, nPitch);
    moBeforeWrite();
    if (oChannels.IsWholePlane())
        return WritePlane(oChannels.GetPlaces().front().mnPlane, oRect, pSource, nPitch);
    if (oChannels.IsOnePlane())
        return WriteChosen(oChannels, oRect, pSource, nPitch);
    const std::size_t nRowBytes = oRect.mnWidth * oChannels.GetValueBytes();
    ForEachSlice(oRect, CountSliceRows(nRowBytes),
                 [&](const PixelRect& oSlice, std::size_t nRow)
                 {
                     for (std::size_t nAt = 0; nAt < oChannels.GetCount(); ++nAt)
                     {
                         unsigned char* const pPlane = moPlanes.Get(nRowBytes * oSlice.mnHeight);
                         raster::ExtractChannel(pSource + nRow * nPitch, nPitch, nAt, oChannels.GetCount(), pPlane,
                                                nRowBytes,
                                                {oSlice.mnWidth, oSlice.mnHeight, oChannels.GetValueBytes()});
                         WritePlane(oChannels.GetPlaces()[nAt].mnPlane, oSlice, pPlane, nRowBytes);
                     }
                 });
}

// The other channels of the pixels keep their values.
void PlainSource::WriteChosen(const ChannelSelection& oChannels, const PixelRect& oRect, const unsigned char* pSource,
                              std::size_t nPitch)
{
    const unsigned int nPlane = oChannels.GetPlaces().front().mnPlane;
    const unsigned int nStored = moLayout.GetPlane(nPlane).mnChannels;
    const std::size_t nRowBytes = oRect.mnWidth * oChannels.GetValueBytes();
    const std::size_t nStoredBytes = oRect.mnWidth * moLayout.GetPixelBytes(nPlane);
    Scratch oChannel;
    ForEachSlice(oRect, CountSliceRows(nStoredBytes),
                 [&](const PixelRect& oSlice, std::size_t nRow)
                 {
                     const raster::PixelArea oArea{oSlice.mnWidth, oSlice.mnHeight, oChannels.GetValueBytes()};
                     unsigned char* const pPlane = oChannel.Get(nRowBytes * oSlice.mnHeight);
                     unsigned char* const pPixels = moPlanes.Get(nStoredBytes * oSlice.mnHeight);
                     if (!oChannels.CoversPlane(nPlane, nStored))
                         ReadPlane(nPlane, oSlice, pPixels, nStoredBytes);
                     for (std::size_t nAt = 0; nAt < oChannels.GetCount(); ++nAt)
                     {
                         raster::ExtractChannel(pSource + nRow * nPitch, nPitch, nAt, oChannels.GetCount(), pPlane,
                                                nRowBytes, oArea);
                         raster::PlaceChannel(pPlane, nRowBytes, pPixels, nStoredBytes, oChannels.GetPositions()[nAt],
                                              nStored, oArea);
                     }
                     WritePlane(nPlane, oSlice, pPixels, nStoredBytes);
                 });
}

PlainIO::PlainIO(std::shared_ptr<PlainSource> poSource, const std::vector<unsigned int>& oChannels, const Place& oPlace)
    : mpoSource(std::move(poSource)), moChannels(mpoSource->GetLayout(), oChannels, oPlace)
{
}

PlainIO::~PlainIO() = default;

unsigned int PlainIO::GetTileHeight() const
{
    const std::size_t nRowBytes = GetTileWidth() * moChannels.GetPixelBytes();
    const auto nRows =
        static_cast<unsigned int>(std::clamp<std::size_t>(TILE_BYTES / nRowBytes, LEAST_TILE_ROWS, MOST_TILE_ROWS));
    return std::min(nRows, GetFileHeight());
}

void PlainIO::ReadPixels(const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch)
{
    mpoSource->Read(moChannels, oRect, pTarget, nPitch);
}

void PlainIO::WritePixels(const PixelRect& oRect, const unsigned char* pSource, std::size_t nPitch)
{
    mpoSource->Write(moChannels, oRect, pSource, nPitch);
}

} // namespace krv::plugins::support
