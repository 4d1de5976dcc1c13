#include "plugins/jp2/writing/tilestore.h"

#include "plugins/jp2/reading/decoder.h"
#include "plugins/jp2/reading/samplecopy.h"
#include "plugins/support/codec/bits.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/raster/interleave.h"

#include <algorithm>
#include <utility>

namespace krv::plugins::jp2
{

namespace
{

constexpr std::size_t HELD_BYTES = std::size_t{128} << 20;
constexpr std::uint64_t FIRST_PLACE = 1; // 0 stands for none

support::ImageLayout MakeLayout(const TileEncoder& oEncoder)
{
    const ImageForm& oForm = oEncoder.GetForm();
    const support::Plane oPlane{oForm.moType, oForm.mnChannels,
                                krv::gobs::DataType(oForm.mnBits, oForm.moType.IsSigned(), false, 0, 0, false)};
    return {oForm.mnWidth, oForm.mnHeight, oEncoder.GetTileWidth(), oEncoder.GetTileHeight(), {oPlane}};
}

} // namespace

TileStore::TileStore(std::shared_ptr<support::File> poFile, TileEncoder oEncoder, std::function<void()> oBeforeWrite)
    : mpoFile(std::move(poFile)), moEncoder(std::move(oEncoder)), moLayout(MakeLayout(moEncoder)),
      moBeforeWrite(std::move(oBeforeWrite)),
      moTiles(std::size_t{moLayout.GetBlocksAcross()} * ((moLayout.GetHeight() - 1) / moLayout.GetBlockHeight() + 1)),
      mnEnd(FIRST_PLACE),
      moHeld(
          HELD_BYTES, moLayout.GetPixelBytes(0),
          [this](const support::HeldBlocks::Block& oBlock, const unsigned char* pPixels)
          {
              if (mbCompleting)
                  Encode(oBlock.mnNumber, pPixels, GetPitch(oBlock.mnNumber));
              else
                  PutAside(oBlock.mnNumber, pPixels);
          },
          [this](unsigned char* pPixels, std::size_t nBytes)
          {
              const ImageForm& oForm = moEncoder.GetForm();
              const std::size_t nValueBytes = oForm.moType.GetBits() / 8;
              codec::FitBits(pPixels, nBytes / nValueBytes, nValueBytes, oForm.mnBits, oForm.moType.IsSigned());
          })
{
}

TileStore::~TileStore() = default;

support::PixelRect TileStore::GetRect(std::uint64_t nTile) const
{
    return moLayout.GetBlockRect(static_cast<unsigned int>(nTile % moLayout.GetBlocksAcross()),
                                 static_cast<unsigned int>(nTile / moLayout.GetBlocksAcross()));
}

std::uint64_t TileStore::GetTileOffset(std::uint64_t nTile) const
{
    return moTiles[nTile].mnOffset + moTiles[nTile].mnHeaderBytes;
}

std::uint64_t TileStore::GetTileBytes(std::uint64_t nTile) const
{
    return moTiles[nTile].mnBytes - moTiles[nTile].mnHeaderBytes - END_BYTES;
}

std::vector<unsigned char> TileStore::ReadMainHeader() const
{
    std::vector<unsigned char> oBytes(moTiles.front().mnHeaderBytes);
    mpoFile->Read(moTiles.front().mnOffset, oBytes.data(), oBytes.size());
    return oBytes;
}

void TileStore::ReadBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart, unsigned char* pTarget,
                          std::size_t nPitch)
{
    const std::uint64_t nTile = moLayout.GetBlockIndex(oBlock.mnColumn, oBlock.mnRow);
    for (unsigned int nRow = 0; nRow < oPart.mnHeight; ++nRow)
        std::fill_n(pTarget + nRow * nPitch, oPart.mnWidth * moLayout.GetPixelBytes(0), static_cast<unsigned char>(0));
    Load(nTile, pTarget, nPitch);
    moHeld.Overlay(nTile, GetRect(nTile), pTarget, nPitch);
}

void TileStore::Load(std::uint64_t nTile, unsigned char* pTarget, std::size_t nPitch)
{
    const Tile& oTile = moTiles[nTile];
    const support::PixelRect oRect = GetRect(nTile);
    if (oTile.mnPixels != 0)
    {
        support::Scratch oScratch;
        const std::size_t nStored = GetPitch(nTile);
        mpoFile->ReadRows(oTile.mnPixels, nStored, nStored, oRect.mnHeight, pTarget, nPitch, oScratch);
    }
    else if (oTile.mnBytes != 0)
    {
        const ImagePtr poImage = Decode(*mpoFile, {{{}, oTile.mnOffset, oTile.mnBytes}}, {}, "a tile that was written");
        std::vector<Samples> oSamples;
        for (unsigned int nChannel = 0; nChannel < moEncoder.GetForm().mnChannels; ++nChannel)
            oSamples.push_back(Samples::OfPixels(poImage->comps[nChannel]));
        CopySamples(oSamples, moEncoder.GetForm().moType, oRect.mnWidth, oRect.mnHeight, pTarget, nPitch);
    }
}

void TileStore::WriteBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart,
                           const unsigned char* pSource, std::size_t nPitch)
{
    moBeforeWrite();
    const std::uint64_t nTile = moLayout.GetBlockIndex(oBlock.mnColumn, oBlock.mnRow);
    const support::PixelRect oRect = GetRect(nTile);
    if (oPart.mnWidth == oRect.mnWidth && oPart.mnHeight == oRect.mnHeight)
    {
        Encode(nTile, pSource, nPitch);
        return moHeld.Forget(nTile);
    }
    moHeld.Write({nTile, oRect}, {oRect.mnX + oPart.mnX, oRect.mnY + oPart.mnY, oPart.mnWidth, oPart.mnHeight}, pSource,
                 nPitch, [&](unsigned char* pPixels, std::size_t nHeldPitch) { Load(nTile, pPixels, nHeldPitch); });
}

void TileStore::Encode(std::uint64_t nTile, const unsigned char* pPixels, std::size_t nPitch)
{
    const EncodedTile oEncoded = moEncoder.Encode(GetRect(nTile), pPixels, nPitch);
    Tile oTile = moTiles[nTile];
    oTile.mnBytes = oEncoded.moBytes.size();
    oTile.mnHeaderBytes = static_cast<std::uint32_t>(oEncoded.mnHeaderBytes);
    if (oTile.mnRoom < oTile.mnBytes)
    {
        oTile.mnOffset = std::exchange(mnEnd, mnEnd + oTile.mnBytes);
        oTile.mnRoom = oTile.mnBytes;
    }
    oTile.mnPixels = 0;
    mpoFile->Write(oTile.mnOffset, oEncoded.moBytes.data(), oEncoded.moBytes.size());
    moTiles[nTile] = oTile;
}

void TileStore::PutAside(std::uint64_t nTile, const unsigned char* pPixels)
{
    const std::uint64_t nBytes = std::uint64_t{GetPitch(nTile)} * GetRect(nTile).mnHeight;
    std::uint64_t nPlace = moTiles[nTile].mnPixels;
    if (nPlace == 0)
        nPlace = std::exchange(mnEnd, mnEnd + nBytes);
    mpoFile->Write(nPlace, pPixels, static_cast<std::size_t>(nBytes));
    moTiles[nTile].mnPixels = nPlace;
}

void TileStore::Complete()
{
    mbCompleting = true;
    try
    {
        moHeld.StoreAll();
    }
    catch (...)
    {
        mbCompleting = false;
        throw;
    }
    mbCompleting = false;
    std::vector<unsigned char> oPixels;
    for (std::uint64_t nTile = 0; nTile < moTiles.size(); ++nTile)
    {
        if (moTiles[nTile].mnPixels == 0 && moTiles[nTile].mnBytes != 0)
            continue;
        const std::size_t nPitch = GetPitch(nTile);
        oPixels.assign(nPitch * GetRect(nTile).mnHeight, 0);
        Load(nTile, oPixels.data(), nPitch);
        Encode(nTile, oPixels.data(), nPitch);
    }
}

} // namespace krv::plugins::jp2
