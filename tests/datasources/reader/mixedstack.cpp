// Stacks of channels of different types, read as one type and compared with a conversion value by value: boundary
// values of every type, and real images where the folder with them is there.

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/multitypereader.h"
#include "gobs/raster/raster.h"
#include "tests/support/conversionmodel.h"
#include "tests/support/facts.h"
#include "tests/support/outputcapture.h"
#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <memory>
#include <string>
#include <vector>

namespace krv::datasources
{

namespace
{

using Bytes = std::vector<unsigned char>;

// A channel as it is, of the type of a code.
struct Channel
{
    krv::gobs::NativeDataTypeCode meType;
    Bytes moValues;
};

constexpr unsigned int HEIGHT = 3;

void WriteStack(const std::string& file, unsigned int nWidth, unsigned int nHeight,
                const std::vector<Channel>& oChannels)
{
    const std::unique_ptr<IDataset> oDataset(DatasetManager::GetInstance()->NewDataset(file, "DEMO", ""));
    auto& oRasters = dynamic_cast<IRasterDataset&>(*oDataset);
    std::vector<krv::gobs::DataType> oTypes;
    for (const Channel& oChannel : oChannels)
        oTypes.emplace_back(oChannel.meType);
    oRasters.Create(nWidth, nHeight, oTypes);
    for (unsigned int nChannel = 1; nChannel <= oChannels.size(); ++nChannel)
    {
        Bytes oPixels = oChannels[nChannel - 1].moValues;
        const std::unique_ptr<IRasterIO> oIO(oRasters.GetRasterIO({nChannel}));
        oIO->WriteWindow(0u, 0u, nWidth, nHeight, oPixels.data());
    }
    oDataset->Close();
}

// oExpected: for each channel of the reader.
void ExpectConverted(IRasterReader& oReader, const std::vector<const Channel*>& oExpected)
{
    const krv::test::Type oTo(oReader.GetDataType().GetNativeCode());
    const std::unique_ptr<krv::gobs::Raster> oRaster(oReader.ReadRaster(0, 0, oReader.GetWidth(), oReader.GetHeight()));
    const std::size_t nPixels = std::size_t{oReader.GetWidth()} * oReader.GetHeight();
    ASSERT_EQ(oRaster->GetBufferSize(), nPixels * oExpected.size() * oTo.Bytes());
    for (std::size_t nPosition = 0; nPosition < oExpected.size(); ++nPosition)
    {
        const krv::test::Type oFrom(oExpected[nPosition]->meType);
        for (std::size_t nPixel = 0; nPixel < nPixels; ++nPixel)
        {
            unsigned char oModel[16];
            krv::test::ModelValue(&oExpected[nPosition]->moValues[nPixel * oFrom.Bytes()], oFrom, oModel, oTo);
            const unsigned char* const pGot =
                oRaster->GetBuffer() + (nPixel * oExpected.size() + nPosition) * oTo.Bytes();
            for (int nPart = 0; nPart < oTo.mnParts; ++nPart)
                ASSERT_TRUE(krv::test::Same(pGot + nPart * oTo.mpoPart->mnBytes, oModel + nPart * oTo.mpoPart->mnBytes,
                                            *oTo.mpoPart))
                    << "position " << nPosition << ", pixel " << nPixel << " as " << oReader.GetDataType().Describe();
        }
    }
}

} // namespace

TEST(MixedStack, BoundaryValuesOfEveryTypeInEveryType)
{
    constexpr unsigned int WIDTH = 101;
    std::vector<Channel> oChannels;
    std::vector<unsigned int> oNumbers;
    std::vector<const Channel*> oExpected;
    for (int nType = krv::gobs::eDT_8U; nType <= krv::gobs::eDT_C64R; ++nType)
    {
        const krv::test::Type oType(nType);
        const Bytes oValues = krv::test::BoundaryValues(*oType.mpoPart);
        Bytes oPixels(WIDTH * HEIGHT * oType.Bytes());
        for (std::size_t i = 0; i < oPixels.size(); ++i)
            oPixels[i] = oValues[i % oValues.size()];
        oChannels.push_back({static_cast<krv::gobs::NativeDataTypeCode>(nType), oPixels});
    }
    for (unsigned int nPosition = 0; nPosition < 2 * oChannels.size(); ++nPosition) // so that no group is consecutive
    {
        oNumbers.push_back(nPosition % 15 + 1);
        oExpected.push_back(&oChannels[nPosition % 15]);
    }
    const krv::conformance::TempFolder oFolder;
    const std::string file = oFolder.File("stack.demo");
    WriteStack(file, WIDTH, HEIGHT, oChannels);
    const krv::test::OutputCapture oOutput; // most of these types lose something
    for (const Channel& oTarget : oChannels)
    {
        MultiTypeReader oReader(file, oNumbers, oTarget.meType, eOwnPlace);
        ExpectConverted(oReader, oExpected);
    }
}

// Two files make a stack in a DEMO file, and a reader of their own readers.
TEST(MixedStack, RealImagesOfTwoTypes)
{
    const std::string folder = krv::test::DataFolder();
    const std::string FILES[][2] = {
        {"/optical/tiny_LC81390452014295LGN00_B5.TIF", "/optical/tiny_LC81390452014295LGN00_B5_refl.TIF"},
        {"/nodata/test-200506000000_0_0.tiff", "/mask/image_rgb_mask.tif"}};
    if (!std::filesystem::exists(folder))
        GTEST_SKIP() << "no real files";
    for (const auto& oFiles : FILES)
    {
        SCOPED_TRACE(oFiles[0]);
        std::vector<Channel> oChannels;
        unsigned int nWidth = 0;
        unsigned int nHeight = 0;
        for (const std::string& file : oFiles)
        {
            BasicReader oReader(folder + file, {1});
            nWidth = oReader.GetWidth();
            nHeight = oReader.GetHeight();
            const std::unique_ptr<krv::gobs::Raster> oRaster(oReader.ReadRaster(0, 0, nWidth, nHeight));
            oChannels.push_back({oReader.GetDataType().GetNativeCode(),
                                 Bytes(oRaster->GetBuffer(), oRaster->GetBuffer() + oRaster->GetBufferSize())});
        }
        const krv::conformance::TempFolder oFolder;
        const std::string stack = oFolder.File("stack.demo");
        WriteStack(stack, nWidth, nHeight, oChannels);
        const std::vector<const Channel*> oExpected = {&oChannels[0], &oChannels[1]};
        const std::unique_ptr<IDataset> oDataset(DatasetManager::GetInstance()->Open(folder + oFiles[0], eReadOnly));
        const krv::test::OutputCapture oOutput;
        for (const auto eType : {krv::gobs::eDT_8U, krv::gobs::eDT_16S, krv::gobs::eDT_32R, krv::gobs::eDT_C64R})
        {
            MultiTypeReader oStacked(stack, {1, 2}, eType);
            ExpectConverted(oStacked, oExpected);
            MultiTypeReader oJoined(
                oDataset.get(), {new BasicReader(folder + oFiles[0], {1}), new BasicReader(folder + oFiles[1], {1})},
                {1, 2}, eType);
            ExpectConverted(oJoined, oExpected);
        }
    }
}

} // namespace krv::datasources
