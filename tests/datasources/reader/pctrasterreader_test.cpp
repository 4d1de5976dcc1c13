#include "datasources/reader/derived/pctrasterreader.h"

#include "datasources/metadata/nodatavalue.h"
#include "datasources/reader/exacthaloreader.h"
#include "datasources/reader/readervalidity.h"
#include "gobs/mask/mask.h"
#include "gobs/pct/pct.h"
#include "gobs/raster/rasterview.h"
#include "tests/datasources/reader/readertest.h"
#include "tests/support/facts.h"

#include <filesystem>

namespace krv::test
{

namespace
{

using namespace krv::datasources;
using krv::gobs::PCT;
using krv::gobs::Raster;

// Ranges of unlike widths with a gap, some of them translucent.
PCT MakeTable(bool bAlpha)
{
    PCT oTable;
    const double aBounds[][2] = {{-30000, -5}, {-5, 3}, {3, 40.5}, {60, 61}, {61, 200}, {1000, 70000}};
    std::uint16_t nPart = 0;
    for (const auto& aRange : aBounds)
    {
        ++nPart;
        oTable.Add({aRange[0],
                    aRange[1],
                    {static_cast<std::uint16_t>(nPart * 257 * 30), static_cast<std::uint16_t>(nPart * 1000),
                     static_cast<std::uint16_t>(65535 - nPart * 4000)},
                    static_cast<std::uint16_t>(bAlpha && nPart == 3 ? 257 * 100 : 65535)});
    }
    oTable.SetBackground({9, 8, 7});
    return oTable;
}

// Colours by the table's own word, value by value; alpha 0 where the mask says so.
std::string ColoursOf(const Raster& oValues, const PCT& oTable, bool bAlpha, const krv::gobs::Mask* poMask)
{
    std::string colours;
    krv::gobs::VisitPartType(oValues.GetDataType(),
                             [&]<class T>(std::type_identity<T>)
                             {
                                 const krv::gobs::RasterView<const T> oView(oValues);
                                 const auto* const pFirst = reinterpret_cast<const T*>(oValues.GetBuffer());
                                 for (std::uint64_t n = 0; n < oValues.GetFullWidth() * oValues.GetFullHeight(); ++n)
                                 {
                                     unsigned char nAlpha = 0;
                                     const auto oColour = oTable.GetValue(static_cast<double>(pFirst[n]), nAlpha);
                                     if (poMask != nullptr &&
                                         !poMask->GetBit(n % oValues.GetFullWidth(), n / oValues.GetFullWidth()))
                                         nAlpha = 0;
                                     for (const unsigned char nByte : {oColour.red, oColour.green, oColour.blue})
                                         colours += static_cast<char>(nByte);
                                     if (bAlpha)
                                         colours += static_cast<char>(nAlpha);
                                 }
                             });
    return colours;
}

std::string BitsOf(const krv::gobs::Mask* poMask)
{
    if (poMask == nullptr)
        return "all";
    return {reinterpret_cast<const char*>(poMask->GetBits()), static_cast<std::size_t>(poMask->GetBitsSize())};
}

class PCTRasterReaderTest : public ReaderTest
{
};

} // namespace

TEST_F(PCTRasterReaderTest, EveryTypeHasTheColoursOfTheTable)
{
    using namespace krv::gobs;
    moModel->mnWidth = 211;
    for (const bool bAlpha : {false, true})
    {
        for (const NativeDataTypeCode eType :
             {eDT_8U, eDT_8S, eDT_16U, eDT_16S, eDT_32U, eDT_32S, eDT_32R, eDT_64U, eDT_64S, eDT_64R})
        {
            moModel->moTypes.assign(3, eType);
            const auto poDataset = MakeDataset();
            PCT oTable = MakeTable(bAlpha);
            for (const bool bInterpolate : {false, true})
            {
                oTable.SetInterpolation(bInterpolate);
                BasicReader oValues(poDataset.get(), {2}, false);
                PCTRasterReader oReader(&oValues, oTable, false);
                EXPECT_EQ(oReader.GetChansCount(), bAlpha ? 4u : 3u);
                EXPECT_EQ(oReader.GetDataType(), DataType(eDT_8U));
                EXPECT_EQ(oReader.GetChannelsInfo().size(), oReader.GetChansCount());
                oReader.SetMargins(5, 3, eWrap);
                const RasterPtr oColours(oReader.ReadRaster(1, 0, 200, 9));
                const RasterPtr oRaster(oValues.ReadRaster(1, 0, 200, 9));
                EXPECT_EQ(PixelsOf(*oColours), ColoursOf(*oRaster, oTable, bAlpha, nullptr))
                    << DataType(eType).Describe() << bAlpha << bInterpolate;
            }
        }
    }
}

TEST_F(PCTRasterReaderTest, ValidityIsTheSourcesAndAlphaShowsIt)
{
    moModel->moTypes.assign(3, krv::gobs::eDT_16U);
    moModel->moLevels = {2, 3};
    moModel->moBitmaps = {{1, ""}};
    {
        const auto poPlain = MakeDataset();
        const RasterPtr oOne(BasicReader(poPlain.get(), {2}, false).ReadRaster(3, 4, 1, 1));
        const unsigned int nNoData = krv::gobs::RasterView<const std::uint16_t>(*oOne).At(0, 0, 0);
        moModel->moAuxiliary.SetChanMetadataValue("NO_DATA_VALUE", std::to_string(nNoData), 2);
    }
    moModel->moAuxiliary.SetFileMetadataValue("STATISTICS_MEAN", "4");
    const auto poDataset = MakeDataset();
    const PCT oTable = MakeTable(true);
    BasicReader oValues(poDataset.get(), {2}, false);
    PCTRasterReader oReader(&oValues, oTable, false);
    EXPECT_TRUE(oReader.HasValidity());
    EXPECT_EQ(oReader.GetDataset(), nullptr);
    const std::unique_ptr<IOverviewReaderAccessor> oLevels(oReader.GetOverviewReaderAccessor());
    const std::unique_ptr<IOverviewReaderAccessor> oValueLevels(oValues.GetOverviewReaderAccessor());
    EXPECT_EQ(oLevels->GetLevels(), moModel->moLevels);
    EXPECT_EQ(oLevels->GetChanCount(), 4u);
    for (const unsigned int nLevel : {1u, 2u, 3u})
    {
        const std::unique_ptr<IRasterReader> oColourLevel(nLevel > 1 ? oLevels->CreateRasterReader(nLevel) : nullptr);
        const std::unique_ptr<IRasterReader> oValueLevel(nLevel > 1 ? oValueLevels->CreateRasterReader(nLevel)
                                                                    : nullptr);
        IRasterReader& oColoured = nLevel > 1 ? *oColourLevel : oReader;
        IRasterReader& oIndices = nLevel > 1 ? *oValueLevel : oValues;
        oColoured.SetMargins(2, 2, eReplicate);
        oIndices.SetMargins(2, 2, eReplicate);
        ReaderValidity oColourValidity(oColoured), oValueValidity(oIndices);
        const RasterPtr oColours(oColoured.ReadRaster(0, 0, oColoured.GetWidth(), oColoured.GetHeight()));
        const RasterPtr oPixels(oIndices.ReadRaster(0, 0, oIndices.GetWidth(), oIndices.GetHeight()));
        const auto oMask = oColourValidity.Read(*oColours);
        const auto oExpected = oValueValidity.Read(*oPixels);
        ASSERT_NE(oMask, nullptr);
        EXPECT_TRUE(nLevel > 1 || oMask->CountSet() < oMask->GetFullWidth() * oMask->GetFullHeight());
        EXPECT_EQ(BitsOf(oMask.get()), BitsOf(oExpected.get())) << nLevel;
        EXPECT_EQ(PixelsOf(*oColours), ColoursOf(*oPixels, oTable, true, oExpected.get())) << nLevel;
    }

    const AuxiliaryData oRecord = oReader.GetAuxiliaryData();
    EXPECT_EQ(oRecord.GetFileMetadataValue("scene"), "alps");
    EXPECT_EQ(oRecord.GetFileMetadataValue("STATISTICS_MEAN"), "");
    EXPECT_EQ(oRecord.GetChannelDescription(1), "channel 2");
    EXPECT_EQ(oRecord.GetChanMetadataValue("ColorInterp", 4), "Alpha");
    float nSource = 0;
    ASSERT_TRUE(krv::qrfutils::GetNoDataValue(oValues, nSource, 1));
    const auto oColour = oTable.GetValue(static_cast<double>(nSource));
    const unsigned char aParts[] = {oColour.red, oColour.green, oColour.blue};
    for (unsigned int n = 1; n <= 3; ++n)
    {
        float nPart = -1;
        EXPECT_TRUE(krv::qrfutils::GetNoDataValue(oReader, nPart, n));
        EXPECT_EQ(nPart, aParts[n - 1]);
    }
    float nNone = -1;
    EXPECT_FALSE(krv::qrfutils::GetNoDataValue(oReader, nNone, 4));
}

TEST_F(PCTRasterReaderTest, LevelsOfMeansAreNotOffered)
{
    moModel->moLevels = {2, 4, 8};
    moModel->moAuxiliary.SetChanMetadataValue("_Overview_2", "valid AVERAGE", 1);
    moModel->moAuxiliary.SetChanMetadataValue("_Overview_4", "valid MODE", 1);
    BasicReader oValues(moFile, {1});
    PCTRasterReader oReader(&oValues, MakeTable(false), false);
    const std::unique_ptr<IOverviewReaderAccessor> oLevels(oReader.GetOverviewReaderAccessor());
    EXPECT_EQ(oLevels->GetLevels(), (std::vector<unsigned int>{4, 8}));
    EXPECT_FALSE(oLevels->IsLevelValid(2));
    EXPECT_FALSE(oLevels->IsValid(3, 2));
    EXPECT_TRUE(oLevels->IsValid(3, 4));
    EXPECT_NE(Error([&] { oLevels->CreateRasterReader(2); }), "");
    EXPECT_NE(Error([&] { static_cast<void>(oLevels->IsValid(4, 4)); }), "");
}

TEST_F(PCTRasterReaderTest, BadSourcesAreRefusedAndNothingStaysAlive)
{
    const PCT oTable = MakeTable(false);
    EXPECT_EQ(Error([&] { PCTRasterReader oReader(static_cast<IRasterReader*>(nullptr), oTable, true); }),
              "data: The source reader is NULL");
    EXPECT_EQ(Error([&] { PCTRasterReader oReader(static_cast<IDataset*>(nullptr), 1, true); }),
              "data: The dataset is NULL");
    BasicReader oTwo(moFile, {1, 2});
    EXPECT_NE(Error([&] { PCTRasterReader oReader(&oTwo, oTable, false); }).find("2 channels"), std::string::npos);
    BasicReader oOne(moFile, {1});
    EXPECT_EQ(Error([&] { PCTRasterReader oReader(&oOne, PCT(), false); }), "data: The colour table has no entries");
    EXPECT_NE(Error([&] { PCTRasterReader oReader(moFile, 1); }).find("channel 1 has no colour table"),
              std::string::npos);
    moModel->moTypes.assign(3, krv::gobs::eDT_C32R);
    BasicReader oComplex(moFile, {1});
    EXPECT_NE(Error([&] { PCTRasterReader oReader(&oComplex, oTable, false); }).find("complex"), std::string::npos);
}

TEST_F(PCTRasterReaderTest, NothingLeaksAtTheNthCall)
{
    const PCT oTable = MakeTable(true);
    moModel->moBitmaps = {{1, ""}};
    moModel->moLevels = {2};
    const auto Use = [](IRasterReader& oReader)
    {
        oReader.SetMargins(1, 1, eMirror);
        const RasterPtr oTile(oReader.GetRaster(0));
        const std::unique_ptr<IOverviewReaderAccessor> oLevels(oReader.GetOverviewReaderAccessor());
        const std::unique_ptr<IRasterReader> oLevel(oLevels->CreateRasterReader(2));
        const RasterPtr oLevelTile(oLevel->GetRaster(0));
    };
    const auto OverReader = [&]
    {
        auto oValues = std::make_unique<BasicReader>(moFile, Channels{2});
        PCTRasterReader oReader(oValues.get(), oTable, true);
        static_cast<void>(oValues.release());
        Use(oReader);
    };
    const auto OverFile = [&]
    {
        PCTRasterReader oReader(moFile, 2);
        Use(oReader);
    };
    const auto OverDataset = [&]
    {
        std::unique_ptr<IDataset> oDataset = MakeDataset();
        PCTRasterReader oReader(oDataset.get(), 2, true);
        static_cast<void>(oDataset.release());
        Use(oReader);
    };
    FailAtEveryCall(OverReader, [] {});
    FailAtEveryCall(OverFile, [] {});
    FailAtEveryCall(OverDataset, [] {});
}

// A file's own table, that of another file by reference, and the colours of all palettes of the real data.
TEST(PCTRasterReaderFiles, PalettesOfFilesAreFound)
{
    unsigned int nFiles = 0;
    std::error_code oNone;
    for (const auto& oEntry : std::filesystem::directory_iterator(DataFolder() + "/palette", oNone))
    {
        const std::string file = oEntry.path().string();
        if (!file.ends_with(".tif") && !file.ends_with(".tiff"))
            continue;
        SCOPED_TRACE(file);
        BasicReader oValues(file, std::vector<unsigned int>{1});
        std::unique_ptr<PCTRasterReader> oReader;
        const std::string error = Error([&] { oReader = std::make_unique<PCTRasterReader>(file); });
        if (!error.empty())
        {
            EXPECT_NE(error.find("has no colour table"), std::string::npos) << error;
            continue;
        }
        ++nFiles;
        ReaderValidity oValidity(oValues);
        const unsigned int nWidth = std::min(oValues.GetWidth(), 300u);
        const unsigned int nHeight = std::min(oValues.GetHeight(), 300u);
        const RasterPtr oPixels(oValues.ReadRaster(0, 0, nWidth, nHeight));
        const auto oMask = oValidity.Read(*oPixels);
        const RasterPtr oColours(oReader->ReadRaster(0, 0, nWidth, nHeight));
        EXPECT_EQ(PixelsOf(*oColours),
                  ColoursOf(*oPixels, oReader->GetTable(), oReader->GetChansCount() == 4, oMask.get()));
        // The same table for a channel of another file, by reference.
        const auto poModel = std::make_shared<ImageModel>();
        poModel->moAuxiliary.SetChanMetadataValue("DEFAULT_PCT_REF", "gdb:" + file + "/{PCT:1}", 2);
        SyntheticDataset oOther(poModel);
        EXPECT_EQ(PCTRasterReader(&oOther, 2, false).GetTable().GetEntries().size(),
                  oReader->GetTable().GetEntries().size());
    }
    if (nFiles == 0)
        GTEST_SKIP() << "no palettes there";
    EXPECT_GE(nFiles, 8u);
}

} // namespace krv::test
