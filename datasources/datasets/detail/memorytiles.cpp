#include "datasources/datasets/detail/memorytiles.h"

#include "datasources/datasets/detail/pixelfill.h"
#include "gobs/raster/buffertype.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/raster/copydata.h"
#include "toolkit/raster/interleave.h"

#include <algorithm>
#include <numeric>
#include <utility>

namespace krv::datasources::detail
{

namespace
{

constexpr std::uint64_t TILES_ACROSS = std::uint64_t{1} << 32; // more than any image has

std::vector<unsigned char> Repeat(const std::vector<unsigned char>& oValue, std::size_t nTimes)
{
    std::vector<unsigned char> oAll;
    oAll.reserve(oValue.size() * nTimes);
    for (std::size_t n = 0; n < nTimes; ++n)
        oAll.insert(oAll.end(), oValue.begin(), oValue.end());
    return oAll;
}

} // namespace

MemoryTiles::MemoryTiles(unsigned int nWidth, unsigned int nHeight, const krv::gobs::DataType& oType,
                         unsigned int nChannels, std::shared_ptr<MemoryBudget> poBudget, double nFill)
    : mnWidth(nWidth), mnHeight(nHeight), moType(oType), mnChannels(nChannels), mpoBudget(std::move(poBudget)),
      mnFillValue(nFill), moFill(static_cast<std::size_t>(oType.GetValueBits() / 8))
{
    krv::raster::CopyData(&nFill, krv::raster::eBT_64R, 1, moFill.data(),
                          krv::gobs::QRFDataType2RasterBufferType(oType), 1, 1);
}

MemoryTiles::~MemoryTiles()
{
    mpoBudget->mnUsed -= mnBytes;
}

std::uint64_t MemoryTiles::GetTileNumber(unsigned int nX, unsigned int nY) const
{
    return nY / TILE_SIZE * TILES_ACROSS + nX / TILE_SIZE;
}

PixelRect MemoryTiles::GetTileRect(unsigned int nX, unsigned int nY) const
{
    nX = nX / TILE_SIZE * TILE_SIZE;
    nY = nY / TILE_SIZE * TILE_SIZE;
    return {nX, nY, std::min(TILE_SIZE, mnWidth - nX), std::min(TILE_SIZE, mnHeight - nY)};
}

unsigned char* MemoryTiles::Find(std::uint64_t nTile) const
{
    const auto oFound = moTiles.find(nTile);
    return oFound != moTiles.end() ? oFound->second.get() : nullptr;
}

std::uint64_t MemoryTiles::CountTileBytes(unsigned int nX, unsigned int nY) const
{
    const PixelRect oRect = GetTileRect(nX, nY);
    return krv::gobs::BufferBytes(oRect.mnWidth, oRect.mnHeight, mnChannels, moType);
}

unsigned char* MemoryTiles::Make(unsigned int nX, unsigned int nY, bool bFill)
{
    const std::uint64_t nBytes = CountTileBytes(nX, nY);
    HBlock oTile(static_cast<unsigned char*>(HMalloc(nBytes)));
    if (bFill)
        FillPixels(oTile.get(), nBytes, nBytes / GetValueBytes(), 1, moFill.data(), moFill.size());
    unsigned char* const pTile = oTile.get();
    moTiles[GetTileNumber(nX, nY)] = std::move(oTile);
    mnBytes += nBytes;
    mpoBudget->mnUsed += nBytes;
    return pTile;
}

std::shared_ptr<MemoryTiles> MemoryTiles::Without(unsigned int nChannel) const
{
    auto oOther = std::make_shared<MemoryTiles>(mnWidth, mnHeight, moType, mnChannels - 1, mpoBudget, mnFillValue);
    std::vector<std::size_t> oKept(mnChannels);
    std::iota(oKept.begin(), oKept.end(), std::size_t{0});
    oKept.erase(oKept.begin() + nChannel);
    for (const auto& [nTile, oTile] : moTiles)
    {
        const auto nX = static_cast<unsigned int>(nTile % TILES_ACROSS) * TILE_SIZE;
        const auto nY = static_cast<unsigned int>(nTile / TILES_ACROSS) * TILE_SIZE;
        const PixelRect oRect = GetTileRect(nX, nY);
        const std::size_t nRow = oRect.mnWidth * GetValueBytes();
        krv::raster::GatherChannels(oTile.get(), nRow * mnChannels, mnChannels, oOther->Make(nX, nY, false),
                                    nRow * oKept.size(), oKept.data(), oKept.size(),
                                    {oRect.mnWidth, oRect.mnHeight, GetValueBytes()});
    }
    return oOther;
}

template <typename Base>
MemoryIO<Base>::MemoryIO(std::vector<MemoryChannel> oChannels, std::function<void()> oBeforeWrite, bool bBits)
    : moChannels(std::move(oChannels)), moBeforeWrite(std::move(oBeforeWrite)), mbBits(bBits)
{
    for (const MemoryChannel& oChannel : moChannels)
    {
        if (std::find(moTiles.begin(), moTiles.end(), oChannel.mpoTiles) == moTiles.end())
            moTiles.push_back(oChannel.mpoTiles);
        moIndices.push_back(oChannel.mnIndex);
    }
    mbStraight = moTiles.size() == 1 && moIndices.size() == moTiles.front()->GetChannels();
    for (std::size_t n = 0; n < moIndices.size(); ++n)
        mbStraight = mbStraight && moIndices[n] == n;
}

template <typename Base>
MemoryIO<Base>::~MemoryIO() = default;

template <typename Base>
unsigned int MemoryIO<Base>::GetTileWidth() const
{
    return std::min(MemoryTiles::TILE_SIZE, GetFileWidth());
}

template <typename Base>
unsigned int MemoryIO<Base>::GetTileHeight() const
{
    return std::min(MemoryTiles::TILE_SIZE, GetFileHeight());
}

template <typename Base>
unsigned char* MemoryIO<Base>::GetScratch(const PixelRect& oPiece)
{
    const std::size_t nBytes = std::size_t{oPiece.mnWidth} * oPiece.mnHeight * First().GetValueBytes();
    if (moScratch.size() < nBytes)
        moScratch.resize(nBytes);
    return moScratch.data();
}

template <typename Base>
void MemoryIO<Base>::ReadPixels(const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch)
{
    ForEachPiece(oRect,
                 [&](const PixelRect& oPiece)
                 {
                     ReadPiece(oPiece,
                               pTarget + (oPiece.mnY - oRect.mnY) * nPitch + (oPiece.mnX - oRect.mnX) * GetPixelBytes(),
                               nPitch);
                 });
}

template <typename Base>
void MemoryIO<Base>::ReadPiece(const PixelRect& oPiece, unsigned char* pTarget, std::size_t nPitch)
{
    const PixelRect oTile = First().GetTileRect(oPiece.mnX, oPiece.mnY);
    const std::uint64_t nTile = First().GetTileNumber(oPiece.mnX, oPiece.mnY);
    const std::size_t nFirst =
        std::size_t{oPiece.mnY - oTile.mnY} * oTile.mnWidth + (oPiece.mnX - oTile.mnX); // pixels into the tile
    const std::size_t nValueBytes = First().GetValueBytes();
    const krv::raster::PixelArea oArea{oPiece.mnWidth, oPiece.mnHeight, nValueBytes};
    if (moTiles.size() == 1)
    {
        const std::size_t nPixelBytes = nValueBytes * First().GetChannels();
        const unsigned char* const pTile = First().Find(nTile);
        if (pTile == nullptr)
        {
            const std::vector<unsigned char> oPixel = Repeat(First().GetFill(), moChannels.size());
            FillPixels(pTarget, nPitch, oPiece.mnWidth, oPiece.mnHeight, oPixel.data(), oPixel.size());
        }
        else if (mbStraight)
            krv::raster::CopyRows(pTile + nFirst * nPixelBytes, oTile.mnWidth * nPixelBytes, pTarget, nPitch,
                                  oPiece.mnWidth * nPixelBytes, oPiece.mnHeight);
        else
            krv::raster::GatherChannels(pTile + nFirst * nPixelBytes, oTile.mnWidth * nPixelBytes,
                                        First().GetChannels(), pTarget, nPitch, moIndices.data(), moIndices.size(),
                                        oArea);
        return;
    }
    unsigned char* const pPlane = GetScratch(oPiece);
    const std::size_t nPlanePitch = oPiece.mnWidth * nValueBytes;
    for (std::size_t n = 0; n < moChannels.size(); ++n)
    {
        const MemoryTiles& oTiles = *moChannels[n].mpoTiles;
        const std::size_t nPixelBytes = nValueBytes * oTiles.GetChannels();
        const unsigned char* const pTile = oTiles.Find(nTile);
        if (pTile == nullptr)
            FillPixels(pPlane, nPlanePitch, oPiece.mnWidth, oPiece.mnHeight, oTiles.GetFill().data(), nValueBytes);
        else
            krv::raster::ExtractChannel(pTile + nFirst * nPixelBytes, oTile.mnWidth * nPixelBytes,
                                        moChannels[n].mnIndex, oTiles.GetChannels(), pPlane, nPlanePitch, oArea);
        krv::raster::PlaceChannel(pPlane, nPlanePitch, pTarget, nPitch, n, moChannels.size(), oArea);
    }
}

template <typename Base>
unsigned char* MemoryIO<Base>::BeginWriting(const PixelRect& oPiece, std::size_t& nPitch)
{
    if (!mbStraight || mbBits)
        return nullptr;
    MakeTiles(oPiece, true);
    if (moBeforeWrite)
        moBeforeWrite();
    const PixelRect oTile = First().GetTileRect(oPiece.mnX, oPiece.mnY);
    nPitch = oTile.mnWidth * GetPixelBytes();
    return First().Find(First().GetTileNumber(oPiece.mnX, oPiece.mnY)) + (oPiece.mnY - oTile.mnY) * nPitch +
           (oPiece.mnX - oTile.mnX) * GetPixelBytes();
}

// The tiles that a rectangle needs, all of them or none. bFill: also those that are about to be written whole.
template <typename Base>
void MemoryIO<Base>::MakeTiles(const PixelRect& oRect, bool bFill)
{
    std::uint64_t nBytes = 0;
    ForEachPiece(oRect,
                 [&](const PixelRect& oPiece)
                 {
                     for (const auto& oTiles : moTiles)
                         if (oTiles->Find(oTiles->GetTileNumber(oPiece.mnX, oPiece.mnY)) == nullptr)
                             nBytes += oTiles->CountTileBytes(oPiece.mnX, oPiece.mnY);
                 });
    const MemoryBudget& oBudget = First().GetBudget();
    if (nBytes > oBudget.mnCeiling - std::min(oBudget.mnUsed, oBudget.mnCeiling))
        throw krv::DataException(oBudget.moName + ": another " + std::to_string(nBytes) + " bytes beside " +
                                 std::to_string(oBudget.mnUsed) + " exceed the ceiling of " +
                                 std::to_string(oBudget.mnCeiling));
    ForEachPiece(oRect,
                 [&](const PixelRect& oPiece)
                 {
                     for (const auto& oTiles : moTiles)
                     {
                         if (oTiles->Find(oTiles->GetTileNumber(oPiece.mnX, oPiece.mnY)) != nullptr)
                             continue;
                         const bool bWhole = mbStraight && oPiece == oTiles->GetTileRect(oPiece.mnX, oPiece.mnY);
                         oTiles->Make(oPiece.mnX, oPiece.mnY, bFill || !bWhole);
                     }
                 });
}

template <typename Base>
void MemoryIO<Base>::WritePixels(const PixelRect& oRect, const unsigned char* pSource, std::size_t nPitch)
{
    MakeTiles(oRect, false);
    if (moBeforeWrite)
        moBeforeWrite();
    ForEachPiece(
        oRect,
        [&](const PixelRect& oPiece)
        {
            WritePiece(oPiece, pSource + (oPiece.mnY - oRect.mnY) * nPitch + (oPiece.mnX - oRect.mnX) * GetPixelBytes(),
                       nPitch);
        });
}

template <typename Base>
void MemoryIO<Base>::WritePiece(const PixelRect& oPiece, const unsigned char* pSource, std::size_t nPitch)
{
    const PixelRect oTile = First().GetTileRect(oPiece.mnX, oPiece.mnY);
    const std::uint64_t nTile = First().GetTileNumber(oPiece.mnX, oPiece.mnY);
    const std::size_t nFirst = std::size_t{oPiece.mnY - oTile.mnY} * oTile.mnWidth + (oPiece.mnX - oTile.mnX);
    const std::size_t nValueBytes = First().GetValueBytes();
    const krv::raster::PixelArea oArea{oPiece.mnWidth, oPiece.mnHeight, nValueBytes};
    if (mbStraight && !mbBits)
    {
        const std::size_t nPixelBytes = GetPixelBytes();
        krv::raster::CopyRows(pSource, nPitch, First().Find(nTile) + nFirst * nPixelBytes, oTile.mnWidth * nPixelBytes,
                              oPiece.mnWidth * nPixelBytes, oPiece.mnHeight);
        return;
    }
    unsigned char* const pPlane = GetScratch(oPiece);
    const std::size_t nPlanePitch = oPiece.mnWidth * nValueBytes;
    for (std::size_t n = 0; n < moChannels.size(); ++n)
    {
        const MemoryTiles& oTiles = *moChannels[n].mpoTiles;
        const std::size_t nPixelBytes = nValueBytes * oTiles.GetChannels();
        krv::raster::ExtractChannel(pSource, nPitch, n, moChannels.size(), pPlane, nPlanePitch, oArea);
        if (mbBits)
            std::transform(pPlane, pPlane + nPlanePitch * oPiece.mnHeight, pPlane,
                           [](unsigned char nByte) { return static_cast<unsigned char>(nByte != 0); });
        krv::raster::PlaceChannel(pPlane, nPlanePitch, oTiles.Find(nTile) + nFirst * nPixelBytes,
                                  oTile.mnWidth * nPixelBytes, moChannels[n].mnIndex, oTiles.GetChannels(), oArea);
    }
}

template class MemoryIO<IRasterIO>;
template class MemoryIO<IOverviewIO>;

MemoryLevelIO::MemoryLevelIO(unsigned int nLevel, std::vector<MemoryChannel> oChannels, bool bBits)
    : MemoryIO(std::move(oChannels), nullptr, bBits), mnLevel(nLevel)
{
}

MemoryLevelIO::~MemoryLevelIO() = default;

} // namespace krv::datasources::detail
