#pragma once

#include "benchmarks/support/scene.h"
#include "plugins/support/codec/deflate.h"
#include "plugins/support/codec/lzw.h"
#include "plugins/support/codec/zstd.h"

#include <cstdint>
#include <list>
#include <unordered_map>
#include <vector>

struct tiff;

namespace krv::benchmarks
{

// The best straight code for the tiles of one file: pread of the stored bytes, the codec library, the vectorised
// predictor, one reused buffer. No other layer in between.
class ByHand
{
public:
    explicit ByHand(const SceneFile& oScene);
    ~ByHand();
    ByHand(const ByHand&) = delete;
    ByHand& operator=(const ByHand&) = delete;

    // Returns the decoded tile; valid until the next call.
    const unsigned char* ReadTile(unsigned int nTile);

private:
    SceneFile moScene;
    int mnFile;
    std::vector<std::uint64_t> moOffsets;
    std::vector<std::uint64_t> moSizes;
    std::vector<unsigned char> moStored;
    std::vector<unsigned char> moScratch;
    unsigned char* mpTile;
    krv::plugins::codec::DeflateDecoder moDeflate;
    krv::plugins::codec::LzwDecoder moLzw;
    krv::plugins::codec::ZstdDecoder moZstd;
};

// libtiff's own decoding of the tiles, mapping off, one reused buffer.
class ByLibtiff
{
public:
    explicit ByLibtiff(const SceneFile& oScene);
    ~ByLibtiff();
    ByLibtiff(const ByLibtiff&) = delete;
    ByLibtiff& operator=(const ByLibtiff&) = delete;

    const unsigned char* ReadTile(unsigned int nTile);
    void ReadTile(unsigned int nTile, unsigned char* pTarget);

private:
    tiff* mpoTiff;
    std::vector<unsigned char> moTile;
};

// The same behind a cache of tiles that holds as many bytes as the process's; the least recently used go first.
class CachedTiles
{
public:
    explicit CachedTiles(const SceneFile& oScene);

    const unsigned char* ReadTile(unsigned int nTile);

private:
    struct Tile
    {
        std::vector<unsigned char> moBytes;
        std::list<unsigned int>::iterator moUse;
    };

    ByLibtiff moSource;
    std::size_t mnTileBytes;
    std::size_t mnMost;             // tiles
    std::list<unsigned int> moUses; // the latest first
    std::unordered_map<unsigned int, Tile> moTiles;
};

} // namespace krv::benchmarks
