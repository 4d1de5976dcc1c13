#include "operations/checksum/checksums.h"

#include "datasources/reader/basicreader.h"
#include "operations/job/exceptions.h"
#include "tests/operations/image.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <vector>

namespace krv::operations
{

namespace
{

using krv::datasources::BasicReader;

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
