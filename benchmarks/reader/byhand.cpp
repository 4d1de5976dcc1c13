#include "benchmarks/reader/byhand.h"

#include "plugins/support/codec/predictor.h"
#include "toolkit/cache/tilestore.h"
#include "toolkit/core/hmalloc.h"

#include <fcntl.h>
#include <tiffio.h>
#include <unistd.h>

#include <algorithm>
#include <stdexcept>
#include <utility>

namespace krv::benchmarks
{

namespace codec = krv::plugins::codec;

ByHand::ByHand(const SceneFile& oScene)
    : moScene(oScene), mnFile(open(oScene.moPath.c_str(), O_RDONLY)),
      mpTile(static_cast<unsigned char*>(HMalloc(oScene.TileBytes())))
{
    TIFF* const poTiff = TIFFOpen(oScene.moPath.c_str(), "r");
    const unsigned int nTiles = TIFFNumberOfTiles(poTiff);
    std::uint64_t nLargest = 0;
    for (unsigned int nTile = 0; nTile < nTiles; ++nTile)
    {
        moOffsets.push_back(TIFFGetStrileOffset(poTiff, nTile));
        moSizes.push_back(TIFFGetStrileByteCount(poTiff, nTile));
        nLargest = std::max(nLargest, moSizes.back());
    }
    TIFFClose(poTiff);
    moStored.resize(nLargest);
}

ByHand::~ByHand()
{
    close(mnFile);
    HFree(mpTile);
}

const unsigned char* ByHand::ReadTile(unsigned int nTile)
{
    const bool bPlain = moScene.moCodec == "none";
    unsigned char* const pStored = bPlain ? mpTile : moStored.data();
    if (pread(mnFile, pStored, moSizes[nTile], static_cast<off_t>(moOffsets[nTile])) !=
        static_cast<ssize_t>(moSizes[nTile]))
        throw std::runtime_error("short read");
    if (bPlain)
        return mpTile;

    const std::size_t nBytes = moScene.TileBytes();
    const codec::Result oResult = moScene.moCodec == "deflate"
                                      ? moDeflate.Decode(pStored, moSizes[nTile], mpTile, nBytes)
                                  : moScene.moCodec == "lzw" ? moLzw.Decode(pStored, moSizes[nTile], mpTile, nBytes)
                                                             : moZstd.Decode(pStored, moSizes[nTile], mpTile, nBytes);
    if (!oResult.IsDone())
        throw std::runtime_error("cannot decode");
    const SceneKind& oKind = moScene.moKind;
    const codec::BlockShape oShape{moScene.mnTile, moScene.mnTile, oKind.mnChannels, oKind.mnBits / 8};
    if (oKind.mbReal)
        codec::UndoFloatingPoint(mpTile, oShape.GetRowBytes(), mpTile, oShape.GetRowBytes(), oShape, moScratch);
    else
        codec::UndoHorizontal(mpTile, oShape.GetRowBytes(), mpTile, oShape.GetRowBytes(), oShape);
    return mpTile;
}

ByLibtiff::ByLibtiff(const SceneFile& oScene)
    : mpoTiff(TIFFOpen(oScene.moPath.c_str(), "rm")), moTile(oScene.TileBytes())
{
}

ByLibtiff::~ByLibtiff()
{
    TIFFClose(mpoTiff);
}

const unsigned char* ByLibtiff::ReadTile(unsigned int nTile)
{
    ReadTile(nTile, moTile.data());
    return moTile.data();
}

void ByLibtiff::ReadTile(unsigned int nTile, unsigned char* pTarget)
{
    if (TIFFReadEncodedTile(mpoTiff, nTile, pTarget, static_cast<tmsize_t>(moTile.size())) < 0)
        throw std::runtime_error("libtiff cannot decode");
}

CachedTiles::CachedTiles(const SceneFile& oScene) : moSource(oScene), mnTileBytes(oScene.TileBytes())
{
    mnMost = krv::cache::TileStore::Process().GetBudget() / mnTileBytes;
}

const unsigned char* CachedTiles::ReadTile(unsigned int nTile)
{
    const auto oFound = moTiles.find(nTile);
    if (oFound != moTiles.end())
    {
        moUses.splice(moUses.begin(), moUses, oFound->second.moUse);
        return oFound->second.moBytes.data();
    }
    std::vector<unsigned char> oBytes;
    if (moTiles.size() < mnMost)
        oBytes.resize(mnTileBytes);
    else
    {
        oBytes = std::move(moTiles.extract(moUses.back()).mapped().moBytes);
        moUses.pop_back();
    }
    moSource.ReadTile(nTile, oBytes.data());
    moUses.push_front(nTile);
    return (moTiles[nTile] = {std::move(oBytes), moUses.begin()}).moBytes.data();
}

} // namespace krv::benchmarks
