// Files that this library did not make are changed at random beside a model of all that they say; libtiff says the same
// of the pixels that are left.

#include "fuzz/support/edits.h"
#include "tests/plugins/tif/tifsupport.h"
#include "tests/support/facts.h"
#include "tests/support/outputcapture.h"
#include "tests/support/tiffwriter.h"
#include "toolkit/exceptions/exceptions.h"

#include <filesystem>

#include <gtest/gtest.h>

namespace
{

using namespace krv::test;

// False when the file is too large to be compared all the time.
bool EditAtRandom(const std::string& fileName, unsigned int nSeed)
{
    std::mt19937 oRandom(nSeed);
    Bytes oBytes(300);
    for (unsigned char& nByte : oBytes)
        nByte = static_cast<unsigned char>(oRandom());
    krv::fuzz::Choices oProgram(oBytes.data(), oBytes.size());
    TifPointer poDataset = OpenTif(fileName, eUpdate);
    if (!krv::fuzz::Edits::IsSmall(*poDataset, 1U << 18U))
        return false;
    const OutputCapture oQuiet; // what is dropped is told
    try
    {
        krv::fuzz::Edits(fileName, oProgram).Run(std::move(poDataset));
    }
    catch (const krv::FileException&) // a page that cannot be read
    {
    }
    catch (const std::logic_error& oError)
    {
        ADD_FAILURE() << "seed " << nSeed << ": " << oError.what();
    }
    return true;
}

void ExpectTheSameByLibtiff(const std::string& fileName)
{
    const Judgement oJudgement = Judge(fileName);
    EXPECT_EQ(oJudgement.moComplaints, "");
    const Bytes oPixels = ReadAll(*OpenTif(fileName));
    EXPECT_TRUE(oJudgement.moPixels.size() != oPixels.size() || oJudgement.moPixels == oPixels);
}

TEST(TifSweep, RealFilesAreChangedAsAModelSays)
{
    if (krv::test::GetFacts().empty())
        GTEST_SKIP() << "no folder of real files";
    const TempFolder oFolder;
    unsigned int nSeed = 0, nChanged = 0;
    for (const Facts& oFacts : krv::test::GetFacts())
    {
        SCOPED_TRACE(oFacts["file"]);
        const std::string fileName = oFolder.Write("sweep.tif", ReadFile(oFacts.GetPath()));
        const bool bSound = Judge(fileName).moComplaints.empty();
        if (!EditAtRandom(fileName, ++nSeed))
            continue;
        ++nChanged;
        if (bSound && !oFacts.IsLossy())
            ExpectTheSameByLibtiff(fileName);
    }
    EXPECT_GT(nChanged, 100U);
}

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
    std::uint16_t mnFormat = SAMPLEFORMAT_UINT;
    std::uint16_t mnFillOrder = FILLORDER_MSB2LSB;
};

TEST(TifSweep, FilesOfOtherProgramsAreUpdatedInTheirOwnForm)
{
    constexpr ForeignFile FILES[] = {
        {"wb", 3, 16, COMPRESSION_NONE, 1, true, false},
        {"wb", 2, 16, COMPRESSION_LZW, 2, false, false},
        {"wb8", 1, 32, COMPRESSION_ADOBE_DEFLATE, 2, true, false},
        {"wb", 3, 16, COMPRESSION_PACKBITS, 1, false, true},
        {"wl", 1, 4, COMPRESSION_NONE, 1, false, false},
        {"wb", 3, 2, COMPRESSION_LZW, 1, true, false},
        {"wl", 1, 12, COMPRESSION_ADOBE_DEFLATE, 1, false, false},
        {"wl", 2, 1, COMPRESSION_PACKBITS, 1, false, true},
        {"wb", 2, 32, COMPRESSION_PACKBITS, 1, true, false, SAMPLEFORMAT_COMPLEXINT},
        {"wb", 1, 64, COMPRESSION_LZMA, 1, true, false, SAMPLEFORMAT_COMPLEXIEEEFP},
        {"wb", 1, 128, COMPRESSION_PACKBITS, 1, false, false, SAMPLEFORMAT_COMPLEXIEEEFP},
        {"wb", 1, 32, COMPRESSION_LZW, 1, false, false, SAMPLEFORMAT_COMPLEXINT},
        {"wl", 1, 16, COMPRESSION_NONE, 1, false, false, SAMPLEFORMAT_UINT, FILLORDER_LSB2MSB},
        {"wl", 3, 8, COMPRESSION_LZW, 2, true, false, SAMPLEFORMAT_UINT, FILLORDER_LSB2MSB},
        {"wb", 1, 1, COMPRESSION_PACKBITS, 1, true, false, SAMPLEFORMAT_UINT, FILLORDER_LSB2MSB}};
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("foreign.tif");
    for (unsigned int nSeed = 0; nSeed < 3 * std::size(FILES); ++nSeed)
    {
        const ForeignFile& oForm = FILES[nSeed % std::size(FILES)];
        SCOPED_TRACE(std::string(oForm.mpMode) + " " + std::to_string(oForm.mnBits) + " bits, compression " +
                     std::to_string(oForm.mnCompression));
        {
            const TiffFile poTiff = NewTiff(fileName, oForm.mpMode);
            SetForm(poTiff.get(), {.mnWidth = 50,
                                   .mnHeight = 40,
                                   .mnChannels = oForm.mnChannels,
                                   .mnBits = oForm.mnBits,
                                   .mnFormat = oForm.mnFormat,
                                   .mnCompression = oForm.mnCompression,
                                   .mnPredictor = oForm.mnPredictor,
                                   .mbSeparate = oForm.mbSeparate,
                                   .mnTileWidth = oForm.mbTiled ? 16u : 0});
            TIFFSetField(poTiff.get(), TIFFTAG_FILLORDER, oForm.mnFillOrder);
            WriteBlocks(poTiff.get());
        }
        EXPECT_TRUE(EditAtRandom(fileName, nSeed));
        ExpectTheSameByLibtiff(fileName);
        EXPECT_EQ(Judge(fileName).mnCompression, oForm.mnCompression);
        EXPECT_EQ(ReadFile(fileName).substr(0, 2), oForm.mpMode[1] == 'b' ? "MM" : "II");
    }
}

// An image of two channels, a level of deflate that is none, a mask of a codec that does not exist: some operations
// fail at their last step, after they have changed something.
TEST(TifSweep, AnOperationThatThrowsChangesNothing)
{
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("whole.tif");
    for (unsigned int nSeed = 0; nSeed < 40; ++nSeed)
    {
        Bytes oBytes = Handmade::Image(32, 32, 32, 1, 1, 3000, 2048, 8, 1, 2).Finish(1000, 8000);
        Handmade oLevel = Handmade::Image(16, 16, 16, 8, 1, 6000, 500, 8, 1, 2);
        oLevel.Add(254, 4, 1, 1);
        Handmade oMask = Handmade::Image(32, 32, 32, 9, 1, 7000, 128, 1, 4);
        oMask.Add(254, 4, 1, 4);
        for (const auto& [nAt, oPage] : {std::pair(1000U, oLevel.Finish(1500)), {1500U, oMask.Finish()}})
            for (std::size_t nByte = 8; nByte < oPage.size(); ++nByte)
                oBytes[nAt + nByte - 8] = oPage[nByte];
        std::fill(oBytes.begin() + 6000, oBytes.end(), static_cast<unsigned char>(0xAB));
        WriteBytes(fileName, oBytes);
        EditAtRandom(fileName, nSeed);
    }
}

} // namespace
