#include "gobs/tile/tileiterator.h"
#include "tests/support/thrown.h"

#include <gtest/gtest.h>

#include <vector>

using namespace krv;
using namespace krv::gobs;

TEST(TileIteratorTest, OutsideTheGrid)
{
    TileIterator oGrid(11, 7);
    oGrid.SetChunkSize(4, 3);
    EXPECT_EQ(oGrid.GetTileIndex(11, 0), 9u);
    EXPECT_EQ(oGrid.GetTileIndex(0, 7), 9u);
    EXPECT_EQ(oGrid.GetTileIndex(0xFFFFFFFFu, 0xFFFFFFFFu), 9u);
    const auto oError = test::Thrown<OutOfBoundsException>([&] { oGrid.GetTile(9); });
    EXPECT_EQ(oError.GetIndices(), std::vector<unsigned int>{9});
}

TEST(TileIteratorTest, ImagesWithoutPixelsHaveNoTiles)
{
    for (const auto& [nWidth, nHeight] : {std::pair{0u, 0u}, {0u, 5u}, {5u, 0u}})
    {
        TileIterator oGrid(nWidth, nHeight);
        oGrid.SetChunkSize(2, 2);
        EXPECT_EQ(oGrid.GetTileRange(), 4294967295u);
        EXPECT_EQ(oGrid.GetTileIndex(0, 0), 0u);
        EXPECT_THROW(oGrid.GetTile(0), OutOfBoundsException);
    }
}

TEST(TileIteratorTest, LargestImages)
{
    TileIterator oGrid(0xFFFFFFFFu, 0xFFFFFFFFu);
    EXPECT_THROW(oGrid.SetChunkSize(0, 0), DataException);
    EXPECT_EQ(oGrid.GetTileRange(), 0u); // as before
    oGrid.SetChunkSize(0x80000000u, 0x80000001u);
    EXPECT_EQ(oGrid.GetTileRange(), 3u);
    EXPECT_EQ(oGrid.GetTile(3), Tile(0x80000000u, 0x80000001u, 0x7FFFFFFFu, 0x7FFFFFFEu));
    EXPECT_EQ(oGrid.GetTileIndex(0xFFFFFFFEu, 0xFFFFFFFEu), 3u);

    TileIterator oLine(0xFFFFFFFFu, 1);
    oLine.SetChunkSize(0, 0);
    EXPECT_EQ(oLine.GetTileRange(), 0xFFFFFFFEu);
    EXPECT_EQ(oLine.GetTile(0xFFFFFFFEu), Tile(0xFFFFFFFEu, 0, 1, 1));
    EXPECT_EQ(oLine.GetTileIndex(0xFFFFFFFEu, 0), 0xFFFFFFFEu);
    EXPECT_THROW(oLine.GetTile(0xFFFFFFFFu), OutOfBoundsException);
    // A grid of 65535 x 65537 tiles has as many as can be counted, one more row too many.
    TileIterator oMost(65535, 65538);
    EXPECT_THROW(oMost.SetChunkSize(1, 1), DataException);
    oMost.SetChunkSize(1, 2);
    EXPECT_EQ(oMost.GetTileRange(), 65535u * 32769u - 1);
}
