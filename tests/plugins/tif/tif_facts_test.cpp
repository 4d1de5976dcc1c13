#include "datasources/interfaces/ichannelinfo.h"
#include "gobs/pct/pct.h"
#include "gobs/raster/datatype.h"
#include "tests/plugins/tif/tifsupport.h"
#include "tests/support/facts.h"

#include <algorithm>
#include <cstring>
#include <sstream>

#include <gtest/gtest.h>
#include <zlib.h>

// What the command does not show of real files: windows, masks and colour tables, pixel by pixel. tests/tools compares
// the rest with the same table.

namespace
{

using krv::test::AllChannels;
using krv::test::Facts;
using krv::test::OpenTif;
using krv::test::ReadAll;
using Bytes = std::vector<unsigned char>;

std::string Crc(const Bytes& oBytes)
{
    char aText[16];
    std::snprintf(aText, sizeof(aText), "%08lx",
                  crc32_z(crc32(0, nullptr, 0), oBytes.data(), static_cast<z_size_t>(oBytes.size())));
    return aText;
}

// The checksums of pixel-interleaved channels; halves are narrowed back.
std::string Crcs(const Bytes& oPixels, std::size_t nChannels, std::size_t nValueBytes, bool bHalf)
{
    const std::size_t nPixels = oPixels.size() / (nChannels * nValueBytes);
    std::string text;
    for (std::size_t nAt = 0; nAt < nChannels; ++nAt)
    {
        Bytes oChannel;
        for (std::size_t nPixel = 0; nPixel < nPixels; ++nPixel)
        {
            const unsigned char* pValue = oPixels.data() + (nPixel * nChannels + nAt) * nValueBytes;
            float nValue = 0;
            if (bHalf)
                std::memcpy(&nValue, pValue, sizeof(nValue));
            const std::uint16_t nHalf = krv::test::ToHalf(nValue);
            const auto* pFrom = bHalf ? reinterpret_cast<const unsigned char*>(&nHalf) : pValue;
            oChannel.insert(oChannel.end(), pFrom, pFrom + (bHalf ? 2 : nValueBytes));
        }
        text += (nAt == 0 ? "" : ";") + Crc(oChannel);
    }
    return text;
}

void CheckWindow(const Facts& oFacts, const OpenTif& oFile)
{
    const unsigned int nChannels = oFile->GetChanCount();
    const std::unique_ptr<krv::datasources::IChannelInfo> poInfo(oFile->GetChannelInfo(1));
    EXPECT_EQ(std::to_string(poInfo->GetNativeDataType().GetValueBits()), oFacts["bits"]);
    const std::size_t nBytes = poInfo->GetDataType().GetValueBits() / 8;
    const std::unique_ptr<krv::datasources::IRasterIO> poIO(oFile->GetRasterIO(AllChannels(nChannels)));
    if (oFacts["layout"] == "tiles")
    {
        EXPECT_EQ(std::to_string(poIO->GetTileWidth()) + "x" + std::to_string(poIO->GetTileHeight()), oFacts["block"]);
    }
    std::istringstream oWindow(oFacts["window"]);
    unsigned int nX = 0, nY = 0, nWidth = 0, nHeight = 0;
    oWindow >> nX >> nY >> nWidth >> nHeight;
    Bytes oPart(std::size_t{nWidth} * nHeight * nChannels * nBytes);
    poIO->ReadWindow(nX, nY, nWidth, nHeight, oPart.data());
    EXPECT_TRUE(oFacts.IsLossy() || Crcs(oPart, nChannels, nBytes, oFacts.IsHalf()) == oFacts["window_crc32"]);
}

// The checksum of a mask; the table has masks of bytes as they stand and of bits as 0 and 255.
void CheckMask(krv::datasources::IRasterIO& oIO, const std::string& fact)
{
    EXPECT_EQ(std::to_string(oIO.GetFileWidth()) + "x" + std::to_string(oIO.GetFileHeight()),
              fact.substr(0, fact.rfind('x')));
    Bytes oPixels = ReadAll(oIO, 1);
    const std::string crc = fact.substr(fact.find(':') + 1);
    if (Crc(oPixels) == crc)
        return;
    for (unsigned char& nByte : oPixels)
        nByte = static_cast<unsigned char>(nByte * 255);
    EXPECT_EQ(Crc(oPixels), crc);
}

void CheckMasks(const Facts& oFacts, const OpenTif& oFile)
{
    const std::unique_ptr<krv::datasources::IOverviewManager> poLevels(oFile->GetBitmapOverviewManager());
    const auto oNumbers = poLevels != nullptr ? poLevels->GetLevels() : std::vector<unsigned int>();
    std::size_t nMasks = 0, nLevels = 0;
    for (const std::string& fact : oFacts.List("masks", ' '))
    {
        const auto nWidth = static_cast<unsigned int>(std::stoul(fact));
        const bool bFull = nWidth == oFile->GetWidth();
        ASSERT_LT(bFull ? nMasks : nLevels, bFull ? oFile->GetBitmapList().size() : oNumbers.size());
        const std::unique_ptr<krv::datasources::IRasterIO> poIO(
            bFull ? oFile->GetBitmapIO({oFile->GetBitmapList()[nMasks++]})
                  : poLevels->GetOverviewIO(oNumbers[nLevels++], {1}));
        CheckMask(*poIO, fact);
    }
    EXPECT_EQ(nMasks, oFile->GetBitmapList().size());
    EXPECT_EQ(nLevels, oNumbers.size());
}

void CheckPalette(const Facts& oFacts, const OpenTif& oFile)
{
    ASSERT_EQ(oFile->GetPCTList().empty(), !oFacts.Has("palette"));
    if (!oFacts.Has("palette"))
        return;
    const std::unique_ptr<krv::gobs::PCT> poTable(oFile->GetPCT(1));
    Bytes oExact, oNarrow;
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
    EXPECT_TRUE(count + Crc(oExact) == oFacts["palette"] || count + Crc(oNarrow) == oFacts["palette"]);
}

class TifFacts : public ::testing::TestWithParam<const char*>
{
};

TEST_P(TifFacts, FilesOfAFolderAgreeWithTheTable)
{
    unsigned int nFiles = 0;
    for (const Facts& oFacts : krv::test::GetFacts())
    {
        if (!oFacts["file"].starts_with(GetParam() + std::string("/")))
            continue;
        SCOPED_TRACE(oFacts["file"]);
        ++nFiles;
        const OpenTif oFile(oFacts.GetPath());
        CheckWindow(oFacts, oFile);
        CheckMasks(oFacts, oFile);
        CheckPalette(oFacts, oFile);
    }
    if (nFiles == 0)
        GTEST_SKIP() << "no real files in " << krv::test::DataFolder() << "/" << GetParam();
}

INSTANTIATE_TEST_SUITE_P(RealFiles, TifFacts,
                         ::testing::Values("codec", "crs", "dem", "depth", "geometry", "large", "mask", "metadata",
                                           "nodata", "optical", "overview", "palette", "sar"),
                         [](const auto& oInfo) { return std::string(oInfo.param); });

} // namespace
