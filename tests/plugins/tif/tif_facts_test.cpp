#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/metadata/auxiliarydata.h"
#include "gobs/pct/pct.h"
#include "gobs/raster/datatype.h"
#include "tests/plugins/tif/tifsupport.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/ogc/cs/icrs.h"

#include <algorithm>
#include <bit>
#include <charconv>
#include <cmath>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <map>
#include <numeric>
#include <sstream>

#include <gtest/gtest.h>
#include <zlib.h>

namespace
{

using krv::test::AllChannels;
using krv::test::OpenTif;
using krv::test::ReadAll;
using Row = std::map<std::string, std::string>;

std::string DataFolder()
{
    const char* pFolder = std::getenv("KRV_TEST_DATA");
    return pFolder != nullptr ? pFolder : KRV_TEST_DATA;
}

std::vector<std::string> Split(const std::string& text, char cSeparator)
{
    std::vector<std::string> oParts;
    std::istringstream oStream(text);
    for (std::string part; std::getline(oStream, part, cSeparator);)
        oParts.push_back(part);
    return oParts;
}

std::vector<Row> ReadFacts()
{
    std::ifstream oFile(DataFolder() + "/FACTS.tsv");
    std::vector<Row> oRows;
    std::string line;
    std::getline(oFile, line);
    const std::vector<std::string> oNames = Split(line, '\t');
    while (std::getline(oFile, line))
    {
        const std::vector<std::string> oValues = Split(line, '\t');
        Row oRow;
        for (std::size_t nAt = 0; nAt < oNames.size() && nAt < oValues.size(); ++nAt)
            oRow[oNames[nAt]] = oValues[nAt];
        oRows.push_back(oRow);
    }
    return oRows;
}

const std::vector<Row>& Facts()
{
    static const std::vector<Row> ROWS = ReadFacts();
    return ROWS;
}

std::uint16_t ToHalf(float nValue)
{
    const auto nBits = std::bit_cast<std::uint32_t>(nValue);
    const auto nSign = static_cast<std::uint16_t>(nBits >> 16 & 0x8000u);
    const auto nExponent = static_cast<int>(nBits >> 23 & 0xFFu);
    const std::uint32_t nFraction = nBits & 0x7FFFFFu;
    if (nExponent == 255)
        return static_cast<std::uint16_t>(nSign | 0x7C00u | nFraction >> 13);
    if (nExponent < 113)
        return static_cast<std::uint16_t>(nSign | (nExponent < 90 ? 0u : (nFraction | 0x800000u) >> (126 - nExponent)));
    return static_cast<std::uint16_t>(nSign | static_cast<std::uint32_t>(nExponent - 112) << 10 | nFraction >> 13);
}

// One channel out of pixel-interleaved values; halves are narrowed back.
std::vector<unsigned char> Channel(const std::vector<unsigned char>& oPixels, std::size_t nAt, std::size_t nChannels,
                                   std::size_t nValueBytes, bool bHalf)
{
    const std::size_t nPixels = oPixels.size() / (nChannels * nValueBytes);
    std::vector<unsigned char> oChannel(nPixels * (bHalf ? 2 : nValueBytes));
    for (std::size_t nPixel = 0; nPixel < nPixels; ++nPixel)
    {
        const unsigned char* pValue = oPixels.data() + (nPixel * nChannels + nAt) * nValueBytes;
        if (bHalf)
        {
            float nValue = 0;
            std::memcpy(&nValue, pValue, sizeof(nValue));
            const std::uint16_t nHalf = ToHalf(nValue);
            std::memcpy(oChannel.data() + nPixel * 2, &nHalf, sizeof(nHalf));
        }
        else
            std::memcpy(oChannel.data() + nPixel * nValueBytes, pValue, nValueBytes);
    }
    return oChannel;
}

std::string Crc(const std::vector<unsigned char>& oBytes)
{
    char aText[16];
    std::snprintf(aText, sizeof(aText), "%08lx",
                  crc32_z(crc32(0, nullptr, 0), oBytes.data(), static_cast<z_size_t>(oBytes.size())));
    return aText;
}

std::string Crcs(const std::vector<unsigned char>& oPixels, std::size_t nChannels, std::size_t nValueBytes, bool bHalf)
{
    std::string text;
    for (std::size_t nAt = 0; nAt < nChannels; ++nAt)
        text += (nAt == 0 ? "" : ";") + Crc(Channel(oPixels, nAt, nChannels, nValueBytes, bHalf));
    return text;
}

std::string ExpectedType(const std::string& type)
{
    const std::map<std::string, std::string> TYPES = {
        {"uint8", "8U"},    {"uint8(packed)", "8U"},   {"int8", "8S"},
        {"uint16", "16U"},  {"uint16(packed)", "16U"}, {"int16", "16S"},
        {"uint32", "32U"},  {"int32", "32S"},          {"float16", "32R"},
        {"float32", "32R"}, {"uint32(packed)", "32U"}, {"uint64", "64U"},
        {"int64", "64S"},   {"float64", "64R"},        {"cint16", "C16S"},
    };
    const auto oFound = TYPES.find(type);
    return oFound == TYPES.end() ? "unknown " + type : oFound->second;
}

class TifFacts : public ::testing::TestWithParam<std::size_t>
{
protected:
    const Row& GetRow() const { return Facts()[GetParam()]; }
    std::string Get(const char* pName) const { return GetRow().at(pName); }
    unsigned int GetNumber(const char* pName) const { return static_cast<unsigned int>(std::stoul(Get(pName))); }
    bool IsHalf() const { return Get("type") == "float16"; }
    bool IsLossy() const { return Get("lossy") == "yes"; }

    void CheckStatistics(const std::vector<unsigned char>& oPixels) const;
    void CheckLevels(krv::plugins::tif::TifDataset& oDataset, const char* pColumn, bool bMasks) const;
};

// Other versions of a lossy codec give other pixels: each may differ by 2, the mean by 0.5. All such files are of
// bytes.
void TifFacts::CheckStatistics(const std::vector<unsigned char>& oPixels) const
{
    const std::vector<std::string> oMin = Split(Get("band_min"), ';');
    const std::vector<std::string> oMax = Split(Get("band_max"), ';');
    const std::vector<std::string> oMean = Split(Get("band_mean"), ';');
    for (std::size_t nAt = 0; nAt < oMean.size(); ++nAt)
    {
        const std::vector<unsigned char> oChannel = Channel(oPixels, nAt, oMean.size(), 1, false);
        const auto [oLeast, oMost] = std::minmax_element(oChannel.begin(), oChannel.end());
        const double nSum = std::accumulate(oChannel.begin(), oChannel.end(), 0.0);
        EXPECT_NEAR(*oLeast, std::stod(oMin[nAt]), 2);
        EXPECT_NEAR(*oMost, std::stod(oMax[nAt]), 2);
        EXPECT_NEAR(nSum / static_cast<double>(oChannel.size()), std::stod(oMean[nAt]), 0.5);
    }
}

void TifFacts::CheckLevels(krv::plugins::tif::TifDataset& oDataset, const char* pColumn, bool bMasks) const
{
    const std::unique_ptr<krv::datasources::IOverviewManager> poManager(bMasks ? oDataset.GetBitmapOverviewManager()
                                                                               : oDataset.GetOverviewManager());
    std::map<unsigned int, std::pair<std::string, std::string>> oExpected;
    const std::string text = Get(pColumn) == "-" ? "" : Get(pColumn);
    for (const std::string& entry : Split(text, ' '))
    {
        const std::string size = entry.substr(0, entry.find(':'));
        const unsigned int nWidth = static_cast<unsigned int>(std::stoul(size));
        if (bMasks && nWidth == oDataset.GetWidth())
            continue;
        const unsigned int nLevel = std::max(2u, (2 * oDataset.GetWidth() + nWidth) / (2 * nWidth));
        oExpected.try_emplace(nLevel, size.substr(0, size.rfind('x')), entry.substr(entry.find(':') + 1));
    }
    if (poManager == nullptr)
    {
        EXPECT_TRUE(oExpected.empty());
        return;
    }
    ASSERT_EQ(poManager->GetLevels().size(), oExpected.size());
    for (const auto& [nLevel, oFacts] : oExpected)
    {
        SCOPED_TRACE("level " + std::to_string(nLevel));
        const unsigned int nChannels = bMasks ? 1 : oDataset.GetChanCount();
        const std::unique_ptr<krv::datasources::IRasterIO> poIO(
            poManager->GetOverviewIO(nLevel, AllChannels(nChannels)));
        EXPECT_EQ(std::to_string(poIO->GetFileWidth()) + "x" + std::to_string(poIO->GetFileHeight()), oFacts.first);
        const std::unique_ptr<krv::datasources::IChannelInfo> poInfo(oDataset.GetChannelInfo(1));
        const std::size_t nBytes = bMasks ? 1 : poInfo->GetDataType().GetValueBits() / 8;
        std::vector<unsigned char> oPixels = ReadAll(*poIO, nChannels * nBytes);
        const std::string plain = Crcs(oPixels, nChannels, nBytes, IsHalf());
        if (plain == oFacts.second || (IsLossy() && !bMasks))
            continue;
        for (unsigned char& nByte : oPixels)
            nByte = static_cast<unsigned char>(nByte * 255);
        EXPECT_TRUE(bMasks && Crcs(oPixels, 1, 1, false) == oFacts.second) << plain << " " << oFacts.second;
    }
}

TEST_P(TifFacts, FileAgreesWithTheTable)
{
    SCOPED_TRACE(Get("file"));
    const OpenTif oFile(DataFolder() + "/" + Get("file"));
    EXPECT_EQ(oFile->GetWidth(), GetNumber("width"));
    EXPECT_EQ(oFile->GetHeight(), GetNumber("height"));
    ASSERT_EQ(oFile->GetChanCount(), GetNumber("bands"));
    const std::unique_ptr<krv::datasources::IChannelInfo> poInfo(oFile->GetChannelInfo(1));
    EXPECT_EQ(poInfo->GetDataType().Describe(), ExpectedType(Get("type")));
    EXPECT_EQ(poInfo->GetNativeDataType().GetValueBits(), GetNumber("bits"));

    const unsigned int nChannels = oFile->GetChanCount();
    const std::size_t nBytes = poInfo->GetDataType().GetValueBits() / 8;
    const std::unique_ptr<krv::datasources::IRasterIO> poIO(oFile->GetRasterIO(AllChannels(nChannels)));
    if (Get("layout") == "tiles")
    {
        EXPECT_EQ(std::to_string(poIO->GetTileWidth()) + "x" + std::to_string(poIO->GetTileHeight()), Get("block"));
    }
    const std::vector<unsigned char> oPixels = ReadAll(*poIO, nChannels * nBytes);
    if (IsLossy())
        CheckStatistics(oPixels);
    else
        EXPECT_EQ(Crcs(oPixels, nChannels, nBytes, IsHalf()), Get("band_crc32"));

    std::istringstream oWindow(Get("window"));
    unsigned int nX = 0, nY = 0, nWidth = 0, nHeight = 0;
    oWindow >> nX >> nY >> nWidth >> nHeight;
    std::vector<unsigned char> oPart(std::size_t{nWidth} * nHeight * nChannels * nBytes);
    const OpenTif oFresh(DataFolder() + "/" + Get("file"));
    const std::unique_ptr<krv::datasources::IRasterIO> poFresh(oFresh->GetRasterIO(AllChannels(nChannels)));
    poFresh->ReadWindow(nX, nY, nWidth, nHeight, oPart.data());
    EXPECT_TRUE(IsLossy() || Crcs(oPart, nChannels, nBytes, IsHalf()) == Get("window_crc32"));

    std::string noData = oFile->ReadAuxiliaryData().GetFileMetadataValue("NO_DATA_VALUE");
    noData.erase(noData.find_last_not_of(' ') + 1);
    EXPECT_EQ(noData, Get("no_data") == "-" ? "" : Get("no_data"));
    CheckLevels(*oFile, "overviews", false);
    CheckLevels(*oFile, "masks", true);
}

TEST_P(TifFacts, GeocodingAndReferenceSystemAgreeWithTheTable)
{
    SCOPED_TRACE(Get("file"));
    const OpenTif oFile(DataFolder() + "/" + Get("file"));
    const krv::ogc::cs::GeocodingInfo& oInfo = oFile->GetGeocoding();
    std::vector<double> oTerms;
    std::istringstream oStream(Get("geotransform") == "-" ? "0 1 0 0 0 1" : Get("geotransform"));
    for (double nTerm = 0; oStream >> nTerm;)
        oTerms.push_back(nTerm);
    ASSERT_EQ(oTerms.size(), 6u);
    for (std::size_t nAt = 0; nAt < 6; ++nAt)
        EXPECT_NEAR(oInfo.GetTerms()[nAt], oTerms[nAt], 1e-9 * std::max(1.0, std::abs(oTerms[nAt])));
    if (Get("crs").starts_with("EPSG:"))
    {
        const std::unique_ptr<krv::ogc::cs::ICRS> poCRS(oFile->ReadCRS());
        ASSERT_NE(poCRS, nullptr);
        EXPECT_EQ("EPSG:" + std::to_string(poCRS->GetEPSG()), Get("crs"));
    }
}

TEST_P(TifFacts, PaletteAgreesWithTheTable)
{
    const OpenTif oFile(DataFolder() + "/" + Get("file"));
    if (Get("palette") == "-")
    {
        EXPECT_TRUE(oFile->GetPCTList().empty());
        return;
    }
    const std::unique_ptr<krv::gobs::PCT> poTable(oFile->GetPCT(1));
    std::vector<unsigned char> oExact, oNarrow;
    for (int nPart = 0; nPart < 3; ++nPart)
        for (const krv::gobs::PCT::Entry& oEntry : poTable->GetEntries())
        {
            const std::uint16_t aParts[] = {oEntry.colour.red, oEntry.colour.green, oEntry.colour.blue};
            for (int nShift : {0, 8})
            {
                oExact.push_back(static_cast<unsigned char>(aParts[nPart] >> nShift));
                oNarrow.push_back(static_cast<unsigned char>(aParts[nPart] / 257 >> nShift));
            }
        }
    const std::string count = std::to_string(poTable->GetEntries().size()) + ":";
    EXPECT_TRUE(count + Crc(oExact) == Get("palette") || count + Crc(oNarrow) == Get("palette")) << Get("palette");
}

GTEST_ALLOW_UNINSTANTIATED_PARAMETERIZED_TEST(TifFacts);

std::string FactName(const ::testing::TestParamInfo<std::size_t>& oInfo)
{
    std::string name = Facts()[oInfo.param].at("file");
    for (char& cLetter : name)
        if (std::isalnum(static_cast<unsigned char>(cLetter)) == 0)
            cLetter = '_';
    return name;
}

INSTANTIATE_TEST_SUITE_P(RealFiles, TifFacts, ::testing::Range<std::size_t>(0, Facts().size()), FactName);

} // namespace
