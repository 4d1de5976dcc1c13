// Real files of every kind against a table of what other decoders make of them, when the folder with both is there.

#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterio.h"
#include "plugins/jp2/jp2builder.h"
#include "plugins/jp2/jp2dataset.h"
#include "tests/support/facts.h"
#include "toolkit/exceptions/exceptions.h"

#include <gtest/gtest.h>
#include <zlib.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <map>
#include <memory>

namespace krv::plugins::jp2
{

namespace
{

using krv::datasources::IRasterIO;
using krv::test::Facts;

struct Step
{
    unsigned int mnX = 1;
    unsigned int mnY = 1;

    friend bool operator==(const Step&, const Step&) = default;
};

// Where a component's own samples lie among the pixels of the reference grid.
struct Grid
{
    std::vector<Step> moSteps; // empty: every pixel is one
    unsigned int mnX = 0;      // of the image
    unsigned int mnY = 0;

    explicit Grid(const Facts& oFacts)
    {
        const std::string& notes = oFacts["notes"];
        const std::string OFFSET = "image offset ", STEPS = "subsampling ";
        const std::size_t nOffset = notes.find(OFFSET), nSteps = notes.find(STEPS);
        if (nOffset != std::string::npos)
        {
            const auto oPlace = krv::test::Split(notes.substr(nOffset + OFFSET.size()), ',');
            mnX = static_cast<unsigned int>(std::stoul(oPlace.at(0)));
            mnY = static_cast<unsigned int>(std::stoul(oPlace.at(1)));
        }
        if (nSteps == std::string::npos)
            return;
        const std::size_t nFrom = nSteps + STEPS.size();
        const std::size_t nEnd = std::min(notes.find_first_not_of("0123456789x ", nFrom), notes.size());
        for (const std::string& step : krv::test::Split(notes.substr(nFrom, nEnd - nFrom), ' '))
            moSteps.push_back({static_cast<unsigned int>(std::stoul(step)),
                               static_cast<unsigned int>(std::stoul(step.substr(step.find('x') + 1)))});
    }

    // The first one, counted from the image's first pixel, where nReduce resolutions are left out.
    static unsigned int First(unsigned int nImage, unsigned int nStep, unsigned int nReduce)
    {
        const auto Up = [](unsigned int nValue, unsigned int nBy)
        {
            return (nValue + nBy - 1) / nBy;
        };
        return Up(nImage, nStep << nReduce) * nStep - Up(nImage, 1u << nReduce);
    }
};

struct Samples
{
    std::string moSize;
    std::string moBytes;
};

Samples ReadSamples(IRasterIO& oIO, std::size_t nBytes, const Grid& oGrid, std::size_t nChannel, unsigned int nReduce)
{
    const unsigned int nWidth = oIO.GetFileWidth(), nHeight = oIO.GetFileHeight();
    std::string pixels(std::size_t{nWidth} * nHeight * nBytes, '?');
    // In pieces that are no blocks.
    constexpr unsigned int PIECE = 300;
    for (unsigned int nY = 0; nY < nHeight; nY += PIECE)
    {
        const unsigned int nRows = std::min(PIECE, nHeight - nY);
        oIO.ReadWindow(0, nY, nWidth, nRows,
                       reinterpret_cast<unsigned char*>(pixels.data()) + std::size_t{nY} * nWidth * nBytes);
    }
    const Step oStep = oGrid.moSteps.empty() ? Step() : oGrid.moSteps.at(nChannel);
    const unsigned int nX0 = Grid::First(oGrid.mnX, oStep.mnX, nReduce);
    const unsigned int nY0 = Grid::First(oGrid.mnY, oStep.mnY, nReduce);
    Samples oSamples;
    unsigned int nColumns = 0, nRows = 0;
    for (unsigned int nY = nY0; nY < nHeight; nY += oStep.mnY, ++nRows)
        for (unsigned int nX = nX0; nX < nWidth; nX += oStep.mnX)
        {
            oSamples.moBytes.append(pixels, (std::size_t{nY} * nWidth + nX) * nBytes, nBytes);
            nColumns += nRows == 0 ? 1 : 0;
        }
    oSamples.moSize = std::to_string(nColumns) + "x" + std::to_string(nRows);
    return oSamples;
}

std::string Crc(const std::string& bytes)
{
    std::array<char, 9> aText{};
    std::snprintf(aText.data(), aText.size(), "%08lx",
                  crc32_z(0, reinterpret_cast<const Bytef*>(bytes.data()), bytes.size()));
    return aText.data();
}

double Value(const krv::gobs::DataType& oType, const char* pBytes)
{
    std::int16_t nShort = 0;
    if (oType.GetBits() == 8)
        return oType.IsSigned() ? static_cast<signed char>(*pBytes) : static_cast<unsigned char>(*pBytes);
    std::memcpy(&nShort, pBytes, 2);
    return oType.IsSigned() ? nShort : static_cast<std::uint16_t>(nShort);
}

// Of several decoders of lossy files each may round otherwise: their bound is one unit.
void CompareValues(const Facts& oFacts, const krv::gobs::DataType& oType, const std::string& bytes, std::size_t nBand)
{
    double nMinimum = HUGE_VAL, nMaximum = -HUGE_VAL, nSum = 0;
    const std::size_t nBytes = oType.GetBits() / 8;
    for (std::size_t nAt = 0; nAt < bytes.size(); nAt += nBytes)
    {
        const double nValue = Value(oType, bytes.data() + nAt);
        nMinimum = std::min(nMinimum, nValue);
        nMaximum = std::max(nMaximum, nValue);
        nSum += nValue;
    }
    const double nBound = oFacts.IsLossy() ? 1.0 : 0.0;
    EXPECT_NEAR(nMinimum, std::stod(oFacts.List("band_min").at(nBand)), nBound);
    EXPECT_NEAR(nMaximum, std::stod(oFacts.List("band_max").at(nBand)), nBound);
    EXPECT_NEAR(nSum / (static_cast<double>(bytes.size()) / static_cast<double>(nBytes)),
                std::stod(oFacts.List("band_mean").at(nBand)), nBound + 1e-6);
}

std::string TypeName(const krv::gobs::DataType& oType)
{
    return (oType.IsSigned() ? "int" : "uint") + std::to_string(oType.GetBits());
}

std::string SizeOf(const IRasterIO& oIO)
{
    return std::to_string(oIO.GetFileWidth()) + "x" + std::to_string(oIO.GetFileHeight());
}

std::vector<std::size_t> ListedBands(const Facts& oFacts)
{
    std::vector<std::size_t> oBands;
    if (oFacts["listed_bands"] == "all")
        for (std::size_t nBand = 1; nBand <= std::stoul(oFacts["bands"]); ++nBand)
            oBands.push_back(nBand);
    else
        for (const std::string& band : oFacts.List("listed_bands", ','))
            oBands.push_back(std::stoul(band));
    return oBands;
}

void CompareImage(const Facts& oFacts, Jp2Dataset& oDataset)
{
    const Grid oGrid(oFacts);
    EXPECT_EQ(std::to_string(oDataset.GetChanCount()), oFacts["bands"]);
    const auto oBits = oFacts.List("bits");
    const auto oSizes = oFacts.List("component_sizes", ' ');
    const std::vector<std::size_t> oBands = ListedBands(oFacts);
    for (std::size_t nAt = 0; nAt < oBands.size(); ++nAt)
    {
        SCOPED_TRACE("band " + std::to_string(oBands[nAt]));
        const auto nChannel = static_cast<unsigned int>(oBands[nAt]);
        const std::unique_ptr<krv::datasources::IChannelInfo> poInfo(oDataset.GetChannelInfo(nChannel));
        const krv::gobs::DataType oType = poInfo->GetDataType();
        EXPECT_EQ(TypeName(oType), oFacts["type"]);
        EXPECT_EQ(std::to_string(poInfo->GetNativeDataType().GetBits()), oBits[oBits.size() == 1 ? 0 : nAt]);
        const std::unique_ptr<IRasterIO> poIO(oDataset.GetRasterIO({nChannel}));
        EXPECT_EQ(SizeOf(*poIO), oFacts["width"] + "x" + oFacts["height"]);
        const Samples oSamples = ReadSamples(*poIO, oType.GetBits() / 8, oGrid, oBands[nAt] - 1, 0);
        EXPECT_EQ(oSamples.moSize, oSizes.empty() ? SizeOf(*poIO) : oSizes.at(nAt));
        CompareValues(oFacts, oType, oSamples.moBytes, nAt);
        EXPECT_EQ(Crc(oSamples.moBytes), oFacts.List("band_crc32").at(nAt));
    }
}

// The table's decoder makes levels of images with an offset a column or a row of zeros larger than they are.
void Enlarge(Samples& oSamples, const std::string& size, std::size_t nBytes)
{
    const auto Parse = [](const std::string& text)
    {
        return std::pair(std::stoul(text), std::stoul(text.substr(text.find('x') + 1)));
    };
    const auto [nWidth, nHeight] = Parse(oSamples.moSize);
    const auto [nTableWidth, nTableHeight] = Parse(size);
    if (nTableWidth - nWidth > 1 || nTableHeight - nHeight > 1)
        return;
    std::string bytes;
    for (std::size_t nRow = 0; nRow < nHeight; ++nRow)
        bytes += oSamples.moBytes.substr(nRow * nWidth * nBytes, nWidth * nBytes) +
                 std::string((nTableWidth - nWidth) * nBytes, '\0');
    bytes.resize(nTableWidth * nTableHeight * nBytes, '\0');
    oSamples = {size, bytes};
}

void CompareLevels(const Facts& oFacts, Jp2Dataset& oDataset)
{
    const Grid oGrid(oFacts);
    const std::unique_ptr<krv::datasources::IOverviewManager> poLevels(oDataset.GetOverviewManager());
    const auto oNumbers = poLevels->GetLevels();
    EXPECT_EQ(std::to_string(oNumbers.size() + 1), oFacts["levels"]);
    const std::vector<std::size_t> oBands = ListedBands(oFacts);
    for (const std::string& level : oFacts.List("level_crc32", ' '))
    {
        SCOPED_TRACE("level " + level);
        const auto oParts = krv::test::Split(level, ':');
        const unsigned int nReduce = static_cast<unsigned int>(std::stoul(oParts.at(0)));
        if (oParts.at(1) == "refused") // by the table's decoder
            continue;
        const auto oSums = krv::test::Split(oParts.at(2), ';');
        ASSERT_EQ(oSums.size(), oBands.size());
        for (std::size_t nAt = 0; nAt < oBands.size(); ++nAt)
        {
            const auto nChannel = static_cast<unsigned int>(oBands[nAt]);
            EXPECT_TRUE(poLevels->IsValid(nChannel, 1u << nReduce));
            const std::unique_ptr<IRasterIO> poIO(poLevels->GetOverviewIO(1u << nReduce, {nChannel}));
            const std::unique_ptr<krv::datasources::IChannelInfo> poInfo(oDataset.GetChannelInfo(nChannel));
            Samples oSamples = ReadSamples(*poIO, poInfo->GetDataType().GetBits() / 8, oGrid, oBands[nAt] - 1, nReduce);
            // The size is that of the first band.
            if (oGrid.moSteps.empty() || oGrid.moSteps[nAt] == oGrid.moSteps[0])
            {
                Enlarge(oSamples, oParts.at(1), poInfo->GetDataType().GetBits() / 8);
                EXPECT_EQ(oSamples.moSize, oParts.at(1));
            }
            EXPECT_EQ(Crc(oSamples.moBytes), oSums[nAt]) << "band " << nChannel;
        }
    }
}

void CompareGeography(const Facts& oFacts, const Jp2Dataset& oDataset)
{
    const std::unique_ptr<krv::ogc::cs::ICRS> poCRS(oDataset.ReadCRS());
    EXPECT_EQ(poCRS ? "EPSG:" + std::to_string(poCRS->GetEPSG()) : "-", oFacts["crs"]);
    const krv::ogc::cs::GeocodingInfo& oInfo = oDataset.GetGeocoding();
    const std::vector<double> oTerms = oFacts.Numbers("geotransform");
    if (oFacts["geo_source"].starts_with("world file"))
        return;
    ASSERT_EQ(oInfo.IsIdentity(), oTerms.empty());
    for (std::size_t nAt = 0; nAt < oTerms.size(); ++nAt)
        EXPECT_NEAR(oInfo.GetTerms()[nAt], oTerms[nAt], 1e-9 * std::abs(oTerms[nAt])) << nAt;
}

// Those without facts about pixels cannot be decoded by anybody.
void CompareFailure(const Facts& oFacts, Jp2Builder& oBuilder)
{
    try
    {
        const std::unique_ptr<krv::datasources::IDataset> poDataset(oBuilder.Open(oFacts.GetPath(), eReadOnly));
        auto& oDataset = dynamic_cast<Jp2Dataset&>(*poDataset);
        const std::unique_ptr<IRasterIO> poIO(oDataset.GetRasterIO({1}));
        std::vector<unsigned char> oPixels(std::size_t{oDataset.GetWidth()} * oDataset.GetHeight() * 2);
        poIO->ReadWindow(0u, 0u, oDataset.GetWidth(), oDataset.GetHeight(), oPixels.data());
        ADD_FAILURE() << "was read";
    }
    catch (const krv::FileException& oException)
    {
        EXPECT_NE(oException.GetMessage().find(oFacts.GetPath()), std::string::npos) << oException.GetMessage();
        EXPECT_GT(oException.GetMessage().size(), oFacts.GetPath().size() + 10);
    }
}

} // namespace

TEST(Jp2Facts, PixelsAndLevelsOfRealFiles)
{
    const auto& oTable = krv::test::GetFacts("FACTS2.tsv");
    if (oTable.empty())
        GTEST_SKIP() << "no folder of real files";
    int nFiles = 0;
    Jp2Builder oBuilder;
    for (const Facts& oFacts : oTable)
    {
        const std::string& kind = oFacts["kind"];
        if (kind != "jp2" && kind != "codestream" && kind != "jph" && kind != "jpx")
            continue;
        SCOPED_TRACE(oFacts["file"]);
        ++nFiles;
        if (!oFacts.Has("band_crc32"))
        {
            CompareFailure(oFacts, oBuilder);
            continue;
        }
        try
        {
            const std::unique_ptr<krv::datasources::IDataset> poDataset(oBuilder.Open(oFacts.GetPath(), eReadOnly));
            auto& oDataset = dynamic_cast<Jp2Dataset&>(*poDataset);
            CompareImage(oFacts, oDataset);
            CompareLevels(oFacts, oDataset);
            CompareGeography(oFacts, oDataset);
        }
        catch (const std::exception& oException)
        {
            ADD_FAILURE() << oException.what();
        }
    }
    EXPECT_GT(nFiles, 80);
}

} // namespace krv::plugins::jp2
