// Another grid by the command, and windows in map coordinates.

#include "datasources/metadata/auxiliarydata.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/validitysource.h"
#include "datasources/writer/basicwriter.h"
#include "datasources/writer/multitypewriter.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/rasterview.h"
#include "tests/support/facts.h"
#include "tests/support/pixels.h"
#include "tests/tools/programrun.h"
#include "toolkit/ogc/cs/controlpoints.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>

#include <cmath>
#include <filesystem>
#include <memory>

namespace krv::test
{

namespace
{

using namespace krv::datasources;
using RasterPtr = std::unique_ptr<krv::gobs::Raster>;
using krv::conformance::TempFolder;
using krv::ogc::cs::GeocodingInfo;

// An 8-bit ramp without a no-data value, 60 x 40 pixels of 10 map units.
std::string MakeFile(const TempFolder& oFolder)
{
    const std::string file = oFolder.GetPath() + "/ramp.tif";
    BasicWriter oWriter(file, {1}, "TIF", "");
    oWriter.CreateNewFile({60, 40, 1, krv::gobs::eDT_8U});
    oWriter.SetGeocodingInfo({1000, 10, 0, 5000, 0, -10});
    krv::gobs::Raster oRaster({60, 40, 1, krv::gobs::eDT_8U}, {0, 0});
    for (unsigned int n = 0; n < 60 * 40; ++n)
        oRaster.GetBuffer()[n] = static_cast<unsigned char>(n % 60 * 3 + n / 60);
    oWriter.WriteRaster(&oRaster);
    oWriter.Synchronize();
    return file;
}

GeocodingInfo PlaceOf(const std::string& file)
{
    return *std::unique_ptr<GeocodingInfo>(BasicReader(file).GetGeocodingInfo());
}

} // namespace

TEST(Warp, GridsAreThoseThatAreAskedFor)
{
    const TempFolder oFolder;
    const std::string file = MakeFile(oFolder), target = oFolder.GetPath() + "/out.tif";
    ASSERT_EQ(RunKrv({"warp", file, target, "--resolution", "20,10", "--resampling", "average"}).code, 0);
    const BasicReader oHalf(target);
    EXPECT_EQ(oHalf.GetWidth(), 30u);
    EXPECT_EQ(oHalf.GetHeight(), 40u);
    EXPECT_EQ(PlaceOf(target), GeocodingInfo(1000, 20, 0, 5000, 0, -10));
    const std::string pixels = ReadPixels(BasicReader(target));
    EXPECT_EQ(+static_cast<unsigned char>(pixels[31]), 8); // of 7 and 10: half to even
    // Pixels outside have no value that says so: a mask does.
    ASSERT_EQ(RunKrv({"warp", file, target, "--bounds", "900,4900,1100,5050", "--resampling", "nearest"}).code, 0);
    BasicReader oBounds(target);
    const RasterPtr oRaster(oBounds.ReadRaster(0, 0, 20, 15));
    const ValiditySource oValidity(oBounds.GetDataset());
    EXPECT_TRUE(oValidity.HasBitmap());
    const std::unique_ptr<krv::gobs::Mask> oMask(oValidity.BuildMask(*oRaster));
    for (unsigned int n = 0; n < 300; ++n)
    {
        const bool bInside = n % 20 >= 10 && n / 20 >= 5;
        ASSERT_EQ(oMask->GetBit(n % 20, n / 20), bInside);
        ASSERT_EQ(+oRaster->GetBuffer()[n], bInside ? (n % 20 - 10) * 3 + (n / 20 - 5) : 0);
    }
    // With a value for them no mask is needed; the grid of a file is taken whole.
    const std::string like = oFolder.GetPath() + "/like.tif";
    ASSERT_EQ(RunKrv({"warp", file, like, "--like", target, "--nodata", "255", "--resampling", "nearest"}).code, 0);
    EXPECT_EQ(PlaceOf(like), PlaceOf(target));
    BasicReader oLike(like);
    EXPECT_FALSE(ValiditySource(oLike.GetDataset()).HasBitmap());
    EXPECT_EQ(+static_cast<unsigned char>(ReadPixels(oLike)[0]), 255);
    // Its own grid gives its own pixels.
    ASSERT_EQ(RunKrv({"warp", file, target, "--like", file, "--resampling", "cubic"}).code, 0);
    EXPECT_EQ(ReadPixels(BasicReader(target)), ReadPixels(BasicReader(file)));
}

TEST(Warp, KeepsTheTypeOfEachChannelWithAnyNumberOfThreads)
{
    const TempFolder oFolder;
    const std::string file = oFolder.GetPath() + "/mixed.krv", half = oFolder.GetPath() + "/half.krv";
    const std::vector<krv::gobs::DataType> oTypes = {krv::gobs::eDT_8U, krv::gobs::eDT_32R, krv::gobs::eDT_8U};
    {
        MultiTypeWriter oWriter(file, {1, 2, 3}, "KRVDSK", "", MixedTypes{oTypes, {}});
        oWriter.CreateNewFile({700, 600, 3, krv::gobs::eDT_32R});
        oWriter.SetGeocodingInfo({1000, 10, 0, 5000, 0, -10});
        krv::gobs::Raster oRaster({700, 600, 3, krv::gobs::eDT_32R}, {0, 0});
        for (unsigned int n = 0; n < 700 * 600 * 3; ++n)
            reinterpret_cast<float*>(oRaster.GetBuffer())[n] = static_cast<float>(n * 7 % 251);
        oWriter.WriteRaster(&oRaster);
        oWriter.Synchronize();
    }
    // The outline is wider: of 8U a mask says so.
    const std::vector<std::string> oGrid = {"--bounds", "500,-1500,8500,5100", "--resolution",
                                            "12,11",    "--resampling",        "cubic"};
    const auto Run = [&](std::vector<std::string> oWords)
    {
        oWords.insert(oWords.end(), oGrid.begin(), oGrid.end());
        return RunKrv(oWords).code;
    };
    ASSERT_EQ(Run({"--threads", "3", "warp", file, half, "--format", "KRVDSK"}), 0);
    for (unsigned int nChannel = 1; nChannel <= 3; ++nChannel)
    {
        BasicReader oMixed(half, {nChannel});
        EXPECT_EQ(oMixed.GetDataType(), oTypes[nChannel - 1]);
        const std::string number = std::to_string(nChannel);
        std::vector<std::string> oFiles;
        for (const char* const pThreads : {"1", "2", "8"})
        {
            oFiles.push_back(oFolder.GetPath() + "/" + number + pThreads + ".tif");
            ASSERT_EQ(Run({"--threads", pThreads, "warp", file, oFiles.back(), "--channels", number, "--options",
                           "COMPRESS=DEFLATE BLOCKXSIZE=128 BLOCKYSIZE=128 TILED=YES"}),
                      0);
            EXPECT_EQ(krv::conformance::ReadFile(oFiles.back()), krv::conformance::ReadFile(oFiles.front()));
        }
        EXPECT_EQ(ReadPixels(oMixed), ReadPixels(BasicReader(oFiles.front())));
    }
    BasicReader oMixed(half, {1}), oOne(oFolder.GetPath() + "/11.tif", {1});
    const ValiditySource oMixedValidity(oMixed.GetDataset()), oOneValidity(oOne.GetDataset());
    const RasterPtr oA(oMixed.ReadRaster(0, 0, 660, 600)), oB(oOne.ReadRaster(0, 0, 660, 600));
    const std::unique_ptr<krv::gobs::Mask> oMixedMask(oMixedValidity.BuildMask(*oA)),
        oOneMask(oOneValidity.BuildMask(*oB));
    EXPECT_LT(oOneMask->CountSet(), 660u * 600u);
    EXPECT_EQ(oMixedMask->CountSet(), oOneMask->CountSet());
}

TEST(Warp, WindowsInMapCoordinatesAreThoseInPixels)
{
    const TempFolder oFolder;
    const std::string file = MakeFile(oFolder), first = oFolder.GetPath() + "/1.tif",
                      second = oFolder.GetPath() + "/2.tif";
    ASSERT_EQ(RunKrv({"convert", file, first, "--window", "3,5,10,8"}).code, 0);
    ASSERT_EQ(RunKrv({"convert", file, second, "--bounds", "1031,4875,1129.5,4945"}).code, 0);
    EXPECT_EQ(ReadPixels(BasicReader(first)), ReadPixels(BasicReader(second)));
    EXPECT_EQ(PlaceOf(first), PlaceOf(second));
    ASSERT_EQ(RunKrv({"convert", file, second, "--like", first}).code, 0);
    EXPECT_EQ(ReadPixels(BasicReader(first)), ReadPixels(BasicReader(second)));
    ASSERT_EQ(RunKrv({"overviews", file, "--levels", "2"}).code, 0);
    EXPECT_EQ(RunKrv({"overviews", file, "--levels", "2", "--bounds", "1031,4875,1129.5,4945"}).code, 0);
}

TEST(Warp, WhatMakesNoSenseIsRefused)
{
    const TempFolder oFolder;
    const std::string file = MakeFile(oFolder), target = oFolder.GetPath() + "/out.tif";
    ExpectRefusals("warp", {{{file, file}, 2, "itself"},
                            {{file, target, "--resolution", "0"}, 2, "resolution"},
                            {{file, target, "--resolution", "1e-12"}, 2, "too many pixels"},
                            {{file, target, "--size", "10"}, 2, "--size"},
                            {{file, target, "--size", "10,10", "--resolution", "3"}, 2, "both"},
                            {{file, target, "--bounds", "1,2,3"}, 2, "--bounds"},
                            {{file, target, "--bounds", "3,2,1,5"}, 2, "--bounds"},
                            {{file, target, "--like", file, "--size", "3,3"}, 2, "as it is"},
                            {{file, target, "--nodata", "x"}, 2, "--no-data"}});
    ExpectRefusals("convert", {{{file, target, "--bounds", "1,2,3,4"}, 2, "none of its pixels"}});
    EXPECT_FALSE(std::filesystem::exists(target));
}

// Both scenes of the real data that are placed by control points alone come out where the points say.
TEST(Warp, ControlPointsPlaceRealScenes)
{
    unsigned int nScenes = 0;
    for (const std::string name : {"/sar/slc.tif", "/sar/cog_gcps.tif"})
    {
        const std::string file = DataFolder() + name;
        if (!std::filesystem::exists(file))
            continue;
        ++nScenes;
        const TempFolder oFolder;
        const std::string target = oFolder.GetPath() + "/out.tif";
        const ProgramRun oRun = RunKrv({"warp", file, target, "--size", "300,200", "--resampling", "nearest"});
        ASSERT_EQ(oRun.code, 0) << oRun.errors;
        EXPECT_NE(oRun.output.find("control points"), std::string::npos) << oRun.output;
        BasicReader oSource(file), oResult(target);
        const GeocodingInfo oPlace = PlaceOf(target);
        const auto oPoints =
            krv::ogc::cs::ParseControlPoints(oSource.GetAuxiliaryData().GetFileMetadataValue("GroundControlPoints"));
        ASSERT_GE(oPoints.size(), 10u);
        const krv::ogc::cs::PolynomialFit oFit(oPoints, 3, krv::ogc::cs::PolynomialFit::eMapToRaster);
        EXPECT_LT(oFit.GetLargestResidual(), 5);
        const RasterPtr oPixels(oResult.ReadRaster(0, 0, 300, 200));
        const std::size_t nBytes = oPixels->GetBufferSize() / 60000;
        unsigned int nCompared = 0;
        for (unsigned int n = 0; n < 60000; n += 997)
        {
            double nX = 0, nY = 0, nColumn = 0, nRow = 0;
            oPlace.RasterToMap(n % 300 + 0.5, n / 300 + 0.5, nX, nY);
            oFit.Map(nX, nY, nColumn, nRow);
            if (nColumn < 0 || nRow < 0 || nColumn >= oSource.GetWidth() || nRow >= oSource.GetHeight())
                continue;
            ++nCompared;
            const RasterPtr oOne(
                oSource.ReadRaster(static_cast<unsigned int>(nColumn), static_cast<unsigned int>(nRow), 1, 1));
            EXPECT_EQ(std::string(reinterpret_cast<const char*>(oPixels->GetBuffer()) + n * nBytes, nBytes),
                      PixelsOf(*oOne));
        }
        EXPECT_GT(nCompared, 20u);
    }
    if (nScenes == 0)
        GTEST_SKIP() << "the scenes are not there";
}

} // namespace krv::test
