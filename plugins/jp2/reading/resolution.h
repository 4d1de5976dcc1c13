#pragma once

#include "plugins/jp2/reading/codestream.h"
#include "plugins/support/image/imagelayout.h"

#include <cstdint>
#include <set>
#include <utility>

namespace krv::plugins::jp2
{

// An image at one of its resolutions: how the pixels are cut into blocks, and which part of the codestream a block
// takes. Pixels are those of the reference grid, or of every 2^n-th of its lines.
class Resolution
{
public:
    // Of the samples of a block while it is decoded, by each thread.
    static constexpr std::uint64_t BLOCK_BYTES = std::uint64_t{208} << 20;

    // nReduce: resolutions left out. nComponents: how many are decoded together at most.
    Resolution(const Codestream& oStream, unsigned int nReduce, std::size_t nComponents,
               std::uint64_t nBlockBytes = BLOCK_BYTES);

    unsigned int GetReduce() const { return mnReduce; }
    std::uint32_t GetWidth() const { return moPixels.mnX1 - moPixels.mnX0; }
    std::uint32_t GetHeight() const { return moPixels.mnY1 - moPixels.mnY0; }
    // Blocks are tiles of the codestream, some of them together where they are small, or areas where they are large or
    // do not lie on one grid.
    std::uint32_t GetBlockWidth() const { return mnBlockWidth; }
    std::uint32_t GetBlockHeight() const { return mnBlockHeight; }

    // The part of the reference grid whose samples make a rectangle of the image, no larger than it has to be: tiles
    // without a pixel at this resolution cannot be decoded.
    GridRect FindArea(const support::PixelRect& oPixels) const;
    // Whether two parts of the grid have the same pixels.
    bool IsSame(const GridRect& oFirst, const GridRect& oSecond) const;
    // Whether there are tiles without a pixel between others.
    bool HasEmptyTiles() const;
    // Of a component: the first sample that decoding an area gives.
    std::uint32_t FindFirstSampleX(const GridRect& oArea, const Component& oComponent) const;
    std::uint32_t FindFirstSampleY(const GridRect& oArea, const Component& oComponent) const;
    // The reference grid's position of the image's first pixel at this resolution.
    std::uint32_t GetFirstX() const { return moPixels.mnX0; }
    std::uint32_t GetFirstY() const { return moPixels.mnY0; }

private:
    void ChooseBlocks(std::size_t nComponents, std::uint64_t nBlockBytes);
    std::pair<std::uint32_t, std::uint32_t> FindSpan(std::uint32_t nImageBegin, std::uint32_t nImageEnd,
                                                     const std::set<std::uint32_t>& oSteps, std::uint32_t nBegin,
                                                     std::uint32_t nPixels) const;

    const Codestream& moStream;
    unsigned int mnReduce;
    GridRect moPixels;
    std::uint32_t mnBlockWidth = 0;
    std::uint32_t mnBlockHeight = 0;
    std::set<std::uint32_t> moStepsX; // of the components
    std::set<std::uint32_t> moStepsY;
};

} // namespace krv::plugins::jp2
