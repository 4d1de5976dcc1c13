// krv overviews as users run it.

#include "tests/support/tiffwriter.h"
#include "tests/tools/programrun.h"
#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>

namespace krv::tool
{

namespace
{

using krv::conformance::ReadFile;
using krv::conformance::TempFolder;
using krv::test::ProgramRun;
using krv::test::RunKrv;
using krv::test::RunProgram;

// One 8-bit channel in strips of 16 rows, as libtiff alone writes it.
std::string MakeFile(const TempFolder& oFolder, unsigned int nSize, bool bTable)
{
    const std::string file = oFolder.File("image.tif");
    const krv::test::TiffFile oTiff = krv::test::NewTiff(file);
    krv::test::SetForm(oTiff.get(), {nSize, nSize});
    if (bTable)
        TIFFSetField(oTiff.get(), TIFFTAG_PHOTOMETRIC, PHOTOMETRIC_PALETTE);
    std::vector<unsigned short> oColours(256);
    if (bTable)
        TIFFSetField(oTiff.get(), TIFFTAG_COLORMAP, oColours.data(), oColours.data(), oColours.data());
    std::vector<unsigned char> oRow(nSize);
    for (unsigned int nY = 0; nY < nSize; ++nY)
    {
        for (unsigned int nX = 0; nX < nSize; ++nX)
            oRow[nX] = static_cast<unsigned char>(nX / 2 + nY);
        TIFFWriteScanline(oTiff.get(), oRow.data(), nY, 0);
    }
    return file;
}

} // namespace

TEST(OverviewsVerb, LevelsAreThereForLibtiffToo)
{
    const TempFolder oFolder;
    const std::string file = MakeFile(oFolder, 600, false);
    const ProgramRun oRun = RunKrv({"overviews", file});
    ASSERT_EQ(oRun.code, 0) << oRun.errors;
    EXPECT_EQ(oRun.output, "level 2: 300 x 300\nlevel 4: 150 x 150\n");
    EXPECT_EQ(RunKrv({"overviews", file, "--levels", "3", "--resampling", "Lanczos"}).code, 0);
    EXPECT_EQ(RunKrv({"info", file, "--json"}).Json()["overviews"].size(), 3u);

    const krv::test::TiffFile oTiff(TIFFOpen(file.c_str(), "r"));
    ASSERT_EQ(TIFFSetDirectory(oTiff.get(), 1), 1);
    unsigned int nKind = 0;
    TIFFGetField(oTiff.get(), TIFFTAG_SUBFILETYPE, &nKind);
    EXPECT_EQ(nKind, static_cast<unsigned int>(FILETYPE_REDUCEDIMAGE));
    std::vector<unsigned char> oRow(300);
    ASSERT_EQ(TIFFReadScanline(oTiff.get(), oRow.data(), 10, 0), 1);
    for (unsigned int nX = 0; nX < 200; ++nX)
        ASSERT_EQ(oRow[nX], nX + 20 + nX % 2) << nX; // halves to the even side
}

TEST(OverviewsVerb, RefusalsLeaveTheFileAsItIs)
{
    const TempFolder oFolder;
    const std::string file = MakeFile(oFolder, 300, true);
    const std::string before = ReadFile(file);
    krv::test::ExpectRefusals("overviews", {{{file, "--resampling", "average"}, 2, "colour table"},
                                            {{file, "--resampling", "best"}, 2, "best"},
                                            {{file, "--levels", "2,x"}, 2, "--levels"},
                                            {{file, "--levels", "1"}, 2, "factors from 2"},
                                            {{file, "--changed", "300,0,9,9"}, 2, "no pixel of the image"},
                                            {{file, "--levels", "2,4096"}, 2, "from 2 to 512"},
                                            {{file, "--changed", "1,2"}, 2, "--changed"},
                                            {{oFolder.File("none.tif")}, 1, "no such file"}});
    EXPECT_EQ(ReadFile(file), before);
    EXPECT_EQ(RunKrv({"overviews", file}).code, 0); // by mode, without being told
}

TEST(OverviewsVerb, InterruptStopsCleanly)
{
    const TempFolder oFolder;
    const std::string file = MakeFile(oFolder, 6000, false);
    const std::string before = ReadFile(file);
    const ProgramRun oRun = RunProgram(KRV_PROGRAM, {"overviews", file, "--resampling", "lanczos"}, {}, 300);
    EXPECT_EQ(oRun.code, 130);
    EXPECT_EQ(oRun.errors, "krv: interrupted; files are as they were\n");
    EXPECT_TRUE(ReadFile(file) == before);
}

} // namespace krv::tool
