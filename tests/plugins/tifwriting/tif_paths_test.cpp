// The rarer ways of writing: files of other programs, colour tables, lossy pixels, limits, several bitmaps at once.

#include "datasources/metadata/auxiliarydata.h"
#include "gobs/pct/pct.h"
#include "gobs/raster/rasterinfo.h"
#include "plugins/tif/reading/rawdirectory.h"
#include "tests/plugins/tif/tifsupport.h"
#include "tests/support/thrown.h"
#include "tests/support/tiffwriter.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/ogc/cs/geocodinginfo.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <filesystem>

namespace
{

using namespace krv::test;
using krv::datasources::AuxiliaryData;

constexpr std::uint32_t WIDTH = 50;
constexpr std::uint32_t HEIGHT = 40;

// Takes the number of bytes of a strip or tile out of the first directory.
void ForgetBytes(const std::string& fileName, std::size_t nStrile)
{
    using namespace krv::plugins;
    support::File oFile(fileName, support::File::Mode::eUpdate);
    tif::PeekReader oReader(oFile);
    unsigned char aHeader[16] = {};
    oFile.ReadUpTo(0, aHeader, sizeof(aHeader));
    const auto oHeader = tif::FileHeader::Parse(aHeader, sizeof(aHeader));
    const tif::RawDirectory oDirectory(oReader, *oHeader, oHeader->mnFirstDirectory);
    for (const std::uint16_t nTag : {TIFFTAG_STRIPBYTECOUNTS, TIFFTAG_TILEBYTECOUNTS})
        if (const tif::DirectoryEntry* const pEntry = oDirectory.Find(nTag))
            oFile.Write(pEntry->mnOffset + nStrile * tif::GetTypeBytes(pEntry->mnType),
                        reinterpret_cast<const unsigned char*>("\0\0\0\0\0\0\0"), tif::GetTypeBytes(pEntry->mnType));
}

// A single strip reaches to what follows it in the file, for who reads it and for who changes a pixel of it. What any
// other strip or tile holds nobody knows until all of it is written.
TEST(TifPaths, AStripWithAPlaceAndNoBytesIsNotTakenForMissing)
{
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("none.tif");
    struct Case
    {
        const char* mpOptions;
        std::size_t mnStrile;
        bool mbKnown;
        unsigned int mnX, mnY, mnWidth, mnHeight; // of the strip or tile
    };
    constexpr Case CASES[] = {{"TILED=NO BLOCKYSIZE=3000", 0, true, 0, 0, 3000, 3000}, // changed in its place
                              {"TILED=NO BLOCKYSIZE=60", 0, true, 0, 0, 50, 60},
                              {"TILED=NO BLOCKYSIZE=60 COMPRESS=DEFLATE", 0, true, 0, 0, 50, 60},
                              {"TILED=NO BLOCKYSIZE=60 COMPRESS=LZW", 0, true, 0, 0, 50, 60},
                              {"TILED=NO BLOCKYSIZE=60 COMPRESS=PACKBITS", 0, true, 0, 0, 50, 60},
                              {"TILED=NO BLOCKYSIZE=60 COMPRESS=ZSTD BIGTIFF=YES", 0, true, 0, 0, 50, 60},
                              {"TILED=NO BLOCKYSIZE=2900", 1, false, 0, 2900, 3000, 100},
                              {"TILED=NO BLOCKYSIZE=20 COMPRESS=DEFLATE", 1, false, 0, 20, 50, 20},
                              {"BLOCKXSIZE=16 BLOCKYSIZE=16 COMPRESS=PACKBITS", 6, false, 32, 16, 16, 16}};
    for (const Case& oCase : CASES)
    {
        SCOPED_TRACE(oCase.mpOptions);
        const unsigned int nWidth = oCase.mnWidth > 50 ? 3000 : 50, nHeight = oCase.mnWidth > 50 ? 3000 : 60;
        Bytes oPixels = MakePixels(nWidth, nHeight, 1, krv::gobs::eDT_8U, 5);
        TifPointer poDataset = CreateTif(fileName, oCase.mpOptions, nWidth, nHeight, 1, krv::gobs::eDT_8U);
        WriteAll(*poDataset, oPixels);
        poDataset->Close();
        ForgetBytes(fileName, oCase.mnStrile);
        poDataset = OpenTif(fileName, eUpdate);
        IOPointer poIO(poDataset->GetRasterIO({1}));
        Bytes oBlock(std::size_t{oCase.mnWidth} * oCase.mnHeight, 77);
        const auto Write = [&](unsigned int nColumns, unsigned int nRows)
        {
            poIO->WriteWindow(oCase.mnX, oCase.mnY, nColumns, nRows, oBlock.data());
        };
        if (oCase.mbKnown)
        {
            EXPECT_TRUE(ReadAll(*OpenTif(fileName)) == oPixels);
            Write(1, 1);
            oPixels[0] = 77;
        }
        else
        {
            EXPECT_THROW(ReadAll(*OpenTif(fileName)), krv::FileFormatException);
            EXPECT_THROW(Write(1, 1), krv::FileFormatException);
            Write(oCase.mnWidth, oCase.mnHeight);
            for (unsigned int nRow = 0; nRow < oCase.mnHeight; ++nRow)
                std::memset(&oPixels[(oCase.mnY + nRow) * nWidth + oCase.mnX], 77, oCase.mnWidth);
        }
        poIO.reset();
        poDataset->Close();
        EXPECT_TRUE(ReadAll(*OpenTif(fileName)) == oPixels);
        EXPECT_TRUE(Judge(fileName).moPixels == oPixels);
    }
}

TEST(TifPaths, PagesBelowTheFirstAndTagsThatNobodyAskedAboutStay)
{
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("below.tif");
    constexpr std::uint32_t MADE_UP = 65001;
    const TIFFFieldInfo oField = {MADE_UP, -1, -1, TIFF_DOUBLE, FIELD_CUSTOM, 1, 1, const_cast<char*>("MadeUp")};
    double aValues[92];
    for (int n = 0; n < 92; ++n)
        aValues[n] = n * 0.1;
    {
        const TiffFile poTiff = NewTiff(fileName);
        TIFFMergeFieldInfo(poTiff.get(), &oField, 1);
        TiffForm oForm{.mnWidth = WIDTH, .mnHeight = HEIGHT, .mnCompression = COMPRESSION_LZW, .mnTileWidth = 16};
        SetForm(poTiff.get(), oForm);
        toff_t aBelow[1] = {0};
        TIFFSetField(poTiff.get(), TIFFTAG_SUBIFD, 1, aBelow);
        TIFFSetField(poTiff.get(), MADE_UP, 92, aValues);
        WriteBlocks(poTiff.get());
        TIFFWriteDirectory(poTiff.get());
        oForm.mnWidth /= 2;
        oForm.mnHeight /= 2;
        SetForm(poTiff.get(), oForm);
        TIFFSetField(poTiff.get(), TIFFTAG_SUBFILETYPE, FILETYPE_REDUCEDIMAGE);
        WriteBlocks(poTiff.get());
    }

    TifPointer poDataset = OpenTif(fileName, eUpdate);
    std::unique_ptr<krv::datasources::IOverviewManager> poLevels(poDataset->GetOverviewManager());
    ASSERT_EQ(poLevels->GetLevels(), std::vector<unsigned int>{2});
    const Bytes oPixels(WIDTH * HEIGHT, 9), oLevel(WIDTH / 2 * HEIGHT / 2, 8);
    WriteAll(*poDataset, oPixels);
    WriteAll(*IOPointer(poLevels->GetOverviewIO(2, {1})), 1, oLevel);
    poLevels->SetValid(1, 2, true);
    AuxiliaryData oRecord = poDataset->ReadAuxiliaryData();
    poDataset->WriteAuxiliaryData(oRecord);
    poDataset->Close();
    // Another update, of something else.
    poDataset = OpenTif(fileName, eUpdate);
    oRecord = poDataset->ReadAuxiliaryData();
    oRecord.SetFileMetadataValue("Note", "changed");
    poDataset->WriteAuxiliaryData(oRecord);
    poDataset->Close();
    const TifPointer poRead = OpenTif(fileName);
    EXPECT_EQ(poRead->ReadAuxiliaryData().GetFileMetadata(), oRecord.GetFileMetadata());
    poLevels.reset(poRead->GetOverviewManager());
    EXPECT_TRUE(poLevels->IsValid(1, 2));
    EXPECT_TRUE(ReadAll(*IOPointer(poLevels->GetOverviewIO(2, {1})), 1) == oLevel);
    EXPECT_TRUE(Judge(fileName).moPixels == oPixels);

    const TiffFile poAgain(TIFFOpen(fileName.c_str(), "r"));
    std::uint32_t nValues = 0; // of a tag that libtiff does not know
    std::uint16_t nBelow = 0;
    const double* pValues = nullptr;
    ASSERT_EQ(TIFFGetField(poAgain.get(), MADE_UP, &nValues, &pValues), 1);
    EXPECT_TRUE(nValues == 92 && std::equal(pValues, pValues + 92, aValues));
    toff_t* pBelow = nullptr;
    ASSERT_EQ(TIFFGetField(poAgain.get(), TIFFTAG_SUBIFD, &nBelow, &pBelow), 1);
    EXPECT_EQ(TIFFSetSubDirectory(poAgain.get(), *pBelow), 1);
}

// Those that are given to a new file are of the pixels to come.
TEST(TifPaths, StatisticsGoWithThePixelsThatTheyAreOf)
{
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("s.tif");
    TifPointer poDataset = CreateTif(fileName, "", 40, 30, 2, krv::gobs::eDT_8U);
    AuxiliaryData oData(2);
    oData.SetFileMetadata({{"Histogram_1", "1 2"}, {"Scale", "2"}});
    oData.SetChanMetadata({{"Statistics_Mean", "5"}, {"Offset", "1"}}, 2);
    AuxiliaryData oLess(2);
    oLess.SetFileMetadata({{"Scale", "2"}});
    oLess.SetChanMetadata({{"Offset", "1"}}, 2);
    poDataset->WriteAuxiliaryData(oData);
    const auto WriteAndRead = [&]
    {
        WriteAll(*poDataset, Bytes(40 * 30 * 2, 9));
        poDataset->Synchronize();
        AuxiliaryData oRead = poDataset->ReadAuxiliaryData();
        return std::pair(oRead.GetFileMetadata(), oRead.GetChanMetadata(2));
    };
    EXPECT_EQ(WriteAndRead(), std::pair(oData.GetFileMetadata(), oData.GetChanMetadata(2)));
    EXPECT_EQ(WriteAndRead(), std::pair(oLess.GetFileMetadata(), oLess.GetChanMetadata(2)));
    poDataset->WriteAuxiliaryData(oData);
    EXPECT_EQ(WriteAndRead(), std::pair(oLess.GetFileMetadata(), oLess.GetChanMetadata(2))) << "of the pixels before";
}

TEST(TifPaths, JpegIsWrittenAndUpdatedWithinItsLoss)
{
    const TempFolder oFolder;
    for (const char* pOptions : {"", " TILED=NO BLOCKYSIZE=32", " INTERLEAVE=BAND", " LEVEL=95"})
    {
        SCOPED_TRACE(pOptions);
        const std::string fileName = oFolder.File("lossy.tif");
        Bytes oPixels(100 * 90 * 3);
        for (std::size_t n = 0; n < oPixels.size(); ++n)
            oPixels[n] = static_cast<unsigned char>(60 + n / 3 % 100 + n / 300 / 3 + n % 3 * 10);
        TifPointer poDataset =
            CreateTif(fileName, std::string("COMPRESS=JPEG") + pOptions, 100, 90, 3, krv::gobs::eDT_8U);
        WriteAll(*poDataset, oPixels);
        poDataset->Close();
        poDataset = OpenTif(fileName, eUpdate);
        {
            const IOPointer poIO(poDataset->GetRasterIO({1, 2, 3}));
            Bytes oWindow(20 * 20 * 3, 128);
            poIO->WriteWindow(10u, 20u, 20u, 20u, oWindow.data());
        }
        for (std::size_t nRow = 20; nRow < 40; ++nRow)
            std::memset(&oPixels[(nRow * 100 + 10) * 3], 128, 60);
        poDataset->Close();
        const Judgement oJudgement = Judge(fileName);
        EXPECT_EQ(oJudgement.moComplaints, "");
        EXPECT_EQ(oJudgement.mnCompression, COMPRESSION_JPEG);
        const Bytes oRead = ReadAll(*OpenTif(fileName));
        double nSum = 0;
        for (std::size_t n = 0; n < oPixels.size(); ++n)
            nSum += std::abs(int{oRead[n]} - int{oPixels[n]});
        EXPECT_LT(nSum / static_cast<double>(oPixels.size()), 3.0);
    }
}

// A tile with tables of its own among others that go by the page's, as careless writers leave them, and colours sampled
// alike in both directions.
TEST(TifPaths, JpegTilesReadTheSameInAnyOrderAndAreWrittenInTheFormOfTheirPage)
{
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("shared.tif");
    const auto Open = [](const std::string& name, int nTables, int nQuality)
    {
        TiffFile poTiff = NewTiff(name);
        SetForm(poTiff.get(), {.mnWidth = 64,
                               .mnHeight = 16,
                               .mnChannels = 3,
                               .mnCompression = COMPRESSION_JPEG,
                               .mnPhotometric = PHOTOMETRIC_YCBCR,
                               .mnTileWidth = 16});
        TIFFSetField(poTiff.get(), TIFFTAG_YCBCRSUBSAMPLING, 1, 1);
        TIFFSetField(poTiff.get(), TIFFTAG_JPEGTABLESMODE, nTables);
        TIFFSetField(poTiff.get(), TIFFTAG_JPEGQUALITY, nQuality);
        TIFFSetField(poTiff.get(), TIFFTAG_JPEGCOLORMODE, JPEGCOLORMODE_RGB);
        WriteBlocks(poTiff.get());
        return poTiff;
    };
    Open(oFolder.File("own.tif"), 0, 98).reset();
    {
        const TiffFile poOwn(TIFFOpen(oFolder.File("own.tif").c_str(), "r"));
        Bytes oRaw(TIFFGetStrileByteCount(poOwn.get(), 0));
        TIFFReadRawTile(poOwn.get(), 0, oRaw.data(), static_cast<tmsize_t>(oRaw.size()));
        const TiffFile poTiff = Open(fileName, JPEGTABLESMODE_QUANT | JPEGTABLESMODE_HUFF, 30);
        ASSERT_GT(TIFFWriteRawTile(poTiff.get(), 0, oRaw.data(), static_cast<tmsize_t>(oRaw.size())), 0);
    }
    const auto ReadTile = [](const TifPointer& poDataset, unsigned int nTile)
    {
        Bytes oTile(16 * 16 * 3);
        IOPointer(poDataset->GetRasterIO({1, 2, 3}))->ReadWindow(16 * nTile, 0U, 16U, 16U, oTile.data());
        return oTile;
    };
    const TifPointer poInOrder = OpenTif(fileName);
    for (unsigned int nTile = 0; nTile < 4; ++nTile)
        EXPECT_TRUE(ReadTile(poInOrder, nTile) == ReadTile(OpenTif(fileName), nTile)) << nTile;
    const TifPointer poDataset = OpenTif(fileName, eUpdate);
    IOPointer(poDataset->GetRasterIO({1, 2, 3}))->WriteWindow(0U, 0U, 32U, 16U, Bytes(32 * 16 * 3, 200).data());
    poDataset->Close();
    const TifPointer poAgain = OpenTif(fileName);
    for (unsigned int nTile = 0; nTile < 2; ++nTile)
        EXPECT_THAT(ReadTile(poAgain, nTile), testing::Each(testing::AllOf(testing::Ge(190), testing::Le(210))));
    for (unsigned int nTile = 2; nTile < 4; ++nTile)
        EXPECT_TRUE(ReadTile(poAgain, nTile) == ReadTile(poInOrder, nTile)) << nTile;
}

// Directories and their values stand before all blocks, from the image to the smallest level; blocks the other way.
TEST(TifPaths, ACloudOptimisedFileIsInItsOrder)
{
    EXPECT_THROW(CreateTif("none.tif", "LAYOUT=COG TILED=NO"), krv::DataException);
    const TempFolder oFolder;
    for (const char* pOptions : {"", " BIGTIFF=YES COMPRESS=ZSTD"})
    {
        const std::string fileName = oFolder.File("cog.tif");
        {
            const TifPointer poDataset =
                CreateTif(fileName, std::string("LAYOUT=COG BLOCKXSIZE=32 BLOCKYSIZE=32") + pOptions, 300, 200, 3,
                          krv::gobs::eDT_8U);
            const std::unique_ptr<krv::datasources::IOverviewManager> poLevels(poDataset->GetOverviewManager());
            for (const unsigned int nLevel : {4U, 2U})
            {
                poLevels->CreateLevel(nLevel);
                const IOPointer poIO(poLevels->GetOverviewIO(nLevel, {1, 2, 3}));
                WriteAll(*poIO, 3, MakePixels(300 / nLevel, 200 / nLevel, 3, krv::gobs::eDT_8U, nLevel));
            }
            poDataset->SetBitmapDescription(poDataset->CreateBitmap(), "");
            WriteAll(*poDataset, MakePixels(300, 200, 3, krv::gobs::eDT_8U, 1));
            AuxiliaryData oRecord(3);
            oRecord.SetFileMetadataValue("Note", std::string(9000, 'x'));
            poDataset->WriteAuxiliaryData(oRecord);
            poDataset->Close();
        }
        EXPECT_EQ(ListFolder(oFolder.GetPath()), std::vector<std::string>{"cog.tif"});
        TIFF* const poTiff = TIFFOpen(fileName.c_str(), "r");
        std::uint64_t nLastDirectory = 0, nFirstBlock = UINT64_MAX, nEarliestBefore = UINT64_MAX;
        std::vector<std::uint32_t> oWidths;
        do
        {
            EXPECT_GT(TIFFCurrentDirOffset(poTiff), nLastDirectory);
            nLastDirectory = TIFFCurrentDirOffset(poTiff);
            std::uint32_t nWidth = 0;
            TIFFGetField(poTiff, TIFFTAG_IMAGEWIDTH, &nWidth);
            oWidths.push_back(nWidth);
            std::uint64_t nEarliest = UINT64_MAX, nBefore = 0;
            for (std::uint32_t nTile = 0; nTile < TIFFNumberOfTiles(poTiff); ++nTile)
            {
                const std::uint64_t nOffset = TIFFGetStrileOffset(poTiff, nTile);
                if (TIFFGetStrileByteCount(poTiff, nTile) == 0)
                    continue;
                EXPECT_GT(nOffset, nBefore);
                nBefore = nOffset;
                nEarliest = std::min(nEarliest, nOffset);
            }
            EXPECT_TRUE(nEarliest == UINT64_MAX || nEarliest < nEarliestBefore);
            nEarliestBefore = std::min(nEarliest, nEarliestBefore);
            nFirstBlock = std::min(nFirstBlock, nEarliest);
        } while (TIFFReadDirectory(poTiff) == 1);
        TIFFSetDirectory(poTiff, 0);
        EXPECT_EQ(TIFFCurrentDirOffset(poTiff), *pOptions == 0 ? 192U : 200U);
        TIFFClose(poTiff);
        EXPECT_EQ(oWidths, (std::vector<std::uint32_t>{300, 300, 150, 75}));
        EXPECT_GT(nFirstBlock, nLastDirectory);
        EXPECT_GT(nFirstBlock, ReadFile(fileName).rfind("xxxx")) << "a value stands behind a block";

        EXPECT_EQ(Judge(fileName, 2).moComplaints, "");
    }
}

TEST(TifPaths, AClassicFileThatIsFullAndAFileThatIsOnlyReadSaySo)
{
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("full.tif");
    CreateTif(fileName, "COMPRESS=DEFLATE", 300, 300, 1, krv::gobs::eDT_8U)->Close();
    const std::string before = ReadFile(fileName);
    const Bytes oPixels = MakePixels(300, 300, 1, krv::gobs::eDT_8U, 1);
    const TifPointer poRead = OpenTif(fileName);
    EXPECT_THROW(WriteAll(*poRead, oPixels), krv::DataException);
    EXPECT_THROW(poRead->WriteAuxiliaryData(AuxiliaryData(1)), krv::DataException);
    EXPECT_THROW(poRead->SetGeocoding(krv::ogc::cs::GeocodingInfo(1, 2, 0, 3, 0, -2)), krv::DataException);
    EXPECT_THROW(poRead->DeleteChannel(1), krv::DataException);
    EXPECT_THROW(poRead->CreateBitmap(), krv::DataException);

    std::filesystem::resize_file(fileName, UINT32_MAX - 70000); // a hole takes no room
    TifPointer poDataset = OpenTif(fileName, eUpdate);
    EXPECT_THAT(Error([&] { WriteAll(*poDataset, oPixels); }), testing::ContainsRegex("^io: .*full.tif"));
    poDataset.reset();
    std::filesystem::resize_file(fileName, before.size());
    EXPECT_EQ(ReadFile(fileName), before);
}

// Rows of a strip that is larger than what is copied at once.
TEST(TifPaths, ChannelsComeToASingleStripWithItsPixels)
{
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("strip.tif");
    for (const std::uint16_t nPlanar : {PLANARCONFIG_CONTIG, PLANARCONFIG_SEPARATE})
    {
        Handmade oFile = Handmade::Image(40, 700, 700, 1, 1, 1000, 28000);
        oFile.Add(284, 3, 1, nPlanar);
        Bytes oBytes = oFile.Finish(0, 29000);
        for (std::size_t nAt = 0; nAt < 28000; ++nAt)
            oBytes[1000 + nAt] = static_cast<unsigned char>(nAt * 7 / 5);
        WriteBytes(fileName, oBytes);
        TifPointer poDataset = OpenTif(fileName, eUpdate);
        poDataset->AddNewChannel(krv::gobs::RasterInfo(40, 700, 1, krv::gobs::eDT_8U));
        const IOPointer poOld(poDataset->GetRasterIO({1}));
        EXPECT_TRUE(ReadAll(*poOld, 1) == Bytes(oBytes.begin() + 1000, oBytes.end()));
        poDataset->DeleteChannel(2);
        EXPECT_THROW(ReadAll(*poOld, 1), krv::DataException);
        poDataset->Close();
        EXPECT_TRUE(Judge(fileName).moPixels == Bytes(oBytes.begin() + 1000, oBytes.end()));
    }
}

// Of a tag that is there twice the first counts; what readers and writers would see differently is not updated.
TEST(TifPaths, DirectoriesThatContradictThemselvesDoNoHarm)
{
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("twice.tif");
    for (const std::uint16_t nTag : {256, 257, 258, 277, 278})
        for (const std::uint32_t nValue : {1u, 8u, 4000u})
        {
            Handmade oFile;
            for (const auto& [nNumber, nSound] : {std::pair(256, 40),
                                                  {257, 30},
                                                  {258, 8},
                                                  {259, 1},
                                                  {262, 1},
                                                  {273, 1000},
                                                  {277, 1},
                                                  {278, 30},
                                                  {279, 1200}})
            {
                oFile.Add(static_cast<std::uint16_t>(nNumber), 4, 1, static_cast<std::uint32_t>(nSound));
                if (nNumber == nTag)
                    oFile.Add(nTag, 4, 1, nValue);
            }
            WriteBytes(fileName, oFile.Finish(0, 3000));
            const TifPointer poDataset = OpenTif(fileName, eUpdate);
            poDataset->AddNewChannel(krv::gobs::RasterInfo(40, 30, 1, krv::gobs::eDT_8U));
            WriteAll(*poDataset, Bytes(2400, 3));
            poDataset->Close();
            EXPECT_TRUE(Judge(fileName).moPixels == Bytes(2400, 3)) << nTag;
        }
    // Values behind the end: what an update adds would be taken for them.
    Handmade oShort = Handmade::Image(16, 16, 16, 1, 1, 1000, 256);
    oShort.Add(65000, 2, 100, 2950);
    WriteBytes(fileName, oShort.Finish(0, 3000));
    EXPECT_NO_THROW(OpenTif(fileName));
    EXPECT_THROW(OpenTif(fileName, eUpdate), krv::FileFormatException);
    // Strips beside tiles: readers take the tiles.
    Handmade oBoth = Handmade::Image(16, 16, 16, 1, 1, 1000, 256);
    for (const auto& [nNumber, nValue] : {std::pair(322, 16), {323, 16}, {324, 2000}, {325, 256}})
        oBoth.Add(static_cast<std::uint16_t>(nNumber), 4, 1, static_cast<std::uint32_t>(nValue));
    WriteBytes(fileName, oBoth.Finish(0, 3000));
    const Bytes oBefore = ReadAll(*OpenTif(fileName));
    EXPECT_TRUE(ReadAll(*OpenTif(fileName, eUpdate)) == oBefore);
}

// Pages that claim the same lists over and over: 1 MB of file would be gigabytes in memory. Many pages below the first
// are kept.
TEST(TifPaths, TheStructureOfAFileIsBoundedByItsSize)
{
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("lists.tif");
    Bytes oBytes = Handmade::Image(1, 120000, 1, 1, 120000, 500000, 500000).Finish(1000, 1000000);
    const Bytes oPage(oBytes.begin() + 8, oBytes.begin() + 8 + 2 + 9 * 12);
    for (std::uint32_t nAt = 1000; nAt < 400000; nAt += 200)
    {
        std::copy(oPage.begin(), oPage.end(), oBytes.begin() + nAt);
        for (int nByte = 0; nByte < 4; ++nByte)
            oBytes[nAt + oPage.size() + static_cast<std::size_t>(nByte)] =
                static_cast<unsigned char>((nAt + 200 < 400000 ? nAt + 200 : 0) >> 8 * nByte);
    }
    WriteBytes(fileName, oBytes);
    EXPECT_THAT(Error([&] { OpenTif(fileName, eUpdate); }),
                testing::ContainsRegex("^file: .*claim far more than the file holds"));

    constexpr std::uint32_t BELOW = 1200;
    Handmade oFirst = Handmade::Image(4, 4, 4, 1, 1, 900, 16);
    oFirst.Add(330, 4, BELOW, 1000);
    oBytes = oFirst.Finish(0, 1000 + BELOW * 4);
    for (std::uint32_t nAt = 0; nAt < BELOW; ++nAt)
    {
        const std::size_t nPlace = oBytes.size();
        for (int nByte = 0; nByte < 4; ++nByte)
            oBytes[1000 + nAt * 4 + static_cast<std::size_t>(nByte)] = static_cast<unsigned char>(nPlace >> 8 * nByte);
        const Bytes oSmall = Handmade::Image(2, 2, 2, 1, 1, 900, 4).Finish();
        oBytes.insert(oBytes.end(), oSmall.begin() + 8, oSmall.end());
    }
    WriteBytes(fileName, oBytes);
    TifPointer poDataset = OpenTif(fileName, eUpdate);
    WriteAll(*poDataset, Bytes(16, 5));
    poDataset->Close();
    const TiffFile poAgain(TIFFOpen(fileName.c_str(), "r"));
    std::uint16_t nBelow = 0;
    toff_t* pBelow = nullptr;
    ASSERT_EQ(TIFFGetField(poAgain.get(), TIFFTAG_SUBIFD, &nBelow, &pBelow), 1);
    EXPECT_EQ(nBelow, BELOW);
}

TEST(TifPaths, ATableForBitsWhoseNumberNoTagTells)
{
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("bits.tif");
    Handmade oBits;
    for (const auto& [nNumber, nValue] :
         {std::pair(256, 16), {257, 16}, {259, 1}, {262, 1}, {273, 200}, {278, 16}, {279, 32}})
        oBits.Add(static_cast<std::uint16_t>(nNumber), 4, 1, static_cast<std::uint32_t>(nValue));
    WriteBytes(fileName, oBits.Finish(0, 300));
    const TifPointer poDataset = OpenTif(fileName, eUpdate);
    poDataset->CreatePCT(krv::gobs::PCT::FromColours(std::vector<krv::gobs::RGBTuple<std::uint16_t>>(2)), 1);
    poDataset->Close();
    EXPECT_EQ(OpenTif(fileName)->GetPCTList(), std::vector<unsigned int>{1});
}

} // namespace
