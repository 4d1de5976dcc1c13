// Real pictures against a table of what other decoders make of them, when the folder with both is there, against
// libvips alone, and damaged; and pictures that are made here.

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/ipageddataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/reader/basicreader.h"
#include "plugins/support/codec/checksum.h"
#include "tests/support/facts.h"
#include "tests/support/outputcapture.h"
#include "tests/support/pixels.h"
#include "tests/support/recipe.h"
#include "tests/support/thrown.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <memory>
#include <set>

#include <vips/vips.h>

using namespace krv::datasources;
using krv::conformance::ReadFile;
using krv::conformance::TempFolder;
using krv::test::Facts;
using krv::test::RecipeImage;

namespace
{

// What libvips presents otherwise than it is stored: palettes as colours, 1 to 4 bits as 8, transparent values as
// opacity, frames as they are composed, inverted CMYK, scaled samples, rows of FITS from the top, turned pictures.
const std::set<std::string> PRESENTED = {"png/basi0g02.png",
                                         "png/basi3p04.png",
                                         "png/basn3p02.png",
                                         "png/i_trns.png",
                                         "png/s03i3p01.png",
                                         "png/s40n3p04.png",
                                         "png/tp1n3p08.png",
                                         "gif/dispose_none.gif",
                                         "gif/gdalicon_interlaced.gif",
                                         "gif/hopper.gif",
                                         "jpeg/cmyk-sample-no-icc.jpg",
                                         "fits/scale.fits",
                                         "fits/arange.fits",
                                         "fits/m13.fits",
                                         "fits/test0.fits",
                                         "avif/abc_color_irot_alpha_NOirot.avif"};

struct Samples
{
    unsigned int mnWidth = 0;
    unsigned int mnHeight = 0;
    std::vector<std::string> moBands;

    friend bool operator==(const Samples&, const Samples&) = default;
};

std::unique_ptr<IDataset> Open(const std::string& file)
{
    return std::unique_ptr<IDataset>(DatasetManager::GetInstance()->Open(file, eReadOnly));
}

Samples ReadSamples(IDataset& oDataset)
{
    auto& oRaster = dynamic_cast<IRasterDataset&>(oDataset);
    Samples oSamples{oRaster.GetWidth(), oRaster.GetHeight(), {}};
    for (unsigned int nChannel = 1; nChannel <= oRaster.GetChanCount(); ++nChannel)
    {
        BasicReader oReader(oDataset.GetName(), {nChannel});
        oSamples.moBands.push_back(krv::test::ReadPixels(oReader));
    }
    return oSamples;
}

// By the loader that libvips chooses itself, all at once.
Samples ReadByVips(const std::string& file)
{
    VipsImage* const pImage = vips_image_new_from_file(file.c_str(), nullptr);
    std::size_t nBytes = 0;
    auto* const pPixels = static_cast<char*>(vips_image_write_to_memory(pImage, &nBytes));
    Samples oSamples{static_cast<unsigned int>(pImage->Xsize), static_cast<unsigned int>(pImage->Ysize), {}};
    const std::size_t nPixel = VIPS_IMAGE_SIZEOF_PEL(pImage), nValue = nPixel / static_cast<std::size_t>(pImage->Bands);
    for (std::size_t nFrom = 0; nFrom < nPixel; nFrom += nValue)
    {
        std::string band;
        for (std::size_t nAt = nFrom; nAt < nBytes; nAt += nPixel)
            band.append(pPixels + nAt, nValue);
        oSamples.moBands.push_back(std::move(band));
    }
    g_free(pPixels);
    g_object_unref(pImage);
    return oSamples;
}

std::string Crc(const std::string& bytes)
{
    std::array<char, 9> aText{};
    std::snprintf(aText.data(), aText.size(), "%08x", krv::plugins::codec::Checksum(0, bytes.data(), bytes.size()));
    return aText.data();
}

double Mean(const std::string& band, std::size_t nValue)
{
    double nSum = 0;
    for (std::size_t nAt = 0; nAt < band.size(); nAt += nValue)
        nSum += static_cast<unsigned char>(band[nAt]) +
                (nValue == 2 ? 256.0 * static_cast<unsigned char>(band[nAt + 1]) : 0);
    return nSum * static_cast<double>(nValue) / static_cast<double>(band.size());
}

void CompareTable(const Facts& oFacts, const Samples& oSamples)
{
    EXPECT_EQ(std::to_string(oSamples.mnWidth), oFacts["width"]);
    EXPECT_EQ(std::to_string(oSamples.mnHeight), oFacts["height"]);
    ASSERT_EQ(std::to_string(oSamples.moBands.size()), oFacts["bands"]);
    for (std::size_t nBand = 0; nBand < oSamples.moBands.size(); ++nBand)
    {
        const std::string& band = oSamples.moBands[nBand];
        if (oFacts["kind"] != "avif")
        {
            EXPECT_EQ(Crc(band), oFacts.List("band_crc32").at(nBand));
            continue;
        }
        // Decoders differ.
        EXPECT_NEAR(Mean(band, oFacts["type"] == "uint8" ? 1 : 2) / std::stod(oFacts.List("band_mean").at(nBand)), 1,
                    0.02);
    }
}

std::string Name(const Facts& oFacts)
{
    return oFacts["file"].substr(std::string("image/").size());
}

std::vector<const Facts*> ListPictures()
{
    std::vector<const Facts*> oPictures;
    for (const Facts& oFacts : krv::test::GetFacts("FACTS2.tsv"))
        if (oFacts["file"].starts_with("image/"))
            oPictures.push_back(&oFacts);
    return oPictures;
}

// All of a picture, or what was thrown.
std::string Read(const std::string& file, Samples& oSamples)
{
    return krv::test::Error(
        [&]
        {
            const auto poDataset = Open(file);
            oSamples = ReadSamples(*poDataset);
        });
}

} // namespace

TEST(Pictures, RealFilesAgreeWithTheTableOrWithLibvips)
{
    if (ListPictures().empty())
        GTEST_SKIP() << "no folder of real files";
    const krv::test::OutputCapture oCapture;
    int nFiles = 0;
    for (const Facts* const pFacts : ListPictures())
    {
        SCOPED_TRACE((*pFacts)["file"]);
        ++nFiles;
        Samples oSamples;
        const std::string error = Read(pFacts->GetPath(), oSamples);
        EXPECT_EQ(error.empty(), pFacts->Has("band_crc32")) << error;
        if (!error.empty())
        {
            EXPECT_NE(error.find(pFacts->GetPath()), std::string::npos) << error;
            continue;
        }
        if (!PRESENTED.contains(Name(*pFacts)))
            CompareTable(*pFacts, oSamples);
        else
        {
            EXPECT_TRUE(oSamples == ReadByVips(pFacts->GetPath()));
            EXPECT_NE(std::to_string(oSamples.moBands.size()) + Crc(oSamples.moBands[0]),
                      (*pFacts)["bands"] + pFacts->List("band_crc32").at(0))
                << "presented as it is stored";
        }
    }
    EXPECT_GE(nFiles, 35);
}

// Cut off anywhere, or with a wrong bit, a picture is an error or what it was; of formats without checksums only its
// size can be known.
TEST(Pictures, DamageIsAnErrorOrDoesNoHarm)
{
    if (ListPictures().empty())
        GTEST_SKIP() << "no folder of real files";
    const krv::test::OutputCapture oCapture;
    const TempFolder oFolder;
    std::uint32_t nRandom = 12345;
    for (const Facts* const pFacts : ListPictures())
    {
        const std::string name = Name(*pFacts), bytes = ReadFile(pFacts->GetPath());
        Samples oWhole;
        if (!Read(pFacts->GetPath(), oWhole).empty() || bytes.size() > 200000)
            continue;
        SCOPED_TRACE(name);
        const std::string file = oFolder.File(std::filesystem::path(name).filename().string());
        for (int nRound = 0; nRound < 12; ++nRound)
        {
            nRandom = nRandom * 1664525 + 1013904223;
            // A last number without an end may be part of one.
            const std::size_t nAt = nRandom % (bytes.size() - 5);
            const bool bCut = nRound % 2 == 0;
            std::string damaged = bCut ? bytes.substr(0, nAt) : bytes;
            if (!bCut)
                damaged[nAt] = static_cast<char>(damaged[nAt] ^ (1 << nRandom / 7 % 8));
            krv::conformance::WriteFile(file, damaged);
            Samples oSamples;
            const std::string error = Read(file, oSamples);
            if (bCut || name.ends_with("png"))
            {
                EXPECT_TRUE(!error.empty() || oSamples == oWhole) << (bCut ? "cut at " : "flipped at ") << nAt;
            }
            if (!error.empty())
            {
                EXPECT_TRUE(error.find(file) != std::string::npos || error == "file: ") << error; // or nobody's
            }
        }
    }
}

// Heads without pixels that claim as many as the formats know, and bits that libvips takes for one number.
TEST(Pictures, GreatClaimsAreRefusedAtOnce)
{
    const TempFolder oFolder;
    const auto Number = [](unsigned int nValue)
    {
        return std::string{static_cast<char>(nValue >> 24), static_cast<char>(nValue >> 16),
                           static_cast<char>(nValue >> 8), static_cast<char>(nValue)};
    };
    const auto Chunk = [&](const std::string& typed)
    {
        return Number(static_cast<unsigned int>(typed.size() - 4)) + typed +
               Number(krv::plugins::codec::Checksum(0, typed.data(), typed.size()));
    };
    using namespace std::string_literals;
    const std::string sides = Number(65500) + Number(65500), shortSides = "\xff\xdc\xff\xdc";
    const std::string frame = "\x00\x11\x08"s + shortSides + "\x03\x01\x22\x00\x02\x11\x01\x03\x11\x01"s;
    const std::string scan = "\xff\xda\x00\x0c\x03\x01\x00\x02\x11\x03\x11\x00\x3f\x00"s + std::string(200, '\x55');
    const std::pair<std::string, std::string> FILES[] = {
        {"a.png", "\x89PNG\r\n\x1a\n" + Chunk("IHDR" + sides + "\x08\x06\x00\x00\x00"s) +
                      Chunk("IDAT" + std::string(500, 'x')) + Chunk("IEND")},
        {"b.png", "\x89PNG\r\n\x1a\n" + Chunk("IHDR" + sides + "\x08\x06\x00\x00\x01"s) +
                      Chunk("IDAT" + std::string(500, 'x')) + Chunk("IEND")},
        {"a.jpg", "\xff\xd8\xff\xc0"s + frame + scan},
        {"b.jpg", "\xff\xd8\xff\xc2"s + frame + scan},
        {"a.gif", "GIF89a"s + shortSides + "\x80\x00\x00\x00\x00\x00\xff\xff\xff,\x00\x00\x00\x00"s + shortSides +
                      "\x00\x02\x02\x44\x01\x00;"s},
        {"a.ppm", "P6\n65500 65500\n255\n" + std::string(100, 'x')},
        {"b.ppm", "P3\n65500 65500\n255\n1 2 3"},
        {"bits.pbm", "P1\n4 2\n1011\n0000\n"}};
    for (const auto& [name, bytes] : FILES)
    {
        Samples oSamples;
        const std::string file = oFolder.Write(name, bytes), error = Read(file, oSamples);
        EXPECT_NE(error.find(file), std::string::npos) << name << ": " << error;
    }
}

// Whatever the order of the windows, upwards too.
TEST(Pictures, WindowsInAnyOrderEqualThePicture)
{
    const TempFolder oFolder;
    const std::string file = oFolder.File("tall.png");
    constexpr unsigned int WIDTH = 700, HEIGHT = 3000;
    const std::string pixels = RecipeImage(WIDTH, HEIGHT, {1, 2, 3}, krv::gobs::eDT_8U);
    {
        const std::unique_ptr<IDataset> poNew(DatasetManager::GetInstance()->NewDataset(file, "png", "COMPRESSION=1"));
        auto& oRaster = dynamic_cast<IRasterDataset&>(*poNew);
        oRaster.Create(WIDTH, HEIGHT, std::vector<krv::gobs::DataType>(3, krv::gobs::eDT_8U));
        const std::unique_ptr<IRasterIO> poIO(oRaster.GetRasterIO({1, 2, 3}));
        // Tiles from the last to the first.
        for (unsigned int nTile = HEIGHT / 250; nTile-- > 0;)
            poIO->WriteWindow(0u, nTile * 250, WIDTH, 250u,
                              reinterpret_cast<unsigned char*>(const_cast<char*>(pixels.data())) +
                                  std::size_t{nTile} * 250 * WIDTH * 3);
        EXPECT_FALSE(std::filesystem::exists(file)) << "before it is whole";
        EXPECT_EQ(std::distance(std::filesystem::directory_iterator(oFolder.GetPath()), {}), 0) << "nor anything else";
        poNew->Synchronize();
    }
    EXPECT_EQ(std::distance(std::filesystem::directory_iterator(oFolder.GetPath()), {}), 1);
    BasicReader oReader(file, {1, 2, 3});
    EXPECT_TRUE(krv::test::ReadPixels(oReader) == pixels);
    for (const unsigned int nY : {2900u, 5u, 1400u, 700u, 2899u, 0u})
    {
        const std::unique_ptr<krv::gobs::Raster> poPart(oReader.ReadRaster(0, static_cast<int>(nY), WIDTH, 100));
        EXPECT_TRUE(krv::test::PixelsOf(*poPart) ==
                    pixels.substr(std::size_t{nY} * WIDTH * 3, std::size_t{WIDTH} * 300))
            << nY;
    }
}

TEST(Pictures, EachTypeKeepsWhatItHoldsAndRefusesTheRest)
{
    const TempFolder oFolder;
    const krv::test::OutputCapture oCapture;
    struct Case
    {
        std::string moType;
        krv::gobs::NativeDataTypeCode meType;
        unsigned int mnChannels;
        std::string moRefusal;
    };
    const Case CASES[] = {{"PNG", krv::gobs::eDT_8U, 1, ""},
                          {"png", krv::gobs::eDT_16U, 4, ""},
                          {"png", krv::gobs::eDT_16U, 2, ""},
                          {"WEBP", krv::gobs::eDT_8U, 3, ""},
                          {"ppm", krv::gobs::eDT_8U, 3, ""},
                          {"pgm", krv::gobs::eDT_16U, 1, ""},
                          {"pgm", krv::gobs::eDT_32R, 1, "PNM pictures hold 8U, 16U, not 32R"},
                          {"png", krv::gobs::eDT_32R, 1, "PNG pictures hold 8U, 16U, not 32R"},
                          {"png", krv::gobs::eDT_8U, 5, "1, 2, 3 or 4 channels, not 5"},
                          {"jpg", krv::gobs::eDT_16U, 1, "JPEG pictures hold 8U, not 16U"},
                          {"jpg", krv::gobs::eDT_8U, 4, "1 or 3 channels, not 4"}};
    for (const Case& oCase : CASES)
    {
        SCOPED_TRACE(oCase.moType + " " + std::to_string(oCase.mnChannels));
        const std::string file = oFolder.File("picture");
        const std::unique_ptr<IDataset> poNew(DatasetManager::GetInstance()->NewDataset(file, oCase.moType, ""));
        auto& oRaster = dynamic_cast<IRasterDataset&>(*poNew);
        const std::vector<krv::gobs::DataType> oTypes(oCase.mnChannels, oCase.meType);
        const std::string error = krv::test::Error([&] { oRaster.Create(90, 70, oTypes); });
        EXPECT_NE(error.find(oCase.moRefusal), std::string::npos) << error;
        if (!oCase.moRefusal.empty())
            continue;
        std::vector<unsigned int> oAll;
        for (unsigned int nChannel = 1; nChannel <= oCase.mnChannels; ++nChannel)
            oAll.push_back(nChannel);
        std::string pixels = RecipeImage(90, 70, oAll, oCase.meType);
        std::unique_ptr<IRasterIO>(oRaster.GetRasterIO(oAll))
            ->WriteWindow(0u, 0u, 90u, 70u, reinterpret_cast<unsigned char*>(pixels.data()));
        poNew->Close();
        EXPECT_TRUE(krv::test::ReadPixels(BasicReader(file, oAll)) == pixels);
    }
}

// A program that is killed leaves neither half of a picture nor a scratch file.
TEST(Pictures, KilledProgramsLeaveNothing)
{
    const TempFolder oFolder, oScratch;
    const pid_t nChild = ::fork();
    if (nChild == 0)
    {
        ::setenv("TMPDIR", oScratch.GetPath().c_str(), 1);
        const std::unique_ptr<IDataset> poNew(
            DatasetManager::GetInstance()->NewDataset(oFolder.File("a.png"), "png", ""));
        auto& oRaster = dynamic_cast<IRasterDataset&>(*poNew);
        oRaster.Create(300, 300, {krv::gobs::eDT_8U});
        std::string pixels(90000, 'x');
        std::unique_ptr<IRasterIO>(oRaster.GetRasterIO({1}))
            ->WriteWindow(0u, 0u, 300u, 300u, reinterpret_cast<unsigned char*>(pixels.data()));
        ::kill(::getpid(), SIGKILL);
    }
    int nStatus = 0;
    ::waitpid(nChild, &nStatus, 0);
    EXPECT_TRUE(WIFSIGNALED(nStatus));
    for (const TempFolder* const pFolder : {&oFolder, &oScratch})
        EXPECT_TRUE(std::filesystem::is_empty(pFolder->GetPath()));
}

TEST(Pictures, FactsBesideThePixelsAreTold)
{
    const std::string folder = krv::test::DataFolder() + "/image/";
    if (ListPictures().empty())
        GTEST_SKIP() << "no folder of real files";
    EXPECT_EQ(Open(folder + "jpeg/hopper_orientation_6.jpg")->ReadAuxiliaryData().GetFileMetadataValue("Orientation"),
              "6");
    const TempFolder oFolder;
    const std::string file = oFolder.Write("a.gif", ReadFile(folder + "gif/dispose_none.gif"));
    oFolder.Write("a.gfw", "2\n0\n0\n-2\n101\n199\n");
    const auto poFirst = Open(file);
    EXPECT_EQ(dynamic_cast<IPagedDataset&>(*poFirst).CountFurtherImages(), 4u);
    const krv::ogc::cs::GeocodingInfo oPlace(100, 2, 0, 200, 0, -2);
    EXPECT_TRUE(dynamic_cast<IGeocodedDataset&>(*poFirst).GetGeocoding() == oPlace);
    const auto OpenPage = [&](const std::string& page)
    {
        return Open(file + "[page=" + page + "]");
    };
    const auto Pixels = [](IDataset& oDataset)
    {
        std::string pixels(30000, '\0');
        std::unique_ptr<IRasterIO>(dynamic_cast<IRasterDataset&>(oDataset).GetRasterIO({1, 2, 3}))
            ->ReadWindow(0u, 0u, 100u, 100u, reinterpret_cast<unsigned char*>(pixels.data()));
        return pixels;
    };
    EXPECT_TRUE(Pixels(*OpenPage("1")) == Pixels(*poFirst));
    EXPECT_FALSE(Pixels(*OpenPage("2")) == Pixels(*poFirst));
    EXPECT_TRUE(dynamic_cast<IGeocodedDataset&>(*OpenPage("5")).GetGeocoding() == oPlace);
    EXPECT_EQ(dynamic_cast<IPagedDataset&>(*OpenPage("3")).CountFurtherImages(), 2u);
    EXPECT_NE(krv::test::Error([&] { OpenPage("6"); }).find("there is no page 6; the last one is 5"),
              std::string::npos);
    EXPECT_NE(krv::test::Error([&] { Open(oFolder.File("none.gif[page=2]")); }).find("none.gif"), std::string::npos);
    krv::conformance::WriteFile(file + "[page=2]", ReadFile(folder + "gif/hopper.gif"));
    EXPECT_EQ(dynamic_cast<IRasterDataset&>(*OpenPage("2")).GetWidth(), 128u) << "a file of that very name";
}
