#include "datasources/reader/multitypereader.h"

#include "datasources/reader/defaultreader.h"
#include "datasources/reader/exacthaloreader.h"
#include "tests/datasources/reader/readertest.h"
#include "tests/support/outputcapture.h"

namespace krv::test
{

namespace
{

using krv::datasources::BasicReader;
using krv::datasources::CreateDefaultReader;
using krv::datasources::IRasterReader;
using krv::datasources::MultiTypeReader;
using krv::gobs::DataType;

class MultiTypeReaderTest : public ReaderTest
{
protected:
    MultiTypeReaderTest() { moModel->moTypes = {krv::gobs::eDT_8U, krv::gobs::eDT_16U, krv::gobs::eDT_8U}; }
};

} // namespace

TEST_F(MultiTypeReaderTest, TypesArePromotedOrRequestedWithAWarning)
{
    const auto dataset = MakeDataset();
    EXPECT_THROW(BasicReader{moFile}, krv::DataException); // all channels at once are of several types
    EXPECT_EQ(MultiTypeReader(dataset.get(), {1, 2}).GetDataType(), DataType(krv::gobs::eDT_16U));
    EXPECT_EQ(MultiTypeReader(dataset.get(), {1, 3}).GetDataType(), DataType(krv::gobs::eDT_8U));
    OutputCapture oOutput;
    EXPECT_EQ(MultiTypeReader(dataset.get(), {1, 2}, krv::gobs::eDT_32R).GetDataType(), DataType(krv::gobs::eDT_32R));
    EXPECT_TRUE(oOutput.moWarnings.empty());
    EXPECT_EQ(MultiTypeReader(dataset.get(), {1, 2, 3}).GetAuxiliaryData().GetChannelDescription(3), "channel 3");
    EXPECT_EQ(MultiTypeReader(dataset.get(), {2, 1}, krv::gobs::eDT_8U).GetDataType(), DataType(krv::gobs::eDT_8U));
    ASSERT_EQ(oOutput.moWarnings.size(), 1u);
    EXPECT_EQ(oOutput.moWarnings[0].moMessage,
              "Lost of information possible due to data type promotion provided by this reader.");
    EXPECT_NE(Error([&] { MultiTypeReader(dataset.get(), {1, 2}, krv::gobs::eDT_BIT); }), "");
}

TEST_F(MultiTypeReaderTest, RefusalsSayWhatIsWrong)
{
    const auto dataset = MakeDataset();
    krv::datasources::IDataset* const poNone = nullptr;
    EXPECT_EQ(Error([&] { MultiTypeReader(dataset.get(), {}); }), "data: Channels list is empty");
    EXPECT_EQ(Error([&] { MultiTypeReader(moFile, {}); }), "data: Channels list is empty");
    EXPECT_EQ(Error([&] { MultiTypeReader(poNone, {1}); }), "data: This Dataset doesn't supports Raster.");
    EXPECT_EQ(Error([&] { MultiTypeReader(dataset.get(), std::vector<IRasterReader*>{}, {1}); }),
              "data: Number of readers should the same as the number of channels");
    MultiTypeReader oReader(dataset.get(), {1, 2});
    krv::gobs::Raster oThree({4, 4, 3, krv::gobs::eDT_64R}, {0, 0});
    krv::gobs::Raster oOther({4, 4, 2, krv::gobs::eDT_64R}, {0, 0});
    EXPECT_EQ(
        Error([&] { oReader.ReadRaster(&oThree); }),
        "data: The number of channels in the requested Rasterdoesn't match the number of channel of this Reader.");
    EXPECT_EQ(Error([&] { oReader.ReadRaster(&oOther); }),
              "data: The data type in the requested Rasterdoesn't match the data type of this Reader.");
    // A refused margin leaves all groups in step.
    EXPECT_NE(Error([&] { oReader.SetMargins(50, 50, eWrap); }), "");
    EXPECT_EQ(oReader.GetMarginBehaviour(), eWrap); // stored even when all refuse, as by one reader
    const RasterPtr oRaster(oReader.GetRaster(0));
    EXPECT_EQ(oRaster->GetXMargin(), 0u);
    moMakeDataset = [this]() -> std::unique_ptr<krv::datasources::IDataset>
    {
        return std::make_unique<DatasetWithoutRaster>(moModel);
    };
    EXPECT_EQ(Error([&] { MultiTypeReader(moFile, {1}); }), "data: Format does not support rasters: file=" + moFile);
}

// Refuses a tile width of 13.
class FussyReader : public BasicReader
{
public:
    using BasicReader::BasicReader;
    void SetTileSize(unsigned int nWidth, unsigned int nHeight) override
    {
        if (nWidth == 13)
            throw krv::DataException("not that one");
        BasicReader::SetTileSize(nWidth, nHeight);
    }
};

// Readers that are made elsewhere refuse different things; what some refuse changes none.
TEST_F(MultiTypeReaderTest, GroupsStayInStep)
{
    const auto dataset = MakeDataset();
    auto oWide = std::make_unique<krv::datasources::ExactHaloReader>(new BasicReader(moFile, Channels{1}), true);
    auto oNarrow = std::make_unique<FussyReader>(moFile, Channels{2});
    IRasterReader* const oReaders[] = {oWide.get(), oNarrow.get()};
    MultiTypeReader oReader(dataset.get(), {oWide.release(), oNarrow.release()}, {5, 9});
    oReader.SetMargins(2, 1, eReplicate);
    oReader.SetTileSize(9, 7);
    EXPECT_NE(Error([&] { oReader.SetMargins(5000, 5000, eMirror); }), "");
    EXPECT_NE(Error([&] { oReader.SetTileSize(13, 7); }), "");
    for (const IRasterReader* const poReader : {oReaders[0], oReaders[1], static_cast<IRasterReader*>(&oReader)})
    {
        EXPECT_EQ(poReader->GetXMargin(), 2u);
        EXPECT_EQ(poReader->GetYMargin(), 1u);
        EXPECT_EQ(poReader->GetMarginBehaviour(), eReplicate);
        EXPECT_EQ(poReader->GetTileWidth(), 9u);
        EXPECT_EQ(poReader->GetTileHeight(), 7u);
    }
    EXPECT_EQ(oReader.GetTileCount(), oReaders[0]->GetTileCount());
    // Metadata come from where the pixels do, whatever the numbers are.
    EXPECT_EQ(oReader.GetAuxiliaryData().GetFileMetadataValue("scene"), "alps");
    EXPECT_EQ(oReader.GetAuxiliaryData().GetChanMetadataValue("band", 2), "b2");
    EXPECT_EQ(oReader.GetAuxiliaryData().GetChannelDescription(1), "channel 1");
    const MultiTypeReader oCopy(oReader);
    EXPECT_EQ(oCopy.GetChannelsInfo(), oReader.GetChannelsInfo());
}

// Nothing is left behind by a failure at any call, through the reader that is chosen and through the fallback.
TEST_F(MultiTypeReaderTest, DefaultReaderIsChosenAndFailuresLeaveNothing)
{
    {
        const std::unique_ptr<IRasterReader> oSame(CreateDefaultReader(moFile, {1, 3}));
        EXPECT_NE(dynamic_cast<BasicReader*>(oSame.get()), nullptr);
        const std::unique_ptr<IRasterReader> oMixed(CreateDefaultReader(moFile, {1, 2}));
        ASSERT_NE(dynamic_cast<MultiTypeReader*>(oMixed.get()), nullptr);
        EXPECT_EQ(oMixed->GetDataType(), DataType(krv::gobs::eDT_16U));
    }
    EXPECT_EQ(Error([&] { CreateDefaultReader(moFile, {}); }), "data: Channels list is empty");
    unsigned int nChannel = 7;
    unsigned int nIndex = 8;
    std::string name = "as it was";
    EXPECT_FALSE(krv::datasources::GetPCTParameters(nullptr, {1}, nChannel, name, nIndex));
    EXPECT_EQ(name + std::to_string(nChannel) + std::to_string(nIndex), "as it was78");
    const auto ReadMixed = [&]
    {
        const std::unique_ptr<IRasterReader> oReader(CreateDefaultReader(moFile, {2, 1}));
        const RasterPtr oRaster(oReader->GetRaster(0));
    };
    FailAtEveryCall(ReadMixed, [] {});
}

} // namespace krv::test
