#include "operations/checksum/checksums.h"

#include "datasources/reader/basicreader.h"
#include "operations/job/exceptions.h"
#include "tests/operations/image.h"
#include "tests/support/recipe.h"

#include <gtest/gtest.h>
#include <zlib.h>

#include <algorithm>
#include <memory>
#include <string>
#include <vector>

namespace krv::operations
{

namespace
{

using krv::datasources::BasicReader;

TEST(Checksums, AreThoseOfTheRowMajorPixelsWhateverTheTiles)
{
    for (const auto eType : {krv::gobs::eDT_8U, krv::gobs::eDT_16S, krv::gobs::eDT_32R, krv::gobs::eDT_64R,
                             krv::gobs::eDT_C16S, krv::gobs::eDT_C64R})
    {
        for (const unsigned int nChannels : {1U, 2U, 3U, 4U, 5U})
        {
            const auto poImage = krv::test::MakeImage(nChannels, eType);
            for (const auto& [nTileWidth, nTileHeight] : {std::pair{8U, 6U}, {21U, 4U}, {1U, 1U}, {64U, 64U}})
            {
                BasicReader oReader(poImage.get(), {}, false);
                oReader.SetTileSize(nTileWidth, nTileHeight);
                const auto oSums = ComputeChecksums(oReader);
                for (unsigned int c = 1; c <= nChannels; ++c)
                {
                    const std::string bytes = krv::test::RecipeImage(21, 17, {c}, eType);
                    EXPECT_EQ(oSums.at(c - 1),
                              crc32(0, reinterpret_cast<const Bytef*>(bytes.data()), static_cast<uInt>(bytes.size())))
                        << "type " << eType << ", channel " << c << " of " << nChannels << ", tile " << nTileWidth;
                }
            }
        }
    }
}

TEST(Progress, CountsToItsTotalAndStopsTheJob)
{
    const auto poImage = krv::test::MakeImage(1, krv::gobs::eDT_16U);
    BasicReader oReader(poImage.get(), {}, false);
    oReader.SetTileSize(8, 6);
    std::vector<std::uint64_t> oDone;
    ComputeChecksums(oReader,
                     [&](const Amount& oAmount)
                     {
                         EXPECT_EQ(oAmount.total, 21U * 17 * 2);
                         oDone.push_back(oAmount.done);
                         return true;
                     });
    EXPECT_TRUE(oDone.front() == 0 && oDone.back() == 21U * 17 * 2 && std::is_sorted(oDone.begin(), oDone.end()));
    EXPECT_THROW(ComputeChecksums(oReader, [](const Amount& oAmount) { return oAmount.done < 100; }), StoppedException);
}

} // namespace

} // namespace krv::operations
