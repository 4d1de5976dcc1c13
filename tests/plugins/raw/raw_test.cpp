#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/ipctdataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/reader/basicreader.h"
#include "gobs/pct/pct.h"
#include "plugins/raw/rawimage.h"
#include "tests/support/pixels.h"
#include "tests/support/recipe.h"
#include "tests/support/thrown.h"
#include "toolkit/ogc/cs/crsfactory.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>
#include <memory>
#include <random>
#include <sstream>

using namespace krv::datasources;
using krv::conformance::ReadFile;
using krv::conformance::TempFolder;
using krv::test::RecipeImage;

namespace
{

const std::string BASE = "ENVI\nsamples = 5\nlines = 4\nbands = 2\ndata type = 2\ninterleave = bsq\n";

// The same with other lines in place of those of their keys.
std::string With(const std::string& lines)
{
    std::string header = BASE;
    std::istringstream oLines(lines);
    for (std::string line; std::getline(oLines, line); header += line + "\n")
        if (const std::size_t nAt = header.find("\n" + line.substr(0, line.find('=')) + "="); nAt != std::string::npos)
            header.erase(nAt + 1, header.find('\n', nAt + 1) - nAt);
    return header;
}

std::unique_ptr<IDataset> Open(const std::string& file, AccessMode eMode = eReadOnly)
{
    return std::unique_ptr<IDataset>(DatasetManager::GetInstance()->Open(file, eMode));
}

std::unique_ptr<IDataset> Create(const std::string& file, const std::string& options)
{
    return std::unique_ptr<IDataset>(DatasetManager::GetInstance()->NewDataset(file, "RAW", options));
}

IRasterDataset& Rasters(IDataset& oDataset)
{
    return dynamic_cast<IRasterDataset&>(oDataset);
}

void WriteChannels(IDataset& oDataset, const std::vector<unsigned int>& oChannels, const krv::gobs::DataType& oType)
{
    const std::unique_ptr<IRasterIO> poIO(Rasters(oDataset).GetRasterIO(oChannels));
    std::string pixels = RecipeImage(poIO->GetFileWidth(), poIO->GetFileHeight(), oChannels, oType);
    poIO->WriteWindow(0u, 0u, poIO->GetFileWidth(), poIO->GetFileHeight(),
                      reinterpret_cast<unsigned char*>(pixels.data()));
}

// What opening says, with FILE for the data file's name without its ending.
std::string OpenError(const std::string& header, std::size_t nBytes)
{
    const TempFolder oFolder;
    const std::string stem = oFolder.File("x");
    oFolder.Write("x.img", std::string(nBytes, 'p'));
    oFolder.Write("x.hdr", header);
    std::string error = krv::test::Error([&] { Open(stem + ".img"); });
    for (std::size_t nAt = error.find(stem); nAt != std::string::npos; nAt = error.find(stem))
        error.replace(nAt, stem.size(), "FILE");
    return error;
}

} // namespace

TEST(RawFormat, HeadersAreHostile)
{
    std::string returns = BASE;
    std::replace(returns.begin(), returns.end(), '\n', '\r');
    const std::tuple<std::string, std::size_t, std::string> HEADERS[] = {
        {BASE, 80, ""},
        {BASE, 90, ""},
        {BASE, 79, "file: FILE.img is shorter than its header says: 79 bytes in place of 80"},
        {BASE, 39, "file: "},
        {BASE, 80 + 4097, "file: "},
        {"ENVI\r\n; all\r\nSAMPLES=5\r\n lines =4\r\nData  Type=2\r\n", 40, ""},
        {"ENVI\nsamples = 5\nlines = 4\n", 80, "file: FILE.hdr: the header has no \"data type\""},
        {With("samples = -5\n"), 80, "file: FILE.hdr: \"samples = -5\" is not a number from 1 to 2147483647"},
        {With("lines = 0\n"), 80, "file: FILE.hdr: \"lines = 0\" is not a number from 1 to 2147483647"},
        {With("lines = 4.0\n"), 80, "file: FILE.hdr: \"lines = 4.0\" is not a number from 1 to 2147483647"},
        {With("bands = 100001\n"), 80, "file: FILE.hdr: \"bands = 100001\" is not a number from 1 to 100000"},
        {With("header offset = 99999999999999999999\n"), 80,
         "file: FILE.hdr: \"header offset = 99999999999999999999\" is not a number from 0 to 9223372036854775807"},
        {With("header offset = 9223372036854775807\n"), 80, "file: "},
        {With("data type = 7\n"), 80,
         "file: FILE.hdr: \"data type = 7\" is not one of 1, 2, 3, 4, 5, 6, 9, 12, 13, 14, 15"},
        {With("interleave = bup\n"), 80, "file: FILE.hdr: \"interleave = bup\" is not bsq, bil or bip"},
        {With("byte order = 2\n"), 80, "file: FILE.hdr: \"byte order = 2\" is not a number from 0 to 1"},
        {BASE + "file compression = 1\n", 80,
         "file: FILE.hdr: \"file compression = 1\" is not 0: compressed files cannot be read"},
        {With("samples = 2147483647\nlines = 2147483647\ndata type = 9\n"), 80, "file: "},
        {BASE + "band names = {a, b", 80, ""},
        {BASE + "Samples=5\n", 80, ""},
        {BASE + "Samples=4\n", 80, "file: FILE.hdr: \"samples\" stands there twice, with different values"},
        {"\xEF\xBB\xBF" + BASE, 80, ""},
        {returns, 80, ""},
        {"ENVI\nsamples =\n{5}\nlines=4\ndata type=2\n", 40, ""},
        {"ENVIsamples = 5\n", 80, "file: "},
        {"nothing of this kind\n", 80, "file: "},
        {BASE + std::string(1, '\0'), 80, "file: "}};
    for (const auto& [header, nBytes, error] : HEADERS)
        EXPECT_EQ(OpenError(header, nBytes), error) << header;
}

// One that ends earlier than when it was opened is told of; pixels of a file that lost its name are still there.
TEST(RawFormat, FilesMayShrinkAndVanish)
{
    const TempFolder oFolder;
    oFolder.Write("x.hdr", BASE);
    const std::string file = oFolder.Write("x.img", std::string(80, 'p'));
    const auto poDataset = Open(file, eUpdate);
    const auto Read = [&]
    {
        std::string pixels(80, '?');
        const std::unique_ptr<IRasterIO> poIO(Rasters(*poDataset).GetRasterIO({2, 1}));
        poIO->ReadWindow(0u, 0u, 5u, 4u, reinterpret_cast<unsigned char*>(pixels.data()));
        return pixels;
    };
    std::filesystem::resize_file(file, 50);
    EXPECT_NE(krv::test::Error(Read).find(file), std::string::npos);
    std::filesystem::resize_file(file, 5000);
    EXPECT_NE(Read().find('p'), std::string::npos);
    std::filesystem::remove(file);
    std::filesystem::remove(oFolder.File("x.hdr"));
    EXPECT_NE(Read().find('p'), std::string::npos);
    EXPECT_EQ(krv::test::Error([&] { poDataset->Close(); }), "");
}

// Whatever belongs to another is left to it, by its first bytes or by its size.
TEST(RawFormat, FilesBelongToTheirHeaders)
{
    const TempFolder oFolder;
    oFolder.Write("x.hdr", BASE);
    for (const char* pName : {"x.img", "x.dat", "x", "x.IMG"})
        oFolder.Write(pName, std::string(80, 'p'));
    oFolder.Write("x.tif", "II*" + std::string(1, '\0') + std::string(76, 'p'));
    oFolder.Write("x.txt", "notes\n");
    oFolder.Write("y.img.hdr", BASE);
    oFolder.Write("y.hdr", "no header");
    oFolder.Write("y.img", std::string(80, 'q'));
    oFolder.Write("z.hdr", BASE);
    oFolder.Write("w.dat.hdr", With("lines = 100\n"));
    oFolder.Write("w.hdr", BASE);
    oFolder.Write("w.dat", std::string(80, 'r'));
    for (const char* pName : {"x.img", "x.dat", "x", "x.IMG", "x.hdr", "y.img", "y.img.hdr", "w.dat"})
        EXPECT_EQ(krv::test::Error([&] { Open(oFolder.File(pName)); }), "") << pName;
    EXPECT_EQ(Open(oFolder.File("y.img.hdr"))->GetName(), oFolder.File("y.img"));
    for (const char* pName : {"x.tif", "x.txt", "y.hdr", "z.hdr", "none.img"})
        EXPECT_NE(krv::test::Error([&] { Open(oFolder.File(pName)); }), "") << pName;
}

// The last channel of each.
TEST(RawFormat, EsriHeadersSayWhereValuesLie)
{
    using namespace krv::gobs;
    const std::string size = "NROWS 2\nNCOLS 2\nNBANDS 2\n";
    const std::tuple<std::string, std::string, DataType, std::string> FILES[] = {
        {"\xEF\xBB\xBF"
         "BYTEORDER M\rNROWS 1\rNCOLS 2\rNBITS 16\r",
         std::string("\0\1\2\0", 4), eDT_16U, std::string("\1\0\0\2", 4)},
        {"NROWS 1\nNCOLS 4\nNODATA -1\n", "abcd", eDT_8S, "abcd"},
        {size + "LAYOUT BSQ\nTOTALROWBYTES 2\nBANDGAPBYTES 3\n", "abcd...efgh", eDT_8U, "efgh"},
        {size + "LAYOUT BSQ\nBANDROWBYTES 3\n", "ab.cd.ef.gh.", eDT_8U, "efgh"},
        {size + "LAYOUT BIL\nBANDROWBYTES 3\nTOTALROWBYTES 7\n", "ab.ef.:cd.gh.:", eDT_8U, "efgh"},
        {size + "LAYOUT BIP\nTOTALROWBYTES 5\n", "aebf.cgdh.", eDT_8U, "efgh"}};
    const TempFolder oFolder;
    for (const auto& [header, data, oType, expected] : FILES)
    {
        oFolder.Write("x.hdr", header);
        const auto poDataset = Open(oFolder.Write("x.bil", data));
        BasicReader oReader(poDataset.get(), std::vector<unsigned int>{Rasters(*poDataset).GetChanCount()}, false);
        EXPECT_EQ(oReader.GetDataType(), oType) << header;
        EXPECT_EQ(krv::test::ReadPixels(oReader), expected) << header;
    }
    oFolder.Write("x.hdr", size + "LAYOUT BSQ\nBANDGAPBYTES 8000000000000\n");
    EXPECT_NE(krv::test::Error([&] { Open(oFolder.File("x.bil")); }), "");
}

// Random windows of random channels, of every layout and byte order, read and written, beside a naive model.
TEST(RawFormat, WindowsAgreeWithAModel)
{
    constexpr unsigned int WIDTH = 301, HEIGHT = 97, CHANNELS = 5;
    std::mt19937 oRandom(14);
    const auto Up = [&oRandom](unsigned int nMost)
    {
        return static_cast<unsigned int>(oRandom() % (nMost + 1));
    };
    for (const krv::gobs::NativeDataTypeCode eType :
         {krv::gobs::eDT_8U, krv::gobs::eDT_16S, krv::gobs::eDT_64R, krv::gobs::eDT_C32R})
        for (const char* pOptions : {"INTERLEAVE=BSQ BYTEORDER=BIG", "INTERLEAVE=BIL BYTEORDER=BIG",
                                     "INTERLEAVE=BIP BYTEORDER=BIG", "INTERLEAVE=BIL", "INTERLEAVE=BIP", ""})
        {
            SCOPED_TRACE(std::to_string(eType) + pOptions);
            const TempFolder oFolder;
            const std::size_t nBytes = krv::gobs::DataType(eType).GetValueBits() / 8;
            const auto poDataset = Create(oFolder.File("x.img"), pOptions);
            Rasters(*poDataset).Create(WIDTH, HEIGHT, std::vector<krv::gobs::DataType>(CHANNELS, eType));
            std::string model = RecipeImage(WIDTH, HEIGHT, {1, 2, 3, 4, 5}, eType);
            WriteChannels(*poDataset, {1, 2, 3, 4, 5}, eType);
            for (int nRound = 0; nRound < 60; ++nRound)
            {
                const unsigned int nX = Up(WIDTH - 1), nY = Up(HEIGHT - 1);
                const unsigned int nWidth = 1 + Up(WIDTH - 1 - nX), nHeight = 1 + Up(HEIGHT - 1 - nY);
                std::vector<unsigned int> oChannels(CHANNELS);
                std::generate(oChannels.begin(), oChannels.end(), [n = 1u]() mutable { return n++; });
                std::shuffle(oChannels.begin(), oChannels.end(), oRandom);
                oChannels.resize(1 + Up(CHANNELS - 1));
                std::string window(nBytes * nWidth * nHeight * oChannels.size(), '?');
                const bool bWrite = nRound % 2 == 0;
                if (bWrite)
                    std::generate(window.begin(), window.end(), [&] { return static_cast<char>(oRandom()); });
                const std::unique_ptr<IRasterIO> poIO(Rasters(*poDataset).GetRasterIO(oChannels));
                auto* const pWindow = reinterpret_cast<unsigned char*>(window.data());
                if (bWrite)
                    poIO->WriteWindow(nX, nY, nWidth, nHeight, pWindow);
                else
                    poIO->ReadWindow(nX, nY, nWidth, nHeight, pWindow);
                std::string expected = window;
                for (std::size_t nAt = 0; nAt < std::size_t{nWidth} * nHeight; ++nAt)
                    for (std::size_t c = 0; c < oChannels.size(); ++c)
                    {
                        const std::size_t nPixel = (nY + nAt / nWidth) * WIDTH + nX + nAt % nWidth;
                        char* const pModel = &model[(nPixel * CHANNELS + oChannels[c] - 1) * nBytes];
                        char* const pExpected = &expected[(nAt * oChannels.size() + c) * nBytes];
                        std::copy_n(bWrite ? pExpected : pModel, nBytes, bWrite ? pModel : pExpected);
                    }
                ASSERT_TRUE(window == expected) << "round " << nRound;
            }
            poDataset->Close();
            EXPECT_TRUE(krv::test::ReadPixels(BasicReader(oFolder.File("x.img"))) == model);
        }
}

// Every kind of line comes back, and what did not change keeps its bytes.
TEST(RawFormat, HeadersAreChangedAsAWhole)
{
    const TempFolder oFolder;
    const std::string header = BASE + "; a comment\nSensor  Type = Own, or not\nband names = {a,\n b}\n"
                                      "wavelength units = nm\nwavelength = {1.5, 2.5}\nlist = {1,\n 2}\n";
    oFolder.Write("x.hdr", header);
    const std::string file = oFolder.Write("x.img", std::string(80, 'p'));
    {
        const auto poDataset = Open(file, eUpdate);
        AuxiliaryData oTags = poDataset->ReadAuxiliaryData();
        EXPECT_EQ(oTags.GetFileMetadata(), (MetadataMap{{"list", "{1,\n 2}"}, {"Sensor  Type", "Own, or not"}}));
        EXPECT_EQ(oTags.GetChannelDescription(2), "b");
        EXPECT_EQ(oTags.GetChanMetadata(1), (MetadataMap{{"Wavelength", "1.5"}, {"WavelengthUnits", "nm"}}));
        poDataset->WriteAuxiliaryData(oTags);
        poDataset->Synchronize();
        EXPECT_EQ(ReadFile(oFolder.File("x.hdr")), header);
        oTags.SetFileMetadataValue("NO_DATA_VALUE", "-1");
        oTags.SetFileMetadataValue("two lines", "a\nb");
        oTags.SetChannelDescription("with, a comma", 1);
        oTags.SetChanMetadataValue("own", "<&>", 2);
        poDataset->WriteAuxiliaryData(oTags);
        dynamic_cast<IGeocodedDataset&>(*poDataset).SetGeocoding({1, 2, 0.5, 3, 0.25, -4});
        poDataset->UpdateCRS(*krv::ogc::cs::CreateCRSFromEPSG(25832));
        WriteChannels(*poDataset, {2}, krv::gobs::eDT_16S);
        poDataset->Close();
    }
    EXPECT_NE(ReadFile(oFolder.File("x.hdr")).find("; a comment\nSensor  Type = Own, or not\n"), std::string::npos);
    EXPECT_NE(ReadFile(oFolder.File("x.hdr")).find("data ignore value = -1\n"), std::string::npos);
    const auto poDataset = Open(file);
    const AuxiliaryData oTags = poDataset->ReadAuxiliaryData();
    EXPECT_EQ(oTags.GetFileMetadataValue("two lines"), "a\nb");
    EXPECT_EQ(oTags.GetChannelDescription(1), "with, a comma");
    EXPECT_EQ(oTags.GetChannelDescription(2), "b");
    EXPECT_EQ(oTags.GetChanMetadataValue("own", 2), "<&>");
    EXPECT_TRUE(dynamic_cast<IGeocodedDataset&>(*poDataset).GetGeocoding() ==
                krv::ogc::cs::GeocodingInfo(1, 2, 0.5, 3, 0.25, -4));
    EXPECT_EQ(std::unique_ptr<krv::ogc::cs::ICRS>(poDataset->ReadCRS())->GetEPSG(), 25832);
    EXPECT_TRUE(krv::test::ReadPixels(BasicReader(file, {2})) == RecipeImage(5, 4, {2}, krv::gobs::eDT_16S));
    EXPECT_EQ(krv::test::ReadPixels(BasicReader(file, {1})), std::string(40, 'p'));
}

TEST(RawFormat, ClassesAreAColourTable)
{
    const TempFolder oFolder;
    const std::string file = oFolder.File("x.dat");
    const auto poTable = krv::gobs::PCT::FromColours({{0, 0, 0}, {65535, 257, 514}});
    {
        const auto poDataset = Create(file, "");
        Rasters(*poDataset).Create(3, 2, {krv::gobs::eDT_8U});
        auto& oTables = dynamic_cast<IPCTDataset&>(*poDataset);
        EXPECT_THROW(oTables.CreatePCT(krv::gobs::PCT::FromColours({{1, 2, 3}}), 1), krv::DataException);
        EXPECT_EQ(oTables.CreatePCT(poTable, 1), 1u);
        poDataset->Close();
    }
    EXPECT_NE(ReadFile(oFolder.File("x.hdr")).find("class lookup = {0, 0, 0, 255, 1, 2}\n"), std::string::npos);
    const auto poDataset = Open(file, eUpdate);
    auto& oTables = dynamic_cast<IPCTDataset&>(*poDataset);
    const std::unique_ptr<krv::gobs::PCT> poRead(oTables.GetPCT(1));
    EXPECT_TRUE(poRead->GetEntries()[1].colour == poTable.GetEntries()[1].colour);
    oTables.DeletePCT(1);
    EXPECT_TRUE(oTables.GetPCTList().empty());
}

// No header is ever beside pixels of another file: of two files of one stem each has its own.
TEST(RawFormat, NewFilesDoNotTakeTheHeadersOfOthers)
{
    const TempFolder oFolder;
    const auto Make = [&](const std::string& name, unsigned int nWidth)
    {
        const auto poDataset = Create(oFolder.File(name), "");
        Rasters(*poDataset).Create(nWidth, 2, {krv::gobs::eDT_8U});
        poDataset->Close();
    };
    Make("x.img", 3);
    Make("x.dat", 4);
    Make("x.img", 5);
    Make("n.bil", 6);
    EXPECT_NE(ReadFile(oFolder.File("n.hdr")).find("interleave = bil\n"), std::string::npos);
    EXPECT_EQ(Open(oFolder.File("n.bil"))->Delete(), eDone);
    EXPECT_EQ(Rasters(*Open(oFolder.File("x.img"))).GetWidth(), 5u);
    EXPECT_EQ(Rasters(*Open(oFolder.File("x.dat"))).GetWidth(), 4u);
    EXPECT_EQ(std::distance(std::filesystem::directory_iterator(oFolder.GetPath()), {}), 4);
    EXPECT_EQ(Open(oFolder.File("x.dat"))->Delete(), eDone);
    EXPECT_EQ(std::distance(std::filesystem::directory_iterator(oFolder.GetPath()), {}), 2);
    const auto poDataset = Create(oFolder.File("y.img"), "");
    EXPECT_THROW(Rasters(*poDataset).Create(3, 2, {krv::gobs::eDT_8S}), krv::DataException);
    EXPECT_THROW(Rasters(*poDataset).Create(3, 2, {krv::gobs::eDT_8U, krv::gobs::eDT_16U}), krv::DataException);
    EXPECT_THROW(Create(oFolder.File("z.hdr"), ""), krv::DataException);
    EXPECT_THROW(Create(oFolder.File("z.img"), "INTERLEAVE=BUP"), krv::DataException);
}
