#include "plugins/support/writing/heldblocks.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <random>

using krv::plugins::support::HeldBlocks;
using krv::plugins::support::Intersect;
using krv::plugins::support::PixelRect;

namespace
{

constexpr unsigned int WIDTH = 21, HEIGHT = 17, BLOCK_WIDTH = 8, BLOCK_HEIGHT = 5, COLUMNS = 3;
constexpr std::size_t PIXEL_BYTES = 3;

using Pixels = std::vector<unsigned char>;

PixelRect BlockRect(std::uint64_t nBlock)
{
    const auto nX = static_cast<unsigned int>(nBlock % COLUMNS) * BLOCK_WIDTH;
    const auto nY = static_cast<unsigned int>(nBlock / COLUMNS) * BLOCK_HEIGHT;
    return {nX, nY, std::min(BLOCK_WIDTH, WIDTH - nX), std::min(BLOCK_HEIGHT, HEIGHT - nY)};
}

unsigned char* At(Pixels& oImage, unsigned int nX, unsigned int nY)
{
    return oImage.data() + (std::size_t{nY} * WIDTH + nX) * PIXEL_BYTES;
}

// The file: an image of whole blocks.
class BlockFile
{
public:
    Pixels moImage = Pixels(std::size_t{WIDTH} * HEIGHT * PIXEL_BYTES);
    std::size_t mnStored = 0;

    HeldBlocks::StoreBlock Storer()
    {
        return [this](const HeldBlocks::Block& oBlock, const unsigned char* pPixels)
        {
            ++mnStored;
            Copy(oBlock.moRect, const_cast<unsigned char*>(pPixels), oBlock.moRect.mnWidth * PIXEL_BYTES, true);
        };
    }
    void Copy(const PixelRect& oRect, unsigned char* pPixels, std::size_t nPitch, bool bIntoFile)
    {
        for (unsigned int nRow = 0; nRow < oRect.mnHeight; ++nRow)
        {
            unsigned char* const pFile = At(moImage, oRect.mnX, oRect.mnY + nRow);
            unsigned char* const pRow = pPixels + nRow * nPitch;
            std::copy_n(bIntoFile ? pRow : pFile, oRect.mnWidth * PIXEL_BYTES, bIntoFile ? pFile : pRow);
        }
    }
};

} // namespace

// Whatever is written in parts, and whichever blocks have to make room: file and held blocks together are the image.
TEST(HeldBlocks, FileAndHeldPartsAreTheImageAtAnyTime)
{
    std::mt19937 oRandom(7);
    const auto Below = [&](unsigned int n)
    {
        return static_cast<unsigned int>(oRandom() % n);
    };
    BlockFile oFile;
    // Room for two blocks and a part of a third.
    HeldBlocks oHeld(std::size_t{5} * BLOCK_WIDTH * BLOCK_HEIGHT * PIXEL_BYTES / 2, PIXEL_BYTES, oFile.Storer());
    Pixels oModel = oFile.moImage;
    for (int nRound = 0; nRound < 2000; ++nRound)
    {
        const std::uint64_t nBlock = Below(12);
        const PixelRect oRect = BlockRect(nBlock);
        PixelRect oPart{oRect.mnX + Below(oRect.mnWidth), oRect.mnY + Below(oRect.mnHeight), 0, 0};
        oPart.mnWidth = 1 + Below(oRect.mnX + oRect.mnWidth - oPart.mnX);
        oPart.mnHeight = 1 + Below(oRect.mnY + oRect.mnHeight - oPart.mnY);
        for (unsigned int nY = oPart.mnY; nY < oPart.mnY + oPart.mnHeight; ++nY)
            std::generate_n(At(oModel, oPart.mnX, nY), oPart.mnWidth * PIXEL_BYTES,
                            [&] { return static_cast<unsigned char>(oRandom()); });
        if (nRound % 50 == 49)
        {
            // A block that comes whole goes into the file by itself.
            oHeld.Forget(nBlock);
            const Pixels oSaved = std::exchange(oFile.moImage, oModel);
            Pixels oWhole(std::size_t{oRect.mnWidth} * oRect.mnHeight * PIXEL_BYTES);
            oFile.Copy(oRect, oWhole.data(), oRect.mnWidth * PIXEL_BYTES, false);
            oFile.moImage = oSaved;
            oFile.Copy(oRect, oWhole.data(), oRect.mnWidth * PIXEL_BYTES, true);
        }
        else
            oHeld.Write({nBlock, oRect}, oPart, At(oModel, oPart.mnX, oPart.mnY), std::size_t{WIDTH} * PIXEL_BYTES,
                        [&](unsigned char* pPixels, std::size_t nPitch) { oFile.Copy(oRect, pPixels, nPitch, false); });
        const PixelRect oWindow{Below(WIDTH / 2), Below(HEIGHT / 2), 1 + Below(WIDTH / 2), 1 + Below(HEIGHT / 2)};
        Pixels oSeen = oFile.moImage;
        for (std::uint64_t n = 0; n < 12; ++n)
            oHeld.Overlay(n, oWindow, At(oSeen, oWindow.mnX, oWindow.mnY), std::size_t{WIDTH} * PIXEL_BYTES);
        for (unsigned int nY = oWindow.mnY; nY < oWindow.mnY + oWindow.mnHeight; ++nY)
            ASSERT_TRUE(std::equal(At(oSeen, oWindow.mnX, nY), At(oSeen, oWindow.mnX + oWindow.mnWidth, nY),
                                   At(oModel, oWindow.mnX, nY)))
                << "round " << nRound;
    }
    EXPECT_GT(oFile.mnStored, 1000U);
    oHeld.StoreAll();
    EXPECT_TRUE(oHeld.IsEmpty());
    EXPECT_EQ(oFile.moImage, oModel);
}

// A block that cannot be stored stays held; what is dropped is gone.
TEST(HeldBlocks, AStoreThatFailsLosesNothing)
{
    BlockFile oFile;
    bool bFails = true;
    const auto Store = oFile.Storer();
    HeldBlocks oHeld(1, PIXEL_BYTES,
                     [&](const HeldBlocks::Block& oBlock, const unsigned char* pPixels)
                     {
                         if (bFails)
                             throw std::runtime_error("full");
                         Store(oBlock, pPixels);
                     });
    const Pixels oOnes(std::size_t{BLOCK_WIDTH} * PIXEL_BYTES, 1);
    const auto Write = [&](std::uint64_t nBlock)
    {
        const PixelRect oRect = BlockRect(nBlock);
        oHeld.Write({nBlock, oRect}, {oRect.mnX, oRect.mnY, 1, 1}, oOnes.data(), oOnes.size(),
                    [](unsigned char*, std::size_t) {});
    };
    Write(0);
    EXPECT_THROW(Write(1), std::runtime_error);
    EXPECT_THROW(oHeld.StoreAll(), std::runtime_error);
    bFails = false;
    Write(1);
    oHeld.StoreAll();
    EXPECT_EQ(oFile.mnStored, 2U);
    EXPECT_EQ(*At(oFile.moImage, 0, 0) + *At(oFile.moImage, BLOCK_WIDTH, 0), 2);
    Write(2);
    oHeld.Clear();
    oHeld.StoreAll();
    EXPECT_EQ(oFile.mnStored, 2U);
    EXPECT_EQ(Intersect({0, 0, 4, 4}, {4, 0, 4, 4}).mnWidth, 0U);
}
