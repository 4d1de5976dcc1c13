#include "gobs/resampling/leveltarget.h"

#include <algorithm>
#include <cstring>
#include <utility>

namespace krv::gobs
{

TileGatherer::TileGatherer(const PixelBounds& oBounds, unsigned int nTileWidth, unsigned int nTileHeight,
                           unsigned int nChannels, const DataType& oType, Store oStore)
    : moBounds(oBounds), mnTileWidth(std::max(nTileWidth, 1U)), mnTileHeight(std::max(nTileHeight, 1U)),
      mnChannels(nChannels), moType(oType), mnPixelBytes(oType.GetValueBits() / 8 * nChannels),
      moStore(std::move(oStore))
{
}

TileGatherer::Tile& TileGatherer::Get(unsigned int nX, unsigned int nY)
{
    if (mpoLast != nullptr && mpoLast->moPart.Contains(nX, nY))
        return *mpoLast;
    const unsigned int nColumn = nX / mnTileWidth;
    const unsigned int nRow = nY / mnTileHeight;
    Tile& oTile = moTiles[{nRow, nColumn}];
    mpoLast = &oTile;
    if (oTile.mpoRaster != nullptr)
        return oTile;
    oTile.moPart = GetPart(nColumn, nRow);
    const unsigned int nWidth = oTile.moPart.GetWidth();
    const unsigned int nHeight = oTile.moPart.GetHeight();
    oTile.mpoRaster = std::make_unique<Raster>(
        RasterInfo(nWidth, nHeight, mnChannels, moType),
        RasterContext(static_cast<int>(oTile.moPart.mnLeft), static_cast<int>(oTile.moPart.mnTop)));
    oTile.mnMissing = std::uint64_t{nWidth} * nHeight;
    return oTile;
}

// The part of a tile that is to be made.
PixelBounds TileGatherer::GetPart(unsigned int nColumn, unsigned int nRow) const
{
    const auto nRight = std::min<std::uint64_t>(moBounds.mnRight, (std::uint64_t{nColumn} + 1) * mnTileWidth);
    const auto nBottom = std::min<std::uint64_t>(moBounds.mnBottom, (std::uint64_t{nRow} + 1) * mnTileHeight);
    return {std::max(moBounds.mnLeft, nColumn * mnTileWidth), std::max(moBounds.mnTop, nRow * mnTileHeight),
            static_cast<unsigned int>(nRight), static_cast<unsigned int>(nBottom)};
}

unsigned char* TileGatherer::FindTile(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight)
{
    const unsigned int nLastX = nX + nWidth - 1;
    const unsigned int nLastY = nY + nHeight - 1;
    if (!moBounds.Contains(nX, nY) || !moBounds.Contains(nLastX, nLastY))
        return nullptr;
    Tile& oTile = Get(nX, nY);
    return oTile.moPart.Contains(nLastX, nLastY) ? GetPlace(oTile, nX, nY) : nullptr;
}

void TileGatherer::StoreLast()
{
    const PixelBounds oPart = mpoLast->moPart;
    std::unique_ptr<Raster> oRaster = std::move(mpoLast->mpoRaster);
    mpoLast = nullptr;
    moTiles.erase({oPart.mnTop / mnTileHeight, oPart.mnLeft / mnTileWidth});
    moStore(std::move(oRaster));
}

void TileGatherer::Put(unsigned int nX, unsigned int nY, unsigned int nCount, const unsigned char* pPixels)
{
    if (nY < moBounds.mnTop || nY >= moBounds.mnBottom)
        return;
    const unsigned int nEnd = std::min(nX + nCount, moBounds.mnRight);
    for (unsigned int nAt = std::max(nX, moBounds.mnLeft); nAt < nEnd;)
    {
        Tile& oTile = Get(nAt, nY);
        const unsigned int nRun = std::min(nEnd, oTile.moPart.mnRight) - nAt;
        std::memcpy(GetPlace(oTile, nAt, nY), pPixels + std::size_t{nAt - nX} * mnPixelBytes, nRun * mnPixelBytes);
        Note(nRun);
        nAt += nRun;
    }
}

LevelTarget::LevelTarget(TileGatherer oPixels, const SourceForm& oForm, const IValueFinisher* poFinisher)
    : moPixels(std::move(oPixels)), mpoFinisher(poFinisher),
      mbFinish(poFinisher != nullptr && poFinisher->ChangesValid()), mnChannels(oForm.mnChannels),
      mnPixelBytes(oForm.GetPixelBytes())
{
}

unsigned char* LevelTarget::BeginApart()
{
    moApart.resize(std::max(moApart.size(), std::size_t{mnWidth} * mnHeight * mnPixelBytes));
    return moApart.data();
}

void LevelTarget::EndRows(const unsigned char* pValid)
{
    const std::size_t nValues = std::size_t{mnWidth} * mnChannels;
    unsigned char* const pFirst = mpDirect != nullptr ? mpDirect : moApart.data();
    const std::size_t nPitch = GetPitch();
    for (unsigned int n = 0; n < mnHeight && (pValid != nullptr || mbFinish); ++n)
        mpoFinisher->Finish(pFirst + n * nPitch, pValid != nullptr ? pValid + n * nValues : nullptr, nValues);
    if (mpDirect != nullptr)
        moPixels.Note(std::size_t{mnWidth} * mnHeight);
    else
        for (unsigned int n = 0; n < mnHeight; ++n)
            moPixels.Put(mnX, mnY + n, mnWidth, moApart.data() + std::size_t{n} * mnWidth * mnPixelBytes);
    if (mpoMask == nullptr)
        return;
    for (unsigned int n = 0; n < mnHeight; ++n)
    {
        moMaskRow.assign(mnWidth, static_cast<unsigned char>(pValid == nullptr));
        for (std::size_t nAt = 0; pValid != nullptr && nAt < nValues; ++nAt)
            moMaskRow[nAt / mnChannels] |= pValid[n * nValues + nAt];
        mpoMask->Put(mnX, mnY + n, mnWidth, moMaskRow.data());
    }
}

} // namespace krv::gobs
