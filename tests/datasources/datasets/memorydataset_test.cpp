#include "datasources/datasets/memorydataset.h"

#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/overviews/overviewbuilder.h"
#include "datasources/reader/basicreader.h"
#include "datasources/writer/memorywriter.h"
#include "gobs/pct/pct.h"
#include "gobs/raster/raster.h"
#include "tests/support/pixels.h"
#include "tests/support/recipe.h"
#include "tests/support/thrown.h"
#include "toolkit/ogc/cs/crsfactory.h"
#include "toolkit/ogc/cs/geocodinginfo.h"

#include <algorithm>
#include <cstring>
#include <random>

namespace krv::test
{

namespace
{

using datasources::AuxiliaryData;
using datasources::BasicReader;
using datasources::BasicWriter;
using datasources::IDataset;
using datasources::IOverviewManager;
using datasources::IRasterIO;
using datasources::MemoryDataset;
using datasources::MemoryOptions;
using datasources::MemoryWriter;
using gobs::DataType;
using Channels = std::vector<unsigned int>;

unsigned char* Bytes(std::string& text)
{
    return reinterpret_cast<unsigned char*>(text.data());
}

std::string ReadAll(IRasterIO* poIO, std::size_t nPixelBytes)
{
    const std::unique_ptr<IRasterIO> oIO(poIO);
    std::string bytes(nPixelBytes * oIO->GetFileWidth() * oIO->GetFileHeight(), '?');
    oIO->ReadWindow(0U, 0U, oIO->GetFileWidth(), oIO->GetFileHeight(), Bytes(bytes));
    return bytes;
}

void WriteAll(IRasterIO* poIO, std::string bytes)
{
    const std::unique_ptr<IRasterIO> oIO(poIO);
    oIO->WriteWindow(0U, 0U, oIO->GetFileWidth(), oIO->GetFileHeight(), Bytes(bytes));
}

// Every channel as a plane of its own, pixel by pixel.
struct Model
{
    static constexpr unsigned int WIDTH = 600, HEIGHT = 530;

    std::vector<DataType> moTypes;
    std::vector<std::string> moPlanes;

    std::size_t BytesOf(unsigned int nChannel) const { return moTypes[nChannel - 1].GetValueBits() / 8; }
    void Add(const DataType& oType, unsigned char nFill)
    {
        moTypes.push_back(oType);
        moPlanes.emplace_back();
        for (unsigned int n = 0; n < WIDTH * HEIGHT; ++n)
        {
            moPlanes.back() += static_cast<char>(nFill); // the fill value is small: its other bytes are 0
            moPlanes.back().append(BytesOf(static_cast<unsigned int>(moTypes.size())) - 1, '\0');
        }
    }
    char* At(unsigned int nChannel, unsigned int nX, unsigned int nY)
    {
        return moPlanes[nChannel - 1].data() + (std::size_t{nY} * WIDTH + nX) * BytesOf(nChannel);
    }
};

} // namespace

// Any windows of any lists of channels, through tiles that exist and such that do not, while channels come and go.
TEST(MemoryDataset, RandomTransfersAgreeWithPlanesPixelByPixel)
{
    constexpr unsigned int SEED = 20130;
    SCOPED_TRACE(SEED);
    std::mt19937 oRandom(SEED);
    const auto Below = [&](unsigned int nEnd)
    {
        return static_cast<unsigned int>(oRandom() % nEnd);
    };
    MemoryDataset oDataset(MemoryOptions{"model", MemoryOptions::NO_CEILING, 3});
    oDataset.Create(Model::WIDTH, Model::HEIGHT, {gobs::eDT_16U, gobs::eDT_8U, gobs::eDT_16U, gobs::eDT_16U});
    Model oModel;
    for (const auto eType : {gobs::eDT_16U, gobs::eDT_8U, gobs::eDT_16U, gobs::eDT_16U})
        oModel.Add(eType, 3);
    for (int nStep = 0; nStep < 400; ++nStep)
    {
        const auto nCount = static_cast<unsigned int>(oModel.moTypes.size());
        if (nStep % 40 == 39 && nCount < 6)
        {
            const DataType oType(Below(2) == 0 ? gobs::eDT_16U : gobs::eDT_C32S);
            oDataset.AddNewChannel({Model::WIDTH, Model::HEIGHT, 1, oType});
            oModel.Add(oType, 3);
        }
        else if (nStep % 70 == 69)
        {
            const unsigned int nGone = Below(nCount);
            oDataset.DeleteChannel(nGone + 1);
            oModel.moTypes.erase(oModel.moTypes.begin() + nGone);
            oModel.moPlanes.erase(oModel.moPlanes.begin() + nGone);
        }
        const unsigned int nFirst = Below(static_cast<unsigned int>(oModel.moTypes.size())) + 1;
        const bool bWrite = nStep % 2 == 0;
        Channels oChannels = {nFirst};
        for (unsigned int n = 1; n <= oModel.moTypes.size(); ++n)
        {
            const bool bNew = std::find(oChannels.begin(), oChannels.end(), n) == oChannels.end();
            if (oModel.moTypes[n - 1] == oModel.moTypes[nFirst - 1] && Below(3) != 0 && (bNew || !bWrite))
                oChannels.insert(oChannels.begin() + Below(static_cast<unsigned int>(oChannels.size()) + 1), n);
        }
        const unsigned int nWidth = 1 + Below(nStep % 5 == 0 ? Model::WIDTH : 90);
        const unsigned int nHeight = 1 + Below(nStep % 5 == 0 ? Model::HEIGHT : 90);
        const unsigned int nX = Below(Model::WIDTH - nWidth + 1), nY = Below(Model::HEIGHT - nHeight + 1);
        const std::size_t nBytes = oModel.BytesOf(nFirst);
        const std::unique_ptr<IRasterIO> oIO(oDataset.GetRasterIO(oChannels));
        std::string buffer(nBytes * oChannels.size() * nWidth * nHeight, '?');
        if (bWrite)
        {
            for (char& nByte : buffer)
                nByte = static_cast<char>(oRandom());
            oIO->WriteWindow(nX, nY, nWidth, nHeight, Bytes(buffer));
        }
        else
            oIO->ReadWindow(nX, nY, nWidth, nHeight, Bytes(buffer));
        std::size_t nAt = 0;
        for (unsigned int n = 0; n < nWidth * nHeight; ++n)
            for (const unsigned int nChannel : oChannels)
            {
                char* const pModel = oModel.At(nChannel, nX + n % nWidth, nY + n / nWidth);
                if (bWrite)
                    std::memcpy(pModel, &buffer[nAt], nBytes);
                else
                    ASSERT_EQ(std::memcmp(pModel, &buffer[nAt], nBytes), 0) << "step " << nStep << ", value " << nAt;
                nAt += nBytes;
            }
    }
}

TEST(MemoryDataset, TakesMemoryAsPixelsComeAndNoMoreThanItsCeiling)
{
    constexpr std::uint64_t TILE = 256 * 256 * 2;
    MemoryDataset oDataset(MemoryOptions{"small", 3 * TILE, 0});
    oDataset.Create(0x7FFFFFFF, 0x7FFFFFFF, {gobs::eDT_16U});
    EXPECT_EQ(oDataset.GetBytes(), 0U);
    std::string two(4, 'x');
    const auto WriteAt = [&](unsigned int nX, unsigned int nY)
    {
        return Error(
            [&]
            {
                const std::unique_ptr<IRasterIO> oIO(oDataset.GetRasterIO({1}));
                oIO->WriteWindow(nX, nY, 2, 1, Bytes(two));
            });
    };
    EXPECT_EQ(WriteAt(0x7FFFFFFD, 0x7FFFFFFE), "");
    EXPECT_EQ(oDataset.GetBytes(), 255U * 255 * 2) << "the last tile is clipped to the image";
    EXPECT_EQ(WriteAt(100, 100), "");
    EXPECT_EQ(WriteAt(511, 0),
              "data: <memory: small>: another 262144 bytes beside 261122 exceed the ceiling of 393216");
    EXPECT_EQ(oDataset.GetBytes(), TILE + 255 * 255 * 2);
    EXPECT_EQ(WriteAt(300, 0), "");
    EXPECT_NE(WriteAt(1000, 1000), "");
    EXPECT_EQ(WriteAt(101, 7), "") << "tiles that are there may change";
    MemoryDataset oNone(MemoryOptions{"", 0, 0});
    oNone.Create(4, 4, {gobs::eDT_8U});
    EXPECT_NE(Error([&] { WriteAll(oNone.GetRasterIO({1}), std::string(16, 'x')); }), "");
    EXPECT_EQ(ReadAll(oNone.GetRasterIO({1}), 1), std::string(16, '\0'));
}

TEST(MemoryDataset, WhatCannotBeIsRefused)
{
    MemoryDataset oDataset;
    EXPECT_FALSE(oDataset.Exists());
    EXPECT_EQ(Error([&] { oDataset.GetWidth(); }), "data: <memory>: the dataset has no image yet");
    EXPECT_THROW(oDataset.Create(0, 4, {gobs::eDT_8U}), DataException);
    EXPECT_THROW(oDataset.Create(4, 1U << 31, {gobs::eDT_8U}), DataException);
    EXPECT_THROW(oDataset.Create(4, 4, {}), DataException);
    EXPECT_THROW(oDataset.Create(4, 4, {gobs::eDT_8U, gobs::eDT_BIT}), DataException);
    EXPECT_FALSE(oDataset.Exists());
    oDataset.Create(4, 4, {gobs::eDT_8U, gobs::eDT_C16U});
    EXPECT_THROW(oDataset.Create(4, 4, {gobs::eDT_8U}), DataException);
    EXPECT_THROW(oDataset.GetRasterIO({1, 2}), DataException);
    EXPECT_THROW(oDataset.GetRasterIO({}), DataException);
    EXPECT_THROW(oDataset.GetChannelInfo(3), DataException);
    EXPECT_THROW(oDataset.AddNewChannel({4, 5, 1, gobs::eDT_8U}), DataException);
    EXPECT_THROW(oDataset.DeleteChannel(3), DataException);
    EXPECT_THROW(oDataset.GetBitmapIO({1}), DataException);
    EXPECT_THROW(std::unique_ptr<gobs::PCT>(oDataset.GetPCT(1)), DataException);
    oDataset.DeleteChannel(1);
    EXPECT_THROW(oDataset.DeleteChannel(1), DataException);
    EXPECT_EQ(oDataset.Delete(), datasources::eDone);
    oDataset.Close();
    EXPECT_THROW(oDataset.GetRasterIO({1}), DataException);
}

// Accesses share everything, and the contents stay until the last goes.
TEST(MemoryWriter, HandsItsImageOnWithoutACopy)
{
    const std::string pixels = RecipeImage(300, 200, {1, 2}, gobs::eDT_32R);
    std::unique_ptr<IDataset> oShared;
    {
        MemoryWriter oWriter;
        EXPECT_FALSE(oWriter.FileExists());
        EXPECT_EQ(oWriter.GetWidth(), 0U);
        EXPECT_NE(Error([&] { oWriter.WriteRaster(nullptr); }), "");
        oWriter.CreateNewFile({300, 200, 2, gobs::eDT_32R});
        EXPECT_EQ(Error(
                      [&] {
                          oWriter.CreateNewFile({300, 200, 2, gobs::eDT_32R});
                      }),
                  "data: The dataset already exists");
        std::string copy = pixels;
        const gobs::Raster oRaster({300, 200, 2, gobs::eDT_32R}, {0, 0}, Bytes(copy), false);
        oWriter.WriteRaster(&oRaster);
        EXPECT_EQ(ReadPixels(oWriter), pixels);
        oWriter.SetGeocodingInfo({1, 2, 0, 3, 0, -4});
        oWriter.SetCRS(ogc::cs::CreateCRSFromEPSG(4326).get());
        AuxiliaryData oTags(2);
        oTags.SetChannelDescription("second", 2);
        oWriter.SetAuxiliaryData(oTags);
        oShared = oWriter.Share();
        EXPECT_EQ(oWriter.GetBytes(), 300U * 200 * 8);
        EXPECT_EQ(dynamic_cast<MemoryDataset&>(*oShared).GetBytes(), 300U * 200 * 8);
    }
    IDataset& oDataset = *oShared;
    BasicReader oReader(&oDataset, {}, false);
    EXPECT_EQ(ReadPixels(oReader), pixels);
    EXPECT_EQ(std::unique_ptr<ogc::cs::GeocodingInfo>(oReader.GetGeocodingInfo())->GetYPerRow(), -4);
    EXPECT_EQ(std::unique_ptr<ogc::cs::ICRS>(oReader.GetCRS())->GetEPSG(), 4326);
    EXPECT_EQ(oReader.GetAuxiliaryData().GetChannelDescription(2), "second");
    EXPECT_EQ(oDataset.GetFileFormat(), nullptr);
    // An I/O object holds the contents by itself.
    const std::unique_ptr<IRasterIO> oIO(dynamic_cast<datasources::IRasterDataset&>(*oShared).GetRasterIO({1, 2}));
    oShared.reset();
    std::string read(pixels.size(), '?');
    oIO->ReadWindow(0U, 0U, 300U, 200U, Bytes(read));
    EXPECT_EQ(read, pixels);
}

TEST(MemoryDataset, RecordBitmapsTablesAndLevelsFollowTheirChannels)
{
    MemoryDataset oDataset;
    oDataset.Create(600, 400, {gobs::eDT_8U, gobs::eDT_16S, gobs::eDT_8U});
    AuxiliaryData oTags(3);
    for (unsigned int n = 1; n <= 3; ++n)
        oTags.SetChanMetadataValue("band", "b" + std::to_string(n), n);
    oTags.SetChanMetadataValue("STATISTICS_MEAN", "7", 3);
    oDataset.WriteAuxiliaryData(oTags);
    const unsigned int nTable = oDataset.CreatePCT(gobs::PCT::FromColours({{1, 2, 3}}), 3);
    oDataset.SetPCTDescription(nTable, "colours");
    WriteAll(oDataset.GetRasterIO({1, 3}), RecipeImage(600, 400, {1, 3}, gobs::eDT_8U));
    EXPECT_EQ(oDataset.ReadAuxiliaryData().GetChanMetadataValue("STATISTICS_MEAN", 3), "7") << "of the pixels to come";
    oDataset.Synchronize();

    // A mask that leaves the left half out, with levels of its own.
    const unsigned int nZone = oDataset.CreateBitmap(), nMask = oDataset.CreateBitmap();
    EXPECT_EQ(oDataset.GetBitmapOverviewManager(), nullptr);
    oDataset.SetBitmapDescription(nMask, "");
    oDataset.SetBitmapMetadata(nMask, {{"a", "b"}});
    std::string valid(600 * 400, '\0');
    for (std::size_t n = 0; n < valid.size(); ++n)
        valid[n] = n % 600 < 300 ? '\0' : '\x7F';
    WriteAll(oDataset.GetBitmapIO({nMask}), valid);
    EXPECT_EQ(ReadAll(oDataset.GetBitmapIO({nMask, nZone}), 2).substr(598, 4), std::string("\0\0\1\0", 4));

    BasicWriter oWriter(static_cast<datasources::IRasterDataset*>(&oDataset), {1, 3});
    ASSERT_TRUE(datasources::BuildOverviews(oWriter, {2, 4}, "average"));
    const std::unique_ptr<IOverviewManager> oLevels(oDataset.GetOverviewManager());
    const std::unique_ptr<IOverviewManager> oMaskLevels(oDataset.GetBitmapOverviewManager());
    EXPECT_EQ(oLevels->GetLevels(), (Channels{2, 4}));
    EXPECT_EQ(oLevels->GetResamplingName(), "AVERAGE");
    EXPECT_EQ(oMaskLevels->GetLevels(), (Channels{2, 4}));
    EXPECT_TRUE(oLevels->IsValid(3, 4) && oMaskLevels->IsValid(nMask, 2) && !oMaskLevels->IsValid(nZone, 2));
    EXPECT_FALSE(oLevels->IsValid(2, 4)) << "not built";
    EXPECT_THROW(oLevels->GetOverviewIO(2, {1, 2}), DataException);
    EXPECT_THROW(oLevels->CreateLevel(2), DataException);
    EXPECT_EQ(ReadAll(oMaskLevels->GetOverviewIO(4, {nMask}), 1).substr(74, 2), std::string("\0\1", 2));
    const std::string level = ReadAll(oLevels->GetOverviewIO(4, {3}), 1);
    EXPECT_EQ(level[0], '\0') << "no valid pixel";

    // The record is replaced, the states of the levels are not.
    oDataset.WriteAuxiliaryData(oTags);
    EXPECT_TRUE(oLevels->IsValid(3, 2));
    oDataset.DeleteChannel(1);
    EXPECT_EQ(oDataset.GetPCTChannel(nTable), 2U);
    EXPECT_EQ(oDataset.ReadAuxiliaryData().GetChanMetadataValue("band", 2), "b3");
    EXPECT_EQ(ReadAll(oLevels->GetOverviewIO(4, {2}), 1), level);
    oDataset.AddNewChannel({600, 400, 2, gobs::eDT_8U});
    EXPECT_TRUE(oLevels->IsValid(2, 4) && !oLevels->IsValid(4, 4));
    EXPECT_EQ(ReadAll(oLevels->GetOverviewIO(4, {2, 4}), 2).size(), 2 * level.size());

    WriteAll(oDataset.GetRasterIO({2}), std::string(600 * 400, 'x'));
    EXPECT_FALSE(oLevels->IsValid(2, 2) || oMaskLevels->IsValid(nMask, 4)) << "the pixels are others now";
    EXPECT_EQ(oDataset.ReadAuxiliaryData().GetChanMetadataValue("STATISTICS_MEAN", 2), "");
    oDataset.SetBitmapDescription(nMask, "a zone now");
    EXPECT_EQ(oDataset.GetBitmapOverviewManager(), nullptr);
    oDataset.DeleteBitmap(nZone);
    EXPECT_EQ(oDataset.GetBitmapList(), Channels{nMask});
}

} // namespace krv::test
