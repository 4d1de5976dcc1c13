#include "datasources/reader/basicoverviewreaderaccessor.h"

#include "datasources/reader/irasterreader.h"
#include "tests/datasources/reader/readertest.h"

#include <cstdlib>

using namespace krv::datasources;
using namespace krv::test;

namespace
{

class OverviewAccessorTest : public ReaderTest
{
protected:
    OverviewAccessorTest() { unsetenv("KRV_GENERIC_LIVE"); }

    BasicOverviewReaderAccessor Accessor(const Channels& oChannels)
    {
        if (moDataset == nullptr)
            moDataset = MakeDataset();
        return BasicOverviewReaderAccessor(dynamic_cast<IRasterDataset*>(moDataset.get()), oChannels);
    }

    // Makes the generic format known and puts levels beside the file.
    void AddGeneric(const std::string& levels)
    {
        moHome.Add(std::string(KRV_TEST_PLUGINS) + "/generic.so");
        DatasetManager::DestroyInstance();
        moHome.GetFolder().Write("image.test.ovrtest", levels);
        moModel->moName = moFile;
    }

    static int GenericLive()
    {
        const char* const pCount = std::getenv("KRV_GENERIC_LIVE");
        return pCount == nullptr ? -1 : std::atoi(pCount); // -1: nothing was ever opened
    }

    std::unique_ptr<IDataset> moDataset;
};

} // namespace

TEST_F(OverviewAccessorTest, ChecksItsArguments)
{
    const auto oDataset = MakeDataset();
    EXPECT_EQ(Error([] { BasicOverviewReaderAccessor(nullptr, {1}); }), "data: The raster dataset is NULL");
    EXPECT_EQ(Error([&] { Accessor({}); }), "data: oReadChans is empty");
    const auto oException = Thrown<krv::DataException>([] { BasicOverviewReaderAccessor(nullptr, {}); });
    ExpectPlace(oException, "BasicOverviewReaderAccessor::BasicOverviewReaderAccessor(",
                "datasources/reader/basicoverviewreaderaccessor", oException.GetLine());
}

TEST_F(OverviewAccessorTest, LevelsOfTheDatasetItself)
{
    AddGeneric("16 32");
    moModel->moLevels = {2, 4, 8};
    moModel->moOutdated = {{2, 4}, {3, 8}};
    BasicOverviewReaderAccessor oAccessor = Accessor({3, 1});
    EXPECT_EQ(oAccessor.GetLevels(), (Channels{2, 4, 8}));
    EXPECT_EQ(GenericLive(), -1); // no second opening
    EXPECT_EQ(oAccessor.GetChanCount(), 2u);
    EXPECT_TRUE(oAccessor.IsValid(1, 4)); // position 1 is channel 3
    EXPECT_FALSE(oAccessor.IsValid(1, 8));
    EXPECT_TRUE(oAccessor.IsValid(2, 8));
    EXPECT_FALSE(oAccessor.IsValid(2, 3));
    for (const unsigned int nPosition : {0u, 3u})
        EXPECT_EQ(Error([&] { oAccessor.IsValid(nPosition, 2); }), "bounds: Out of bounds.");
    EXPECT_TRUE(oAccessor.IsLevelValid(4));
    EXPECT_FALSE(oAccessor.IsLevelValid(8));
    EXPECT_FALSE(Accessor({1, 2}).IsLevelValid(4));

    const AuxiliaryData oData = oAccessor.GetAuxiliaryData(4);
    EXPECT_EQ(oData.GetFileMetadataValue("level"), "4");
    ASSERT_EQ(oData.GetChannelCount(), 2u);
    EXPECT_EQ(oData.GetChanMetadataValue("band", 1), "b3");
    EXPECT_EQ(oData.GetChanMetadataValue("band", 2), "b1");
    EXPECT_EQ(oData.GetChannelDescription(1), ""); // descriptions are not copied

    const std::unique_ptr<IRasterReader> oReader(oAccessor.CreateRasterReader(4));
    EXPECT_EQ(oReader->GetWidth(), 6u);
    EXPECT_EQ(oReader->GetTileWidth(), 8u);
    EXPECT_EQ(ReadPixels(*oReader), LevelImage(*moModel, 4, {3, 1}));
    EXPECT_EQ(oReader->GetOverviewReaderAccessor(), nullptr);
    EXPECT_EQ(Error([&] { oAccessor.CreateRasterReader(3); }), "data: synthetic: no level 3");
}

TEST_F(OverviewAccessorTest, LevelsBesideTheFileThroughTheGenericFormat)
{
    AddGeneric("2 16");
    for (const bool bManager : {false, true})
    {
        moModel->mbOverviewManager = bManager; // no facet at all, or one without levels
        {
            const auto poFirst = std::make_unique<BasicOverviewReaderAccessor>(Accessor({1, 2}));
            BasicOverviewReaderAccessor oCopy(Accessor({3}));
            oCopy = *poFirst;
            EXPECT_EQ(oCopy.GetLevels(), (Channels{2, 16}));
            EXPECT_EQ(oCopy.GetChanCount(), 2u);
            const std::unique_ptr<IRasterReader> oReader(oCopy.CreateRasterReader(16));
            EXPECT_EQ(oReader->GetHeight(), 2u);
            EXPECT_EQ(GenericLive(), 1); // copies share
        }
        EXPECT_EQ(GenericLive(), 0);
    }
    EXPECT_EQ(moProbe.GetLive(), 1); // the dataset: every manager went
}

TEST_F(OverviewAccessorTest, NothingAnywhere)
{
    for (const char* pGeneric : {"none", "closed", "without levels"})
    {
        SCOPED_TRACE(pGeneric);
        if (pGeneric == std::string("closed"))
        {
            AddGeneric("");
            moModel->moName = "elsewhere"; // the generic format cannot open it
        }
        if (pGeneric == std::string("without levels"))
            moModel->moName = moFile;
        for (const bool bManager : {false, true})
        {
            moModel->mbOverviewManager = bManager;
            BasicOverviewReaderAccessor oAccessor = Accessor({1});
            EXPECT_TRUE(oAccessor.GetLevels().empty());
            EXPECT_FALSE(oAccessor.IsValid(1, 2));
            EXPECT_FALSE(oAccessor.IsLevelValid(2));
            EXPECT_EQ(Error([&] { oAccessor.IsValid(2, 2); }), "bounds: Out of bounds.");
            EXPECT_EQ(Error([&] { oAccessor.CreateRasterReader(2); }).substr(0, 6), "data: ");
            if (!bManager)
            {
                EXPECT_EQ(oAccessor.GetAuxiliaryData(2).GetChannelCount(), 1u);
            }
        }
        EXPECT_LE(GenericLive(), 0);
    }
}
