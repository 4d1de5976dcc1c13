// Files made here: what was written is read, whatever the order, the tiles and the resolution; damage is told.

#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterio.h"
#include "gobs/pct/pct.h"
#include "plugins/jp2/jp2builder.h"
#include "plugins/jp2/jp2dataset.h"
#include "plugins/jp2/reading/jp2source.h"
#include "plugins/support/image/rasterio.h"
#include "tests/support/thrown.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/ogc/cs/crsfactory.h"
#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <fstream>
#include <memory>
#include <numeric>
#include <random>
#include <thread>

namespace krv::plugins::jp2
{

namespace
{

using krv::datasources::IRasterIO;
using krv::gobs::DataType;
using Bytes = std::vector<unsigned char>;
using DatasetPointer = std::unique_ptr<Jp2Dataset>;

DatasetPointer Open(const std::string& file)
{
    static Jp2Builder oBuilder;
    return DatasetPointer(dynamic_cast<Jp2Dataset*>(oBuilder.Open(file, eReadOnly)));
}

DatasetPointer Create(const std::string& file, const std::string& options)
{
    static Jp2Builder oBuilder;
    return DatasetPointer(dynamic_cast<Jp2Dataset*>(oBuilder.Create(file, options)));
}

struct Image
{
    unsigned int mnWidth;
    unsigned int mnHeight;
    unsigned int mnChannels;
    DataType moType;

    std::vector<unsigned int> GetChannels() const
    {
        std::vector<unsigned int> oChannels(mnChannels);
        std::iota(oChannels.begin(), oChannels.end(), 1u);
        return oChannels;
    }
    std::size_t GetPixelBytes() const { return mnChannels * moType.GetBits() / 8; }

    // Slopes with noise: neither constant nor incompressible, of all bits.
    Bytes MakePixels(unsigned int nSeed) const
    {
        std::mt19937 oRandom(nSeed);
        Bytes oPixels(std::size_t{mnWidth} * mnHeight * GetPixelBytes());
        for (std::size_t nAt = 0; nAt < oPixels.size(); ++nAt)
            oPixels[nAt] = static_cast<unsigned char>(nAt / 7 + oRandom() % 5);
        return oPixels;
    }
};

Bytes ReadWindow(IRasterIO& oIO, const Image& oImage, const support::PixelRect& oRect)
{
    Bytes oPixels(std::size_t{oRect.mnWidth} * oRect.mnHeight * oImage.GetPixelBytes());
    oIO.ReadWindow(oRect.mnX, oRect.mnY, oRect.mnWidth, oRect.mnHeight, oPixels.data());
    return oPixels;
}

Bytes ReadAll(Jp2Dataset& oDataset, const Image& oImage)
{
    const std::unique_ptr<IRasterIO> poIO(oDataset.GetRasterIO(oImage.GetChannels()));
    return ReadWindow(*poIO, oImage, {0, 0, oImage.mnWidth, oImage.mnHeight});
}

Bytes Cut(const Bytes& oPixels, const Image& oImage, const support::PixelRect& oRect)
{
    Bytes oCut;
    for (unsigned int nRow = 0; nRow < oRect.mnHeight; ++nRow)
    {
        const auto oFirst =
            oPixels.begin() + static_cast<std::ptrdiff_t>((std::size_t{oRect.mnY + nRow} * oImage.mnWidth + oRect.mnX) *
                                                          oImage.GetPixelBytes());
        oCut.insert(oCut.end(), oFirst, oFirst + static_cast<std::ptrdiff_t>(oRect.mnWidth * oImage.GetPixelBytes()));
    }
    return oCut;
}

// In pieces that are no tiles, from the last to the first one.
void WritePieces(Jp2Dataset& oDataset, const Image& oImage, const Bytes& oPixels, unsigned int nPiece)
{
    const std::unique_ptr<IRasterIO> poIO(oDataset.GetRasterIO(oImage.GetChannels()));
    for (unsigned int nRow = (oImage.mnHeight - 1) / nPiece + 1; nRow-- > 0;)
        for (unsigned int nColumn = (oImage.mnWidth - 1) / nPiece + 1; nColumn-- > 0;)
        {
            const support::PixelRect oRect = {nColumn * nPiece, nRow * nPiece,
                                              std::min(nPiece, oImage.mnWidth - nColumn * nPiece),
                                              std::min(nPiece, oImage.mnHeight - nRow * nPiece)};
            Bytes oPart = Cut(oPixels, oImage, oRect);
            poIO->WriteWindow(oRect.mnX, oRect.mnY, oRect.mnWidth, oRect.mnHeight, oPart.data());
        }
}

std::string Make(const std::string& file, const std::string& options, const Image& oImage, const Bytes& oPixels,
                 unsigned int nPiece = 4096)
{
    const DatasetPointer poDataset = Create(file, options);
    poDataset->Create(oImage.mnWidth, oImage.mnHeight, std::vector<DataType>(oImage.mnChannels, oImage.moType));
    WritePieces(*poDataset, oImage, oPixels, nPiece);
    poDataset->Close();
    return file;
}

Bytes ReadFile(const std::string& file)
{
    std::ifstream oStream(file, std::ios::binary);
    return Bytes(std::istreambuf_iterator<char>(oStream), {});
}

void WriteFile(const std::string& file, const Bytes& oBytes)
{
    std::ofstream(file, std::ios::binary)
        .write(reinterpret_cast<const char*>(oBytes.data()), static_cast<std::streamsize>(oBytes.size()));
}

// Opens and reads everything; the message when that fails, which names the file.
std::string ReadError(const std::string& file)
{
    try
    {
        const DatasetPointer poDataset = Open(file);
        const unsigned int nRows = std::min(poDataset->GetHeight(), 64u),
                           nWidth = std::min(poDataset->GetWidth(), 512u);
        for (unsigned int nChannel = 1; nChannel <= std::min(poDataset->GetChanCount(), 3u); ++nChannel)
        {
            const std::unique_ptr<IRasterIO> poIO(poDataset->GetRasterIO({nChannel}));
            Bytes oPixels(std::size_t{nWidth} * nRows * 4);
            poIO->ReadWindow(0, 0, nWidth, nRows, oPixels.data());
            poIO->ReadWindow(poDataset->GetWidth() - nWidth, poDataset->GetHeight() - nRows, nWidth, nRows,
                             oPixels.data());
        }
        const std::unique_ptr<krv::datasources::IOverviewManager> poLevels(poDataset->GetOverviewManager());
        for (const unsigned int nLevel : poLevels->GetLevels())
        {
            const std::unique_ptr<IRasterIO> poIO(poLevels->GetOverviewIO(nLevel, {1}));
            Bytes oPixels(std::size_t{64} * 64 * 4);
            poIO->ReadWindow(0, 0, std::min(64u, poIO->GetFileWidth()), std::min(64u, poIO->GetFileHeight()),
                             oPixels.data());
        }
        const std::unique_ptr<krv::ogc::cs::ICRS> poCRS(poDataset->ReadCRS());
        poDataset->ReadAuxiliaryData();
        return {};
    }
    catch (const krv::FileException& oException)
    {
        EXPECT_NE(oException.GetMessage().find(file), std::string::npos) << oException.GetMessage();
        return oException.GetMessage();
    }
}

} // namespace

TEST(Jp2Room, WhatIsWrittenIsReadWhateverTheTypeTheTilesAndTheOrder)
{
    const krv::conformance::TempFolder oFolder;
    unsigned int nSeed = 0;
    const std::pair<Image, const char*> CASES[] = {
        {{300, 200, 1, krv::gobs::eDT_16U}, ""},
        {{300, 200, 1, krv::gobs::eDT_16S}, "BLOCKXSIZE=64 BLOCKYSIZE=100 PROGRESSION=CPRL"},
        {{301, 199, 3, krv::gobs::eDT_8U}, "BLOCKXSIZE=128 BLOCKYSIZE=128"},
        {{301, 199, 4, krv::gobs::eDT_8U}, "BLOCKXSIZE=37 BLOCKYSIZE=300 LEVELS=1 COLORTRANSFORM=NO"},
        {{130, 70, 7, krv::gobs::eDT_8S}, "BLOCKXSIZE=8 BLOCKYSIZE=8 BOXES=NO"},
        {{1, 1, 2, krv::gobs::eDT_16U}, "LEVELS=0"},
    };
    for (const auto& [oImage, pOptions] : CASES)
    {
        SCOPED_TRACE(pOptions);
        const Bytes oPixels = oImage.MakePixels(++nSeed);
        const std::string file = Make(oFolder.File("image"), pOptions, oImage, oPixels, nSeed % 2 == 0 ? 50 : 128);
        const DatasetPointer poRead = Open(file);
        EXPECT_EQ(ReadAll(*poRead, oImage), oPixels);
        std::mt19937 oRandom(nSeed);
        const std::unique_ptr<IRasterIO> poIO(poRead->GetRasterIO(oImage.GetChannels()));
        for (int nWindow = 0; nWindow < 20; ++nWindow)
        {
            const unsigned int nX = oRandom() % oImage.mnWidth, nY = oRandom() % oImage.mnHeight;
            const support::PixelRect oRect = {nX, nY, static_cast<unsigned int>(1 + oRandom() % (oImage.mnWidth - nX)),
                                              static_cast<unsigned int>(1 + oRandom() % (oImage.mnHeight - nY))};
            EXPECT_EQ(ReadWindow(*poIO, oImage, oRect), Cut(oPixels, oImage, oRect)) << nX << " " << nY;
        }
    }
}

TEST(Jp2Room, ChangesAreSeenAtOnceAndMakeTheFileAnewAsAWhole)
{
    const krv::conformance::TempFolder oFolder;
    const Image oImage{200, 150, 2, krv::gobs::eDT_16U};
    const std::string file = oFolder.File("image.jp2");
    const DatasetPointer poDataset = Create(file, "BLOCKXSIZE=64 BLOCKYSIZE=64");
    poDataset->Create(oImage.mnWidth, oImage.mnHeight, {oImage.moType, oImage.moType});
    Bytes oExpected(std::size_t{oImage.mnWidth} * oImage.mnHeight * oImage.GetPixelBytes());
    poDataset->Synchronize();
    EXPECT_EQ(ReadAll(*Open(file), oImage), oExpected) << "tiles that nobody wrote are 0";
    std::mt19937 oRandom(7);
    for (int nRound = 0; nRound < 40; ++nRound)
    {
        const unsigned int nX = oRandom() % oImage.mnWidth, nY = oRandom() % oImage.mnHeight;
        const unsigned int nWidth = std::min(1 + static_cast<unsigned int>(oRandom() % 130), oImage.mnWidth - nX);
        const unsigned int nHeight = std::min(1 + static_cast<unsigned int>(oRandom() % 90), oImage.mnHeight - nY);
        const unsigned int nChannel = nRound % 2;
        const std::unique_ptr<IRasterIO> poIO(poDataset->GetRasterIO({nChannel + 1}));
        std::vector<std::uint16_t> oPart(std::size_t{nWidth} * nHeight, static_cast<std::uint16_t>(oRandom()));
        poIO->WriteWindow(nX, nY, nWidth, nHeight, reinterpret_cast<unsigned char*>(oPart.data()));
        auto* pExpected = reinterpret_cast<std::uint16_t*>(oExpected.data());
        for (unsigned int nAt = 0; nAt < nWidth * nHeight; ++nAt)
            pExpected[((nY + nAt / nWidth) * oImage.mnWidth + nX + nAt % nWidth) * 2 + nChannel] = oPart[nAt];
        EXPECT_TRUE(nRound % 7 != 0 || ReadAll(*poDataset, oImage) == oExpected) << nRound;
        if (nRound % 13 == 0)
        {
            poDataset->Synchronize();
            EXPECT_EQ(ReadAll(*Open(file), oImage), oExpected);
        }
    }
    poDataset->Close();
    EXPECT_EQ(ReadAll(*Open(file), oImage), oExpected);
}

TEST(Jp2Room, AQualityOrARatioIsKept)
{
    const krv::conformance::TempFolder oFolder;
    const Image oImage{512, 512, 1, krv::gobs::eDT_8U};
    Bytes oPixels = oImage.MakePixels(1);
    for (std::size_t nAt = 0; nAt < oPixels.size(); ++nAt)
        oPixels[nAt] = static_cast<unsigned char>(120 + 100 * std::sin(nAt % 512 * 0.05) * std::cos(nAt / 512 * 0.03) +
                                                  oPixels[nAt] % 8);
    const auto Noise = [&](const std::string& file)
    {
        const Bytes oRead = ReadAll(*Open(file), oImage);
        double nSum = 0;
        for (std::size_t nAt = 0; nAt < oPixels.size(); ++nAt)
            nSum += std::pow(static_cast<double>(oRead[nAt]) - oPixels[nAt], 2);
        return 10 * std::log10(255.0 * 255.0 * static_cast<double>(oPixels.size()) / nSum);
    };
    EXPECT_NEAR(Noise(Make(oFolder.File("q"), "QUALITY=40", oImage, oPixels)), 40, 3);
    const std::string file = Make(oFolder.File("r"), "RATIO=20", oImage, oPixels);
    EXPECT_NEAR(static_cast<double>(oPixels.size()) / static_cast<double>(ReadFile(file).size()), 20, 4);
    EXPECT_GT(Noise(file), 30);
    const Image oNarrow{64, 64, 1, krv::gobs::eDT_16U};
    const DatasetPointer poDataset = Open(Make(oFolder.File("n"), "NBITS=12", oNarrow, oNarrow.MakePixels(2)));
    const std::unique_ptr<krv::datasources::IChannelInfo> poInfo(poDataset->GetChannelInfo(1));
    EXPECT_EQ(poInfo->GetNativeDataType().GetBits(), 12u);
    const Bytes oRead = ReadAll(*poDataset, oNarrow);
    EXPECT_EQ(*std::max_element(reinterpret_cast<const std::uint16_t*>(oRead.data()),
                                reinterpret_cast<const std::uint16_t*>(oRead.data() + oRead.size())),
              4095);
}

TEST(Jp2Room, WhatIsSaidOfAnImageIsKept)
{
    const krv::conformance::TempFolder oFolder;
    const std::string file = oFolder.File("image.jp2");
    const krv::ogc::cs::GeocodingInfo oPlaces[] = {{399960, 10, 0, 5400000, 0, -10}, {10, 0.5, 0.1, 50, 0.1, -0.5}};
    for (const krv::ogc::cs::GeocodingInfo& oPlace : oPlaces)
    {
        const DatasetPointer poDataset = Create(file, "");
        poDataset->Create(40, 30, std::vector<DataType>(4, krv::gobs::eDT_8U));
        krv::datasources::AuxiliaryData oData(4);
        oData.SetFileMetadataValue("scene", "alps = 1\n%");
        oData.SetFileMetadataValue("NO_DATA_VALUE", "7");
        oData.SetChannelDescription("near infrared", 2);
        oData.SetChanMetadataValue("ColorInterp", "Alpha", 4);
        oData.SetChanMetadataValue("AlphaKind", "Straight", 4);
        poDataset->WriteAuxiliaryData(oData);
        poDataset->UpdateCRS(*krv::ogc::cs::CreateCRSFromEPSG(32632));
        poDataset->SetGeocoding(oPlace);
        poDataset->Close();
        const DatasetPointer poRead = Open(file);
        const krv::datasources::AuxiliaryData oBack = poRead->ReadAuxiliaryData();
        EXPECT_EQ(oBack.GetFileMetadataValue("scene"), "alps = 1\n%");
        EXPECT_EQ(oBack.GetFileMetadataValue("NO_DATA_VALUE"), "7");
        EXPECT_EQ(oBack.GetChannelDescription(2), "near infrared");
        EXPECT_EQ(oBack.GetChanMetadataValue("ColorInterp", 1), "Red");
        EXPECT_EQ(oBack.GetChanMetadataValue("AlphaKind", 4), "Straight");
        EXPECT_EQ(std::unique_ptr<krv::ogc::cs::ICRS>(poRead->ReadCRS())->GetEPSG(), 32632);
        EXPECT_EQ(poRead->GetGeocoding(), oPlace);
    }
    const DatasetPointer poTable = Create(file, "");
    poTable->Create(40, 30, {krv::gobs::eDT_8U});
    krv::gobs::PCT oTable;
    for (int nEntry = 0; nEntry < 256; ++nEntry)
        oTable.Add({nEntry * 1.0, nEntry + 1.0, {static_cast<std::uint16_t>(nEntry * 250), 1, 65535}});
    poTable->CreatePCT(oTable, 1);
    poTable->Close();
    const std::unique_ptr<krv::gobs::PCT> poBack(Open(file)->GetPCT(1));
    ASSERT_EQ(poBack->GetEntries().size(), 256u);
    for (std::size_t nEntry = 0; nEntry < 256; ++nEntry)
        EXPECT_EQ(poBack->GetEntries()[nEntry].colour, oTable.GetEntries()[nEntry].colour);
}

// By areas, as those that do not fit the memory are, a tile has the same pixels.
TEST(Jp2Room, LargeTilesAreReadByAreas)
{
    const krv::conformance::TempFolder oFolder;
    for (const unsigned int nChannels : {1u, 3u})
    {
        const Image oImage{700, 500, nChannels, krv::gobs::eDT_8U};
        const Bytes oPixels = oImage.MakePixels(nChannels);
        const std::string file = Make(oFolder.File("image.j2k"), "", oImage, oPixels);
        const auto poFile = std::make_shared<support::File>(file, support::File::Mode::eRead);
        for (const unsigned int nReduce : {0u, 1u, 3u})
        {
            const auto Read = [&](std::uint64_t nBytes)
            {
                const auto poSource = std::make_shared<Jp2Source>(
                    std::make_shared<Codestream>(poFile, 0, poFile->GetSize()), nReduce, nBytes);
                EXPECT_EQ(poSource->GetLayout().GetBlockWidth() < poSource->GetLayout().GetWidth(), nBytes < 1000000);
                support::RasterIO oIO(
                    std::make_shared<support::BlockImage>(poSource, std::make_shared<support::BlockCache>()),
                    oImage.GetChannels());
                Image oLevel = oImage;
                oLevel.mnWidth = oIO.GetFileWidth();
                oLevel.mnHeight = oIO.GetFileHeight();
                return ReadWindow(oIO, oLevel, {0, 0, oLevel.mnWidth, oLevel.mnHeight});
            };
            EXPECT_EQ(Read(nReduce == 3 ? 10000 : 200000), Read(Resolution::BLOCK_BYTES)) << nReduce;
        }
    }
}

TEST(Jp2Room, HostileHeadersAreRefusedBeforeMemoryIsTaken)
{
    const krv::conformance::TempFolder oFolder;
    const Image oImage{300, 200, 3, krv::gobs::eDT_8U};
    const std::string file =
        Make(oFolder.File("image.j2k"), "BLOCKXSIZE=100 BLOCKYSIZE=100", oImage, oImage.MakePixels(3));
    const Bytes oSound = ReadFile(file);
    // Places in SIZ (which begins at 2) and COD.
    constexpr unsigned char COD[] = {0xFF, 0x52};
    const auto nCod =
        static_cast<std::size_t>(std::search(oSound.begin(), oSound.end(), COD, COD + 2) - oSound.begin());
    struct Fault
    {
        std::size_t mnAt;
        std::size_t mnBytes;
        std::uint64_t mnValue;
        const char* mpWords;
    };
    const Fault FAULTS[] = {
        {8, 4, 0, "out of range"},
        {8, 4, 0xFFFFFFFF, "out of range"},
        {8, 4, 0x7FFFFFFF, "tiles; there can be"},
        {16, 4, 300, "out of range"},
        {24, 4, 0, "out of range"},
        {24, 8, 0x0000000100000001, "is missing"},
        {32, 4, 400, "out of range"},
        {40, 2, 0, "components"},
        {40, 2, 65535, "components"},
        {42, 1, 60, "bits"},
        {43, 1, 0, "no samples"},
        {4, 2, 3, ""},
        {nCod + 6, 2, 65535, "more packets"},
        {nCod + 9, 1, 40, "out of range"},
        {nCod + 10, 1, 11, "out of range"},
        {nCod + 2, 2, 1, "no valid length"},
        {nCod + 2, 2, 65535, ""},
    };
    for (const Fault& oFault : FAULTS)
    {
        Bytes oBytes = oSound;
        for (std::size_t nAt = 0; nAt < oFault.mnBytes; ++nAt)
            oBytes[oFault.mnAt + nAt] = static_cast<unsigned char>(oFault.mnValue >> 8 * (oFault.mnBytes - 1 - nAt));
        WriteFile(file, oBytes);
        const std::string error = ReadError(file);
        EXPECT_NE(error, "") << oFault.mnAt;
        EXPECT_NE(error.find(oFault.mpWords), std::string::npos) << oFault.mnAt << ": " << error;
    }
    // Precincts of one sample: millions of packets.
    Bytes oPrecincts = oSound;
    oPrecincts[nCod + 4] |= 1;
    oPrecincts[nCod + 9] = 0;
    oPrecincts[nCod + 3] = 13;
    oPrecincts.insert(oPrecincts.begin() + static_cast<std::ptrdiff_t>(nCod) + 14, 0);
    for (const std::size_t nAt : {std::size_t{8}, std::size_t{12}, std::size_t{24}, std::size_t{28}})
        oPrecincts[nAt + 2] = 0x40;
    WriteFile(file, oPrecincts);
    EXPECT_NE(ReadError(file).find("takes more than"), std::string::npos) << ReadError(file);
}

// What is cut off fails with a reason, what is there is read; bits that flip never end the program.
TEST(Jp2Room, DamageIsToldAndGoesNoFurther)
{
    const krv::conformance::TempFolder oFolder;
    const Image oImage{200, 120, 1, krv::gobs::eDT_16U};
    const Bytes oPixels = oImage.MakePixels(5);
    const std::string file = Make(oFolder.File("image.jp2"), "BLOCKXSIZE=64 BLOCKYSIZE=64", oImage, oPixels);
    const Bytes oSound = ReadFile(file);
    for (std::size_t nBytes = 0; nBytes < oSound.size(); nBytes += 1 + oSound.size() / 60)
    {
        WriteFile(file, Bytes(oSound.begin(), oSound.begin() + static_cast<std::ptrdiff_t>(nBytes)));
        EXPECT_NE(ReadError(file), "") << nBytes;
    }
    const auto nHalf = static_cast<std::ptrdiff_t>(oSound.size() / 2);
    WriteFile(file, Bytes(oSound.begin(), oSound.begin() + nHalf));
    const DatasetPointer poHalf = Open(file);
    const std::unique_ptr<IRasterIO> poIO(poHalf->GetRasterIO({1}));
    EXPECT_EQ(ReadWindow(*poIO, oImage, {0, 0, 64, 64}), Cut(oPixels, oImage, {0, 0, 64, 64}));
    std::mt19937 oRandom(11);
    for (int nRound = 0; nRound < 300; ++nRound)
    {
        Bytes oBytes = oSound;
        for (int nFault = 0; nFault < 1 + nRound % 4; ++nFault)
            oBytes[oRandom() % (nRound % 2 == 0 ? 400 : oBytes.size())] = static_cast<unsigned char>(oRandom());
        WriteFile(file, oBytes);
        ReadError(file);
    }
}

// Each thread has a dataset of its own over one file.
TEST(Jp2Room, ThreadsReadOneFile)
{
    const krv::conformance::TempFolder oFolder;
    const Image oImage{400, 300, 3, krv::gobs::eDT_8U};
    const Bytes oPixels = oImage.MakePixels(9);
    const std::string file = Make(oFolder.File("image.jp2"), "BLOCKXSIZE=64 BLOCKYSIZE=64", oImage, oPixels);
    std::vector<std::thread> oThreads;
    for (int nThread = 0; nThread < 3; ++nThread)
        oThreads.emplace_back([&] { EXPECT_EQ(ReadAll(*Open(file), oImage), oPixels); });
    for (std::thread& oThread : oThreads)
        oThread.join();
}

} // namespace krv::plugins::jp2
