// krv edit and krv sample, and what krv info says of a file's place and layout.

#include "datasources/reader/basicreader.h"
#include "gobs/raster/raster.h"
#include "operations/sample/sampling.h"
#include "operations/source/sourcefile.h"
#include "tests/tools/programrun.h"
#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>
#include <tiffio.h>

#include <cmath>
#include <cstring>
#include <filesystem>

namespace krv::tool
{

namespace
{

using krv::conformance::ReadFile;
using krv::conformance::TempFolder;
using krv::conformance::WriteFile;
using krv::test::ExpectFailure;
using krv::test::RunKrv;
using nlohmann::json;
using operations::PointCoordinates;

json InfoOf(const std::string& file)
{
    const auto oRun = RunKrv({"info", file, "--json"});
    EXPECT_EQ(oRun.code, 0) << oRun.errors;
    return oRun.Json();
}

class EditCommand : public ::testing::Test
{
protected:
    EditCommand()
    {
        krv::test::RunProgram(KRV_SAMPLESCENE_PROGRAM, {moFolder.GetPath(), "--size", "600"});
        moScene = moFolder.File("rgb.tif");
    }

    std::string Copy(const std::string& name, const std::string& options = {})
    {
        const std::string copy = moFolder.File(name);
        std::vector<std::string> oArguments{"convert", moScene, copy};
        if (!options.empty())
            oArguments.insert(oArguments.end(), {"--options", options});
        const auto oRun = RunKrv(oArguments);
        EXPECT_EQ(oRun.code, 0) << oRun.errors;
        return copy;
    }

    TempFolder moFolder;
    std::string moScene;
};

TEST_F(EditCommand, EveryFormatThatIsUpdatedTakesAndLosesAllOfIt)
{
    for (const char* pName : {"a.tif", "a.krv", "a.img"})
    {
        SCOPED_TRACE(pName);
        const std::string file = Copy(pName);
        const json oBefore = InfoOf(file);
        const auto oSums = RunKrv({"checksum", file}).output;
        auto oRun = RunKrv({"edit", file, "--no-data", "7", "--crs", "EPSG:25833", "--bounds", "100,200,1300,800",
                            "--tag", "OWNER=somebody", "--description", "2=the second", "--display", "3,2,1"});
        ASSERT_EQ(oRun.code, 0) << oRun.errors;
        json oInfo = InfoOf(file);
        EXPECT_EQ(oInfo["channels"][0]["noData"], "7");
        EXPECT_EQ(oInfo["crs"]["epsg"], 25833);
        EXPECT_EQ(oInfo["geocoding"], json::parse("[100.0, 2.0, 0.0, 800.0, 0.0, -1.0]"));
        EXPECT_EQ(oInfo["bounds"], json::parse("[100.0, 200.0, 1300.0, 800.0]"));
        EXPECT_EQ(oInfo["pixelSize"]["unit"], "metre");
        EXPECT_EQ(oInfo["metadata"]["OWNER"], "somebody");
        EXPECT_EQ(oInfo["channels"][1]["description"], "the second");
        EXPECT_EQ(oInfo["displayDefaults"]["red"], 3);
        const std::string bytes = ReadFile(file);
        EXPECT_NE(RunKrv({"edit", file, "--no-data", "7", "--crs", "25833"}).output.find("nothing changed"),
                  std::string::npos);
        EXPECT_EQ(ReadFile(file), bytes);
        oRun = RunKrv({"edit", file, "--no-data", "none", "--crs", "none", "--geocoding", "none", "--remove-tag",
                       "OWNER", "--display", "none"});
        ASSERT_EQ(oRun.code, 0) << oRun.errors;
        oInfo = InfoOf(file);
        for (const char* pGone : {"crs", "geocoding", "bounds", "boundsLonLat", "placedBy"})
            EXPECT_EQ(oInfo[pGone], nullptr) << pGone;
        EXPECT_EQ(oInfo["channels"][0]["noData"], nullptr);
        EXPECT_EQ(oInfo["displayDefaults"]["red"], nullptr);
        ASSERT_EQ(RunKrv({"edit", file, "--like", moScene, "--copy", "crs,geocoding"}).code, 0);
        oInfo = InfoOf(file);
        EXPECT_EQ(oInfo["geocoding"], oBefore["geocoding"]);
        EXPECT_EQ(oInfo["crs"]["epsg"], oBefore["crs"]["epsg"]);
        EXPECT_EQ(oInfo["channels"][0]["noData"], nullptr) << "was not asked for";
        EXPECT_EQ(RunKrv({"checksum", file}).output, oSums);
    }
}

// What is removed is gone for whoever opens the file next, wherever it stood.
TEST_F(EditCommand, WhatLiesBesideIsRemovedToo)
{
    ASSERT_EQ(RunKrv({"convert", moScene, moFolder.File("bare.png")}).code, 0);
    std::filesystem::remove(moFolder.File("bare.png.aux.xml"));
    for (const char* pName : {"a.tif", "a.krv", "a.img", "a.jp2"})
    {
        SCOPED_TRACE(pName);
        const std::string file = moFolder.File(pName);
        ASSERT_EQ(RunKrv({"convert", moFolder.File("bare.png"), file}).code, 0);
        std::filesystem::remove(file + ".aux.xml");
        WriteFile(file + ".aux.xml",
                  "<PAMDataset><SRS>EPSG:32633</SRS><GeoTransform>100,2,0,800,0,-2</GeoTransform>"
                  "<Metadata><MDI key=\"OWNER\"> somebody</MDI><MDI key=\"KEPT\"> leading</MDI></Metadata>"
                  "<PAMRasterBand band=\"1\"><Description>first</Description><NoDataValue>7</NoDataValue>"
                  "</PAMRasterBand></PAMDataset>");
        json oInfo = InfoOf(file);
        ASSERT_EQ(oInfo["crs"]["epsg"], 32633);
        ASSERT_EQ(oInfo["geocoding"][0], 100.0);
        ASSERT_EQ(oInfo["channels"][0]["noData"], "7");
        ASSERT_EQ(oInfo["channels"][0]["description"], "first");
        const auto oRun = RunKrv({"edit", file, "--no-data", "none", "--crs", "none", "--geocoding", "none",
                                  "--remove-tag", "OWNER", "--description", "1=none"});
        ASSERT_EQ(oRun.code, 0) << oRun.errors;
        EXPECT_EQ(oRun.errors, "");
        oInfo = InfoOf(file);
        for (const char* pGone : {"crs", "geocoding"})
            EXPECT_EQ(oInfo[pGone], nullptr) << pGone;
        EXPECT_EQ(oInfo["channels"][0]["noData"], nullptr);
        EXPECT_EQ(oInfo["channels"][0]["description"], nullptr);
        EXPECT_FALSE(oInfo["metadata"].contains("OWNER")) << oInfo["metadata"];
        EXPECT_EQ(oInfo["metadata"]["KEPT"], " leading");
    }
    // A world file stays, and is told.
    WriteFile(moFolder.File("a.tfw"), "2\n0\n0\n-2\n101\n799\n");
    const auto oRun = RunKrv({"edit", moFolder.File("a.tif"), "--geocoding", "none"});
    EXPECT_EQ(oRun.code, 0);
    EXPECT_NE(oRun.errors.find("the geocoding stays"), std::string::npos) << oRun.errors;
    EXPECT_NE(oRun.output.find("nothing changed"), std::string::npos) << oRun.output;
}

TEST_F(EditCommand, WhatMakesNoSenseChangesNothing)
{
    const std::string file = Copy("a.tif"), bytes = ReadFile(file);
    ASSERT_EQ(RunKrv({"convert", moScene, moFolder.File("small.tif"), "--window", "0,0,10,10"}).code, 0);
    krv::test::ExpectRefusals("edit", {{{file}, 2, "say what is to change"},
                                       {{file, "--no-data", "seven"}, 2, "seven"},
                                       {{file, "--tag", "A=1", "--crs", "EPSG:1"}, 2, "EPSG:1"},
                                       {{file, "--tag", "A=1", "--description", "9=x"}, 2, "no channel 9"},
                                       {{file, "--tag", "A=1", "--colour", "1=pink"}, 2, "pink"},
                                       {{file, "--tag", "A=1", "--bounds", "3,2,1,4"}, 2, "west,south,east,north"},
                                       {{file, "--geocoding", "1,0,0,1,0,0"}, 2, "one line"},
                                       {{file, "--like", moFolder.File("small.tif")}, 2, "10 x 10"},
                                       {{file, "--like", moScene, "--copy", "shoes"}, 2, "shoes"},
                                       {{moFolder.File("none.tif"), "--tag", "A=1"}, 1, "no such file"}});
    EXPECT_EQ(ReadFile(file), bytes);
}

// The same pixel by all coordinates that lead to it.
TEST_F(EditCommand, PointsMeanTheSamePixelInEverySystem)
{
    const operations::SourceFile oFile(moScene);
    krv::datasources::BasicReader oReader(moScene, {1, 2, 3});
    const auto oPlace = operations::ImagePlace::Find(oFile);
    ASSERT_TRUE(oPlace);
    for (const auto& [nColumn, nRow] : {std::pair(0U, 0U), {599U, 599U}, {255U, 256U}, {300U, 17U}})
    {
        const std::unique_ptr<gobs::Raster> poPixel(oReader.ReadRaster(nColumn, nRow, 1, 1));
        operations::SamplePoint oPixel{nColumn + 0.5, nRow + 0.5}, oMap = oPixel;
        ASSERT_TRUE(oPlace->ToMap(oPixel.x, oPixel.y, oMap.x, oMap.y));
        const json oAll = RunKrv({"sample", moScene, "--json", "--coordinates", "map", std::to_string(oMap.x),
                                  std::to_string(oMap.y)})
                              .Json();
        EXPECT_EQ(oAll["points"][0]["column"], nColumn + 0.5);
        for (const auto& oRequest : {operations::SampleRequest{{oPixel}, PointCoordinates::ePixels, {}, {}},
                                     operations::SampleRequest{{oMap}, PointCoordinates::eAsPlaced, {}, {}},
                                     operations::SampleRequest{{oMap}, PointCoordinates::eNamedMap, "EPSG:32719", {}}})
        {
            const auto oResult = SampleValues(oFile, oRequest);
            for (unsigned int c = 0; c < 3; ++c)
            {
                const auto& oValue = oResult.points[0].values[c];
                EXPECT_EQ(oValue.real.GetUnsigned(), poPixel->GetBuffer()[c]);
                EXPECT_EQ(oValue.state == operations::SampleState::eNoData, poPixel->GetBuffer()[c] == 0);
            }
        }
    }
    // The corners of the extent in degrees are those of the image.
    const json oInfo = InfoOf(moScene);
    const json& oBounds = oInfo["boundsLonLat"];
    const auto oCorner = SampleValues(
        oFile, {{{oBounds[0], oBounds[3]}, {oBounds[2], oBounds[1]}, {0, 0}}, PointCoordinates::eGeographic, {}, {1}});
    EXPECT_NEAR(oCorner.points[0].column, 0, 30);
    EXPECT_NEAR(oCorner.points[0].row, 0, 30);
    EXPECT_NEAR(oCorner.points[1].column, 600, 30);
    EXPECT_EQ(oCorner.points[2].values[0].state, operations::SampleState::eOutside);
    const std::string csv =
        RunKrv({"sample", moScene, "--coordinates", "pixel", "-5", "5", "--no-data", "0", "--channels", "1-2"}).output;
    EXPECT_EQ(csv, "x,y,column,row,channel1,channel2\n-5,5,-5.000,5.000,,\n");
    ExpectFailure(RunKrv({"sample", moScene, "1", "2", "3"}), 2, {"3 numbers"});
}

TEST_F(EditCommand, InfoTellsTheFilesOwnBlocks)
{
    const json oStrips = InfoOf(Copy("strips.tif", "TILED=NO BLOCKYSIZE=3 COMPRESS=DEFLATE BIGTIFF=YES"));
    EXPECT_EQ(oStrips["blockWidth"], 600);
    EXPECT_EQ(oStrips["blockHeight"], 3);
    EXPECT_EQ(oStrips["storage"]["layout"], "strips");
    EXPECT_EQ(oStrips["storage"]["compression"], "DEFLATE");
    EXPECT_EQ(oStrips["storage"]["variant"], "BigTIFF");
    EXPECT_GT(oStrips["preferredTile"]["height"], 3);
    EXPECT_EQ(oStrips["cloudLayout"]["valid"], false);
    EXPECT_EQ(RunKrv({"doctor", "--cog", moFolder.File("strips.tif")}).code, 1);
}

// What the text behind the header promises holds for every block, and libtiff reads the file as any other; a change
// withdraws the promise.
TEST_F(EditCommand, ClientsOfCloudFilesFindWhatTheyArePromised)
{
    for (const char* pOptions : {"LAYOUT=COG COMPRESS=DEFLATE BLOCKXSIZE=128 BLOCKYSIZE=128", "LAYOUT=COG BIGTIFF=YES"})
    {
        SCOPED_TRACE(pOptions);
        const std::string file = Copy("cog.tif", pOptions);
        EXPECT_EQ(InfoOf(file)["cloudLayout"], json::parse(R"({"valid": true, "reasons": []})"));
        EXPECT_TRUE(InfoOf(file)["channels"][0]["metadata"].contains("STATISTICS_MAXIMUM"));
        const auto oSums = RunKrv({"checksum", file}).output;
        EXPECT_EQ(oSums, RunKrv({"checksum", moScene}).output);
        const std::string bytes = ReadFile(file);
        const std::size_t nText = bytes[2] == 43 ? 16 : 8;
        EXPECT_EQ(bytes.compare(nText, 43, "GDAL_STRUCTURAL_METADATA_SIZE=000140 bytes\n"), 0);
        EXPECT_EQ(bytes.substr(nText + 43 + 140 - 32, 32), "\nKNOWN_INCOMPATIBLE_EDITION=NO\n ");
        EXPECT_LT(InfoOf(file)["unusedBytes"], 64) << "of leaders and trailers";
        TIFF* const pTiff = TIFFOpen(file.c_str(), "r");
        ASSERT_NE(pTiff, nullptr);
        std::size_t nBlocks = 0;
        do
        {
            for (std::uint32_t nTile = 0; nTile < TIFFNumberOfTiles(pTiff); ++nTile, ++nBlocks)
            {
                const std::uint64_t nAt = TIFFGetStrileOffset(pTiff, nTile),
                                    nSize = TIFFGetStrileByteCount(pTiff, nTile);
                std::uint32_t nLeader = 0;
                std::memcpy(&nLeader, bytes.data() + nAt - 4, 4);
                ASSERT_EQ(nLeader, nSize);
                ASSERT_EQ(bytes.substr(nAt + nSize - 4, 4), bytes.substr(nAt + nSize, 4));
            }
        } while (TIFFReadDirectory(pTiff) == 1);
        TIFFClose(pTiff);
        EXPECT_GT(nBlocks, 9U);
        ASSERT_EQ(RunKrv({"edit", file, "--tag", "A=1"}).code, 0);
        EXPECT_EQ(ReadFile(file).substr(nText + 43 + 140 - 31, 31), "KNOWN_INCOMPATIBLE_EDITION=YES\n");
        EXPECT_EQ(InfoOf(file)["cloudLayout"]["valid"], false);
        EXPECT_EQ(RunKrv({"checksum", file}).output, oSums);
        std::filesystem::remove(file);
    }
}

// A client takes the mask of a block from what stands right behind it.
TEST_F(EditCommand, MasksOfCloudFilesStandBehindTheirBlocks)
{
    const std::string masked = Copy("masked.tif", "COMPRESS=DEFLATE"), file = moFolder.File("cog.tif");
    ASSERT_EQ(RunKrv({"mask", masked, "--polygon", "POLYGON((0 0,600 0,600 600,100 600,0 0))", "--coordinates", "pixel",
                      "--validity"})
                  .code,
              0);
    ASSERT_EQ(
        RunKrv({"convert", masked, file, "--options", "LAYOUT=COG COMPRESS=DEFLATE BLOCKXSIZE=512 BLOCKYSIZE=512"})
            .errors,
        "");
    EXPECT_NE(ReadFile(file).find("\n MASK_INTERLEAVED_WITH_IMAGERY=YES\n"), std::string::npos);
    EXPECT_EQ(InfoOf(file)["cloudLayout"]["valid"], true);
    EXPECT_EQ(RunKrv({"stats", file}).output, RunKrv({"stats", masked}).output);
    TIFF* const pTiff = TIFFOpen(file.c_str(), "r");
    ASSERT_NE(pTiff, nullptr);
    std::vector<std::uint64_t> oEnds;
    do
    {
        std::uint32_t nKind = 0;
        TIFFGetField(pTiff, TIFFTAG_SUBFILETYPE, &nKind);
        const bool bMask = (nKind & FILETYPE_MASK) != 0;
        for (std::uint32_t nTile = 0; nTile < TIFFNumberOfTiles(pTiff); ++nTile)
        {
            const std::uint64_t nAt = TIFFGetStrileOffset(pTiff, nTile);
            if (bMask)
                EXPECT_EQ(nAt, oEnds[nTile] + 8) << "a trailer and a leader apart";
            else
                oEnds.resize(nTile + 1), oEnds[nTile] = nAt + TIFFGetStrileByteCount(pTiff, nTile);
        }
    } while (TIFFReadDirectory(pTiff) == 1);
    TIFFClose(pTiff);
    EXPECT_FALSE(oEnds.empty());
    EXPECT_EQ(RunKrv({"edit", file, "--tag", "A=1"}).code, 0);
    EXPECT_EQ(RunKrv({"stats", file}).output, RunKrv({"stats", masked}).output);
}

} // namespace

} // namespace krv::tool
