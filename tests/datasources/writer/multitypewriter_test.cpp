#include "datasources/writer/multitypewriter.h"

#include "datasources/datasets/memorydataset.h"
#include "datasources/interfaces/datatypechannelfilter.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/overviews/overviewbuilder.h"
#include "datasources/reader/multitypereader.h"
#include "datasources/writer/defaultwriter.h"
#include "datasources/writer/memorywriter.h"
#include "datasources/writer/multitypeoverviewwriteraccessor.h"
#include "gobs/raster/buffertype.h"
#include "tests/datasources/reader/readertest.h"
#include "toolkit/raster/copydata.h"

#include <cmath>
#include <numeric>

namespace krv::test
{

namespace
{

using namespace krv::datasources;
using gobs::DataType;
using gobs::Raster;

constexpr unsigned int WIDTH = 300, HEIGHT = 280;
const std::vector<DataType> TYPES = {gobs::eDT_8U, gobs::eDT_16S, gobs::eDT_8U, gobs::eDT_32R, gobs::eDT_8U};

// The file is opened as a decorated access to one dataset in memory, which has channels of three types.
class MultiTypeWriterTest : public ReaderTest
{
protected:
    MultiTypeWriterTest()
    {
        moMemory.Create(WIDTH, HEIGHT, TYPES);
        moMakeDataset = [this]
        {
            return Decorate(moProbe, moMemory.Share());
        };
    }

    IRasterDataset* Rasters() { return &moMemory; }

    // Whole numbers that every one of the types holds, as a raster of one type.
    static std::string MakePixels(std::size_t nChannels, const DataType& oType, unsigned int nSeed = 0)
    {
        std::vector<unsigned char> oSmall(nChannels * WIDTH * HEIGHT);
        for (std::size_t n = 0; n < oSmall.size(); ++n)
            oSmall[n] = static_cast<unsigned char>((n * 37 + n / 255 + nSeed) % 128);
        std::string pixels(oSmall.size() * oType.GetValueBits() / 8, '\0');
        raster::CopyData(oSmall.data(), raster::eBT_8U, 1, pixels.data(), gobs::QRFDataType2RasterBufferType(oType), 1,
                         oSmall.size());
        return pixels;
    }

    static void WriteWhole(IRasterWriter& oWriter, std::string pixels)
    {
        const Raster oRaster({WIDTH, HEIGHT, oWriter.GetChansCount(), oWriter.GetDataType()}, {0, 0},
                             reinterpret_cast<unsigned char*>(pixels.data()), false);
        oWriter.WriteRaster(&oRaster);
    }

    // One channel of pixels, as a channel of its type holds it.
    static std::string Channel(const std::string& pixels, const DataType& oFrom, std::size_t nChannel,
                               std::size_t nChannels, const DataType& oTo)
    {
        std::string channel(std::size_t{WIDTH} * HEIGHT * oTo.GetValueBits() / 8, '\0');
        raster::CopyData(pixels.data() + nChannel * oFrom.GetValueBits() / 8, gobs::QRFDataType2RasterBufferType(oFrom),
                         nChannels, channel.data(), gobs::QRFDataType2RasterBufferType(oTo), 1,
                         std::uint64_t{WIDTH} * HEIGHT);
        return channel;
    }

    MemoryDataset moMemory;
};

} // namespace

// Tile by tile with margins, which stay behind: in an order of channels of its own, and all channels of a type in the
// order in which they lie in memory, where they are written in place.
TEST_F(MultiTypeWriterTest, EveryChannelGoesToItsOwnPlaceInItsOwnType)
{
    for (const Channels& oList : {Channels{4, 5, 2, 1}, Channels{4, 1, 2, 3, 5}})
    {
        const auto nCount = static_cast<unsigned int>(oList.size());
        MultiTypeWriter oWriter(Rasters(), oList);
        EXPECT_EQ(oWriter.GetDataType(), DataType(gobs::eDT_32R));
        EXPECT_EQ(oWriter.GetChannelsInfo()[2]->GetDataType(), DataType(gobs::eDT_16S));
        const std::string pixels = MakePixels(nCount, gobs::eDT_32R, nCount);
        const ReferenceImage oImage{WIDTH, HEIGHT, 4 * nCount, pixels};
        oWriter.SetTileSize(70, 33);
        oWriter.SetMargins(3, 5, eMirror);
        for (unsigned int nTile = 0; nTile < oWriter.GetTileCount(); ++nTile)
        {
            const RasterPtr oTile(oWriter.GetRaster(nTile));
            const std::string bytes = oImage.WithMargins(oTile->GetX(), oTile->GetY(), oTile->GetWidth(),
                                                         oTile->GetHeight(), 3, 5, eConstant);
            std::copy(bytes.begin(), bytes.end(), oTile->GetBuffer());
            oWriter.WriteRaster(oTile.get());
            const RasterPtr oBack(oWriter.GetRaster(nTile));
            EXPECT_EQ(oBack->GetXMargin(), 3U);
        }
        EXPECT_EQ(oWriter.GetChangedSamples(), std::vector<std::uint64_t>(nCount));
        oWriter.SetMargins(0, 0, eMirror);
        EXPECT_EQ(ReadPixels(oWriter), pixels);
        oWriter.SetMargins(4, 4, eMirror);
        const RasterPtr oCorner(oWriter.ReadRaster(0, 0, 20, 20));
        EXPECT_EQ(PixelsOf(*oCorner), oImage.WithMargins(0, 0, 20, 20, 4, 4, eMirror));
        IDataset& oDataset = moMemory;
        for (std::size_t n = 0; n < oList.size(); ++n)
            EXPECT_EQ(ReadPixels(BasicReader(&oDataset, {oList[n]}, false)),
                      Channel(pixels, gobs::eDT_32R, n, nCount, TYPES[oList[n] - 1]))
                << "channel " << oList[n];
        if (nCount == 4)
        {
            EXPECT_EQ(ReadPixels(BasicReader(&oDataset, {3}, false)), std::string(WIDTH * HEIGHT, '\0'))
                << "not listed";
        }
        MultiTypeReader oReader(&oDataset, oList, gobs::eDT_32R, eOwnPlace);
        EXPECT_EQ(ReadPixels(oReader), pixels);
    }
}

// Tiles in memory are 256 wide: a window as wide as one lies in one or across two, in few rows or in many.
TEST_F(MultiTypeWriterTest, WindowsLieAcrossTilesInMemory)
{
    MemoryDataset oWide;
    oWide.Create(600, HEIGHT, TYPES);
    for (const unsigned int nX : {0u, 40u})
    {
        for (const unsigned int nHeight : {20u, 270u})
        {
            MultiTypeWriter oWriter(&oWide, {1, 2, 3, 4, 5});
            const RasterPtr oWindow(oWriter.ReadRaster(nX, 5, 256, nHeight));
            auto* const p = reinterpret_cast<float*>(oWindow->GetBuffer());
            for (std::size_t n = 0; n < std::size_t{256} * nHeight * 5; ++n)
                p[n] = static_cast<float>((n * 7 + n / 101) % 128);
            oWriter.WriteRaster(oWindow.get());
            const RasterPtr oBack(oWriter.ReadRaster(nX, 5, 256, nHeight));
            EXPECT_EQ(PixelsOf(*oBack), PixelsOf(*oWindow)) << nX << " " << nHeight;
        }
    }
}

TEST_F(MultiTypeWriterTest, ChangedSamplesAreCountedOrRefusedBeforeAnythingIsWritten)
{
    MixedTypes oTypes;
    oTypes.moRaster = gobs::eDT_C64R;
    MultiTypeWriter oCounting(Rasters(), {1, 2, 4}, oTypes);
    oTypes.mbStrict = true;
    MultiTypeWriter oStrict(Rasters(), {1, 2, 4}, oTypes);
    const auto Write = [](MultiTypeWriter& oWriter, const std::vector<double>& oValues)
    {
        const Raster oRaster({1, 1, 3, gobs::eDT_C64R}, {7, 9},
                             reinterpret_cast<unsigned char*>(const_cast<double*>(oValues.data())), false);
        return Error([&] { oWriter.WriteRaster(&oRaster); });
    };
    const std::vector<double> FITS = {255, 0, -7, -0.0, 0.5, 0}, CUT = {256, 0, 4, 0, 0.1, 0},
                              COMPLEX = {1, 0, 2, 3, std::nan(""), 0};
    EXPECT_EQ(Write(oCounting, FITS), "");
    EXPECT_EQ(oCounting.GetChangedSamples(), (std::vector<std::uint64_t>{0, 0, 0}));
    EXPECT_EQ(Write(oCounting, CUT), "");
    EXPECT_EQ(Write(oCounting, COMPLEX), "");
    EXPECT_EQ(oCounting.GetChangedSamples(), (std::vector<std::uint64_t>{1, 1, 1}));
    EXPECT_EQ(Write(oStrict, FITS), "");
    const std::string before = ReadPixels(oStrict);
    EXPECT_EQ(Write(oStrict, CUT),
              "data: Channel 1 is of the type 8U, which does not hold 1 of the samples of type C64R "
              "at 7, 9; nothing was written");
    EXPECT_EQ(Write(oStrict, COMPLEX), "data: Channel 2 is of the type 16S, which does not hold 1 of the samples of "
                                       "type C64R at 7, 9; nothing was written");
    EXPECT_EQ(ReadPixels(oStrict), before);
    EXPECT_EQ(oStrict.GetChangedSamples(), (std::vector<std::uint64_t>{0, 0, 0}));
}

TEST_F(MultiTypeWriterTest, NewImagesAreLaidOutInTheTypesThatWereGiven)
{
    const auto TypesOf = [](const MemoryDataset& oDataset)
    {
        std::vector<DataType> oTypes;
        for (unsigned int n = 1; n <= oDataset.GetChanCount(); ++n)
            oTypes.push_back(std::unique_ptr<IChannelInfo>(oDataset.GetChannelInfo(n))->GetDataType());
        return oTypes;
    };
    MixedTypes oTypes;
    oTypes.moChannels = {gobs::eDT_16U, gobs::eDT_8U, gobs::eDT_32S};
    MemoryDataset oNew;
    {
        MultiTypeWriter oWriter(static_cast<IRasterDataset*>(&oNew), {3, 1, 2}, oTypes);
        EXPECT_EQ(oWriter.GetWidth(), 0U);
        EXPECT_EQ(Error(
                      [&] {
                          oWriter.CreateNewFile({9, 9, 2, gobs::eDT_32S});
                      }),
                  "data: The RasterInfo does not match the write channels of this writer");
        oWriter.CreateNewFile({WIDTH, HEIGHT, 3, gobs::eDT_64R});
        EXPECT_EQ(oWriter.GetDataType(), DataType(gobs::eDT_64R)) << "as the description has it";
        EXPECT_EQ(Error([&] { oWriter.CreateNewFile({9, 9, 3, gobs::eDT_64R}); }), "data: The dataset already exists");
        WriteWhole(oWriter, MakePixels(3, gobs::eDT_64R));
        EXPECT_EQ(ReadPixels(oWriter), MakePixels(3, gobs::eDT_64R));
    }
    EXPECT_EQ(TypesOf(oNew), (std::vector<DataType>{gobs::eDT_8U, gobs::eDT_32S, gobs::eDT_16U})) << "by number";
    MemoryDataset oOther;
    oTypes.moRaster = gobs::eDT_32S;
    MultiTypeWriter oAsked(static_cast<IRasterDataset*>(&oOther), {}, oTypes);
    EXPECT_EQ(Error(
                  [&] {
                      oAsked.CreateNewFile({9, 9, 3, gobs::eDT_8U});
                  }),
              "data: The RasterInfo is of the type 8U, the rasters of this writer of 32S");
    oAsked.CreateNewFile({9, 9, 3, gobs::eDT_32S});
    EXPECT_EQ(TypesOf(oOther), oTypes.moChannels);
    MemoryDataset oPlain;
    MultiTypeWriter oOneType(static_cast<IRasterDataset*>(&oPlain), {});
    oOneType.CreateNewFile({9, 9, 3, gobs::eDT_16S});
    EXPECT_EQ(TypesOf(oPlain), std::vector<DataType>(3, gobs::eDT_16S));
}

// Levels through the accessor, by hand and built, are those of each type by itself.
TEST_F(MultiTypeWriterTest, LevelsAreWrittenInTheTypesOfTheirChannels)
{
    AuxiliaryData oTags(5);
    oTags.SetChanMetadataValue("NO_DATA_VALUE", "60", 1);
    oTags.SetChanMetadataValue("NO_DATA_VALUE", "60", 2);
    moMemory.WriteAuxiliaryData(oTags);
    const Channels oList = {1, 2, 3, 4};
    MultiTypeWriter oWriter(Rasters(), oList);
    WriteWhole(oWriter, MakePixels(4, gobs::eDT_32R));
    unsigned int nCalls = 0;
    OverviewOptions oOptions;
    std::uint64_t nLast = 0, nAll = 0;
    oOptions.moProgress = [&](std::uint64_t nDone, std::uint64_t nTotal)
    {
        ++nCalls;
        EXPECT_GE(nDone, nLast);
        nLast = nDone;
        nAll = nTotal;
        return true;
    };
    ASSERT_TRUE(BuildOverviews(oWriter, {2, 4}, "average", oOptions));
    EXPECT_GT(nCalls, 2U);
    EXPECT_EQ(nLast, nAll);
    IDataset& oDataset = moMemory;
    const auto ReadLevel = [&](const Channels& oChannels)
    {
        BasicReader oReader(&oDataset, oChannels, false);
        const std::unique_ptr<IOverviewReaderAccessor> oLevels(oReader.GetOverviewReaderAccessor());
        return ReadPixels(*std::unique_ptr<IRasterReader>(oLevels->CreateRasterReader(4)));
    };
    const std::vector<std::string> oBuilt = {ReadLevel({1, 3}), ReadLevel({2}), ReadLevel({4})};
    for (const Channels& oChannels : {Channels{1, 3}, Channels{2}, Channels{4}})
    {
        BasicWriter oOne(Rasters(), oChannels);
        ASSERT_TRUE(BuildOverviews(oOne, {4}, "average"));
    }
    EXPECT_EQ(oBuilt, (std::vector<std::string>{ReadLevel({1, 3}), ReadLevel({2}), ReadLevel({4})}));

    const std::unique_ptr<IOverviewWriterAccessor> oLevels(oWriter.GetOverviewWriterAccessor());
    EXPECT_EQ(oLevels->GetChanCount(), 4U);
    EXPECT_EQ(oLevels->GetLevels(), (Channels{2, 4}));
    EXPECT_TRUE(oLevels->IsLevelValid(4));
    const std::unique_ptr<IRasterWriter> oLevel(oLevels->CreateRasterWriter(4));
    EXPECT_EQ(oLevel->GetWidth(), WIDTH / 4);
    EXPECT_EQ(oLevel->GetDataType(), DataType(gobs::eDT_32R));
    EXPECT_EQ(std::unique_ptr<IOverviewWriterAccessor>(oLevel->GetOverviewWriterAccessor()), nullptr);
    const RasterPtr oRaster(oLevel->ReadRaster(0, 0, 5, 5));
    auto* const pValues = reinterpret_cast<float*>(oRaster->GetBuffer());
    std::iota(pValues, pValues + 100, 0.0F);
    oLevel->WriteRaster(oRaster.get());
    const std::unique_ptr<IOverviewReaderAccessor> oRead(oWriter.GetOverviewReaderAccessor());
    const std::unique_ptr<IRasterReader> oReader(oRead->CreateRasterReader(4));
    const RasterPtr oBack(oReader->ReadRaster(0, 0, 5, 5));
    EXPECT_EQ(PixelsOf(*oBack), PixelsOf(*oRaster));
    EXPECT_EQ(Error([&] { MultiTypeOverviewWriterAccessor(nullptr, {1}); }), "data: The raster dataset is NULL");
    EXPECT_EQ(Error([&] { MultiTypeOverviewWriterAccessor(Rasters(), {}); }),
              "data: No channels were specified for pyramiding. Are you sure this file contains raster data?");
}

TEST_F(MultiTypeWriterTest, RefusalsSayWhatIsWrong)
{
    IRasterDataset* const poNone = nullptr;
    MixedTypes oTwo, oBits;
    oTwo.moChannels = {gobs::eDT_8U, gobs::eDT_8U};
    oBits.moRaster = gobs::eDT_BIT;
    EXPECT_EQ(Error([&] { MultiTypeWriter(poNone, {1}); }), "data: Invalid Raster Dataset");
    EXPECT_EQ(Error([&] { MultiTypeWriter("none.tif", {}, "TIF", ""); }),
              "data: No channels in dataset: file=none.tif");
    EXPECT_EQ(Error([&] { MultiTypeWriter(Rasters(), {1, 2, 3}, oTwo); }), "data: 2 types for 3 channels");
    EXPECT_NE(Error([&] { MultiTypeWriter(Rasters(), {1, 2}, oBits); }), "");
    const auto One = [&](unsigned int nChannel)
    {
        return new BasicWriter(Rasters(), {nChannel});
    };
    using Writers = std::vector<ChannelWriter>;
    EXPECT_EQ(Error(
                  [&] {
                      MultiTypeWriter(Rasters(), Writers{{One(1), {0}}}, {1, 2});
                  }),
              "data: The writers do not place every channel once");
    EXPECT_EQ(Error(
                  [&] {
                      MultiTypeWriter(Rasters(), Writers{{One(1), {0}}, {One(2), {0}}}, {1, 2});
                  }),
              "data: The writers do not place every channel once");
    EXPECT_EQ(Error(
                  [&] {
                      MultiTypeWriter(Rasters(), Writers{{One(1), {0, 1}}}, {1, 2});
                  }),
              "data: A writer of 1 channels has 2 places");
    EXPECT_EQ(Error(
                  [&] {
                      MultiTypeWriter(Rasters(), Writers{{One(1), {0}}, {nullptr, {1}}}, {1, 2});
                  }),
              "data: A writer is NULL");
    EXPECT_EQ(Error([&] { MultiTypeWriter(Rasters(), Writers{}, {}); }), "data: Channel list can not be empty");
    MemoryWriter* const poSmall = new MemoryWriter({5, 5, 1, gobs::eDT_8U});
    EXPECT_EQ(Error(
                  [&] {
                      MultiTypeWriter(Rasters(), Writers{{One(1), {0}}, {poSmall, {1}}}, {1, 2});
                  }),
              "data: The writers differ in size");
    MultiTypeWriter oWriter(Rasters(), {1, 2});
    const Raster oOther({4, 4, 2, gobs::eDT_8U}, {0, 0}), oOutside({4, 4, 2, gobs::eDT_16S}, {298, 0});
    EXPECT_NE(Error([&] { oWriter.WriteRaster(&oOther); }), "");
    EXPECT_NE(Error([&] { oWriter.WriteRaster(&oOutside); }), "");
    EXPECT_NE(Error([&] { oWriter.WriteRaster(nullptr); }), "");
}

TEST_F(MultiTypeWriterTest, DefaultWriterMirrorsTheChoiceOfTheReader)
{
    std::unique_ptr<IRasterWriter> oWriter(CreateDefaultWriter(moFile, {1, 3}));
    EXPECT_EQ(dynamic_cast<MultiTypeWriter*>(oWriter.get()), nullptr);
    oWriter.reset(CreateDefaultWriter(moFile, {1, 2}));
    EXPECT_NE(dynamic_cast<MultiTypeWriter*>(oWriter.get()), nullptr);
    oWriter.reset(CreateDefaultWriter(&moMemory, {}));
    EXPECT_EQ(oWriter->GetChansCount(), 5U);
    EXPECT_EQ(oWriter->GetDataType(), DataType(gobs::eDT_32R));
    EXPECT_EQ(Error([&] { CreateDefaultWriter(static_cast<IDataset*>(nullptr), {}); }), "data: Invalid Raster Dataset");
}

// A failure at any call leaves nothing behind, whatever the constructor.
TEST_F(MultiTypeWriterTest, FailuresLeaveNothing)
{
    const DataTypeChannelFilter oFilter(gobs::eDT_8U);
    MixedTypes oTypes;
    oTypes.moRaster = gobs::eDT_64R;
    const auto Use = [](IRasterWriter& oWriter)
    {
        const RasterPtr oRaster(oWriter.GetRaster(0));
        oWriter.WriteRaster(oRaster.get());
        const std::unique_ptr<IOverviewWriterAccessor> oLevels(oWriter.GetOverviewWriterAccessor());
        oLevels->CreateLevel(2);
        const std::unique_ptr<IRasterWriter> oLevel(oLevels->CreateRasterWriter(2));
        const RasterPtr oPart(oLevel->GetRaster(0));
        oLevel->WriteRaster(oPart.get());
        oLevels->SetLevelValid(2, true);
        oWriter.SetAuxiliaryData(oWriter.GetAuxiliaryData());
        oWriter.Synchronize();
    };
    const std::function<void()> OPERATIONS[] = {
        [&]
        {
            MultiTypeWriter oWriter(moFile);
            Use(oWriter);
        },
        [&]
        {
            MultiTypeWriter oWriter(moFile, {2, 1, 4}, oTypes);
            Use(oWriter);
        },
        [&] {
            MultiTypeWriter oWriter(moFile, {1, 2}, "SYNTHETIC", "");
        },
        [&] { MultiTypeWriter oWriter(moFile, oFilter, oTypes); },
        [&]
        {
            const auto dataset = MakeDataset();
            MultiTypeWriter oWriter(dynamic_cast<IRasterDataset*>(dataset.get()), {1, 2, 3});
            Use(oWriter);
        },
        [&]
        {
            const std::unique_ptr<IRasterWriter> oWriter(CreateDefaultWriter(moFile, {4, 1}));
            const RasterPtr oRaster(oWriter->GetRaster(0));
        },
    };
    const auto Prepare = [&]
    {
        const std::unique_ptr<IOverviewManager> oLevels(moMemory.GetOverviewManager());
        for (const unsigned int nLevel : oLevels->GetLevels())
            oLevels->DeleteLevel(nLevel);
    };
    for (const auto& oOperation : OPERATIONS)
        FailAtEveryCall(oOperation, Prepare);
}

} // namespace krv::test
