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
#include "toolkit/exceptions/exceptions.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <memory>
#include <sstream>
#include <string>
#include <vector>

namespace krv::datasources
{

namespace
{

std::string DataFolder()
{
    const char* const pFolder = std::getenv("KRV_TEST_DATA");
    return pFolder != nullptr ? pFolder : KRV_TEST_DATA;
}

std::vector<std::string> Split(const std::string& text, char cSeparator)
{
    std::vector<std::string> oParts;
    std::stringstream oStream(text);
    for (std::string part; std::getline(oStream, part, cSeparator);)
        oParts.push_back(part);
    return oParts;
}

struct Fact
{
    std::string moFile;
    std::string moText;
    std::vector<std::string> moCounts; // one a channel
};

std::size_t Column(const std::vector<std::string>& oNames, const std::string& name)
{
    return static_cast<std::size_t>(std::find(oNames.begin(), oNames.end(), name) - oNames.begin());
}

// The files that have a no-data value and a count for it.
std::vector<Fact> ReadFacts()
{
    std::ifstream oStream(DataFolder() + "/FACTS.tsv");
    std::string line;
    std::getline(oStream, line);
    const auto oNames = Split(line, '\t');
    const std::size_t nText = Column(oNames, "no_data");
    const std::size_t nCount = Column(oNames, "band_no_data_count");
    std::vector<Fact> oFacts;
    while (std::getline(oStream, line))
    {
        const auto oValues = Split(line, '\t');
        if (oValues.size() > nCount && oValues[nText] != "-" && oValues[nCount] != "-")
            oFacts.push_back({DataFolder() + "/" + oValues[0], oValues[nText], Split(oValues[nCount], ';')});
    }
    return oFacts;
}

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
        if (!std::filesystem::exists(DataFolder() + "/FACTS.tsv"))
            GTEST_SKIP() << "there are no real files in " << DataFolder();
    }
};

TEST_F(RealNoData, MaskCountsAgreeWithTheFacts)
{
    const auto oFacts = ReadFacts();
    ASSERT_GT(oFacts.size(), 20u);
    for (const Fact& oFact : oFacts)
    {
        SCOPED_TRACE(oFact.moFile);
        for (std::size_t n = 0; n < oFact.moCounts.size(); ++n)
        {
            const auto nChannel = static_cast<unsigned int>(n + 1);
            const BasicReader oReader(oFact.moFile, {nChannel});
            const AuxiliaryData oMetadata = oReader.GetAuxiliaryData();
            EXPECT_EQ(GetNoDataText(oMetadata, 1), oFact.moText);
            const std::unique_ptr<krv::gobs::IMaskBuilder> oTyped(
                GetTypedNoDataMaskBuilder(oMetadata, krv::gobs::eAnyChannel));
            EXPECT_EQ(CountMasked(oFact.moFile, nChannel, *oTyped), std::stoull(oFact.moCounts[n]));
            if (GetTypedNoData(oMetadata, 1)->IsNaN())
            {
                EXPECT_THROW(GetNoDataMaskBuilder(oMetadata, krv::gobs::eAnyChannel), krv::Exception);
                continue;
            }
            const std::unique_ptr<krv::gobs::IMaskBuilder> oPlain(
                GetNoDataMaskBuilder(oMetadata, krv::gobs::eAnyChannel));
            EXPECT_EQ(CountMasked(oFact.moFile, nChannel, *oPlain), std::stoull(oFact.moCounts[n]));
        }
    }
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
