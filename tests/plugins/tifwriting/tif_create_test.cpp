#include "tests/plugins/tif/tifsupport.h"
#include "tests/support/thrown.h"

#include <algorithm>
#include <cstring>
#include <filesystem>
#include <random>

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/resource.h>
#include <tiff.h>

namespace
{

using namespace krv::test;
using krv::gobs::DataType;

struct Layout
{
    const char* mpOptions;
    bool mbTiled;
};

TEST(TifCreate, EveryTypeLayoutAndCodecIsReadBackByLibtiffAndHere)
{
    constexpr Layout LAYOUTS[] = {{"TILED=YES BLOCKXSIZE=64 BLOCKYSIZE=32", true}, {"TILED=NO BLOCKYSIZE=13", false}};
    constexpr const char* CODECS[] = {"COMPRESS=NONE",
                                      "COMPRESS=DEFLATE",
                                      "COMPRESS=DEFLATE LEVEL=1 PREDICTOR=NO",
                                      "COMPRESS=LZW",
                                      "COMPRESS=LZW PREDICTOR=NO",
                                      "COMPRESS=ZSTD LEVEL=5",
                                      "COMPRESS=PACKBITS",
                                      "COMPRESS=LZMA"};
    const TempFolder oFolder;
    unsigned int nSeed = 0;
    for (int nType = krv::gobs::eDT_8U; nType <= krv::gobs::eDT_C64R; ++nType)
        for (const Layout& oLayout : LAYOUTS)
            for (const char* pCodec : CODECS)
                for (const bool bBand : {false, true})
                {
                    const auto eType = static_cast<krv::gobs::NativeDataTypeCode>(nType);
                    const unsigned int nChannels = nSeed % 7 == 0 ? 23 : 1 + nSeed % 4;
                    const std::string options = std::string(oLayout.mpOptions) + " " + pCodec +
                                                (bBand ? " INTERLEAVE=BAND" : "") +
                                                (nSeed % 5 == 0 ? " BIGTIFF=YES" : "");
                    SCOPED_TRACE(DataType(eType).Describe() + " x " + std::to_string(nChannels) + " " + options);
                    const std::string fileName = oFolder.File("a.tif");
                    const Bytes oPixels = MakePixels(101, 77, nChannels, eType, ++nSeed);
                    TifPointer poDataset = CreateTif(fileName, options, 101, 77, nChannels, eType);
                    WriteAll(*poDataset, oPixels);
                    ASSERT_EQ(ReadAll(*poDataset), oPixels);
                    poDataset->Synchronize();
                    ASSERT_EQ(ReadAll(*poDataset), oPixels);
                    poDataset->Close();

                    const Judgement oJudgement = Judge(fileName);
                    ASSERT_EQ(oJudgement.moComplaints, "");
                    ASSERT_EQ(oJudgement.mbTiled, oLayout.mbTiled);
                    ASSERT_EQ(oJudgement.mbSeparate, bBand && nChannels > 1);
                    ASSERT_EQ(oJudgement.mnChannels, nChannels);
                    ASSERT_TRUE(oJudgement.moPixels == oPixels);
                    ASSERT_EQ(ReadAll(*OpenTif(fileName)), oPixels);
                    std::filesystem::remove(fileName);
                }
}

TEST(TifCreate, BlocksThatWereNeverWrittenReadAsZeroAndTakeNoRoom)
{
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("sparse.tif");
    TifPointer poDataset = CreateTif(fileName, "BLOCKXSIZE=256 BLOCKYSIZE=256", 4000, 4000, 1, krv::gobs::eDT_16U);
    const IOPointer poIO(poDataset->GetRasterIO({1}));
    Bytes oBlock(256 * 256 * 2, 9);
    poIO->WriteWindow(512u, 256u, 256, 256, oBlock.data());
    poDataset->Close();
    EXPECT_LT(std::filesystem::file_size(fileName), 200000u);
    const TifPointer poRead = OpenTif(fileName);
    const Bytes oPixels = ReadAll(*poRead);
    EXPECT_EQ(std::count(oPixels.begin(), oPixels.end(), 9), 256 * 256 * 2);
    EXPECT_EQ(oPixels[(256 * 4000 + 512) * 2], 9);
    // libtiff in update mode hands out the head of the file for such blocks.
    const TifPointer poUpdated = OpenTif(fileName, eUpdate);
    EXPECT_EQ(ReadAll(*poUpdated), oPixels);
}

// Integers are limited to their bits, reals rounded to the nearest, of two the even.
TEST(TifCreate, NarrowSamplesAreTheNearestThatFit)
{
    struct Narrow
    {
        krv::gobs::NativeDataTypeCode meType;
        std::vector<unsigned int> moBits;
    };
    const Narrow NARROW[] = {{krv::gobs::eDT_8U, {1, 2, 4, 7}},  {krv::gobs::eDT_8S, {3, 7}},
                             {krv::gobs::eDT_16U, {9, 12, 15}},  {krv::gobs::eDT_16S, {10}},
                             {krv::gobs::eDT_32U, {17, 24, 31}}, {krv::gobs::eDT_32S, {24, 20}},
                             {krv::gobs::eDT_32R, {16}}};
    const auto Fit = [](const DataType& oType, unsigned int nBits, unsigned char* pValue)
    {
        if (oType.IsReal())
        {
            float nValue;
            std::memcpy(&nValue, pValue, sizeof(nValue));
            nValue = static_cast<float>(static_cast<_Float16>(nValue));
            return std::memcpy(pValue, &nValue, sizeof(nValue)), void();
        }
        std::int64_t nValue = oType.IsSigned() && (pValue[oType.GetBits() / 8 - 1] & 0x80) != 0 ? -1 : 0;
        std::memcpy(&nValue, pValue, oType.GetBits() / 8);
        const std::int64_t nHighest = (std::int64_t{1} << (nBits - (oType.IsSigned() ? 1 : 0))) - 1;
        nValue = std::clamp(nValue, oType.IsSigned() ? -nHighest - 1 : 0, nHighest);
        std::memcpy(pValue, &nValue, oType.GetBits() / 8);
    };
    const TempFolder oFolder;
    unsigned int nSeed = 0;
    for (const Narrow& oNarrow : NARROW)
        for (const unsigned int nBits : oNarrow.moBits)
            for (const char* pForm : {"", "TILED=NO COMPRESS=LZW INTERLEAVE=BAND", "COMPRESS=ZSTD"})
            {
                const DataType oType(oNarrow.meType);
                const std::size_t nBytes = oType.GetBits() / 8;
                const std::string fileName = oFolder.File("narrow.tif");
                SCOPED_TRACE(oType.Describe() + " in " + std::to_string(nBits) + " bits " + pForm);
                Bytes oPixels = MakePixels(61, 37, 3, oNarrow.meType, ++nSeed);
                std::mt19937 oRandom(nSeed);
                for (std::size_t nAt = 0; nAt < oPixels.size(); nAt += 2 * nBytes)
                {
                    // Half of them fit; reals lie about the ends of the range, some halfway between two.
                    const std::uint32_t nReal = (95 + oRandom() % 50) << 23 | (oRandom() & 0x7FF000U);
                    if (oType.IsReal())
                        std::memcpy(&oPixels[nAt], &nReal, nBytes);
                    else
                        std::fill_n(&oPixels[nAt + nBits / 8], nBytes - nBits / 8, 0);
                }
                TifPointer poDataset =
                    CreateTif(fileName, "NBITS=" + std::to_string(nBits) + " " + pForm, 61, 37, 3, oNarrow.meType);
                WriteAll(*poDataset, oPixels);
                poDataset->Close();
                for (std::size_t nAt = 0; nAt < oPixels.size(); nAt += nBytes)
                    Fit(oType, nBits, &oPixels[nAt]);
                EXPECT_TRUE(ReadAll(*OpenTif(fileName)) == oPixels);
                EXPECT_EQ(Judge(fileName).moComplaints, "");
            }
}

TEST(TifCreate, OptionsAndTypesThatDoNotGoTogetherAreNamed)
{
    const TempFolder oFolder;
    const auto Message = [&](const std::string& options, const std::vector<DataType>& oTypes)
    {
        return Error([&] { CreateTif(oFolder.File("bad.tif"), options)->Create(10, 10, oTypes); });
    };
    const std::pair<const char*, const char*> OPTIONS[] = {
        {"COMPRESS=LZ77", "NONE, DEFLATE, LZW, ZSTD, PACKBITS, LZMA, JPEG"},
        {"BLOCKXSIZE=100", "multiples of 16"},
        {"TILED=NO BLOCKXSIZE=64", "BLOCKXSIZE"},
        {"LEVEL=3", "LEVEL"},
        {"COMPRESS=ZSTD LEVEL=23", "at most 22"},
        {"COMPRESS=ZSTD PREDICTOR=3", "8U"},
        {"ALPHA=YES", "ALPHA"},
        {"NBITS=9", "NBITS=9"},
        {"NBITS=4 COMPRESS=JPEG", "JPEG"}};
    for (const auto& [pOptions, pWord] : OPTIONS)
        EXPECT_THAT(Message(pOptions, {krv::gobs::eDT_8U}), testing::HasSubstr(pWord));
    EXPECT_THAT(Message("COMPRESS=JPEG", {krv::gobs::eDT_16U}), testing::HasSubstr("JPEG"));
    EXPECT_THAT(Message("NBITS=8", {krv::gobs::eDT_16U}), testing::HasSubstr("16U"));
    const std::string mixed = Message("", {krv::gobs::eDT_8U, krv::gobs::eDT_8U, krv::gobs::eDT_32R});
    EXPECT_THAT(mixed, testing::AllOf(testing::HasSubstr("8U"), testing::HasSubstr("32R")));
    EXPECT_NE(Message("", {}), "");
    EXPECT_NE(Message("", {krv::gobs::eDT_BIT}), "");
    EXPECT_TRUE(ListFolder(oFolder.GetPath()).empty());
}

// Blocks go from file to file as they are when the form fits in every point; the rest is refused and changes nothing.
TEST(TifCreate, BlocksAreTakenAsBytesInTheFormThatTheyHave)
{
    using krv::datasources::EncodedForm;
    const TempFolder oFolder;
    const Bytes oPixels = MakePixels(70, 50, 3, krv::gobs::eDT_16U, 5);
    const TifPointer poFrom =
        CreateTif(oFolder.File("a.tif"), "COMPRESS=LZW BLOCKXSIZE=32 BLOCKYSIZE=16 INTERLEAVE=BAND", 70, 50, 3,
                  krv::gobs::eDT_16U);
    WriteAll(*poFrom, oPixels); // blocks that are held back are handed out too
    const EncodedForm oForm = poFrom->GetEncodedForm(1);
    const std::string fileName = oFolder.File("b.tif");
    const TifPointer poTo = CreateTif(fileName, "TILED=NO", 70, 50, 3, krv::gobs::eDT_16U);
    const EncodedForm oOwn = poTo->GetEncodedForm(1);
    const auto Changed = [&oForm](auto oChange)
    {
        EncodedForm oOther = oForm;
        oChange(oOther);
        return oOther;
    };
    for (const EncodedForm& oOther :
         {Changed([](EncodedForm& o) { o.mnWidth = 71; }), Changed([](EncodedForm& o) { o.mnChannels = 2; }),
          Changed([](EncodedForm& o) { o.moType = DataType(krv::gobs::eDT_16S); }),
          Changed([](EncodedForm& o) { o.mbBigEndian = true; }), Changed([](EncodedForm& o) { o.mnSampleBits = 8; }),
          Changed([](EncodedForm& o) { o.moCodec = "MAGIC"; }), Changed([](EncodedForm& o) { o.moCodec = "JPEG"; }),
          Changed([](EncodedForm& o) { o.mnBlockHeight = 0; }),
          Changed([](EncodedForm& o) { o.mbWholeBlocks = false; }), Changed([](EncodedForm& o) { o.mnPredictor = 9; }),
          Changed([](EncodedForm& o) { o.moParameters["SPEED"] = "1"; }),
          Changed(
              [](EncodedForm& o) {
                  o.moTables = {1, 2, 3};
              })})
    {
        EXPECT_FALSE(poTo->SetEncodedForm(1, oOther));
        EXPECT_TRUE(poTo->GetEncodedForm(1) == oOwn);
    }
    ASSERT_TRUE(poTo->SetEncodedForm(1, oForm));
    std::vector<unsigned char> oBytes;
    for (unsigned int nBlock = 0; nBlock < 3 * 3 * 4; ++nBlock)
    {
        const krv::datasources::BlockNumber oBlock{nBlock / 12, nBlock % 3, nBlock / 3 % 4};
        EXPECT_FALSE(poTo->ReadEncoded(1, oBlock, oBytes)); // not stored yet
        ASSERT_TRUE(poFrom->ReadEncoded(1, oBlock, oBytes));
        poTo->StoreEncoded(1, oBlock, oBytes.data(), oBytes.size());
    }
    EXPECT_EQ(ReadAll(*poTo), oPixels);
    EXPECT_THAT(Error([&] { poTo->SetEncodedForm(1, oForm); }), testing::HasSubstr("stored already"));
    EXPECT_THAT(Error([&] { poTo->ReadEncoded(1, {0, 3, 0}, oBytes); }), testing::HasSubstr("no block 3, 0"));
    EXPECT_THAT(Error([&] { poTo->GetEncodedForm(2); }), testing::HasSubstr("level 2 does not exist"));
    const std::unique_ptr<krv::datasources::IOverviewManager> poLevels(poTo->GetOverviewManager());
    poLevels->CreateLevel(2);
    poLevels->SetValid(1, 2, true);
    poTo->StoreEncoded(1, {0, 0, 0}, oBytes.data(), oBytes.size());
    EXPECT_FALSE(poLevels->IsValid(1, 2));
    poTo->StoreEncoded(2, {2, 1, 1}, oBytes.data(), oBytes.size()); // pixels of the level's own
    ASSERT_TRUE(poFrom->ReadEncoded(1, {0, 0, 0}, oBytes));
    poTo->StoreEncoded(1, {0, 0, 0}, oBytes.data(), oBytes.size());
    poTo->Close();
    const Judgement oJudgement = Judge(fileName);
    EXPECT_EQ(oJudgement.moComplaints, "");
    EXPECT_TRUE(oJudgement.moPixels == oPixels);
    EXPECT_THAT(Error([&] { OpenTif(fileName)->StoreEncoded(1, {}, oBytes.data(), 1); }),
                testing::HasSubstr("reading only"));
}

// The most memory that this process has had, in MiB.
long PeakMemory()
{
    rusage oUsage = {};
    getrusage(RUSAGE_SELF, &oUsage);
    return oUsage.ru_maxrss >> 10;
}

TEST(TifCreate, SizesAreRefusedBeforeTheirTablesAreMade)
{
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("a.tif");
    const long nBefore = PeakMemory();
    for (const char* pOptions : {"BLOCKXSIZE=16 BLOCKYSIZE=16", "TILED=NO BLOCKYSIZE=1 INTERLEAVE=BAND"})
    {
        const unsigned int nChannels = pOptions[0] == 'T' ? 1000 : 1;
        const std::string error =
            Error([&] { CreateTif(fileName, pOptions, 270000, 270000, nChannels, krv::gobs::eDT_8U); });
        EXPECT_THAT(error, testing::HasSubstr("strips or tiles; choose larger ones"));
        EXPECT_LT(PeakMemory() - nBefore, 64);
    }
    // Legal giants of which little is stored take little.
    {
        TifPointer poDataset = CreateTif(fileName, "", 100000, 100000, 1, krv::gobs::eDT_8U);
        Bytes oPixels(160 * 160, 7);
        const IOPointer poIO(poDataset->GetRasterIO({1}));
        poIO->WriteWindow(99840u, 99840u, 160u, 160u, oPixels.data());
        poDataset->Close();
    }
    EXPECT_LT(std::filesystem::file_size(fileName), 4u << 20);
}

TEST(TifCreate, LargeImagesAreBigTiffInTime)
{
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("large.tif");
    CreateTif(fileName, "", 40000, 30000, 3, krv::gobs::eDT_8U)->Close();
    EXPECT_EQ(ReadFile(fileName).substr(0, 3), "II+");
    CreateTif(fileName, "", 4000, 3000, 3, krv::gobs::eDT_8U)->Close();
    EXPECT_EQ(ReadFile(fileName).substr(0, 3), "II*");
    EXPECT_THROW(CreateTif(fileName, "BIGTIFF=NO", 80000, 60000, 3, krv::gobs::eDT_8U), krv::DataException);
}

} // namespace
