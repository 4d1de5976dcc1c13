#include "plugins/jp2/reading/resolution.h"

#include <algorithm>
#include <cmath>
#include <numeric>

namespace krv::plugins::jp2
{

namespace
{

constexpr std::uint64_t SAMPLE_BYTES = 4;
// Decoding a part of a tile takes the samples three times.
constexpr std::uint64_t AREA_SAMPLE_BYTES = 12;
// Smaller tiles are read several at a time.
constexpr std::uint32_t SMALL_BLOCK = 64;
constexpr std::uint32_t USUAL_BLOCK = 256;
constexpr std::uint32_t MOST_TILES = 32; // in a row or column of a block
// Areas end so far from the ends of code-blocks that the filters reach into no further ones: multiples of such a size
// lie inside code-blocks of each band.
constexpr std::uint32_t AREA_STEP = 512;
constexpr std::uint32_t AREA_SHIFT = 48;

struct Axis
{
    std::uint32_t mnImage; // first position of the image
    std::uint32_t mnTile;  // of the tiles
    std::uint32_t mnTileSize;
    std::uint32_t mnTiles;
    std::uint32_t mnPixels; // of the image at the resolution
};

// So many pixels that their edges are those of tiles; 0 when none are.
std::uint32_t FindTileBlock(const Axis& oAxis, unsigned int nReduce)
{
    if (oAxis.mnTiles == 1)
        return oAxis.mnPixels;
    if (ShiftUp(oAxis.mnImage, nReduce) != ShiftUp(oAxis.mnTile, nReduce))
        return 0;
    const std::uint64_t nScale = std::uint64_t{1} << nReduce;
    std::uint64_t nTiles = nScale / std::gcd(std::uint64_t{oAxis.mnTileSize}, nScale);
    const std::uint64_t nPixels = nTiles * oAxis.mnTileSize / nScale;
    if (nTiles > MOST_TILES)
        return 0;
    if (nPixels < SMALL_BLOCK)
        nTiles *= std::clamp<std::uint64_t>(USUAL_BLOCK / nPixels, 1, MOST_TILES / nTiles);
    return static_cast<std::uint32_t>(std::min<std::uint64_t>(nTiles * oAxis.mnTileSize / nScale, oAxis.mnPixels));
}

std::uint32_t ChooseBlock(const Axis& oAxis, unsigned int nReduce)
{
    const std::uint32_t nBlock = FindTileBlock(oAxis, nReduce);
    if (nBlock != 0)
        return nBlock;
    return std::min(oAxis.mnPixels, std::max(USUAL_BLOCK, oAxis.mnTileSize >> nReduce));
}

} // namespace

Resolution::Resolution(const Codestream& oStream, unsigned int nReduce, std::size_t nComponents,
                       std::uint64_t nBlockBytes)
    : moStream(oStream), mnReduce(nReduce)
{
    const GridRect& oImage = oStream.GetImage();
    moPixels = {ShiftUp(oImage.mnX0, nReduce), ShiftUp(oImage.mnY0, nReduce), ShiftUp(oImage.mnX1, nReduce),
                ShiftUp(oImage.mnY1, nReduce)};
    for (const Component& oOne : oStream.GetComponents())
    {
        moStepsX.insert(oOne.mnStepX);
        moStepsY.insert(oOne.mnStepY);
    }
    if (GetWidth() > 0 && GetHeight() > 0)
        ChooseBlocks(nComponents, nBlockBytes);
}

void Resolution::ChooseBlocks(std::size_t nComponents, std::uint64_t nBlockBytes)
{
    const GridRect& oImage = moStream.GetImage();
    mnBlockWidth = ChooseBlock(
        {oImage.mnX0, moStream.GetTileLeft(), moStream.GetTileWidth(), moStream.GetTilesAcross(), GetWidth()},
        mnReduce);
    mnBlockHeight = ChooseBlock(
        {oImage.mnY0, moStream.GetTileTop(), moStream.GetTileHeight(), moStream.GetTilesDown(), GetHeight()}, mnReduce);
    if (std::uint64_t{mnBlockWidth} * mnBlockHeight <= nBlockBytes / SAMPLE_BYTES / nComponents)
        return;
    const auto ToArea = [](double nSize) -> std::uint32_t
    {
        const auto nPixels = static_cast<std::uint32_t>(std::max(nSize, static_cast<double>(SMALL_BLOCK)));
        return nPixels < AREA_STEP + AREA_SHIFT ? nPixels : (nPixels - AREA_SHIFT) / AREA_STEP * AREA_STEP + AREA_SHIFT;
    };
    const double nPixels = static_cast<double>(nBlockBytes / AREA_SAMPLE_BYTES) / static_cast<double>(nComponents);
    const double nSide = std::sqrt(nPixels);
    if (mnBlockHeight <= nSide)
        mnBlockWidth = ToArea(nPixels / mnBlockHeight);
    else if (mnBlockWidth <= nSide)
        mnBlockHeight = ToArea(nPixels / mnBlockWidth);
    else
        mnBlockWidth = mnBlockHeight = ToArea(nSide);
}

// With the sample that the first pixel repeats: the one before it, or the first one of all.
std::pair<std::uint32_t, std::uint32_t> Resolution::FindSpan(std::uint32_t nImageBegin, std::uint32_t nImageEnd,
                                                             const std::set<std::uint32_t>& oSteps,
                                                             std::uint32_t nBegin, std::uint32_t nPixels) const
{
    const std::uint64_t nFirst = std::uint64_t{ShiftUp(nImageBegin, mnReduce)} + nBegin;
    std::uint64_t nFrom = nFirst, nTo = nFirst + nPixels;
    for (const std::uint32_t nStep : oSteps)
    {
        nFrom = std::min(nFrom, nFirst - nFirst % nStep);
        const std::uint64_t nFirstSample = std::uint64_t{ShiftUp(DivideUp(nImageBegin, nStep), mnReduce)} * nStep;
        nTo = std::max(nTo, nFirst < nFirstSample ? nFirstSample + 1 : 0);
    }
    nFrom = std::max<std::uint64_t>(nFrom, ShiftUp(nImageBegin, mnReduce));
    return {static_cast<std::uint32_t>(nFrom << mnReduce),
            static_cast<std::uint32_t>(std::min<std::uint64_t>(((nTo - 1) << mnReduce) + 1, nImageEnd))};
}

GridRect Resolution::FindArea(const support::PixelRect& oPixels) const
{
    const GridRect& oImage = moStream.GetImage();
    const auto [nX0, nX1] = FindSpan(oImage.mnX0, oImage.mnX1, moStepsX, oPixels.mnX, oPixels.mnWidth);
    const auto [nY0, nY1] = FindSpan(oImage.mnY0, oImage.mnY1, moStepsY, oPixels.mnY, oPixels.mnHeight);
    return {nX0, nY0, nX1, nY1};
}

bool Resolution::HasEmptyTiles() const
{
    return std::min(moStream.GetTileWidth(), moStream.GetTileHeight()) >> mnReduce == 0;
}

bool Resolution::IsSame(const GridRect& oFirst, const GridRect& oSecond) const
{
    const auto Reduce = [this](const GridRect& oRect)
    {
        return GridRect{ShiftUp(oRect.mnX0, mnReduce), ShiftUp(oRect.mnY0, mnReduce), ShiftUp(oRect.mnX1, mnReduce),
                        ShiftUp(oRect.mnY1, mnReduce)};
    };
    return Reduce(oFirst) == Reduce(oSecond);
}

std::uint32_t Resolution::FindFirstSampleX(const GridRect& oArea, const Component& oComponent) const
{
    return ShiftUp(DivideUp(oArea.mnX0, oComponent.mnStepX), mnReduce);
}

std::uint32_t Resolution::FindFirstSampleY(const GridRect& oArea, const Component& oComponent) const
{
    return ShiftUp(DivideUp(oArea.mnY0, oComponent.mnStepY), mnReduce);
}

} // namespace krv::plugins::jp2
