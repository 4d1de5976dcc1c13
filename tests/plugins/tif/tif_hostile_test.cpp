#include "datasources/metadata/auxiliarydata.h"
#include "fuzz/support/exercise.h"
#include "tests/plugins/tif/tifsupport.h"
#include "tests/support/facts.h"
#include "tests/support/outputcapture.h"
#include "tests/support/tiffwriter.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <cstring>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <random>

#include <gtest/gtest.h>
#include <sys/resource.h>

namespace
{

using namespace krv::test;

Bytes ReadBytes(const std::string& fileName)
{
    const std::string bytes = ReadFile(fileName);
    return {bytes.begin(), bytes.end()};
}

// Of the processor: a busy machine is no fault of the format.
double Seconds()
{
    return static_cast<double>(std::clock()) / CLOCKS_PER_SEC;
}

// Asks a file everything. Returns what is warned of and the messages of all exceptions; anything that is no
// krv::Exception passes.
std::string UseFile(const std::string& fileName)
{
    const OutputCapture oOutput;
    std::string messages;
    const auto Hear = [&messages](const krv::Exception& oException)
    {
        messages += oException.GetMessage() + "\n";
    };
    try
    {
        krv::fuzz::ExerciseDataset(*OpenTif(fileName), Hear);
    }
    catch (const krv::Exception& oException)
    {
        Hear(oException);
    }
    for (const OutputCapture::Line& oLine : oOutput.moWarnings)
        messages += oLine.moMessage + "\n";
    return messages;
}

struct Recipe
{
    bool tiled;
    std::uint16_t compression;
    std::uint16_t bits;
    std::uint16_t photometric;
    const char* mode;
};

// Three channels (or one) of 70 x 50, with a level, a mask and metadata.
void MakeFile(const std::string& fileName, const Recipe& oRecipe)
{
    const bool bYCbCr = oRecipe.photometric == PHOTOMETRIC_YCBCR;
    const TiffFile poTiff = NewTiff(fileName, oRecipe.mode);
    for (const std::uint32_t nKind : {0, FILETYPE_REDUCEDIMAGE, FILETYPE_MASK})
    {
        TiffForm oForm{70, 50};
        if (nKind == FILETYPE_REDUCEDIMAGE)
            oForm = {35, 25};
        oForm.mnBits = nKind == FILETYPE_MASK ? 1 : oRecipe.bits;
        oForm.mnPhotometric = nKind == FILETYPE_MASK ? PHOTOMETRIC_MASK : oRecipe.photometric;
        oForm.mnChannels = oForm.mnPhotometric == PHOTOMETRIC_RGB || (bYCbCr && nKind != FILETYPE_MASK) ? 3 : 1;
        oForm.mnCompression = nKind == FILETYPE_MASK ? COMPRESSION_NONE : oRecipe.compression;
        if (oRecipe.tiled)
            oForm.mnTileWidth = oForm.mnRows = 32;
        else if (oRecipe.compression == COMPRESSION_JBIG) // it knows one strip only
            oForm.mnRows = oForm.mnHeight;
        SetForm(poTiff.get(), oForm);
        TIFFSetField(poTiff.get(), TIFFTAG_SUBFILETYPE, nKind);
        TIFFSetField(poTiff.get(), TIFFTAG_SOFTWARE, "test");
        if (bYCbCr && nKind != FILETYPE_MASK)
            TIFFSetField(poTiff.get(), TIFFTAG_JPEGCOLORMODE, JPEGCOLORMODE_RGB);
        WriteBlocks(poTiff.get());
        TIFFWriteDirectory(poTiff.get());
    }
}

constexpr Recipe RECIPES[] = {
    {true, COMPRESSION_NONE, 8, PHOTOMETRIC_RGB, "w"},
    {false, COMPRESSION_NONE, 16, PHOTOMETRIC_MINISBLACK, "wb"},
    {true, COMPRESSION_LZW, 16, PHOTOMETRIC_MINISBLACK, "w8"},
    {false, COMPRESSION_ADOBE_DEFLATE, 8, PHOTOMETRIC_RGB, "w"},
    {true, COMPRESSION_ZSTD, 32, PHOTOMETRIC_MINISBLACK, "wb8"},
    {false, COMPRESSION_PACKBITS, 8, PHOTOMETRIC_RGB, "w"},
    {true, COMPRESSION_JPEG, 8, PHOTOMETRIC_YCBCR, "w"},
    {false, COMPRESSION_CCITTFAX4, 1, PHOTOMETRIC_MINISWHITE, "w"},
    {true, COMPRESSION_LZMA, 8, PHOTOMETRIC_MINISBLACK, "w"},
    {false, COMPRESSION_LERC, 8, PHOTOMETRIC_MINISBLACK, "w"},
    {true, COMPRESSION_WEBP, 8, PHOTOMETRIC_RGB, "w"},
    {false, COMPRESSION_JBIG, 1, PHOTOMETRIC_MINISWHITE, "w"},
    {false, COMPRESSION_CCITTFAX3, 1, PHOTOMETRIC_MINISBLACK, "wb"},
};

class TifDamaged : public ::testing::TestWithParam<Recipe>
{
};

// Every cut-off leaves a file that is read or refused with a text that names it; nothing else happens.
TEST_P(TifDamaged, CutFilesAreRefusedByName)
{
    const TempFolder oFolder;
    const std::string file = oFolder.File("file.tif");
    MakeFile(file, GetParam());
    EXPECT_EQ(UseFile(file), "");
    const TifPointer poSound = OpenTif(file);
    EXPECT_EQ(ReadAll(*poSound), ReadAll(*poSound)); // stored bytes that are kept stay what they are
    const Bytes oBytes = ReadBytes(file);
    for (std::size_t nSize = 0; nSize + 8 < oBytes.size(); nSize += 1 + nSize / 40)
    {
        // A cut in the word that names the next directory makes this one the last.
        std::string message;
        for (const std::size_t nEnd : {nSize, nSize - 4})
            if (message.empty())
            {
                WriteBytes(file, Bytes(oBytes.begin(), oBytes.begin() + static_cast<std::ptrdiff_t>(nEnd)));
                message = UseFile(file);
            }
        EXPECT_NE(message.find(file), std::string::npos) << nSize << ": " << message;
    }
}

// The pixels of everything in a file: the message of the first exception, or empty.
std::string ReadPixels(const std::string& fileName)
{
    try
    {
        const TifPointer oFile = OpenTif(fileName);
        const std::unique_ptr<krv::datasources::IOverviewManager> poLevels(oFile->GetOverviewManager());
        const std::unique_ptr<krv::datasources::IOverviewManager> poMaskLevels(oFile->GetBitmapOverviewManager());
        ReadAll(*oFile);
        for (const unsigned int nLevel : poLevels->GetLevels())
            ReadAll(*IOPointer(poLevels->GetOverviewIO(nLevel, AllChannels(oFile->GetChanCount()))),
                    PixelBytes(*oFile));
        for (const unsigned int nBitmap : oFile->GetBitmapList())
            ReadAll(*IOPointer(oFile->GetBitmapIO({nBitmap})), 1);
        for (const unsigned int nLevel : poMaskLevels ? poMaskLevels->GetLevels() : std::vector<unsigned int>())
            ReadAll(*IOPointer(poMaskLevels->GetOverviewIO(nLevel, {1})), 1);
        return {};
    }
    catch (const krv::Exception& oException)
    {
        return oException.GetMessage();
    }
}

// Changes single bytes of strips and tiles: what libtiff refuses when it decodes them whole is refused. Returns how
// much that was.
unsigned int ChangePixelBytes(const std::string& fileName, unsigned int nTries)
{
    const Bytes oSound = ReadBytes(fileName);
    std::vector<std::size_t> oPlaces;
    std::uint16_t nPages = 0;
    {
        const TiffFile poTiff(TIFFOpen(fileName.c_str(), "r"));
        nPages = static_cast<std::uint16_t>(TIFFNumberOfDirectories(poTiff.get()));
        for (std::uint16_t nPage = 0; nPage < nPages && TIFFSetDirectory(poTiff.get(), nPage) == 1; ++nPage)
            for (std::uint32_t nAt = 0; nAt < TIFFNumberOfStrips(poTiff.get()); ++nAt)
                for (std::uint64_t nByte = 0; nByte < TIFFGetStrileByteCount(poTiff.get(), nAt); ++nByte)
                    oPlaces.push_back(TIFFGetStrileOffset(poTiff.get(), nAt) + nByte);
    }
    unsigned int nRefused = 0;
    std::mt19937 oRandom(3);
    for (unsigned int nTry = 0; nTry < nTries; ++nTry)
    {
        Bytes oBytes = oSound;
        const std::size_t nPlace = oPlaces[oRandom() % oPlaces.size()];
        oBytes[nPlace] ^= static_cast<unsigned char>(1u << oRandom() % 8);
        WriteBytes(fileName, oBytes);
        std::string complaints;
        for (unsigned int nPage = 0; nPage < nPages; ++nPage)
            complaints += Judge(fileName, nPage).moComplaints;
        nRefused += !complaints.empty();
        EXPECT_TRUE(complaints.empty() || !ReadPixels(fileName).empty()) << "byte " << nPlace << ": " << complaints;
    }
    return nRefused;
}

// A changed directory is refused, or read as libtiff reads it.
TEST(TifHostile, DirectoriesSayTheSameHereAndToLibtiff)
{
    const TempFolder oFolder;
    const std::string file = oFolder.File("file.tif");
    unsigned int nRead = 0;
    std::mt19937 oRandom(5);
    for (const Recipe& oRecipe : RECIPES)
    {
        std::filesystem::remove(file);
        MakeFile(file, oRecipe);
        const Bytes oSound = ReadBytes(file);
        const krv::plugins::support::File oBytes(file, krv::plugins::support::File::Mode::eRead);
        krv::plugins::tif::PeekReader oReader(oBytes);
        const auto oHeader = krv::plugins::tif::FileHeader::Parse(oSound.data(), oSound.size());
        const krv::plugins::tif::RawDirectory oDirectory(oReader, *oHeader, oHeader->mnFirstDirectory);
        const std::size_t nBytes = 8 + oDirectory.GetEntries().size() * (oHeader->mbBigTiff ? 20 : 12);
        const std::string changed = oFolder.File("changed.tif");
        for (int nTry = 0; nTry < 100; ++nTry)
        {
            Bytes oChanged = oSound;
            const std::size_t nAt = oHeader->mnFirstDirectory + oRandom() % nBytes;
            oChanged[nAt] = static_cast<unsigned char>(oRandom() % 2 == 0 ? oRandom() : oRandom() % 8);
            WriteBytes(changed, oChanged);
            SCOPED_TRACE(std::to_string(oRecipe.compression) + ", byte " + std::to_string(nAt));
            TifPointer poFile;
            Bytes oPixels;
            try
            {
                poFile = OpenTif(changed);
                if (std::uint64_t{poFile->GetWidth()} * poFile->GetHeight() * poFile->GetChanCount() > 1000000)
                    continue;
                oPixels = ReadAll(*poFile);
            }
            catch (const krv::Exception&)
            {
                continue;
            }
            const Judgement oJudgement = Judge(changed);
            EXPECT_FALSE(oJudgement.moComplaints.starts_with("cannot be opened")) << oJudgement.moComplaints;
            EXPECT_EQ(oJudgement.mnWidth, poFile->GetWidth());
            EXPECT_EQ(oJudgement.mnHeight, poFile->GetHeight());
            EXPECT_EQ(oJudgement.mnChannels, poFile->GetChanCount());
            // Of deflated strips that are too long libtiff gives a part; several channels of single bits are not
            // placed.
            const bool bJudged = oJudgement.moComplaints.empty() && oPixels.size() == oJudgement.moPixels.size() &&
                                 oRecipe.compression != COMPRESSION_NONE &&
                                 oRecipe.compression != COMPRESSION_ADOBE_DEFLATE;
            EXPECT_TRUE(!bJudged || oPixels == oJudgement.moPixels);
            ++nRead;
        }
    }
    EXPECT_GT(nRead, 200u);
}

TEST(TifHostile, DamageThatLibtiffSeesIsSeen)
{
    const TempFolder oFolder;
    const std::string file = oFolder.File("file.tif");
    for (Recipe oRecipe : RECIPES)
        for (const bool bTiled : {false, true})
        {
            oRecipe.tiled = bTiled && oRecipe.compression != COMPRESSION_JBIG;
            if (oRecipe.compression == COMPRESSION_NONE)
                continue;
            SCOPED_TRACE(oRecipe.compression);
            MakeFile(file, oRecipe);
            ChangePixelBytes(file, 40);
        }
    for (const char* pOptions : {"LAYOUT=COG COMPRESS=DEFLATE PREDICTOR=2", "COMPRESS=LZW", "COMPRESS=ZSTD"})
    {
        std::filesystem::remove(file);
        const krv::gobs::DataType oType(krv::gobs::eDT_8U);
        const TifPointer poFile = CreateTif(file, pOptions, 300, 270, 1, oType);
        WriteAll(*poFile, MakePixels(300, 270, 1, oType, 1));
        poFile->Close();
        EXPECT_GT(ChangePixelBytes(file, 60), 5u) << pOptions;
    }
    const std::string real = DataFolder() + "/mask/cog_uint8_rgb_mask.tif";
    if (std::filesystem::exists(real))
    {
        WriteFile(file, ReadFile(real));
        EXPECT_GT(ChangePixelBytes(file, 60), 5u);
    }
}

// Strips are read several at a time; what is wrong with one does not cost the rows of the others.
TEST(TifHostile, ADamagedStripCostsItsOwnRowsAlone)
{
    const TempFolder oFolder;
    const std::string file = oFolder.File("file.tif");
    for (const char* pOptions : {"INTERLEAVE=PIXEL", "INTERLEAVE=BAND"})
    {
        std::filesystem::remove(file);
        const krv::gobs::DataType oType(krv::gobs::eDT_8U);
        const Bytes oPixels = MakePixels(40, 64, 2, oType, 1);
        TifPointer poFile =
            CreateTif(file, std::string("COMPRESS=DEFLATE TILED=NO BLOCKYSIZE=16 ") + pOptions, 40, 64, 2, oType);
        WriteAll(*poFile, oPixels);
        poFile->Close();
        TIFF* const poTiff = TIFFOpen(file.c_str(), "r");
        const auto nPlace = static_cast<std::size_t>(TIFFGetStrileOffset(poTiff, 1));
        TIFFClose(poTiff);
        std::string bytes = ReadFile(file);
        bytes[nPlace + 10] ^= 0x7F;
        WriteFile(file, bytes);
        for (const AccessMode eMode : {eReadOnly, eUpdate})
        {
            poFile = OpenTif(file, eMode);
            const std::unique_ptr<krv::datasources::IRasterIO> poIO(poFile->GetRasterIO({2, 1}));
            EXPECT_GT(poIO->GetTileHeight(), 16u) << "several strips a block";
            Bytes oRow(80);
            EXPECT_THROW(poIO->ReadWindow(0u, 16u, 40u, 1u, oRow.data()), krv::FileException);
            EXPECT_THROW(poIO->ReadWindow(3u, 15u, 5u, 2u, oRow.data()), krv::FileException);
            for (const unsigned int nY : {0u, 15u, 32u, 63u})
            {
                ASSERT_NO_THROW(poIO->ReadWindow(0u, nY, 40u, 1u, oRow.data())) << nY;
                for (unsigned int n = 0; n < 80; ++n)
                    ASSERT_EQ(oRow[n], oPixels[nY * 80 + (n ^ 1)]) << nY;
            }
        }
    }
}

std::string RecipeName(const ::testing::TestParamInfo<Recipe>& oInfo)
{
    return "Codec" + std::to_string(oInfo.param.compression) + "n" + std::to_string(oInfo.index);
}

INSTANTIATE_TEST_SUITE_P(Recipes, TifDamaged, ::testing::ValuesIn(RECIPES), RecipeName);

TEST(TifHostile, HugeClaimsAreRefusedOrServedInBoundedMemory)
{
    struct Case
    {
        const char* name;
        Bytes bytes;
        const char* refusal; // a part of the message, null where it is served
    };
    const Case CASES[] = {
        {"width 0", Handmade::Image(0, 10, 10, 1, 1, 200, 100).Finish(0, 400), "the image size 0 x 10 is out of range"},
        {"height beyond signed", Handmade::Image(10, 0x90000000u, 10, 1, 1, 200, 100).Finish(0, 400), "out of range"},
        {"row beyond memory", Handmade::Image(0x7FFFFFFF, 10, 10, 1, 1, 200, 100, 64).Finish(0, 400),
         "a row of 17179869176 bytes is too long"},
        {"strips without a list", Handmade::Image(1000, 2000000000, 1, 1, 2000000000, 200, 250).Finish(0, 400), ""},
        {"pixels behind the end", Handmade::Image(50000, 50000, 50000, 1, 1, 200, 2500000000u).Finish(0, 400), ""},
        {"tiny data for a huge strip", Handmade::Image(60000, 60000, 60000, 8, 1, 200, 150).Finish(0, 400), ""},
        {"tiny fax for a huge strip", Handmade::Image(60000, 60000, 60000, 4, 1, 200, 150, 1).Finish(0, 400), ""},
        {"strip that claims the file", Handmade::Image(16, 16, 16, 5, 1, 200, 0xFFFFFFFFu).Finish(0, 400), ""},
        {"strips of no rows", Handmade::Image(16, 16, 0, 1, 1, 200, 256).Finish(0, 600), "its strips have no rows"},
        {"unstored strips", Handmade::Image(100, 100, 1, 1, 0, 0, 0).Finish(0, 400), ""},
        {"unstored image", Handmade::Image(100000, 100000, 100000, 8, 1, 0, 0).Finish(0, 400), nullptr},
    };
    for (const Case& oCase : CASES)
    {
        SCOPED_TRACE(oCase.name);
        const TempFolder oFolder;
        const std::string file = oFolder.File("file.tif");
        WriteBytes(file, oCase.bytes);
        const double dBegin = Seconds();
        const std::string message = UseFile(file);
        EXPECT_LT(Seconds() - dBegin, 2);
        EXPECT_EQ(!message.empty(), oCase.refusal != nullptr) << message;
        for (const std::string& part : {file, std::string(oCase.refusal ? oCase.refusal : "")})
            EXPECT_TRUE(!oCase.refusal || message.find(part) != std::string::npos) << message;
    }
    rusage oUsage{};
    getrusage(RUSAGE_SELF, &oUsage);
    EXPECT_LT(oUsage.ru_maxrss, 1024L * 1024); // kilobytes, of all tests in this process and a sanitizer's share
}

TEST(TifHostile, TagsThatClaimMoreThanMemoryAreRefused)
{
    Handmade oFile = Handmade::Image(16, 16, 16, 1, 1, 400, 256);
    for (std::uint16_t nTag = 60000; nTag < 60010; ++nTag)
        oFile.Add(nTag, 1, 20000000, 8);
    const TempFolder oFolder;
    const std::string file = oFolder.File("file.tif");
    WriteBytes(file, oFile.Finish(0, 1000));
    std::filesystem::resize_file(file, 2000000000);
    EXPECT_NE(UseFile(file).find("the tags claim"), std::string::npos);
}

TEST(TifHostile, ChainsOfDirectoriesThatNeverEndDoNotHang)
{
    const TempFolder oFolder;
    const std::string file = oFolder.File("file.tif");
    // A chain into itself.
    WriteBytes(file, Handmade::Image(16, 16, 16, 1, 1, 400, 256).Finish(8, 1000));
    EXPECT_NE(UseFile(file).find("circle"), std::string::npos);
    // What lies before the break is there, with one warning.
    MakeFile(file, RECIPES[0]);
    Bytes oPages = ReadBytes(file);
    std::size_t nNext = 4;
    for (int nPage = 0; nPage < 2; ++nPage)
    {
        std::uint32_t nOffset = 0;
        std::memcpy(&nOffset, &oPages[nNext], 4);
        nNext = nOffset + 2 + std::size_t{12} * oPages[nOffset];
    }
    std::memset(&oPages[nNext], 0x7F, 4);
    WriteBytes(file, oPages);
    const OutputCapture oOutput;
    for (int nTime = 0; nTime < 2; ++nTime)
    {
        const TifPointer poFile = OpenTif(file);
        const std::unique_ptr<krv::datasources::IOverviewManager> poLevels(poFile->GetOverviewManager());
        EXPECT_EQ(poLevels->GetLevels(), std::vector<unsigned int>{2});
        EXPECT_TRUE(poFile->GetBitmapList().empty());
        ASSERT_EQ(oOutput.moWarnings.size(), nTime + 1u);
        const std::string& said = oOutput.moWarnings[0].moMessage;
        EXPECT_NE(said.find(file + ": levels and masks are listed only"), std::string::npos) << said;
    }
    // Directories of one entry, so many as the file holds.
    Bytes oBytes = Handmade::Image(16, 16, 16, 1, 1, 400, 256).Finish(1000, 1000);
    for (std::uint32_t nAt = 0; nAt < 200000; ++nAt)
    {
        Handmade oPage;
        oPage.Add(254, 4, 1, 1);
        const Bytes oFile = oPage.Finish(1000 + 18 * (nAt + 1));
        oBytes.insert(oBytes.end(), oFile.begin() + 8, oFile.end());
    }
    WriteBytes(file, oBytes);
    const double dBegin = Seconds();
    EXPECT_NE(UseFile(file).find("directories"), std::string::npos);
    EXPECT_LT(Seconds() - dBegin, 2);
}

// Some cameras and writers pad a stream before a marker.
TEST(TifHostile, BytesBeforeAMarkerOfJpegAreNoDamage)
{
    const TempFolder oFolder;
    const std::string sound = oFolder.File("sound.tif"), padded = oFolder.File("padded.tif");
    const Bytes oPixels = MakePixels(16, 16, 1, krv::gobs::eDT_8U, 3);
    const TifPointer poNew = CreateTif(sound, "COMPRESS=JPEG TILED=NO", 16, 16, 1, krv::gobs::eDT_8U);
    WriteAll(*poNew, oPixels);
    poNew->Close();
    Bytes oStream(4096);
    {
        const TiffFile poTiff(TIFFOpen(sound.c_str(), "r"));
        oStream.resize(static_cast<std::size_t>(TIFFReadRawStrip(poTiff.get(), 0, oStream.data(), 4096)));
    }
    oStream.insert(oStream.begin() + 2, 5, 0);
    Bytes oFile = Handmade::Image(16, 16, 16, 7, 1, 400, static_cast<std::uint32_t>(oStream.size())).Finish(0, 400);
    oFile.insert(oFile.end(), oStream.begin(), oStream.end());
    WriteBytes(padded, oFile);
    EXPECT_EQ(UseFile(padded), "");
    EXPECT_EQ(ReadAll(*OpenTif(padded)), ReadAll(*OpenTif(sound)));
}

TEST(TifHostile, MessagesSayDamagedOrUnknownAndNothingOfLibtiff)
{
    const auto Deflated = [](std::uint16_t nTag, std::uint32_t nValue, std::uint16_t nBits)
    {
        Handmade oFile = Handmade::Image(16, 16, 16, 8, 1, 400, 256, nBits);
        oFile.Add(nTag, 3, 1, nValue);
        return oFile.Finish(0, 1000);
    };
    const std::pair<Bytes, const char*> CASES[] = {
        {Deflated(TIFFTAG_PREDICTOR, 4, 64),
         "predictor 4, which no reader knows,; the file is of a kind that is not read"},
        {Deflated(TIFFTAG_PREDICTOR, 2, 4), "of a kind that is not read"},
        {Deflated(TIFFTAG_PREDICTOR, 3, 8), "of a kind that is not read"},
        {Deflated(TIFFTAG_PREDICTOR, 1, 8), "strip 0: "},
        {Handmade::Image(16, 16, 16, 7, 1, 400, 256).Finish(0, 1000), "its data make no sense; the file is damaged"},
        {Handmade::Image(16, 16, 16, 34712, 1, 400, 256).Finish(0, 1000), "the file is of a kind that is not read"},
        {Handmade::Image(16, 0, 16, 1, 1, 400, 256).Finish(0, 1000), "the file is damaged"}};
    const TempFolder oFolder;
    for (const auto& [oBytes, pWords] : CASES)
    {
        const std::string file = oFolder.File("file.tif");
        WriteBytes(file, oBytes);
        EXPECT_NE(UseFile(file).find(pWords), std::string::npos) << UseFile(file);
    }
}

// Nothing of it is lost, and it is told.
TEST(TifHostile, ATag42112ThatIsNoXmlIsNamedAndKept)
{
    const std::string text = "<GDALMetadata><Item name=\"\xE4\">1</Item></GDALMetadata>";
    Handmade oFile = Handmade::Image(16, 16, 16, 1, 1, 400, 256);
    oFile.Add(42112, 2, static_cast<std::uint32_t>(text.size() + 1), 700);
    Bytes oBytes = oFile.Finish(0, 1000);
    std::copy(text.begin(), text.end(), oBytes.begin() + 700);
    const TempFolder oFolder;
    const std::string file = oFolder.File("file.tif");
    WriteBytes(file, oBytes);
    EXPECT_NE(UseFile(file).find(file + ": tag 42112"), std::string::npos) << UseFile(file);
    const OutputCapture oQuiet;
    for (const bool bWritten : {false, true})
    {
        krv::datasources::AuxiliaryData oData = OpenTif(file)->ReadAuxiliaryData();
        EXPECT_EQ(oData.GetFileMetadataValue("MetadataXML"), text);
        EXPECT_EQ(oData.GetFileMetadataValue("Own"), bWritten ? "x" : "");
        const TifPointer poFile = OpenTif(file, eUpdate);
        oData.SetFileMetadataValue("Own", "x");
        poFile->WriteAuxiliaryData(oData);
        poFile->Close();
    }
    EXPECT_EQ(UseFile(file), "");
}

TEST(TifHostile, OnlyTiffFilesAreClaimed)
{
    krv::plugins::tif::TifBuilder oBuilder;
    const auto Claims = [&oBuilder](Bytes oBytes)
    {
        oBytes.resize(4096);
        return oBuilder.Identify("a.tif", oBytes.data(), 4096, 0) == 0;
    };
    for (const Bytes& oBytes : {Bytes{'I', 'I', 42, 0, 8, 0, 0, 0},
                                {'M', 'M', 0, 42, 0, 0, 0, 8},
                                {'I', 'I', 43, 0, 8, 0, 0, 0, 16},
                                {'M', 'M', 0, 43, 0, 8, 0, 0, 0, 0, 0, 0, 0, 0, 1, 0}})
        EXPECT_TRUE(Claims(oBytes));
    for (const Bytes& oBytes : {Bytes{'I', 'I', 42, 0},
                                {'M', 'M', 42, 0, 8, 0, 0, 0},
                                {'I', 'I', 43, 0, 4, 0, 0, 0, 16},
                                {'I', 'M', 42, 0, 8, 0, 0, 0},
                                {}})
        EXPECT_FALSE(Claims(oBytes));
    EXPECT_THROW(oBuilder.Open("nowhere.tif", eReadOnly), krv::FileNotFoundException);
    EXPECT_THROW(oBuilder.Open("nowhere.tif", eUpdate), krv::FileNotFoundException);
}

TEST(TifHostile, FileThatShrinksWhileOpenEndsInAnException)
{
    const TempFolder oFolder;
    const std::string file = oFolder.File("file.tif");
    MakeFile(file, RECIPES[0]);
    const TifPointer oFile = OpenTif(file);
    const IOPointer poIO(oFile->GetRasterIO({1, 2, 3}));
    std::filesystem::resize_file(file, 100);
    Bytes oBuffer(70 * 50 * 3);
    EXPECT_THROW(poIO->ReadWindow(0u, 0u, 70u, 50u, oBuffer.data()), krv::FileException);
}

} // namespace
