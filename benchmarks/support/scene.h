#pragma once

#include <string>

namespace krv::benchmarks
{

// An image of terrain, nSize x nSize pixels in square tiles, made for measuring.
struct SceneKind
{
    std::string moName;
    unsigned int mnChannels;
    unsigned int mnBits;
    bool mbReal;
};

struct SceneFile
{
    SceneKind moKind;
    std::string moCodec; // none, deflate, lzw, zstd; the compressed ones with the predictor of the kind
    unsigned int mnTile;
    unsigned int mnSize;
    std::string moPath;

    unsigned long long TileBytes() const { return 1ull * mnTile * mnTile * mnChannelsBytes(); }
    unsigned int mnChannelsBytes() const { return moKind.mnChannels * moKind.mnBits / 8; }
    unsigned int TilesAcross() const { return (mnSize + mnTile - 1) / mnTile; }
};

// Writes the file below a folder unless it is there from an earlier run.
SceneFile MakeScene(const std::string& folder, const SceneKind& oKind, const std::string& codec, unsigned int nTile,
                    unsigned int nSize);

// A tiled 8-bit file without a single stored block.
std::string MakeSparse(const std::string& folder, unsigned int nSize, unsigned int nTile);

} // namespace krv::benchmarks
