#include "datasources/datasets/metacomplexdataset.h"

#include "datasources/datasets/memorydataset.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/overviews/overviewbuilder.h"
#include "datasources/reader/validitysource.h"
#include "datasources/writer/basicwriter.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/buffertype.h"
#include "tests/datasources/reader/readertest.h"
#include "tests/support/outputcapture.h"
#include "toolkit/ogc/cs/crsfactory.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/raster/copydata.h"

#include <cmath>
#include <complex>
#include <cstring>

namespace krv::test
{

namespace
{

using namespace krv::datasources;
using gobs::DataType;

constexpr unsigned int WIDTH = 300, HEIGHT = 70;

void WriteAll(IRasterIO* poIO, std::string bytes)
{
    const std::unique_ptr<IRasterIO> oIO(poIO);
    oIO->WriteWindow(0U, 0U, oIO->GetFileWidth(), oIO->GetFileHeight(), reinterpret_cast<unsigned char*>(bytes.data()));
}

template <class Value>
std::vector<Value> ValuesOf(const std::string& bytes)
{
    std::vector<Value> oValues(bytes.size() / sizeof(Value));
    std::memcpy(oValues.data(), bytes.data(), bytes.size());
    return oValues;
}

template <class Value>
std::string BytesOf(const std::vector<Value>& oValues)
{
    return {reinterpret_cast<const char*>(oValues.data()), oValues.size() * sizeof(Value)};
}

// A dataset in memory with the recipe's channels of one type.
std::unique_ptr<MemoryDataset> MakeSource(const DataType& oType, const Channels& oChannels, const char* pName = "")
{
    auto oSource = std::make_unique<MemoryDataset>(MemoryOptions{pName, MemoryOptions::NO_CEILING, 0});
    oSource->Create(WIDTH, HEIGHT, std::vector<DataType>(oChannels.size(), oType));
    Channels oAll(oChannels.size());
    for (unsigned int n = 0; n < oAll.size(); ++n)
        oAll[n] = n + 1;
    WriteAll(oSource->GetRasterIO(oAll), RecipeImage(WIDTH, HEIGHT, oChannels, oType));
    return oSource;
}

std::string ReadChannels(IDataset& oDataset, const Channels& oChannels)
{
    return ReadPixels(BasicReader(&oDataset, oChannels, false));
}

// The types of pairs, and whether they are exact.
struct Pairing
{
    DataType moSource;
    DataType moComplex;
    bool mbExact;
};

const Pairing PAIRINGS[] = {
    {gobs::eDT_8U, gobs::eDT_C16S, true},   {gobs::eDT_8S, gobs::eDT_C16S, true},
    {gobs::eDT_16S, gobs::eDT_C16S, true},  {gobs::eDT_16U, gobs::eDT_C16U, true},
    {gobs::eDT_32S, gobs::eDT_C32S, true},  {gobs::eDT_32U, gobs::eDT_C64R, true},
    {gobs::eDT_32R, gobs::eDT_C32R, true},  {gobs::eDT_64R, gobs::eDT_C64R, true},
    {gobs::eDT_64U, gobs::eDT_C64R, false}, {gobs::eDT_64S, gobs::eDT_C64R, false},
};

} // namespace

// Each part as CopyData converts it alone, from one source and from two, read and written back.
TEST(MetaComplexDataset, EveryTypePairsFromOneSourceAndFromTwo)
{
    for (const Pairing& oPairing : PAIRINGS)
    {
        SCOPED_TRACE(oPairing.moSource.Describe());
        const OutputCapture oCapture;
        const auto oOne = MakeSource(oPairing.moSource, {1, 2, 3, 4});
        const auto oI = MakeSource(oPairing.moSource, {1, 3}), oQ = MakeSource(oPairing.moSource, {4, 2});
        MetaComplexDataset oSingle(oOne.get(), {{1, 2}, {3, 4}}, false);
        MetaComplexDataset oDouble(oI.get(), oQ.get(), {{1, 2}, {2, 1}}, false);
        EXPECT_EQ(oSingle.IsExact(), oPairing.mbExact);
        EXPECT_EQ(oCapture.moWarnings.size(), oPairing.mbExact ? 0U : 2U);
        const std::unique_ptr<IChannelInfo> oInfo(oSingle.GetChannelInfo(2));
        EXPECT_EQ(oInfo->GetDataType(), oPairing.moComplex);

        const DataType oPart(oPairing.moComplex.GetBits(), oPairing.moComplex.IsSigned(), oPairing.moComplex.IsReal(),
                             0, 0, false);
        const std::size_t nPart = oPart.GetValueBits() / 8, nPixels = WIDTH * HEIGHT;
        const auto Convert = [&](const Channels& oOrder)
        {
            const std::string samples = RecipeImage(WIDTH, HEIGHT, oOrder, oPairing.moSource);
            std::string parts(nPixels * oOrder.size() * nPart, '\0');
            raster::CopyData(samples.data(), gobs::QRFDataType2RasterBufferType(oPairing.moSource), 1, parts.data(),
                             gobs::QRFDataType2RasterBufferType(oPart), 1, nPixels * oOrder.size());
            return parts;
        };
        EXPECT_EQ(ReadChannels(oSingle, {2, 1, 2}), Convert({3, 4, 1, 2, 3, 4}));
        EXPECT_EQ(ReadChannels(oDouble, {1, 2}), Convert({1, 2, 3, 4}));
        // Margins as of any dataset.
        BasicReader oReader(static_cast<IDataset*>(&oDouble), {2}, false);
        oReader.SetMargins(3, 2, eMirror);
        const RasterPtr oTile(oReader.ReadRaster(290, 60, 10, 10));
        const ReferenceImage oImage{WIDTH, HEIGHT, 2 * nPart, Convert({3, 4})};
        EXPECT_EQ(PixelsOf(*oTile), oImage.WithMargins(290, 60, 10, 10, 3, 2, eMirror));

        if (oPairing.mbExact)
        {
            const auto oCopy = MakeSource(oPairing.moSource, {9, 9, 9, 9});
            MetaComplexDataset oTarget(oCopy.get(), {{4, 1}, {2, 3}}, false);
            WriteAll(oTarget.GetRasterIO({1, 2}), Convert({1, 2, 3, 4}));
            EXPECT_EQ(ReadChannels(*oCopy, {4, 1, 2, 3}), RecipeImage(WIDTH, HEIGHT, {1, 2, 3, 4}, oPairing.moSource));
            WriteAll(oDouble.GetRasterIO({2, 1}), Convert({1, 2, 3, 4}));
            EXPECT_EQ(ReadChannels(*oI, {2, 1}), RecipeImage(WIDTH, HEIGHT, {1, 3}, oPairing.moSource));
            EXPECT_EQ(ReadChannels(*oQ, {1, 2}), RecipeImage(WIDTH, HEIGHT, {2, 4}, oPairing.moSource));
        }
    }
}

TEST(MetaComplexDataset, AmplitudeAndPhaseAreOneValue)
{
    MemoryDataset oSource;
    oSource.Create(3, 1, {gobs::eDT_32R, gobs::eDT_32R});
    AuxiliaryData oTags(2);
    oTags.SetFileMetadataValue("NO_DATA_VALUE", "-1");
    oSource.WriteAuxiliaryData(oTags);
    WriteAll(oSource.GetRasterIO({1, 2}), BytesOf(std::vector<float>{2, 0.5F, 3, -2.25F, -1, -1}));
    MetaComplexDataset oDataset(&oSource, {{1, 2}}, false, eAmplitudePhase);
    EXPECT_FALSE(oDataset.IsExact());
    EXPECT_EQ(oDataset.ReadAuxiliaryData().GetChanMetadataValue("NO_DATA_VALUE", 1), "nan");
    const auto oValues = ValuesOf<std::complex<float>>(ReadChannels(oDataset, {1}));
    for (const std::size_t n : {0U, 1U})
        EXPECT_LT(std::abs(oValues[n] - std::polar(n == 0 ? 2.0F : 3.0F, n == 0 ? 0.5F : -2.25F)), 1e-6F);
    EXPECT_TRUE(std::isnan(oValues[2].real()) && std::isnan(oValues[2].imag()));
    WriteAll(oDataset.GetRasterIO({1}),
             BytesOf(std::vector<std::complex<float>>{{0, -4}, {std::nanf(""), std::nanf("")}, {std::nanf(""), 1}}));
    const auto oBack = ValuesOf<float>(ReadChannels(oSource, {1, 2}));
    EXPECT_FLOAT_EQ(oBack[0], 4);
    EXPECT_FLOAT_EQ(oBack[1], -std::acos(-1.0F) / 2);
    EXPECT_EQ(oBack[2], -1) << "no-data comes back as it was";
    EXPECT_EQ(oBack[3], -1);
    // Means of phases are none: levels count when they were picked.
    BasicWriter oWriter(static_cast<IRasterDataset*>(&oSource), {1, 2});
    ASSERT_TRUE(BuildOverviews(oWriter, {2}, "average"));
    const std::unique_ptr<IOverviewManager> oLevels(oDataset.GetOverviewManager());
    EXPECT_TRUE(oLevels->GetLevels().empty());
    EXPECT_FALSE(oLevels->IsValid(1, 2));
    ASSERT_TRUE(BuildOverviews(oWriter, {2}, "nearest"));
    EXPECT_EQ(oLevels->GetLevels(), Channels{2});
    EXPECT_TRUE(oLevels->IsValid(1, 2));
    EXPECT_NE(Error([&] { oLevels->CreateLevel(4); }), "");
}

// A pixel is no-data when both parts are, whatever stands for that.
TEST(MetaComplexDataset, NoDataNeedsBothParts)
{
    const auto Read = [](const DataType& oType, const char* pI, const char* pQ, std::string pixels)
    {
        MemoryDataset oSource;
        oSource.Create(4, 1, {oType, oType});
        AuxiliaryData oTags(2);
        oTags.SetChanMetadataValue("NO_DATA_VALUE", pI, 1);
        oTags.SetChanMetadataValue("NO_DATA_VALUE", pQ, 2);
        oSource.WriteAuxiliaryData(oTags);
        WriteAll(oSource.GetRasterIO({1, 2}), pixels);
        MetaComplexDataset oDataset(&oSource, {{1, 2}}, false);
        std::string valid = oDataset.ReadAuxiliaryData().GetChanMetadataValue("NO_DATA_VALUE", 1) + ":";
        BasicReader oReader(static_cast<IDataset*>(&oDataset), {1}, false);
        const RasterPtr oRaster(oReader.ReadRaster(0, 0, 4, 1));
        const std::unique_ptr<gobs::Mask> oMask(ValiditySource(&oDataset).BuildMask(*oRaster));
        for (unsigned int n = 0; n < 4; ++n)
            valid += oMask->GetBit(n, 0) ? '1' : '0';
        WriteAll(oDataset.GetRasterIO({1}), PixelsOf(*oRaster));
        EXPECT_EQ(ReadChannels(oSource, {1, 2}), pixels) << "written back";
        return valid;
    };
    const std::string shorts = BytesOf(std::vector<std::int16_t>{-9, -9, -9, 5, 0, 0, 5, -9});
    const std::string floats = BytesOf(std::vector<float>{-9, -9, -9, 0, 0, 0, 5, -9});
    EXPECT_EQ(Read(gobs::eDT_16S, "-9", "-9", shorts), "-9:0111");
    EXPECT_EQ(Read(gobs::eDT_16S, "0", "0", shorts), "0:1101");
    EXPECT_EQ(Read(gobs::eDT_16S, "5", "-9", shorts), "5:1110");
    EXPECT_EQ(Read(gobs::eDT_16S, "-9", "", shorts), ":1111");
    EXPECT_EQ(Read(gobs::eDT_16S, "-9", "words", shorts), ":1111");
    EXPECT_EQ(Read(gobs::eDT_16S, "-9", "70000", shorts), "-9:1111");
    EXPECT_EQ(Read(gobs::eDT_32R, "-9", "-9", floats), "nan:0111") << "-9 with 0 is a value";
    EXPECT_EQ(Read(gobs::eDT_32R, "0", "0", floats), "0:1101");
}

TEST(MetaComplexDataset, RecordAndPlaceAreThoseOfTheSources)
{
    const auto oI = MakeSource(gobs::eDT_16S, {1, 2}), oQ = MakeSource(gobs::eDT_16S, {3});
    const auto SetTags = [](IDataset& oSource, const char* pPart)
    {
        AuxiliaryData oTags = oSource.ReadAuxiliaryData();
        oTags.SetFileMetadataValue("orbit", "17");
        oTags.SetFileMetadataValue("part", pPart);
        oTags.SetChanMetadataValue("unit", pPart, 1);
        oTags.SetChanMetadataValue("STATISTICS_MEAN", "4", 1);
        oTags.SetChannelDescription(std::string("part ") + pPart, 1);
        oSource.WriteAuxiliaryData(oTags);
    };
    SetTags(*oI, "I");
    SetTags(*oQ, "Q");
    oI->SetGeocoding({1, 2, 0, 3, 0, -4});
    oI->UpdateCRS(*ogc::cs::CreateCRSFromEPSG(32633));
    MetaComplexDataset oDataset(oI.get(), oQ.get(), {{1, 1}}, false);
    AuxiliaryData oTags = oDataset.ReadAuxiliaryData();
    EXPECT_EQ(oTags.GetFileMetadata(), (MetadataMap{{"orbit", "17"}, {"part", "I"}, {"part_Q", "Q"}}));
    EXPECT_EQ(oTags.GetChanMetadata(1), (MetadataMap{{"unit", "I"}, {"unit_Q", "Q"}, {"Description_Q", "part Q"}}));
    EXPECT_EQ(oTags.GetChannelDescription(1), "part I");
    EXPECT_EQ(oDataset.GetGeocoding().GetYPerRow(), -4);
    EXPECT_EQ(std::unique_ptr<ogc::cs::ICRS>(oDataset.ReadCRS())->GetEPSG(), 32633);
    oTags.SetChanMetadata({{"unit", "V"}, {"gain_Q", "2"}, {"NO_DATA_VALUE", "0"}}, 1);
    oTags.SetFileMetadata({{"orbit", "17"}, {"part_Q", "other"}});
    oDataset.WriteAuxiliaryData(oTags);
    EXPECT_EQ(oI->ReadAuxiliaryData().GetFileMetadata(), (MetadataMap{{"orbit", "17"}}));
    EXPECT_EQ(oQ->ReadAuxiliaryData().GetFileMetadata(), (MetadataMap{{"orbit", "17"}, {"part", "other"}}));
    EXPECT_EQ(oI->ReadAuxiliaryData().GetChanMetadata(1),
              (MetadataMap{{"unit", "V"}, {"NO_DATA_VALUE", "0"}, {"STATISTICS_MEAN", "4"}}));
    EXPECT_EQ(oQ->ReadAuxiliaryData().GetChanMetadata(1),
              (MetadataMap{{"gain", "2"}, {"NO_DATA_VALUE", "0"}, {"STATISTICS_MEAN", "4"}}));
    oDataset.SetGeocoding({5, 2, 0, 3, 0, -4});
    EXPECT_EQ(oQ->GetGeocoding().GetXOffset(), 5);
    EXPECT_TRUE(oDataset.IsLinked() && oDataset.Exists());
    EXPECT_TRUE(oDataset.GetRasterCapabilities().IsUpdatable());
    EXPECT_EQ(oDataset.Delete(), eDone);
    EXPECT_TRUE(oI->Exists());
    EXPECT_EQ(oDataset.GetName(), "<complex pairs of <memory> and <memory>>");

    // Both masks count.
    for (const auto& [poSource, nFirst] : {std::pair{oI.get(), 1U}, {oQ.get(), 2U}})
    {
        const unsigned int nMask = poSource->CreateBitmap();
        std::string bits(WIDTH * HEIGHT, '\1');
        bits[nFirst] = '\0';
        WriteAll(poSource->GetBitmapIO({nMask}), bits);
    }
    oQ->SetBitmapDescription(1, "");
    EXPECT_EQ(oDataset.GetBitmapList(), (Channels{1, 2}));
    EXPECT_EQ(FindValidityMask(oDataset), 2U) << "the second source's alone";
    oI->SetBitmapDescription(1, "");
    EXPECT_EQ(oDataset.GetBitmapList(), Channels{1});
    IBitmapDataset& oBitmaps = oDataset;
    EXPECT_EQ(ReadPixels(BasicReader(&oBitmaps, Channels{1}, false)).substr(0, 4), std::string("\1\0\0\1", 4));
    EXPECT_EQ(oDataset.GetBitmapOverviewManager(), nullptr);
}

TEST(MetaComplexDataset, LevelsAreThoseThatBothHave)
{
    const auto oI = MakeSource(gobs::eDT_16S, {1}), oQ = MakeSource(gobs::eDT_16S, {2});
    MetaComplexDataset oDataset(oI.get(), oQ.get(), {{1, 1}}, false);
    BasicWriter oBoth(static_cast<IRasterDataset*>(&oDataset), {1}),
        oFirst(static_cast<IRasterDataset*>(oI.get()), {1});
    ASSERT_TRUE(BuildOverviews(oBoth, {2}, "average"));
    ASSERT_TRUE(BuildOverviews(oFirst, {4}, "average"));
    const std::unique_ptr<IOverviewManager> oLevels(oDataset.GetOverviewManager());
    EXPECT_EQ(oLevels->GetLevels(), Channels{2});
    EXPECT_TRUE(oLevels->IsValid(1, 2) && !oLevels->IsValid(1, 4) && !oLevels->IsValid(2, 2));
    EXPECT_EQ(oDataset.ReadAuxiliaryData().GetChanMetadata(1), (MetadataMap{{"_Overview_2", "valid AVERAGE"}}));
    EXPECT_NE(Error([&] { oLevels->GetOverviewIO(4, {1}); }), "");
    // The mean of a complex channel is that of its parts.
    const auto ReadLevel = [](IDataset& oSource)
    {
        BasicReader oReader(&oSource, {1}, false);
        const std::unique_ptr<IOverviewReaderAccessor> oAccessor(oReader.GetOverviewReaderAccessor());
        return ValuesOf<std::int16_t>(ReadPixels(*std::unique_ptr<IRasterReader>(oAccessor->CreateRasterReader(2))));
    };
    const auto oComplex = ReadLevel(oDataset), oReal = ReadLevel(*oI), oImaginary = ReadLevel(*oQ);
    for (std::size_t n = 0; n < oReal.size(); ++n)
        ASSERT_TRUE(oComplex[2 * n] == oReal[n] && oComplex[2 * n + 1] == oImaginary[n]) << n;
    WriteAll(oQ->GetRasterIO({1}), std::string(2 * WIDTH * HEIGHT, 'x'));
    EXPECT_FALSE(oLevels->IsValid(1, 2));
    oLevels->DeleteLevel(2);
    EXPECT_TRUE(std::unique_ptr<IOverviewManager>(oQ->GetOverviewManager())->GetLevels().empty());
}

TEST(MetaComplexDataset, WhatDoesNotFitIsRefusedByName)
{
    const auto oI = MakeSource(gobs::eDT_16S, {1, 2}, "I");
    MemoryDataset oSmall, oComplex, oMixed, oElsewhere;
    oSmall.Create(5, 5, {gobs::eDT_16S});
    oComplex.Create(WIDTH, HEIGHT, {gobs::eDT_C16S, gobs::eDT_C16S});
    oMixed.Create(WIDTH, HEIGHT, {gobs::eDT_16S, gobs::eDT_16U, gobs::eDT_16S, gobs::eDT_8U, gobs::eDT_8U});
    oElsewhere.Create(WIDTH, HEIGHT, {gobs::eDT_16S});
    oI->SetGeocoding({1, 2, 0, 3, 0, -4});
    oElsewhere.SetGeocoding({1, 2, 0, 4, 0, -4});
    IDataset* const poNone = nullptr;
    using Pairs = std::vector<ComplexPair>;
    const auto One = [](IDataset* poSource, const Pairs& oPairs)
    {
        return Error([&] { MetaComplexDataset(poSource, oPairs, false); });
    };
    const auto Two = [&](IDataset* poSecond)
    {
        return Error([&] { MetaComplexDataset(oI.get(), poSecond, {{1, 1}}, false); });
    };
    EXPECT_EQ(One(poNone, {{1, 2}}), "data: <complex pairs of nothing>: a source has no rasters");
    EXPECT_EQ(One(oI.get(), {}), "data: <complex pairs of <memory: I>>: no pairs of channels were given");
    EXPECT_EQ(One(oI.get(), {{1, 3}}), "data: <complex pairs of <memory: I>>: channel 3 does not exist; there are 2");
    EXPECT_NE(One(oI.get(), {{0, 1}}), "");
    EXPECT_EQ(One(&oMixed, {{1, 2}}),
              "data: <complex pairs of <memory>>: channels 1 and 2 of the types 16S and 16U are "
              "no pair");
    EXPECT_NE(One(&oComplex, {{1, 2}}), "");
    EXPECT_EQ(Two(poNone), "data: <complex pairs of <memory: I>>: the second source is NULL");
    EXPECT_EQ(Two(&oSmall), "data: <complex pairs of <memory: I> and <memory>>: the sources are of 300 x 70 and 5 x 5 "
                            "pixels");
    EXPECT_NE(Two(&oElsewhere).find("the sources lie at different places"), std::string::npos);
    MetaComplexDataset oDataset(&oMixed, {{1, 3}, {4, 5}}, false);
    EXPECT_NE(Error([&] { oDataset.GetRasterIO({3}); }), "");
    EXPECT_NE(Error([&] { oDataset.AddNewChannel({WIDTH, HEIGHT, 1, gobs::eDT_C16S}); }), "");
    EXPECT_NE(Error([&] { oDataset.WriteAuxiliaryData(AuxiliaryData(1)); }), "");
    oDataset.Close();
    EXPECT_NE(Error([&] { oDataset.GetRasterIO({1}); }), "");
    EXPECT_TRUE(oMixed.IsOpen()) << "the caller's";
}

class MetaComplexFiles : public ReaderTest
{
};

// Sources that fail at any call, owned and borrowed, one and two.
TEST_F(MetaComplexFiles, FailuresLeaveNothing)
{
    const auto Use = [](MetaComplexDataset& oDataset)
    {
        IDataset& oRoot = oDataset;
        BasicReader oReader(&oRoot, {1}, false);
        const RasterPtr oRaster(oReader.GetRaster(0));
        oReader.GetAuxiliaryData();
        const std::unique_ptr<IOverviewManager> oLevels(oDataset.GetOverviewManager());
        const std::unique_ptr<IRasterIO> oLevel(oLevels->GetOverviewIO(2, {1}));
        oDataset.Synchronize();
        oDataset.Close();
    };
    const std::function<void()> OPERATIONS[] = {
        [&]
        {
            MetaComplexDataset oDataset(moFile, moFile, {{1, 2}});
            Use(oDataset);
        },
        [&]
        {
            MetaComplexDataset oDataset(MakeDataset().release(), {{2, 3}}, true, eAmplitudePhase);
            const std::unique_ptr<IRasterIO> oIO(oDataset.GetRasterIO({1}));
        },
        [&]
        {
            const auto oFirst = MakeDataset();
            const auto oSecond = MakeDataset();
            MetaComplexDataset oDataset(oFirst.get(), oSecond.get(), {{1, 2}, {3, 1}}, false);
            Use(oDataset);
        },
        [&]
        {
            auto oFirst = MakeDataset();
            auto oSecond = MakeDataset();
            MetaComplexDataset oDataset(oFirst.release(), oSecond.release(), {{1, 2}}, true);
            Use(oDataset);
        },
        [&] {
            MetaComplexDataset oDataset(MakeDataset().release(), {{1, 7}}, true);
        },
    };
    moModel->moLevels = {2};
    for (const auto& oOperation : OPERATIONS)
        FailAtEveryCall(oOperation, [] {});
}

} // namespace krv::test
