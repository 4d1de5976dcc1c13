// Counts the no-data pixels of real files and compares them with a table of facts, when the folder with both is there.

#include "datasources/interfaces/idataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/nodatavalue.h"
#include "datasources/metadata/typednodata.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/rasterrange.h"
#include "datasources/reader/validitysource.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/raster.h"
#include "tests/support/facts.h"
#include "toolkit/exceptions/exceptions.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

namespace krv::datasources
{

namespace
{

using krv::test::DataFolder;
using krv::test::Facts;

std::uint64_t CountMasked(const std::string& file, unsigned int nChannel, const krv::gobs::IMaskBuilder& oBuilder)
{
    BasicReader oReader(file, {nChannel});
    std::uint64_t nCount = 0;
    for (const auto poTile : RasterRange(oReader))
        nCount += std::unique_ptr<krv::gobs::Mask>(oBuilder.BuildMask(*poTile))->CountSet();
    return nCount;
}

} // namespace

class RealNoData : public testing::Test
{
protected:
    void SetUp() override
    {
        if (krv::test::GetFacts().empty())
            GTEST_SKIP() << "there are no real files in " << DataFolder();
    }
};

TEST_F(RealNoData, MaskCountsAgreeWithTheFacts)
{
    unsigned int nCounted = 0;
    for (const Facts& oFacts : krv::test::GetFacts())
    {
        const auto oCounts = oFacts.List("band_no_data_count");
        SCOPED_TRACE(oFacts["file"]);
        for (std::size_t n = 0; n < oCounts.size() && oFacts.Has("no_data"); ++n)
        {
            const auto nChannel = static_cast<unsigned int>(n + 1);
            const std::uint64_t nExpected = std::stoull(oCounts[n]);
            ++nCounted;
            const BasicReader oReader(oFacts.GetPath(), {nChannel});
            const AuxiliaryData oMetadata = oReader.GetAuxiliaryData();
            EXPECT_EQ(GetNoDataText(oMetadata, 1), oFacts["no_data"]);
            const std::unique_ptr<krv::gobs::IMaskBuilder> oTyped(
                GetTypedNoDataMaskBuilder(oMetadata, krv::gobs::eAnyChannel));
            EXPECT_EQ(CountMasked(oFacts.GetPath(), nChannel, *oTyped), nExpected);
            if (GetTypedNoData(oMetadata, 1)->IsNaN())
            {
                EXPECT_THROW(GetNoDataMaskBuilder(oMetadata, krv::gobs::eAnyChannel), krv::Exception);
                continue;
            }
            const std::unique_ptr<krv::gobs::IMaskBuilder> oPlain(
                GetNoDataMaskBuilder(oMetadata, krv::gobs::eAnyChannel));
            EXPECT_EQ(CountMasked(oFacts.GetPath(), nChannel, *oPlain), nExpected);
        }
    }
    EXPECT_GT(nCounted, 20U);
}

TEST_F(RealNoData, ValidityAddsBitmapsAndAlpha)
{
    struct Case
    {
        const char* mpFile;
        bool mbNoData, mbBitmap, mbAlpha;
    };
    const Case CASES[] = {{"mask/cog_uint8_rgb_nodata.tif", true, false, false},
                          {"mask/cog_uint8_rgb_mask.tif", false, true, false},
                          {"mask/cog_uint8_rgba.tif", false, false, true}};
    std::vector<std::uint64_t> oCounts;
    for (const Case& oCase : CASES)
    {
        SCOPED_TRACE(oCase.mpFile);
        const std::unique_ptr<IDataset> oDataset(
            DatasetManager::GetInstance()->Open(DataFolder() + "/" + oCase.mpFile, eReadOnly));
        const ValiditySource oSource(oDataset.get());
        EXPECT_EQ(oSource.HasNoData(), oCase.mbNoData);
        EXPECT_EQ(oSource.HasBitmap(), oCase.mbBitmap);
        EXPECT_EQ(oSource.HasAlpha(), oCase.mbAlpha);
        BasicReader oReader(oDataset.get(), {}, false);
        std::uint64_t nValid = 0;
        for (const auto poTile : RasterRange(oReader))
            nValid += std::unique_ptr<krv::gobs::Mask>(oSource.BuildMask(*poTile))->CountSet();
        EXPECT_GT(nValid, 0u);
        EXPECT_LT(nValid, std::uint64_t{oReader.GetWidth()} * oReader.GetHeight());
        oCounts.push_back(nValid);
    }
    // The same scene, whose missing pixels are marked in three ways.
    EXPECT_EQ(oCounts[1], oCounts[2]);
}

} // namespace krv::datasources
