// The rarer ways of writing: files of other programs, colour tables, lossy pixels, limits, several bitmaps at once.

#include "datasources/metadata/auxiliarydata.h"
#include "gobs/pct/pct.h"
#include "gobs/raster/rasterinfo.h"
#include "tests/plugins/tif/tifsupport.h"
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

// A file as libtiff writes it, in tiles or strips of 16 rows.
struct ForeignFile
{
    const char* mpMode;
    std::uint16_t mnChannels;
    std::uint16_t mnBits;
    std::uint16_t mnCompression;
    std::uint16_t mnPredictor;
    bool mbTiled;
    bool mbSeparate;

    TiffForm GetForm() const
    {
        return {.mnWidth = WIDTH,
                .mnHeight = HEIGHT,
                .mnChannels = mnChannels,
                .mnBits = mnBits,
                .mnCompression = mnCompression,
                .mnPredictor = mnPredictor,
                .mbSeparate = mbSeparate,
                .mnTileWidth = mbTiled ? 16u : 0};
    }
};

TEST(TifPaths, FilesOfOtherProgramsAreUpdatedInTheirOwnForm)
{
    constexpr ForeignFile FILES[] = {
        {"wb", 3, 16, COMPRESSION_NONE, 1, true, false},           {"wb", 2, 16, COMPRESSION_LZW, 2, false, false},
        {"wb8", 1, 32, COMPRESSION_ADOBE_DEFLATE, 2, true, false}, {"wb", 3, 16, COMPRESSION_PACKBITS, 1, false, true},
        {"wl", 1, 4, COMPRESSION_NONE, 1, false, false},           {"wb", 3, 2, COMPRESSION_LZW, 1, true, false},
        {"wl", 1, 12, COMPRESSION_ADOBE_DEFLATE, 1, false, false}, {"wl", 2, 1, COMPRESSION_PACKBITS, 1, false, true}};
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("foreign.tif");
    for (const ForeignFile& oForm : FILES)
    {
        SCOPED_TRACE(std::string(oForm.mpMode) + " " + std::to_string(oForm.mnBits) + " bits, compression " +
                     std::to_string(oForm.mnCompression));
        {
            const TiffFile poTiff = NewTiff(fileName, oForm.mpMode);
            SetForm(poTiff.get(), oForm.GetForm());
            WriteBlocks(poTiff.get());
        }
        TifPointer poDataset = OpenTif(fileName, eUpdate);
        Bytes oExpected = ReadAll(*poDataset);
        const std::size_t nPixel = PixelBytes(*poDataset), nValue = nPixel / oForm.mnChannels;
        const unsigned int nMask = oForm.mnBits >= 8 ? 255U : (1U << oForm.mnBits) - 1;
        constexpr unsigned int X = 9, Y = 11, W = 30, H = 20;
        Bytes oWindow(W * H * nPixel, 0);
        for (std::size_t nAt = 0; nAt < oWindow.size(); nAt += nValue)
            oWindow[nAt] = static_cast<unsigned char>((nAt / nValue * 5 + 1) & nMask);
        for (unsigned int nRow = 0; nRow < H; ++nRow)
            std::memcpy(&oExpected[((Y + nRow) * WIDTH + X) * nPixel], &oWindow[nRow * W * nPixel], W * nPixel);
        {
            const IOPointer poIO(poDataset->GetRasterIO(AllChannels(oForm.mnChannels)));
            poIO->WriteWindow(X, Y, W, H, oWindow.data());
        }
        EXPECT_TRUE(ReadAll(*poDataset) == oExpected);
        poDataset->Close();
        EXPECT_TRUE(ReadAll(*OpenTif(fileName)) == oExpected);
        const Judgement oJudgement = Judge(fileName);
        EXPECT_EQ(oJudgement.moComplaints, "");
        EXPECT_EQ(oJudgement.mnCompression, oForm.mnCompression);
        EXPECT_EQ(ReadFile(fileName).substr(0, 2), oForm.mpMode[1] == 'b' ? "MM" : "II");
        if (oForm.mnBits % 8 == 0)
        {
            EXPECT_TRUE(oJudgement.moPixels == oExpected);
        }
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
    const std::string polynomials = [&aValues]
    {
        std::ostringstream oText;
        for (int n = 0; n < 92; ++n)
            oText << (n == 0 ? "" : " ") << aValues[n];
        return oText.str();
    }();
    oRecord.SetFileMetadataValue("RPC", polynomials);
    oRecord.SetFileMetadataValue("GroundControlPoints", "1 2 10 20 0; 30 2 40 20 0; 1 30 10 60 0");
    poDataset->WriteAuxiliaryData(oRecord);
    poDataset->Close();
    // Another update, of something else.
    poDataset = OpenTif(fileName, eUpdate);
    oRecord = poDataset->ReadAuxiliaryData();
    EXPECT_EQ(oRecord.GetFileMetadataValue("RPC"), polynomials);
    EXPECT_EQ(oRecord.GetFileMetadataValue("GroundControlPoints"), "1 2 10 20 0; 30 2 40 20 0; 1 30 10 60 0");
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

TEST(TifPaths, ColourTablesAreStoredChangedAndDeleted)
{
    const TempFolder oFolder;
    for (const auto eType : {krv::gobs::eDT_8U, krv::gobs::eDT_16U})
    {
        const std::string fileName = oFolder.File("table.tif");
        std::vector<krv::gobs::RGBTuple<std::uint16_t>> oColours(eType == krv::gobs::eDT_8U ? 256 : 65536);
        for (std::size_t n = 0; n < oColours.size(); ++n)
            oColours[n] = {static_cast<std::uint16_t>(n * 257), static_cast<std::uint16_t>(65535 - n), 700};
        TifPointer poDataset = CreateTif(fileName, "COMPRESS=DEFLATE", 20, 20, 1, eType);
        EXPECT_THROW(poDataset->CreatePCT(krv::gobs::PCT(), 2), krv::DataException);
        EXPECT_EQ(poDataset->CreatePCT(krv::gobs::PCT::FromColours(oColours), 1), 1U);
        EXPECT_THROW(poDataset->CreatePCT(krv::gobs::PCT(), 1), krv::DataException);
        poDataset->Close();
        TIFF* const poTiff = TIFFOpen(fileName.c_str(), "r");
        std::uint16_t* aParts[3] = {};
        ASSERT_EQ(TIFFGetField(poTiff, TIFFTAG_COLORMAP, &aParts[0], &aParts[1], &aParts[2]), 1);
        EXPECT_EQ(aParts[0][17], oColours[17].red);
        EXPECT_EQ(aParts[1][255], oColours[255].green);
        TIFFClose(poTiff);
        poDataset = OpenTif(fileName, eUpdate);
        oColours[17].blue = 60000;
        poDataset->UpdatePCT(1, krv::gobs::PCT::FromColours(oColours));
        poDataset->Close();
        poDataset = OpenTif(fileName, eUpdate);
        const std::unique_ptr<krv::gobs::PCT> poTable(poDataset->GetPCT(1));
        ASSERT_EQ(poTable->GetEntries().size(), oColours.size());
        EXPECT_EQ(poTable->GetEntries()[17].colour.blue, 60000);
        poDataset->DeletePCT(1);
        EXPECT_TRUE(poDataset->GetPCTList().empty());
        poDataset->Close();
        EXPECT_TRUE(OpenTif(fileName)->GetPCTList().empty());
    }
    EXPECT_THROW(CreateTif(oFolder.File("rgb.tif"), "", 9, 9, 3, krv::gobs::eDT_8U)->CreatePCT({}, 1),
                 krv::DataException);
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

// Directories and their values stand before all blocks, from the image to the smallest level; blocks the other way.
TEST(TifPaths, ACloudOptimisedFileIsInItsOrder)
{
    EXPECT_THROW(CreateTif("none.tif", "LAYOUT=COG TILED=NO"), krv::DataException);
    const TempFolder oFolder;
    for (const char* pOptions : {"", " BIGTIFF=YES COMPRESS=ZSTD"})
    {
        const std::string fileName = oFolder.File("cog.tif");
        const auto Create = [&](const std::string& options, const std::string& name)
        {
            TifPointer poDataset =
                CreateTif(name, "BLOCKXSIZE=32 BLOCKYSIZE=32" + options, 300, 200, 3, krv::gobs::eDT_8U);
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
        };
        Create(pOptions + std::string(" LAYOUT=COG"), fileName);
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
        EXPECT_EQ(TIFFCurrentDirOffset(poTiff), *pOptions == 0 ? 8U : 16U);
        TIFFClose(poTiff);
        EXPECT_EQ(oWidths, (std::vector<std::uint32_t>{300, 300, 150, 75}));
        EXPECT_GT(nFirstBlock, nLastDirectory);
        EXPECT_GT(nFirstBlock, ReadFile(fileName).rfind("xxxx")) << "a value stands behind a block";

        const std::string plain = oFolder.File("plain.tif");
        Create(pOptions, plain);
        const TifPointer poCloud = OpenTif(fileName), poPlain = OpenTif(plain);
        EXPECT_TRUE(ReadAll(*poCloud) == ReadAll(*poPlain));
        EXPECT_EQ(poCloud->ReadAuxiliaryData().GetFileMetadata(), poPlain->ReadAuxiliaryData().GetFileMetadata());
        EXPECT_EQ(poCloud->GetBitmapList(), poPlain->GetBitmapList());
        EXPECT_EQ(Judge(fileName, 2).moComplaints, "");
        EXPECT_TRUE(Judge(fileName, 2).moPixels == Judge(plain, 2).moPixels);
        std::filesystem::remove(plain);
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
    try
    {
        WriteAll(*poDataset, oPixels);
        FAIL() << "what lies behind 4 GiB was written";
    }
    catch (const krv::IOException& oException)
    {
        EXPECT_THAT(oException.GetMessage(), testing::HasSubstr("full.tif"));
    }
    poDataset.reset();
    std::filesystem::resize_file(fileName, before.size());
    EXPECT_EQ(ReadFile(fileName), before);
}

} // namespace
