#include "datasources/reader/basicreader.h"

#include "datasources/interfaces/datatypechannelfilter.h"
#include "datasources/reader/checkrastercompatible.h"
#include "datasources/reader/rasterrange.h"
#include "tests/datasources/reader/readertest.h"
#include "toolkit/ogc/cs/geocodinginfo.h"

#include <limits>

using namespace krv::datasources;
using namespace krv::test;

namespace
{

class BasicReaderTest : public ReaderTest
{
protected:
    using ReaderPtr = std::unique_ptr<BasicReader>;
    const Channels ALL{3, 1, 2}, NONE, BITMAPS{7, 2};

    struct Constructor
    {
        const char* mpName;
        std::function<ReaderPtr()> moMake;
        bool mbWraps = false; // rethrows everything that has a message as DataException
    };

    // Every public constructor over three channels, or two bitmaps; mpoOpen is the dataset of those that take one.
    std::vector<Constructor> Constructors()
    {
        return {
            {"file", [this] { return New(moFile); }, true},
            {"file and channels",
             [this]
             {
                 return New(moFile, ALL);
             }},
            {"file and no channels",
             [this]
             {
                 return New(moFile, NONE);
             }},
            {"file and filter",
             [this]
             {
                 return New(moFile, moFilter);
             }},
            {"bitmaps",
             [this]
             {
                 return New(dynamic_cast<IBitmapDataset*>(mpoOpen.get()), BITMAPS, false);
             }},
            {"dataset",
             [this]
             {
                 return New(mpoOpen.get(), ALL, false);
             }},
            {"own dataset",
             [this]
             {
                 auto oReader = New(mpoOpen.get(), NONE, true);
                 [[maybe_unused]] IDataset* const poTakenOver = mpoOpen.release();
                 return oReader;
             }},
            {"level",
             [this]
             {
                 auto* const poRaster = dynamic_cast<IRasterDataset*>(mpoOpen.get());
                 const std::unique_ptr<IOverviewManager> oManager(poRaster->GetOverviewManager());
                 return New(poRaster, oManager->GetOverviewIO(2, {1, 2}), Channels{1, 2});
             }},
        };
    }

    template <class... Arguments>
    static ReaderPtr New(const Arguments&... oArguments)
    {
        return std::make_unique<BasicReader>(oArguments...);
    }

    // Every reading operation; results go at once.
    static void UseEverything(BasicReader& oReader)
    {
        oReader.SetOptimalTileSize();
        for (const RasterPtr& oTile : RasterRange(oReader))
            ASSERT_NE(oTile, nullptr);
        oReader.SetMargins(2, 1, eMirror);
        RasterPtr(*oReader.FindRaster(9, 8));
        RasterPtr(oReader.ReadRaster(3, 2, 2, 3));
        krv::gobs::Raster oOwn({4, 4, oReader.GetChansCount(), oReader.GetDataType()}, {0, 0, 3, 3});
        oReader.ReadRaster(&oOwn);
        oReader.GetAuxiliaryData();
        oReader.GetFileFormat();
        EXPECT_EQ(oReader.GetCRS(), nullptr);
        std::unique_ptr<krv::ogc::cs::GeocodingInfo>(oReader.GetGeocodingInfo());
        const std::unique_ptr<IOverviewReaderAccessor> oAccessor(oReader.GetOverviewReaderAccessor());
        if (oAccessor == nullptr)
            return;
        for (const unsigned int nLevel : oAccessor->GetLevels())
        {
            oAccessor->IsValid(1, nLevel);
            oAccessor->IsLevelValid(nLevel);
            oAccessor->GetAuxiliaryData(nLevel);
            const std::unique_ptr<IRasterReader> oLevel(oAccessor->CreateRasterReader(nLevel));
            RasterPtr(oLevel->GetRaster(0));
        }
    }

    BasicReaderTest()
    {
        moModel->moLevels = {2, 4};
        moModel->moBitmaps = {{2, "clouds"}, {7, "water"}};
    }

    DataTypeChannelFilter moFilter{krv::gobs::eDT_16U};
    std::unique_ptr<IDataset> mpoOpen;
};

} // namespace

// A probe throws at the first, second, third ... call of every constructor and of everything that reads, until a run
// gets through: nothing stays alive, the exception is the documented one, and no I/O object outlives its dataset.
TEST_F(BasicReaderTest, NothingLeaksWhicheverCallFails)
{
    for (const Constructor& oConstructor : Constructors())
    {
        for (const Fault eFault : {Fault::eKrv, Fault::eStandard, Fault::eForeign})
        {
            unsigned int nCall = 0;
            do
            {
                mpoOpen = MakeDataset();
                moProbe.Arm(++nCall, eFault);
                bool bConstructed = false;
                const std::string error = Error(
                    [&]
                    {
                        const ReaderPtr oReader = oConstructor.moMake();
                        bConstructed = true;
                        UseEverything(*oReader);
                    });
                const bool bWraps = oConstructor.mbWraps && !bConstructed && eFault != Fault::eForeign;
                const char* const ERRORS[] = {"io: probe", "standard: probe", "foreign"};
                EXPECT_EQ(error, !moProbe.HasThrown() ? "" : bWraps ? "data: probe" : ERRORS[static_cast<int>(eFault)]);
                mpoOpen.reset();
                ASSERT_EQ(moProbe.GetLive(), 0)
                    << oConstructor.mpName << ", call " << nCall << " " << moProbe.GetCalls().back();
                ASSERT_FALSE(moProbe.HasOrphans()) << oConstructor.mpName << ", call " << nCall;
            } while (moProbe.HasThrown());
            EXPECT_GT(nCall, 20u) << oConstructor.mpName;
        }
    }
}

TEST_F(BasicReaderTest, ConstructorsCheckTheirArguments)
{
    const Channels oAll;
    EXPECT_EQ(Error([&] { BasicReader((IDataset*)nullptr, oAll, false); }), "data: The dataset is NULL");
    EXPECT_EQ(Error([&] { BasicReader((IBitmapDataset*)nullptr, oAll, true); }), "data: The dataset is NULL");
    Synthetic<BitmapPart> oBitmaps(moModel);
    EXPECT_EQ(Error([&] { BasicReader((IBitmapDataset*)&oBitmaps, oAll, false); }), "data: The dataset is NULL");
    Synthetic<RasterPart> oRaster(moModel);
    IRasterIO* const poNone = nullptr;
    EXPECT_EQ(Error([&] { BasicReader(nullptr, oRaster.GetRasterIO({1}), {1}); }),
              "data: Invalid Raster Dataset: poRDS cannot be NULL");
    EXPECT_EQ(Error([&] { BasicReader(&oRaster, poNone, {1}); }), "data: Invalid Raster IO: poRasterIO cannot be NULL");
    EXPECT_EQ(Error([&] { BasicReader(&oRaster, oRaster.GetRasterIO({1}), {1}); }), "data: Invalid Raster Dataset");

    IRasterIO* const poIO = oRaster.GetRasterIO({1});
    moModel->moTypes.clear();
    moModel->moBitmaps.clear();
    const auto oEmpty = MakeDataset();
    auto* const poEmptyRaster = dynamic_cast<IRasterDataset*>(oEmpty.get());
    auto* const poEmptyBitmaps = dynamic_cast<IBitmapDataset*>(oEmpty.get());
    EXPECT_EQ(Error([&] { BasicReader(moFile, oAll); }), "data: No available channels.");
    EXPECT_EQ(Error([&] { BasicReader(moFile, moFilter); }), "data: No channels in dataset: file=" + moFile);
    EXPECT_EQ(Error([&] { BasicReader{moFile}; }), "data: No channels in dataset: file=" + moFile);
    EXPECT_EQ(Error([&] { BasicReader(oEmpty.get(), oAll, false); }), "data: No available channels.");
    EXPECT_EQ(Error([&] { BasicReader(poEmptyRaster, poIO, oAll); }), "data: No available channels.");
    EXPECT_EQ(Error([&] { BasicReader(poEmptyBitmaps, oAll, false); }), "data: Bitmap list is empty");
    EXPECT_EQ(moProbe.GetLive(), 1); // oEmpty: ownership was never taken
    EXPECT_THROW(BasicReader(moHome.GetFolder().File("missing")), krv::FileNotFoundException);

    moMakeDataset = [this]
    {
        return std::make_unique<DatasetWithoutRaster>(moModel);
    };
    const std::string error = "data: Format does not support rasters: file=" + moFile;
    EXPECT_EQ(Error([&] { BasicReader(moFile, oAll); }), error);
    EXPECT_EQ(Error([&] { BasicReader(moFile, moFilter); }), error);
    EXPECT_EQ(Error([&] { BasicReader{moFile}; }), error);
    const auto oBare = MakeDataset();
    EXPECT_EQ(Error([&] { BasicReader(oBare.get(), oAll, false); }), "data: This dataset doesn't support Raster.");
}

TEST_F(BasicReaderTest, RefusedMarginsKeepTheOldOnesButForTheBehaviour)
{
    BasicReader oReader(moFile);
    oReader.SetMargins(1, 2, eReplicate);
    const RasterPtr oRaster(oReader.GetRaster(0));
    EXPECT_EQ(Error([&] { oReader.SetMargins(11, 0, eWrap); }), "data: Margins can't be wider than half of the file");
    EXPECT_EQ(oReader.GetXMargin(), 1u);
    EXPECT_EQ(oReader.GetYMargin(), 2u);
    EXPECT_EQ(oReader.GetMarginBehaviour(), eWrap); // stored even when refused
    oReader.SetMargins(0, 0, eReplicate);
    EXPECT_EQ(oRaster->GetXMargin(), 1u); // as it was made
}

TEST_F(BasicReaderTest, PositionsBeyond32BitsAreRefusedBeforeReading)
{
    constexpr int LAST = std::numeric_limits<int>::max();
    BasicReader oReader(moFile, {1});
    unsigned char aBuffer[8] = {};
    moProbe.Arm(0);
    const krv::gobs::RasterContext CONTEXTS[] = {
        {LAST, 0, 1, 0}, {0, LAST, 0, 1}, {-LAST - 1, 0, 1, 0}, {0, 0, 1u << 31, 1}, {0, 0, 1, 1u << 30}};
    for (const auto& oContext : CONTEXTS)
    {
        krv::gobs::Raster oRaster({1, 1, 1, oReader.GetDataType()}, oContext, aBuffer, false);
        EXPECT_THROW(oReader.ReadRaster(&oRaster), krv::DataException)
            << oContext.GetX() << " " << oContext.GetXMargin();
    }
    EXPECT_TRUE(moProbe.GetCalls().empty());
}

TEST_F(BasicReaderTest, IncompatibleRastersAreRefusedBeforeReading)
{
    using krv::gobs::DataType;
    BasicReader oReader(moFile, {1, 2});
    moProbe.Arm(0);
    EXPECT_NE(Error([&] { oReader.ReadRaster(nullptr); }), "");
    krv::gobs::Raster oChannels({2, 2, 3, krv::gobs::eDT_8U}, {});
    const std::string channels = Error([&] { oReader.ReadRaster(&oChannels); });
    EXPECT_NE(channels.find("3"), std::string::npos) << channels; // found; the count comes before the type
    EXPECT_NE(channels.find("2"), std::string::npos) << channels; // expected
    EXPECT_EQ(channels.find("8U"), std::string::npos) << channels;
    const DataType TYPES[] = {{8, false, false, 0, 0, false},  {16, true, false, 0, 0, false},
                              {16, false, true, 0, 0, false},  {16, false, false, 1, 0, false},
                              {16, false, false, 0, 1, false}, {16, false, false, 0, 0, true}};
    for (const DataType& oType : TYPES)
    {
        krv::gobs::Raster oRaster({2, 2, 2, oType}, {});
        const std::string error = Error([&] { oReader.ReadRaster(&oRaster); });
        EXPECT_EQ(error.substr(0, 6), "data: ");
        EXPECT_NE(error.find(oType.Describe()), std::string::npos) << error;
        EXPECT_NE(error.find("16U"), std::string::npos) << error;
    }
    EXPECT_TRUE(moProbe.GetCalls().empty());
}

TEST_F(BasicReaderTest, GeocodingIsScaledToTheLevel)
{
    using krv::ogc::cs::GeocodingInfo;
    using GeocodingPtr = std::unique_ptr<GeocodingInfo>;
    moModel->moGeocoding = GeocodingInfo(1000, 30, -2, 5000, 3, -20);
    moModel->mnWidth = 20;
    BasicReader oReader(moFile);
    EXPECT_EQ(*GeocodingPtr(oReader.GetGeocodingInfo()), moModel->moGeocoding);
    const std::unique_ptr<IOverviewReaderAccessor> oAccessor(oReader.GetOverviewReaderAccessor());
    const std::unique_ptr<IRasterReader> oLevel(oAccessor->CreateRasterReader(4)); // 5 x 5 of 20 x 17
    const double nY = 17.0 / 5;
    EXPECT_EQ(*GeocodingPtr(oLevel->GetGeocodingInfo()), GeocodingInfo(1000, 120, -2 * nY, 5000, 12, -20 * nY));

    Synthetic<DatasetPart, GeocodedPart, BitmapPart> oMasks(moModel);
    EXPECT_EQ(*GeocodingPtr(BasicReader((IBitmapDataset*)&oMasks, {2}, false).GetGeocodingInfo()),
              moModel->moGeocoding);
    Synthetic<DatasetPart, RasterPart> oPlain(moModel);
    EXPECT_EQ(BasicReader((IDataset*)&oPlain, {}, false).GetGeocodingInfo(), nullptr);
}

TEST_F(BasicReaderTest, MetadataFollowsTheReadersChannels)
{
    const AuxiliaryData oData = BasicReader(moFile, {3, 1}).GetAuxiliaryData();
    EXPECT_EQ(oData.GetFileMetadataValue("SCENE"), "alps");
    ASSERT_EQ(oData.GetChannelCount(), 2u);
    EXPECT_EQ(oData.GetChanMetadataValue("band", 1), "b3");
    EXPECT_EQ(oData.GetChannelDescription(1), "channel 3");
    EXPECT_EQ(oData.GetChanMetadataValue("band", 2), "b1");
    EXPECT_EQ(oData.GetChannelDescription(2), "channel 1");

    const auto oDataset = MakeDataset();
    const BasicReader oMasks(dynamic_cast<IBitmapDataset*>(oDataset.get()), {7, 2}, false);
    const AuxiliaryData oMaskData = oMasks.GetAuxiliaryData();
    EXPECT_EQ(oMaskData.GetFileMetadataValue("scene"), "alps");
    EXPECT_EQ(oMaskData.GetChannelDescription(1), "water");
    EXPECT_EQ(oMaskData.GetChanMetadataValue("bitmap", 1), "7");
    EXPECT_EQ(oMaskData.GetChannelDescription(2), "clouds");
    EXPECT_EQ(oMaskData.GetChanMetadataValue("band", 2), "");
}

TEST_F(BasicReaderTest, IteratorsStepOverTheEnd)
{
    BasicReader oReader(moFile);
    const unsigned int nCount = oReader.GetTileCount();
    EXPECT_EQ(oReader.End(), RasterIterator(&oReader, nCount + 5));
    EXPECT_EQ(--oReader.Begin(), oReader.End());
    EXPECT_EQ(++RasterIterator(&oReader, nCount - 1), oReader.End());
    EXPECT_EQ(++oReader.End(), oReader.End());
    EXPECT_EQ(--oReader.End(), RasterIterator(&oReader, nCount - 1));
    RasterIterator oStep = oReader.Begin();
    EXPECT_EQ(oStep++, oReader.Begin());
    EXPECT_EQ(oStep, RasterIterator(&oReader, 1));
    EXPECT_EQ(oStep--, RasterIterator(&oReader, 1));
    EXPECT_EQ(oStep, oReader.Begin());
    BasicReader oOther(moFile);
    EXPECT_NE(oReader.Begin(), oOther.Begin());
    EXPECT_NE(RasterPtr(*oStep).get(), nullptr);

    moModel->mnWidth = 0;
    BasicReader oNothing(moFile);
    EXPECT_EQ(oNothing.GetTileCount(), 0u);
    EXPECT_EQ(oNothing.Begin(), oNothing.End());
    EXPECT_EQ(++oNothing.Begin(), oNothing.End());
    EXPECT_EQ(--oNothing.Begin(), oNothing.End());
}

// Claims more channels than it has.
class TooManyChannels : public SyntheticDataset
{
public:
    using SyntheticDataset::SyntheticDataset;
    unsigned int GetChanCount() const override { return 5; }
};

// Hands out null where the contract promises an object.
class NullInfo : public SyntheticDataset
{
public:
    using SyntheticDataset::SyntheticDataset;
    IChannelInfo* GetChannelInfo(unsigned int) const override { return nullptr; }
};

class NullIO : public SyntheticDataset
{
public:
    using SyntheticDataset::SyntheticDataset;
    IRasterIO* GetRasterIO(const std::vector<unsigned int>&) override { return nullptr; }
};

template <class Dataset>
std::unique_ptr<IDataset> Make(const ImageModelPtr& poModel)
{
    return std::make_unique<Dataset>(poModel);
}

TEST_F(BasicReaderTest, DatasetsThatGoWrongEndInAnException)
{
    const auto ErrorOf = [this](auto pMake)
    {
        moMakeDataset = [=, this]
        {
            return pMake(moModel);
        };
        return Error([this] { RasterPtr(BasicReader(moFile).GetRaster(0)); });
    };
    EXPECT_EQ(ErrorOf(&Make<TooManyChannels>), "data: synthetic: no channel 4");
    EXPECT_EQ(ErrorOf(&Make<NullInfo>), "data: The dataset gave no description of channel 1");
    EXPECT_EQ(ErrorOf(&Make<NullIO>), "data: The dataset gave no raster I/O for the channels");
    EXPECT_EQ(ErrorOf([](auto&) { return nullptr; }), "data: Format does not support rasters: file=" + moFile);
    moModel->moTypes.assign(3, krv::gobs::eDT_BIT);
    EXPECT_EQ(ErrorOf(&Make<SyntheticDataset>), "data: Channel 1 is of the type BIT, which no I/O hands out");
    moModel->moTypes.assign(3, krv::gobs::eDT_8U);
    moModel->mnWidth = moModel->mnHeight = 0;
    EXPECT_EQ(ErrorOf(&Make<SyntheticDataset>), "bounds: There is no tile 0: the image has 0");
}
