// krv mask on copies of real files and on files made here.

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/reader/basicreader.h"
#include "gobs/raster/rasterinfo.h"
#include "tests/support/demofile.h"
#include "tests/support/facts.h"
#include "tests/support/pixels.h"
#include "tests/tools/programrun.h"
#include "toolkit/ogc/cs/coordinatetransformation.h"
#include "toolkit/ogc/cs/crsfactory.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <filesystem>
#include <memory>

namespace krv::tool
{

namespace
{

using krv::conformance::TempFolder;
using krv::datasources::BasicReader;
using krv::datasources::IDataset;
using krv::test::ProgramRun;
using krv::test::RunKrv;
using nlohmann::json;

constexpr unsigned int WIDTH = 791;
constexpr unsigned int HEIGHT = 718;

// A copy of a georeferenced image of 791 x 718 pixels, 3 x 8U, no-data 0.
class MaskCommand : public testing::Test
{
protected:
    void SetUp() override
    {
        const std::string source = krv::test::DataFolder() + "/optical/rgb_deflate.tif";
        if (!std::filesystem::exists(source))
            GTEST_SKIP() << "no " << source;
        krv::conformance::WriteFile(moFile, krv::conformance::ReadFile(source));
    }

    std::unique_ptr<IDataset> Open() const
    {
        return std::unique_ptr<IDataset>(krv::datasources::DatasetManager::GetInstance()->Open(moFile, eReadOnly));
    }

    // All bytes of a bitmap or, for 0, of the three channels.
    std::string Pixels(unsigned int nBitmap) const
    {
        const auto poDataset = Open();
        const auto poReader =
            nBitmap == 0
                ? std::make_unique<BasicReader>(poDataset.get(), std::vector<unsigned int>{}, false)
                : std::make_unique<BasicReader>(dynamic_cast<krv::datasources::IBitmapDataset*>(poDataset.get()),
                                                std::vector<unsigned int>{nBitmap}, false);
        return krv::test::ReadPixels(*poReader);
    }

    // A run that writes a new bitmap; returns the bitmap's pixels.
    std::string Written(const std::vector<std::string>& oArguments)
    {
        std::vector<std::string> oAll{"mask", moFile, "--write", "new", "--json"};
        oAll.insert(oAll.end(), oArguments.begin(), oArguments.end());
        const ProgramRun oRun = RunKrv(oAll);
        EXPECT_EQ(oRun.code, 0) << oRun.errors;
        if (oRun.code != 0)
            return {};
        moReport = oRun.Json();
        return Pixels(moReport["bitmap"]);
    }

    TempFolder moFolder;
    std::string moFile = moFolder.File("scene.tif");
    json moReport;
};

TEST_F(MaskCommand, PolygonsMeanTheSamePixelsInEveryReferenceSystem)
{
    const auto poDataset = Open();
    const auto& oGeocoding = dynamic_cast<krv::datasources::IGeocodedDataset&>(*poDataset).GetGeocoding();
    const std::unique_ptr<krv::ogc::cs::ICRS> poSystem(poDataset->ReadCRS());
    const krv::ogc::cs::CoordinateTransformation oToDegrees(*poSystem, *krv::ogc::cs::CreateCRSFromEPSG(4326));
    const krv::ogc::cs::CoordinateTransformation oToMercator(*poSystem, *krv::ogc::cs::CreateCRSFromEPSG(3857));
    const double aRings[2][4][2] = {{{-30.3, 40.7}, {700.2, 3.1}, {640.9, 600.4}, {100.6, 801.9}},
                                    {{200.3, 200.8}, {300.2, 210.3}, {280.1, 330.7}, {205.4, 340.2}}};
    std::string pixels = "Polygon ((", mercator = "SRID=3857;MULTIPOLYGON Z(((";
    std::string map = "  polygon\n zm ((";
    json oGeoJson = json::array();
    for (const auto& aRing : aRings)
    {
        json oRing = json::array();
        // Many vertices, since an edge is straight in one of the systems only.
        constexpr int PIECES = 64;
        for (int i = 0; i <= 4 * PIECES; ++i)
        {
            const double *const pFrom = aRing[i / PIECES % 4], *const pTo = aRing[(i / PIECES + 1) % 4];
            const double pVertex[] = {std::lerp(pFrom[0], pTo[0], i % PIECES / double{PIECES}),
                                      std::lerp(pFrom[1], pTo[1], i % PIECES / double{PIECES})};
            const char* const pEnd = i < 4 * PIECES ? ", " : &aRing == &aRings[0] ? "), (" : ")";
            double nX = 0, nY = 0;
            oGeocoding.RasterToMap(pVertex[0], pVertex[1], nX, nY);
            double nDegreesX = nX, nDegreesY = nY, nMercatorX = nX, nMercatorY = nY;
            ASSERT_TRUE(oToDegrees.Transform(nDegreesX, nDegreesY) && oToMercator.Transform(nMercatorX, nMercatorY));
            pixels += json(pVertex[0]).dump() + " " + json(pVertex[1]).dump() + pEnd;
            map += json(nX).dump() + "\t" + json(nY).dump() + " 12 -7e1" + pEnd;
            mercator += json(nMercatorX).dump() + " " + json(nMercatorY).dump() + " 0" + pEnd;
            oRing.push_back({nDegreesX, nDegreesY});
        }
        oGeoJson.push_back(oRing);
    }
    const json oFeatures{{"type", "FeatureCollection"},
                         {"features",
                          {{{"type", "Feature"}, {"geometry", nullptr}},
                           {{"type", "Feature"},
                            {"geometry",
                             {{"type", "GeometryCollection"},
                              {"geometries",
                               {{{"type", "Point"}, {"coordinates", {1, 2}}},
                                {{"type", "MultiPolygon"}, {"coordinates", {oGeoJson}}}}}}}}}}};
    krv::conformance::WriteFile(moFolder.File("zones.geojson"), oFeatures.dump());
    const std::string expected = Written({"--polygon", pixels + ")", "--coordinates", "pixel"});
    EXPECT_GT(moReport["set"], 200000);
    EXPECT_EQ(moReport["set"], std::count(expected.begin(), expected.end(), '\1'));
    EXPECT_EQ(moReport["complement"], false);
    EXPECT_EQ(expected[300 * WIDTH + 150], '\1');
    EXPECT_EQ(expected[270 * WIDTH + 250], '\0') << "the hole";
    EXPECT_TRUE(Written({"--polygon", map + ")"}) == expected);
    EXPECT_TRUE(Written({"--polygon", mercator + "))"}) == expected);
    EXPECT_TRUE(Written({"--polygon", moFolder.File("zones.geojson")}) == expected);
    EXPECT_TRUE(Written({"--polygon", oFeatures.dump(), "--crs", "EPSG:4326"}) == expected);
    EXPECT_TRUE(Written({"--bitmap", "2,1"}) == expected);
    // In two parts that overlap.
    Written({"--polygon", "POLYGON((0 0,20 0,20 10,0 10))", "--polygon",
             R"({"type":"Polygon","coordinates":[[[10,0],[30,0],[30,10],[10,10]]]})", "--coordinates", "pixel"});
    EXPECT_EQ(moReport["set"], 300);
}

TEST_F(MaskCommand, LongEdgesBendBetweenReferenceSystems)
{
    const auto Set = [this](const std::string& polygon)
    {
        return RunKrv({"mask", moFile, "--crs", "EPSG:4326", "--polygon", polygon, "--json"}).Json()["set"].get<int>();
    };
    std::string fine = "POLYGON((";
    for (int i = 0; i <= 3000; ++i)
        fine += std::to_string(-90 + i * 0.01) + " 25,";
    const int nHalf = Set("POLYGON((-90 25,-60 25,-60 40,-90 40,-90 25))");
    EXPECT_GT(nHalf, 100000);
    EXPECT_NEAR(nHalf, Set(fine + "-60 40,-90 40,-90 25))"), 100);
    // The same a turn further, and the whole world.
    EXPECT_EQ(Set("POLYGON((270 25,300 25,300 40,270 40,270 25))"), nHalf);
    EXPECT_EQ(Set("POLYGON((-180 -80,180 -80,180 84,-180 84,-180 -80))"), int{WIDTH * HEIGHT});
    EXPECT_EQ(Set("POLYGON((0 -80,90 -80,90 84,0 84))"), 0);
    // A file whose surroundings are the whole turn.
    constexpr double STEP = 20037508.34 / 20;
    const std::unique_ptr<IDataset> oWorld(
        krv::datasources::DatasetManager::GetInstance()->NewDataset(moFolder.File("world.tif"), "TIF", ""));
    dynamic_cast<krv::datasources::IRasterDataset&>(*oWorld).Create({40, 40, 1, krv::gobs::eDT_8U});
    dynamic_cast<krv::datasources::IGeocodedDataset&>(*oWorld).SetGeocoding({-20 * STEP, STEP, 0, 20 * STEP, 0, -STEP});
    oWorld->UpdateCRS(*krv::ogc::cs::CreateCRSFromEPSG(3857));
    oWorld->Close();
    moFile = moFolder.File("world.tif");
    EXPECT_EQ(Set("POLYGON((-90 -80,90 -80,90 80,-90 80))"), 20 * 32);
}

TEST_F(MaskCommand, NoDataIsStoredAsItsComplement)
{
    const std::string pixels = Pixels(0);
    std::string any, all;
    for (std::size_t i = 0; i < pixels.size(); i += 3)
    {
        const auto nZeros = std::count(pixels.begin() + static_cast<std::ptrdiff_t>(i),
                                       pixels.begin() + static_cast<std::ptrdiff_t>(i) + 3, '\0');
        any += nZeros == 0 ? '\1' : '\0';
        all += nZeros != 3 ? '\1' : '\0';
    }
    ASSERT_NE(any, all);
    EXPECT_TRUE(Written({"--no-data"}) == any);
    EXPECT_EQ(moReport["complement"], true);
    EXPECT_EQ(moReport["validity"], true);
    const std::int64_t nNone = std::count(any.begin(), any.end(), '\0');
    EXPECT_EQ(moReport["set"], nNone);
    krv::test::ExpectRefusals("mask", {{{moFile, "--no-data", "--write", "new"}, 2, "bitmap 1 is the validity mask"}});
    for (char& cBit : all)
        cBit ^= 1;
    EXPECT_TRUE(Written({"--no-data", "--rule", "all", "--zone"}) == all) << "a zone is no complement";
    EXPECT_EQ(moReport["validity"], false);
    const ProgramRun oRun = RunKrv({"mask", moFile, "--no-data", "--write", "1"});
    EXPECT_NE(oRun.output.find("complement"), std::string::npos) << oRun.output;

    // It is honoured: a pixel that is zero in one channel takes part in none.
    const json oFirst = RunKrv({"stats", moFile, "--json"}).Json()["channels"][0];
    EXPECT_EQ(oFirst["valid"], WIDTH * HEIGHT - nNone);
    EXPECT_EQ(oFirst["noDataCount"].get<std::int64_t>() + oFirst["masked"].get<std::int64_t>(), nNone);
    EXPECT_GT(oFirst["masked"], 0);
    const json oRaw = RunKrv({"stats", moFile, "--json", "--raw"}).Json()["channels"][0];
    EXPECT_EQ(oRaw["valid"], WIDTH * HEIGHT - oFirst["noDataCount"].get<std::int64_t>());
    EXPECT_EQ(oRaw["masked"], 0);

    // Another bitmap takes its place.
    EXPECT_EQ(RunKrv({"mask", moFile, "--bitmap", "1", "--write", "1", "--zone"}).code, 0);
    EXPECT_EQ(RunKrv({"mask", moFile, "--bitmap", "2", "--write", "2", "--validity"}).code, 0);
    const json oBitmaps = RunKrv({"info", moFile, "--json"}).Json()["bitmaps"];
    EXPECT_EQ(oBitmaps[0]["description"], "Bitmap 1");
    EXPECT_EQ(oBitmaps[1]["validity"], true);
    EXPECT_EQ(RunKrv({"stats", moFile, "--json"}).Json()["channels"][0]["valid"], 0) << "no-data alone is set there";
}

TEST_F(MaskCommand, FailuresSayWhyOnOneLineAndChangeNothing)
{
    const std::string demo = moFolder.File("plain.demo"), picture = moFolder.GetPath() + "/none/mask.png";
    krv::test::WriteDemoFile(demo, 8, 8, {krv::gobs::eDT_8U});
    const std::string before = krv::conformance::ReadFile(moFile);
    const std::string square = "POLYGON((0 0,5 0,5 5,0 5))";
    const std::vector<krv::test::Refusal> oRefusals{
        {{moFile}, 2, "--polygon, --bitmap or --no-data"},
        {{moFile, "--bitmap", "1", "--no-data"}, 2, "one of them"},
        {{moFile, "--bitmap", "7", "--write", "new"}, 2, "there is no bitmap 7; the file has none"},
        {{moFile, "--no-data", "--write", "4"}, 2, "there is no bitmap 4"},
        {{moFile, "--no-data", "--write", "-1"}, 2, "--write"},
        {{moFile, "--no-data", "--zone"}, 2, "--zone goes with --write"},
        {{moFile, "--no-data", "--write", "new", "--zone", "--validity"}, 2, "--zone"},
        {{moFile, "--no-data", "--channels", "4"}, 2, "channel 4"},
        {{moFile, "--no-data", "--coordinates", "pixel"}, 2, "--polygon"},
        {{moFile, "--polygon", square, "--crs", "EPSG:4326", "--coordinates", "pixel"}, 2, "--crs"},
        {{moFile, "--polygon", square, "--crs", "nonsense", "--write", "new"}, 2, "nonsense"},
        {{moFile, "--polygon", "POLYGON((0 0,5 0"}, 2, "character 17"},
        {{moFile, "--polygon", "POLYGON((0 0,nan 0,4 4))"}, 2, "a number is expected"},
        {{moFile, "--polygon", "POLYGON((0 0,1e400 0,4 4))"}, 2, "a number is expected"},
        {{moFile, "--polygon", "POLYGON EMPTY"}, 2, "no polygon"},
        {{moFile, "--polygon", "zones(1).json"}, 2, "no such file"},
        {{moFile, "--polygon", "POINT(1 2)"}, 2, "expected at character 1 "},
        {{moFile, "--polygon", "null"}, 2, "expected at character 1 "},
        {{moFile, "--polygon", "SRID=4326;" + square, "--coordinates", "pixel"}, 2, "EPSG:4326"},
        {{moFile, "--polygon", "SRID=4326;" + square, "--coordinates", "map"}, 2, "EPSG:4326"},
        {{moFile, "--polygon", square, "--crs", ""}, 2, "no known reference system"},
        {{moFile, "--polygon", moFolder.GetPath()}, 2, "folder"},
        {{moFile, "--polygon", moFile}, 2, "scene.tif"},
        {{moFile, "--polygon", R"({"type":"Polygon","coordinates":[[[1],[2,3]]]})"}, 2, "[x, y]"},
        {{moFile, "--polygon", R"({"type":"Polygon"})"}, 2, "coordinates"},
        {{moFile, "--polygon", R"({"type":"Polygon",)"}, 2, "not valid: parse error"},
        {{moFile, "--polygon", R"({"type":"Polygon","coordinates":[[[0,1e999],[1,2]]]})"}, 2, "GeoJSON"},
        {{moFile, "--polygon", R"({"type":"Polygon","coordinates":[[[0,95],[1,2],[3,4]]]})"}, 1, "0 95"},
        {{demo, "--polygon", square}, 2, "not georeferenced"},
        {{demo, "--polygon", square, "--coordinates", "pixel", "--write", "new"}, 1, "plain.demo"},
        {{demo, "--no-data"}, 1, "no no-data value"},
        {{moFile, "--no-data", "--png", moFile}, 2, "the file itself"},
        {{moFile, "--no-data", "--write", "new", "--png", picture}, 1, "mask.png"}};
    krv::test::ExpectRefusals("mask", oRefusals);
    EXPECT_TRUE(krv::conformance::ReadFile(moFile) == before);
}

} // namespace

} // namespace krv::tool
