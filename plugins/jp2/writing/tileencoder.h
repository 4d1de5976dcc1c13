#pragma once

#include "gobs/raster/datatype.h"
#include "plugins/jp2/writing/createoptions.h"
#include "plugins/support/image/imagelayout.h"

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

namespace krv::plugins::jp2
{

// The form of an image that is encoded tile by tile.
struct ImageForm
{
    std::uint32_t mnWidth = 0;
    std::uint32_t mnHeight = 0;
    unsigned int mnChannels = 1;
    krv::gobs::DataType moType;
    unsigned int mnBits = 8; // of a sample
};

// A codestream of one tile, and where in it the main header ends: the rest but for the last marker is the tile.
struct EncodedTile
{
    std::vector<unsigned char> moBytes;
    std::size_t mnHeaderBytes = 0;
};

constexpr std::size_t END_BYTES = 2; // the last marker

// Encodes each tile with a codec of its own, at its place on the reference grid: tiles may come in any order, and from
// any thread.
class TileEncoder
{
public:
    TileEncoder(std::string fileName, const CreateOptions& oOptions, const ImageForm& oForm);

    const ImageForm& GetForm() const { return moForm; }
    bool HasColourTransform() const { return mbColourTransform; }
    std::uint32_t GetTileWidth() const { return moOptions.mnTileWidth; }
    std::uint32_t GetTileHeight() const { return moOptions.mnTileHeight; }

    // oTile: of the image; pixel-interleaved samples, rows nPitch bytes apart; those beyond the bits that are stored
    // become the nearest that fit. Throws IOException with OpenJPEG's words when it fails.
    EncodedTile Encode(const support::PixelRect& oTile, const unsigned char* pPixels, std::size_t nPitch) const;

private:
    unsigned int ChooseLevels() const;

    std::string moFileName;
    CreateOptions moOptions;
    ImageForm moForm;
    bool mbColourTransform;
    unsigned int mnLevels;
};

} // namespace krv::plugins::jp2
