// Compares what the command says of plain files with headers, and what the library reads of them, with a table of facts
// about real ones, when the folder with both is there.

#include "datasources/reader/basicreader.h"
#include "gobs/raster/raster.h"
#include "tests/support/facts.h"
#include "tests/tools/programrun.h"

#include <gtest/gtest.h>
#include <zlib.h>

#include <cmath>
#include <map>
#include <set>
#include <sstream>

namespace krv::tool
{

namespace
{

using krv::datasources::BasicReader;
using krv::test::Facts;
using krv::test::RunKrv;
using krv::test::Split;
using nlohmann::json;

std::string ExpectedType(const std::string& type)
{
    static const std::map<std::string, std::string> TYPES{{"uint8", "8U"},      {"int16", "16S"},    {"uint16", "16U"},
                                                          {"int32", "32S"},     {"uint32", "32U"},   {"int64", "64S"},
                                                          {"uint64", "64U"},    {"float32", "32R"},  {"float64", "64R"},
                                                          {"cfloat32", "C32R"}, {"cfloat64", "C64R"}};
    return TYPES.at(type);
}

std::string Hex(unsigned long nCrc)
{
    std::array<char, 9> aText{};
    std::snprintf(aText.data(), aText.size(), "%08lx", nCrc);
    return aText.data();
}

// The channels that the table lists.
std::vector<unsigned int> ListedChannels(const Facts& oFacts)
{
    std::vector<unsigned int> oChannels;
    if (oFacts["listed_bands"] != "all")
        for (const std::string& number : oFacts.List("listed_bands", ','))
            oChannels.push_back(static_cast<unsigned int>(std::stoul(number)));
    for (unsigned int n = 1; oFacts["listed_bands"] == "all" && n <= std::stoul(oFacts["bands"]); ++n)
        oChannels.push_back(n);
    return oChannels;
}

unsigned long AddChannel(unsigned long nCrc, const krv::gobs::Raster& oRaster)
{
    return crc32_z(nCrc, oRaster.GetBuffer(),
                   oRaster.GetFullWidth() * oRaster.GetFullHeight() * oRaster.GetDataType().GetValueBits() / 8);
}

// Channel by channel, all of the image and the window; then several at once, as the channels of pixels.
void ComparePixels(const Facts& oFacts, const std::string& file)
{
    std::istringstream oWindow(oFacts["window"]);
    unsigned int nX = 0, nY = 0, nWidth = 0, nHeight = 0;
    oWindow >> nX >> nY >> nWidth >> nHeight;
    const auto oListed = ListedChannels(oFacts);
    const auto oSums = oFacts.List("band_crc32"), oWindowSums = oFacts.List("window_crc32");
    ASSERT_EQ(oListed.size(), oSums.size());
    for (std::size_t n = 0; n < oListed.size(); ++n)
    {
        BasicReader oReader(file, {oListed[n]});
        const std::unique_ptr<krv::gobs::Raster> poAll(
            oReader.ReadRaster(0, 0, oReader.GetWidth(), oReader.GetHeight())),
            poPart(oReader.ReadRaster(nX, nY, nWidth, nHeight));
        EXPECT_EQ(Hex(AddChannel(0, *poAll)), oSums[n]) << "channel " << oListed[n];
        EXPECT_EQ(Hex(AddChannel(0, *poPart)), oWindowSums[n]) << "channel " << oListed[n];
    }
    unsigned long nCube = 0;
    for (unsigned int nChannel = 1; nChannel <= std::stoul(oFacts["bands"]); ++nChannel)
    {
        BasicReader oReader(file, {nChannel});
        const std::unique_ptr<krv::gobs::Raster> poAll(
            oReader.ReadRaster(0, 0, oReader.GetWidth(), oReader.GetHeight()));
        nCube = AddChannel(nCube, *poAll);
    }
    EXPECT_EQ(Hex(nCube), oFacts["cube_crc32"]);
}

void CompareChecksums(const Facts& oFacts, const std::string& file)
{
    const auto oRun = RunKrv({"checksum", file, "--json"});
    ASSERT_EQ(oRun.code, 0) << oRun.errors;
    const json oFound = oRun.Json();
    const auto oListed = ListedChannels(oFacts);
    ASSERT_EQ(std::to_string(oFound["channels"].size()), oFacts["bands"]);
    for (std::size_t n = 0; n < oListed.size(); ++n)
        EXPECT_EQ(oFound["channels"][oListed[n] - 1]["crc32"], oFacts.List("band_crc32")[n]);
}

void CompareGeography(const Facts& oFacts, const json& oInfo)
{
    const std::string& crs = oFacts["crs"];
    ASSERT_EQ(oInfo["crs"].is_null(), crs == "-") << oInfo["crs"];
    EXPECT_EQ(crs == "-" ? crs : "EPSG:" + oInfo["crs"]["epsg"].dump(), crs);
    const auto oTerms = oFacts.Numbers("geotransform");
    ASSERT_EQ(oInfo["geocoding"].is_null(), oTerms.empty()) << oInfo["geocoding"];
    for (std::size_t i = 0; i < oTerms.size(); ++i)
        EXPECT_NEAR(oInfo["geocoding"][i].get<double>(), oTerms[i], 1e-13 * std::fabs(oTerms[i]) + 1e-15)
            << "term " << i;
}

// The table's column is of the file itself; what the sidecar adds stands in its notes.
json ExpectedNoData(const Facts& oFacts, unsigned int nChannel)
{
    const std::string sign = "band " + std::to_string(nChannel) + " no-data ";
    const std::size_t nAt = oFacts["notes"].find(sign);
    if (oFacts.Has("no_data"))
        return oFacts["no_data"];
    if (nAt == std::string::npos)
        return nullptr;
    const std::size_t nValue = nAt + sign.size();
    return oFacts["notes"].substr(nValue, oFacts["notes"].find_first_of("; ", nValue) - nValue);
}

void CompareInfo(const Facts& oFacts, const std::string& file)
{
    const auto oRun = RunKrv({"info", file, "--json"});
    ASSERT_EQ(oRun.code, 0) << oRun.errors;
    const json oInfo = oRun.Json();
    EXPECT_EQ(oInfo["format"], "RAW");
    EXPECT_EQ(oInfo["width"].dump() + " " + oInfo["height"].dump(), oFacts["width"] + " " + oFacts["height"]);
    ASSERT_EQ(std::to_string(oInfo["channels"].size()), oFacts["bands"]);
    for (const json& oChannel : oInfo["channels"])
    {
        EXPECT_EQ(oChannel["type"], ExpectedType(oFacts["type"]));
        EXPECT_EQ(oChannel["noData"], ExpectedNoData(oFacts, oChannel["number"]));
    }
    CompareGeography(oFacts, oInfo);
}

void CompareStatistics(const Facts& oFacts, const std::string& file)
{
    const auto oRun = RunKrv({"stats", file, "--json", "--raw"});
    ASSERT_EQ(oRun.code, 0) << oRun.errors;
    const json oFound = oRun.Json();
    const auto oListed = ListedChannels(oFacts);
    const auto oNoData = oFacts.List("band_no_data_count");
    for (std::size_t n = 0; n < oListed.size(); ++n)
    {
        const json& oChannel = oFound["channels"][oListed[n] - 1];
        EXPECT_TRUE(oNoData.empty() || oChannel["noDataCount"].dump() == oNoData.at(n)) << oChannel["noDataCount"];
        // The table's figures include no-data, and are of the parts of complex values.
        if (oChannel["noDataCount"] != 0 || oChannel["of"] == "magnitude")
            continue;
        EXPECT_EQ(oChannel["nan"].dump(), oFacts.List("band_nan").at(n));
        for (const char* pWhat : {"min", "max", "mean"})
        {
            const double nExpected = std::stod(oFacts.List(std::string("band_") + pWhat).at(n));
            EXPECT_NEAR(oChannel[pWhat].get<double>(), nExpected, std::fabs(nExpected) * 1e-9 + 1e-9) << pWhat;
        }
    }
}

} // namespace

TEST(RealRawFiles, AgreeWithTheTableOfFacts)
{
    const auto& oRows = krv::test::GetFacts("FACTS2.tsv");
    if (oRows.empty())
        GTEST_SKIP() << "no folder of real files";
    unsigned int nCompared = 0;
    for (const Facts& oFacts : oRows)
    {
        const bool bKind = std::set<std::string>{"envi", "hgt", "esri bil", "esri float grid"}.contains(oFacts["kind"]);
        if (!bKind || !oFacts.Has("band_crc32"))
            continue;
        SCOPED_TRACE(oFacts["file"]);
        const std::string file = oFacts.GetPath();
        CompareInfo(oFacts, file);
        CompareChecksums(oFacts, file);
        CompareStatistics(oFacts, file);
        ComparePixels(oFacts, file);
        ++nCompared;
    }
    EXPECT_GE(nCompared, 50u);
}

// Their own facts stand in another table; here it is what lies beside them.
TEST(RealRawFiles, ImagesHaveTheirSidecars)
{
    unsigned int nCompared = 0;
    for (const Facts& oFacts : krv::test::GetFacts("FACTS2.tsv"))
    {
        if (oFacts["kind"] != "tiff" || !oFacts.Has("geotransform"))
            continue;
        SCOPED_TRACE(oFacts["file"]);
        const auto oRun = RunKrv({"info", oFacts.GetPath(), "--json"});
        ASSERT_EQ(oRun.code, 0) << oRun.errors;
        CompareGeography(oFacts, oRun.Json());
        ++nCompared;
    }
    EXPECT_TRUE(nCompared == 0 || nCompared == 6) << nCompared;
    // The pages of levels, by the table of TIFF files.
    for (const Facts& oFacts : krv::test::GetFacts("FACTS2_TIFF.tsv"))
    {
        const std::string& file = oFacts["file"];
        if (!file.ends_with(".ovr"))
            continue;
        const std::string image = oFacts.GetPath().substr(0, oFacts.GetPath().size() - 4);
        std::vector<std::vector<std::string>> oSums{oFacts.List("band_crc32")};
        for (const std::string& page : oFacts.List("overviews", ' '))
            oSums.push_back(Split(page.substr(page.find(':') + 1), ';'));
        for (std::size_t n = 0; n < oSums.size(); ++n)
        {
            const auto oRun = RunKrv({"checksum", image, "--json", "--level", std::to_string(2u << n)});
            ASSERT_EQ(oRun.code, 0) << oRun.errors;
            const json oChannels = oRun.Json()["channels"];
            ASSERT_EQ(oChannels.size(), oSums[n].size());
            for (std::size_t c = 0; c < oChannels.size(); ++c)
                EXPECT_EQ(oChannels[c]["crc32"], oSums[n][c]) << file << " level " << (2u << n);
        }
    }
}

TEST(RealRawFiles, OthersAreRefusedWithTheirReason)
{
    const std::string folder = krv::test::DataFolder() + "/";
    if (krv::test::GetFacts("FACTS2.tsv").empty())
        GTEST_SKIP() << "no folder of real files";
    const std::pair<const char*, const char*> FILES[] = {
        {"raw/written/hand_short.dat", "is shorter than its header says: 15588 bytes in place of 15688"},
        {"raw/written/hand_short.hdr", "is shorter than its header says: 15588 bytes in place of 15688"},
        {"raw/plantcv/darkReference4.hdr", "\"interleave = bup\" is not bsq, bil or bip"},
        {"raw/asc/lon_wrap_180.asc", "no format recognises this file"},
        {"raw/pyrate/roipac_test_trimmed.dem", "no format recognises this file"},
        {"raw/pyrate/20060619_utm.dem", "no format recognises this file"},
        {"raw/pyrate/20060619_utm_dem.par", "no format recognises this file"},
        {"sar/pyrate/geo_060619-061002.unw.rsc", "no format recognises this file"}};
    for (const auto& [pFile, pReason] : FILES)
    {
        const auto oRun = RunKrv({"info", folder + pFile});
        EXPECT_EQ(oRun.code, 1) << pFile;
        EXPECT_NE(oRun.errors.find(pReason), std::string::npos) << oRun.errors;
    }
}

} // namespace krv::tool
