// Compares what the command says and the library reads with a table of facts about real files, when the folder with
// both is there.

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/ipctdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/reader/basicreader.h"
#include "gobs/pct/pct.h"
#include "gobs/raster/raster.h"
#include "tests/support/facts.h"
#include "tests/tools/programrun.h"
#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>
#include <zlib.h>

#include <algorithm>
#include <cmath>
#include <cstring>
#include <filesystem>
#include <map>
#include <sstream>

namespace krv::tool
{

namespace
{

using krv::datasources::BasicReader;
using krv::test::DataFolder;
using krv::test::Facts;
using krv::test::RunKrv;
using krv::test::Split;
using krv::test::ToHalf;
using nlohmann::json;
using Colour = krv::gobs::RGBTuple<std::uint16_t>;

std::string ExpectedType(const std::string& type)
{
    static const std::map<std::string, std::string> TYPES{{"uint8", "8U"},          {"int8", "8S"},
                                                          {"uint16", "16U"},        {"int16", "16S"},
                                                          {"uint32", "32U"},        {"int32", "32S"},
                                                          {"uint64", "64U"},        {"int64", "64S"},
                                                          {"float16", "32R"},       {"float32", "32R"},
                                                          {"float64", "64R"},       {"cint16", "C16S"},
                                                          {"uint8(packed)", "8U"},  {"uint16(packed)", "16U"},
                                                          {"uint32(packed)", "32U"}};
    return TYPES.at(type);
}

std::string Crc(const std::string& bytes)
{
    std::array<char, 9> aText{};
    std::snprintf(aText.data(), aText.size(), "%08lx",
                  crc32_z(0, reinterpret_cast<const Bytef*>(bytes.data()), bytes.size()));
    return aText.data();
}

// The checksum of a channel; halves are narrowed back.
std::string ChannelChecksum(const krv::gobs::Raster& oRaster, unsigned int nPosition, bool bHalf)
{
    const std::size_t nValueBytes = oRaster.GetDataType().GetValueBits() / 8;
    std::string bytes;
    for (std::uint64_t nPixel = 0; nPixel < oRaster.GetFullWidth() * oRaster.GetFullHeight(); ++nPixel)
    {
        const auto* const pValue = reinterpret_cast<const char*>(
            oRaster.GetBuffer() + (nPixel * oRaster.GetChansCount() + nPosition) * nValueBytes);
        float nValue = 0;
        if (bHalf)
            std::memcpy(&nValue, pValue, sizeof nValue);
        const std::uint16_t nHalf = ToHalf(nValue);
        bytes.append(bHalf ? reinterpret_cast<const char*>(&nHalf) : pValue, bHalf ? 2 : nValueBytes);
    }
    return Crc(bytes);
}

void CompareWindow(const Facts& oFacts, const std::string& file)
{
    BasicReader oReader(file);
    EXPECT_EQ(std::to_string(oReader.GetChannelsInfo()[0]->GetNativeDataType().GetValueBits()), oFacts["bits"]);
    if (oFacts["layout"] == "tiles")
    {
        EXPECT_EQ(std::to_string(oReader.GetTileWidth()) + "x" + std::to_string(oReader.GetTileHeight()),
                  oFacts["block"]);
    }
    std::istringstream oWindow(oFacts["window"]);
    unsigned int nX = 0, nY = 0, nWidth = 0, nHeight = 0;
    oWindow >> nX >> nY >> nWidth >> nHeight;
    const std::unique_ptr<krv::gobs::Raster> poPart(oReader.ReadRaster(nX, nY, nWidth, nHeight));
    std::string sums;
    for (unsigned int nPosition = 0; nPosition < oReader.GetChansCount(); ++nPosition)
        sums += (nPosition == 0 ? "" : ";") + ChannelChecksum(*poPart, nPosition, oFacts.IsHalf());
    EXPECT_TRUE(oFacts.IsLossy() || sums == oFacts["window_crc32"]) << sums;
}

// The table has masks of bytes as they stand and of bits as 0 and 255.
void CompareMask(krv::datasources::IRasterIO& oIO, const std::string& fact)
{
    EXPECT_EQ(std::to_string(oIO.GetFileWidth()) + "x" + std::to_string(oIO.GetFileHeight()),
              fact.substr(0, fact.rfind('x')));
    std::string bytes(std::size_t{oIO.GetFileWidth()} * oIO.GetFileHeight(), '?');
    oIO.ReadWindow(0u, 0u, oIO.GetFileWidth(), oIO.GetFileHeight(), reinterpret_cast<unsigned char*>(bytes.data()));
    const std::string plain = Crc(bytes);
    std::replace(bytes.begin(), bytes.end(), '\1', '\xff');
    const std::string crc = fact.substr(fact.find(':') + 1);
    EXPECT_TRUE(crc == plain || crc == Crc(bytes)) << crc;
}

void CompareMasks(const Facts& oFacts, krv::datasources::IBitmapDataset& oDataset)
{
    const std::unique_ptr<krv::datasources::IOverviewManager> poLevels(oDataset.GetBitmapOverviewManager());
    const auto oNumbers = poLevels != nullptr ? poLevels->GetLevels() : std::vector<unsigned int>();
    auto oBitmaps = oDataset.GetBitmapList();
    std::erase(oBitmaps, 65536U); // one that lies beside the file
    std::size_t nMasks = 0, nLevels = 0;
    for (const std::string& fact : oFacts.List("masks", ' '))
    {
        const bool bFull = fact.starts_with(oFacts["width"] + "x");
        ASSERT_LT(bFull ? nMasks : nLevels, bFull ? oBitmaps.size() : oNumbers.size());
        const std::unique_ptr<krv::datasources::IRasterIO> poIO(
            bFull ? oDataset.GetBitmapIO({oBitmaps[nMasks++]}) : poLevels->GetOverviewIO(oNumbers[nLevels++], {1}));
        CompareMask(*poIO, fact);
    }
    EXPECT_EQ(nMasks, oBitmaps.size());
    EXPECT_EQ(nLevels, oNumbers.size());
}

void ComparePalette(const Facts& oFacts, krv::datasources::IPCTDataset& oDataset)
{
    ASSERT_EQ(oDataset.GetPCTList().empty(), !oFacts.Has("palette"));
    if (!oFacts.Has("palette"))
        return;
    const std::unique_ptr<krv::gobs::PCT> poTable(oDataset.GetPCT(1));
    std::string exact, narrow;
    for (const auto pPart : {&Colour::red, &Colour::green, &Colour::blue})
        for (const krv::gobs::PCT::Entry& oEntry : poTable->GetEntries())
            for (const int nShift : {0, 8})
            {
                exact += static_cast<char>(oEntry.colour.*pPart >> nShift);
                narrow += static_cast<char>(oEntry.colour.*pPart / 257 >> nShift);
            }
    const std::string count = std::to_string(poTable->GetEntries().size()) + ":";
    EXPECT_TRUE(count + Crc(exact) == oFacts["palette"] || count + Crc(narrow) == oFacts["palette"]);
}

// The table is of the file alone; what lies beside it has a test of its own.
bool SaysBeside(const json& oInfo, const char* pWhat)
{
    return std::any_of(oInfo["sidecars"].begin(), oInfo["sidecars"].end(),
                       [pWhat](const json& oSidecar) { return oSidecar["says"] == pWhat && oSidecar["used"] == true; });
}

void CompareGeography(const Facts& oFacts, const json& oInfo)
{
    EXPECT_EQ(oInfo["furtherImages"], oFacts.List("other_pages", ' ').size());
    const std::string& crs = oFacts["crs"];
    if (crs.starts_with("EPSG:"))
    {
        ASSERT_FALSE(oInfo["crs"].is_null());
        EXPECT_EQ(oInfo["crs"]["epsg"], json::parse(crs.substr(5)));
    }
    else if (crs == "-")
    {
        EXPECT_TRUE(oInfo["crs"].is_null());
    }
    if (SaysBeside(oInfo, "geocoding"))
        return;
    const auto oTerms = oFacts.Numbers("geotransform");
    ASSERT_EQ(oInfo["geocoding"].is_null(), oTerms.empty());
    for (std::size_t i = 0; i < oTerms.size(); ++i)
        EXPECT_NEAR(oInfo["geocoding"][i].get<double>(), oTerms[i], 1e-13 * std::fabs(oTerms[i]) + 1e-15)
            << "term " << i;
}

// The levels that the reduced pages make: the larger page stays where two have one number.
std::map<unsigned int, std::vector<std::string>> ExpectedLevels(const Facts& oFacts)
{
    std::map<unsigned int, std::vector<std::string>> oLevels;
    for (const std::string& page : oFacts.List("overviews", ' '))
    {
        const auto oSize = Split(page.substr(0, page.find(':')), 'x');
        const double nRatio = std::stod(oFacts["width"]) / std::stod(oSize[0]);
        const auto nLevel = static_cast<unsigned int>(std::max(std::lround(nRatio), 2L));
        std::vector<std::string> oPage{oSize[0], oSize[1]};
        const auto oSums = Split(page.substr(page.find(':') + 1), ';');
        oPage.insert(oPage.end(), oSums.begin(), oSums.end());
        const auto oOld = oLevels.find(nLevel);
        if (oOld == oLevels.end() || std::stoul(oOld->second[0]) < std::stoul(oPage[0]))
            oLevels[nLevel] = oPage;
    }
    return oLevels;
}

void CompareLevels(const Facts& oFacts, const json& oInfo, const std::string& file)
{
    if (SaysBeside(oInfo, "levels"))
        return;
    const auto oLevels = ExpectedLevels(oFacts);
    ASSERT_EQ(oInfo["overviews"].size(), oLevels.size()) << oInfo["overviews"].dump();
    std::size_t i = 0;
    for (const auto& [nLevel, oPage] : oLevels)
    {
        const json& oFound = oInfo["overviews"][i++];
        EXPECT_EQ(oFound["level"], nLevel);
        EXPECT_EQ(oFound["width"].dump() + " " + oFound["height"].dump(), oPage[0] + " " + oPage[1]);
        if (oFacts.IsLossy() || oFacts.IsHalf())
            continue;
        const auto oRun = RunKrv({"checksum", file, "--json", "--level", std::to_string(nLevel)});
        ASSERT_EQ(oRun.code, 0) << oRun.errors;
        const json oSums = oRun.Json();
        for (std::size_t c = 0; c < oSums["channels"].size(); ++c)
            EXPECT_EQ(oSums["channels"][c]["crc32"], oPage.at(2 + c)) << "level " << nLevel << ", channel " << c + 1;
    }
}

void CompareInfo(const Facts& oFacts, const std::string& file)
{
    const auto oRun = RunKrv({"info", file, "--json"});
    ASSERT_EQ(oRun.code, 0) << oRun.errors;
    const json oInfo = oRun.Json();
    EXPECT_EQ(oInfo["format"], "TIF");
    EXPECT_EQ(oInfo["width"].dump(), oFacts["width"]);
    EXPECT_EQ(oInfo["height"].dump(), oFacts["height"]);
    ASSERT_EQ(std::to_string(oInfo["channels"].size()), oFacts["bands"]);
    for (const json& oChannel : oInfo["channels"])
    {
        EXPECT_EQ(oChannel["type"], ExpectedType(oFacts["type"]));
        EXPECT_EQ(oChannel["noData"], oFacts.Has("no_data") ? json(oFacts["no_data"]) : json(nullptr));
    }
    CompareGeography(oFacts, oInfo);
    CompareLevels(oFacts, oInfo, file);
}

void CompareChecksums(const Facts& oFacts, const std::string& file)
{
    const auto oRun = RunKrv({"checksum", file, "--json"});
    ASSERT_EQ(oRun.code, 0) << oRun.errors;
    const json oSums = oRun.Json();
    const auto oExpected = oFacts.List("band_crc32");
    ASSERT_EQ(oSums["channels"].size(), oExpected.size());
    for (std::size_t c = 0; c < oExpected.size() && !oFacts.IsLossy(); ++c)
    {
        BasicReader oReader(file, {static_cast<unsigned int>(c) + 1});
        const std::unique_ptr<krv::gobs::Raster> poWhole(
            oFacts.IsHalf() ? oReader.ReadRaster(0, 0, oReader.GetWidth(), oReader.GetHeight()) : nullptr);
        const std::string found =
            oFacts.IsHalf() ? ChannelChecksum(*poWhole, 0, true) : oSums["channels"][c]["crc32"].get<std::string>();
        EXPECT_EQ(found, oExpected[c]) << "channel " << c + 1;
    }
}

// A value of the table, within the rounding of its digits and the leeway of lossy codecs.
void ExpectNear(const json& oFound, const std::string& expected, double nLeeway, const char* what)
{
    const double nExpected = std::stod(expected);
    EXPECT_NEAR(oFound.get<double>(), nExpected, std::fabs(nExpected) * 1e-9 + 1e-9 + nLeeway) << what;
}

void CompareStatistics(const Facts& oFacts, const std::string& file)
{
    const auto oRun = RunKrv({"stats", file, "--json", "--raw"});
    ASSERT_EQ(oRun.code, 0) << oRun.errors;
    const json oStatistics = oRun.Json();
    const double nPixels = std::stod(oFacts["width"]) * std::stod(oFacts["height"]);
    const auto oNoData = oFacts.List("band_no_data_count"), oNan = oFacts.List("band_nan");
    for (std::size_t c = 0; c < oStatistics["channels"].size(); ++c)
    {
        const json& oChannel = oStatistics["channels"][c];
        double nCounted = 0;
        for (const char* pCount : {"valid", "noDataCount", "nan", "infinite"})
            nCounted += oChannel[pCount].get<double>();
        EXPECT_EQ(nCounted, nPixels);
        if (!oNoData.empty() && !oFacts.IsLossy())
        {
            EXPECT_EQ(oChannel["noDataCount"].dump(), oNoData.at(c));
            const auto oMask = RunKrv({"mask", file, "--no-data", "--channels", std::to_string(c + 1), "--json"});
            EXPECT_TRUE(!oFacts.Has("no_data") || oMask.Json()["set"].dump() == oNoData.at(c)) << oMask.errors;
        }
        if (oFacts["no_data"] != "nan" && oFacts["type"] != "cint16")
        {
            EXPECT_EQ(oChannel["nan"].dump(), oNan.at(c));
        }
        const bool bSame = oNoData.empty() || oNoData.at(c) == "0"; // the table's figures include no-data
        if (!bSame || oChannel["of"] == "magnitude" || oChannel["valid"] == 0 || oChannel["infinite"] != 0)
            continue;
        ExpectNear(oChannel["min"], oFacts.List("band_min").at(c), oFacts.IsLossy() ? 2 : 0, "minimum");
        ExpectNear(oChannel["max"], oFacts.List("band_max").at(c), oFacts.IsLossy() ? 2 : 0, "maximum");
        ExpectNear(oChannel["mean"], oFacts.List("band_mean").at(c), oFacts.IsLossy() ? 0.5 : 0, "mean");
    }
}

TEST(RealFiles, AgreeWithTheTableOfFacts)
{
    if (krv::test::GetFacts().empty())
        GTEST_SKIP() << "no folder of real files";
    for (const Facts& oFacts : krv::test::GetFacts())
    {
        SCOPED_TRACE(oFacts["file"]);
        // The table is of the files alone, without what lies beside some.
        const krv::conformance::TempFolder oAlone;
        const std::string file = oAlone.File(std::filesystem::path(oFacts["file"]).filename());
        std::filesystem::create_symlink(std::filesystem::absolute(oFacts.GetPath()), file);
        CompareInfo(oFacts, file);
        CompareChecksums(oFacts, file);
        CompareStatistics(oFacts, file);
        CompareWindow(oFacts, file);
        const std::unique_ptr<krv::datasources::IDataset> poDataset(
            krv::datasources::DatasetManager::GetInstance()->Open(file, eReadOnly));
        CompareMasks(oFacts, dynamic_cast<krv::datasources::IBitmapDataset&>(*poDataset));
        ComparePalette(oFacts, dynamic_cast<krv::datasources::IPCTDataset&>(*poDataset));
    }
}

TEST(RealFiles, OfOtherKindsAreRefusedWithAReason)
{
    if (!std::filesystem::exists(DataFolder() + "/MANIFEST.tsv"))
        GTEST_SKIP() << "no folder of real files";
    unsigned int nAsked = 0;
    for (const auto& oEntry : std::filesystem::directory_iterator(DataFolder() + "/other"))
    {
        const std::string extension = oEntry.path().extension();
        if (!oEntry.is_regular_file() || extension == ".tif" || extension == ".jp2" || extension == ".j2k" ||
            extension == ".png")
            continue;
        const auto oRun = RunKrv({"info", oEntry.path().string()});
        ++nAsked;
        EXPECT_EQ(oRun.code, 1) << oEntry.path();
        EXPECT_NE(oRun.errors.find("no format recognises this file"), std::string::npos) << oRun.errors;
    }
    EXPECT_GT(nAsked, 0U);
}

} // namespace

} // namespace krv::tool
