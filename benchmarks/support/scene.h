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
    unsigned int mnSize; // the width, and the height unless that is given
    std::string moPath;
    unsigned int mnHeight = 0;

    unsigned long long TileBytes() const { return 1ull * mnTile * mnTile * mnChannelsBytes(); }
    unsigned int mnChannelsBytes() const { return moKind.mnChannels * moKind.mnBits / 8; }
    unsigned int TilesAcross() const { return (mnSize + mnTile - 1) / mnTile; }
    unsigned int TilesDown() const { return ((mnHeight == 0 ? mnSize : mnHeight) + mnTile - 1) / mnTile; }
};

// Writes the file below a folder unless it is there from an earlier run.
SceneFile MakeScene(const std::string& folder, const SceneKind& oKind, const std::string& codec, unsigned int nTile,
                    unsigned int nSize, unsigned int nHeight = 0);

// The same terrain, 8 bits or one, laid out otherwise.
struct Layout
{
    std::string moName;
    unsigned int mnChannels;
    unsigned int mnBits;
    unsigned int mnCompression; // of libtiff
    unsigned int mnTile;        // 0: strips of 16 rows
    bool mbSeparate;
};

// Writes the file, nSize x nSize pixels, a multiple of 256, unless it is there, and returns its path.
std::string MakeLayout(const std::string& folder, const Layout& oLayout, unsigned int nSize);

// A tiled 8-bit file without a single stored block.
std::string MakeSparse(const std::string& folder, unsigned int nSize, unsigned int nTile);

} // namespace krv::benchmarks
