#include "datasources/metadata/auxiliarydata.h"
#include "gobs/raster/rasterinfo.h"
#include "tests/plugins/tif/tifsupport.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/ogc/cs/crsfactory.h"

#include <chrono>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <map>
#include <thread>

#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <tiffio.h>
#include <unistd.h>

namespace
{

using namespace krv::test;
using krv::datasources::AuxiliaryData;
using krv::gobs::DataType;

constexpr const char* KINDS[] = {"COMPRESS=NONE BLOCKXSIZE=32 BLOCKYSIZE=32", "COMPRESS=DEFLATE TILED=NO BLOCKYSIZE=7",
                                 "COMPRESS=LZW BLOCKXSIZE=48 BLOCKYSIZE=16 INTERLEAVE=BAND",
                                 "COMPRESS=ZSTD BLOCKXSIZE=64 BLOCKYSIZE=64 BIGTIFF=YES"};

// What a writer does besides filling all pixels with the number of the state, and the same number as a reader finds it;
// nothing when there is none yet.
struct WayOfWriting
{
    const char* mpName;
    void (*mpWrite)(krv::plugins::tif::TifDataset&, unsigned char nState);
    Bytes (*mpRead)(krv::plugins::tif::TifDataset&);
};

void WriteState(krv::plugins::tif::TifDataset& oDataset, const WayOfWriting& oWay, unsigned char nState)
{
    oWay.mpWrite(oDataset, nState);
    WriteAll(oDataset, Bytes(std::size_t{300} * 200 * oDataset.GetChanCount(), nState));
}

constexpr WayOfWriting WAYS[] = {
    {"pixels", [](auto&, unsigned char) {},
     [](auto&)
     {
         return Bytes();
     }},
    {"metadata",
     [](auto& oDataset, unsigned char nState)
     {
         AuxiliaryData oData = oDataset.ReadAuxiliaryData();
         oData.SetFileMetadataValue("State", std::string(nState * 99U, 'x'));
         oDataset.WriteAuxiliaryData(oData);
     },
     [](auto& oDataset)
     {
         const std::size_t nLength = oDataset.ReadAuxiliaryData().GetFileMetadataValue("State").size();
         return Bytes(1, static_cast<unsigned char>(nLength / 99));
     }},
    {"levels",
     [](auto& oDataset, unsigned char nState)
     {
         const std::unique_ptr<krv::datasources::IOverviewManager> poLevels(oDataset.GetOverviewManager());
         if (!poLevels->GetLevels().empty())
             poLevels->DeleteLevel(2);
         poLevels->CreateLevel(2);
         WriteAll(*IOPointer(poLevels->GetOverviewIO(2, {1})), 1, Bytes(150 * 100, nState));
     },
     [](auto& oDataset)
     {
         const std::unique_ptr<krv::datasources::IOverviewManager> poLevels(oDataset.GetOverviewManager());
         if (poLevels->GetLevels().empty())
             return Bytes();
         return ReadAll(*IOPointer(poLevels->GetOverviewIO(2, {1})), 1);
     }},
    {"bitmaps",
     [](auto& oDataset, unsigned char nState)
     {
         for (const unsigned int nBitmap : oDataset.GetBitmapList())
             oDataset.DeleteBitmap(nBitmap);
         const unsigned int nBitmap = oDataset.CreateBitmap();
         oDataset.SetBitmapDescription(nBitmap, std::to_string(nState));
         WriteAll(*IOPointer(oDataset.GetBitmapIO({nBitmap})), 1, Bytes(300 * 200, nState & 1));
     },
     [](auto& oDataset)
     {
         if (oDataset.GetBitmapList().empty())
             return Bytes();
         const unsigned int nBitmap = oDataset.GetBitmapList().front();
         const auto nState = static_cast<unsigned char>(std::stoi(oDataset.GetBitmapDescription(nBitmap)));
         Bytes oBits = ReadAll(*IOPointer(oDataset.GetBitmapIO({nBitmap})), 1);
         for (unsigned char& nBit : oBits)
             nBit = nBit == (nState & 1) ? nState : static_cast<unsigned char>(nState + 1);
         return oBits;
     }},
    {"channels",
     [](auto& oDataset, unsigned char)
     {
         if (oDataset.GetChanCount() == 1)
             oDataset.AddNewChannel(krv::gobs::RasterInfo(300, 200, 1, krv::gobs::eDT_8U));
         else
             oDataset.DeleteChannel(1);
     },
     [](auto&)
     {
         return Bytes();
     }}};

// Runs a writer that never ends and kills it at a random moment; bLater: not before it tells that it has done
// something.
template <typename Writer>
void Kill(std::mt19937& oRandom, bool bLater, Writer oWriter)
{
    int aPipe[2] = {};
    ASSERT_EQ(::pipe2(aPipe, O_NONBLOCK), 0);
    const pid_t nChild = ::fork();
    if (nChild == 0)
        oWriter([&] { return ::write(aPipe[1], "", 1); });
    pollfd oTold = {aPipe[0], POLLIN, 0};
    if (bLater)
        ::poll(&oTold, 1, 60000);
    std::this_thread::sleep_for(std::chrono::microseconds(oRandom() % 60000));
    ::kill(nChild, SIGKILL);
    int nStatus = 0;
    ::waitpid(nChild, &nStatus, 0);
    ::close(aPipe[0]);
    ::close(aPipe[1]);
    ASSERT_TRUE(WIFSIGNALED(nStatus) && WTERMSIG(nStatus) == SIGKILL) << "the writer failed before it was killed";
}

// How often each way of writing is killed.
int KillRuns()
{
    const char* const pRuns = std::getenv("KRV_KILL_RUNS");
    return pRuns != nullptr ? std::atoi(pRuns) : 4;
}

// A file that shows one number everywhere is rewritten with the next one over and over; a kill leaves one of them
// whole.
TEST(TifUpdate, AKilledWriterLeavesTheLastSynchronisedState)
{
    std::mt19937 oRandom(20);
    for (const WayOfWriting& oWay : WAYS)
    {
        int nChanged = 0;
        const TempFolder oFolder;
        const std::string fileName = oFolder.File("k.tif");
        for (int nRun = 0; nRun < KillRuns(); ++nRun)
        {
            const char* const pKind = KINDS[nRun / 4 % 4];
            SCOPED_TRACE(std::string(oWay.mpName) + ", run " + std::to_string(nRun) + " " + pKind);
            // Killed while it is made, then again and again while it is updated.
            const bool bNew = nRun % 4 == 0;
            if (bNew)
                std::filesystem::remove(fileName);
            else if (!std::filesystem::exists(fileName))
                CreateTif(fileName, pKind, 300, 200, 1, krv::gobs::eDT_8U)->Close();
            Kill(oRandom, nRun + 1 == KillRuns(),
                 [&](auto oTell)
                 {
                     const TifPointer poDataset =
                         bNew ? CreateTif(fileName, pKind, 300, 200, 1, krv::gobs::eDT_8U) : OpenTif(fileName, eUpdate);
                     for (unsigned char nState = 1;; ++nState)
                     {
                         WriteState(*poDataset, oWay, nState);
                         poDataset->Synchronize();
                         oTell();
                     }
                 });
            if (bNew && !std::filesystem::exists(fileName))
                continue;
            ASSERT_EQ(Judge(fileName).moComplaints, "");
            const TifPointer poDataset = OpenTif(fileName, eUpdate);
            const Bytes oPixels = ReadAll(*poDataset), oMore = oWay.mpRead(*poDataset);
            ASSERT_EQ(std::count(oPixels.begin(), oPixels.end(), oPixels[0]), std::ssize(oPixels));
            ASSERT_EQ(std::count(oMore.begin(), oMore.end(), oPixels[0]), std::ssize(oMore));
            nChanged += oPixels[0] != 0 ? 1 : 0;
        }
        EXPECT_GT(nChanged, 0) << oWay.mpName << ": no writer lived long enough";
    }
}

// One that lays its file out anew at the end leaves the one before, and what is left behind is never taken for a file.
TEST(TifUpdate, AKilledWriterOfAnOrderedFileLeavesTheOneBefore)
{
    std::mt19937 oRandom(21);
    int nChanged = 0;
    for (int nRun = 0; nRun < KillRuns(); ++nRun)
    {
        const TempFolder oFolder;
        const std::string fileName = oFolder.File("k.tif");
        Kill(oRandom, nRun + 1 == KillRuns(),
             [&](auto oTell)
             {
                 for (unsigned char nState = 1;; ++nState)
                 {
                     const TifPointer poDataset =
                         CreateTif(fileName, "LAYOUT=COG BLOCKXSIZE=32 BLOCKYSIZE=32", 300, 200, 1, krv::gobs::eDT_8U);
                     for (const std::size_t nWay : {1U, 2U, 3U})
                         WAYS[nWay].mpWrite(*poDataset, nState);
                     WriteState(*poDataset, WAYS[0], nState);
                     poDataset->Close();
                     oTell();
                 }
             });
        for (const std::string& name : ListFolder(oFolder.GetPath()))
        {
            if (name != "k.tif")
            {
                EXPECT_TRUE(name.starts_with(".k.tif.") && name.ends_with(".part")) << name;
                continue;
            }
            ASSERT_EQ(Judge(fileName).moComplaints, "");
            const TifPointer poDataset = OpenTif(fileName);
            Bytes oValues = ReadAll(*poDataset);
            for (const std::size_t nWay : {1U, 2U, 3U})
            {
                const Bytes oMore = WAYS[nWay].mpRead(*poDataset);
                oValues.insert(oValues.end(), oMore.begin(), oMore.end());
            }
            ASSERT_EQ(std::count(oValues.begin(), oValues.end(), oValues[0]), std::ssize(oValues));
            ++nChanged;
        }
    }
    EXPECT_GT(nChanged, 0) << "no writer lived long enough";
}

TEST(TifUpdate, AFullDiskAndAMissingFolderAreReported)
{
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("f/full.tif");
    std::signal(SIGXFSZ, SIG_IGN);
    rlimit oOld = {};
    ::getrlimit(RLIMIT_FSIZE, &oOld);
    const rlimit oSmall{50000, oOld.rlim_max};
    {
        TifPointer poDataset = CreateTif(fileName, "", 400, 400, 1, krv::gobs::eDT_8U);
        ::setrlimit(RLIMIT_FSIZE, &oSmall);
        EXPECT_THROW(WriteAll(*poDataset, Bytes(400 * 400, 1)), krv::IOException);
        ::setrlimit(RLIMIT_FSIZE, &oOld);
        WriteAll(*poDataset, Bytes(400 * 400, 2));
        poDataset->Synchronize();
        EXPECT_EQ(Judge(fileName).moPixels, Bytes(400 * 400, 2));
        ::setrlimit(RLIMIT_FSIZE, &oSmall);
        EXPECT_THROW(
            {
                WriteAll(*poDataset, Bytes(400 * 400, 3));
                poDataset->Synchronize();
            },
            krv::IOException);
        ::setrlimit(RLIMIT_FSIZE, &oOld);
    }
    EXPECT_EQ(Judge(fileName).moPixels, Bytes(400 * 400, 2));
    TifPointer poDataset = CreateTif(oFolder.File("gone/a.tif"), "", 40, 40, 1, krv::gobs::eDT_8U);
    std::filesystem::remove_all(oFolder.GetPath() + "/gone");
    EXPECT_THROW(poDataset->Synchronize(), krv::IOException);
    TifPointer poRemoved = OpenTif(fileName, eUpdate);
    std::filesystem::remove(fileName);
    WriteAll(*poRemoved, Bytes(400 * 400, 4));
    EXPECT_THROW(poRemoved->Synchronize(), krv::IOException);
    EXPECT_THROW(CreateTif(oFolder.GetPath() + "/none/a.tif", "", 40, 40, 1, krv::gobs::eDT_8U), krv::FileException);
    EXPECT_THROW(OpenTif(oFolder.Write("text.tif", "no image"), eUpdate), krv::FileException);
}

// Two writers would overwrite each other, and what is added to a file that was cut would be taken for what it lacks.
TEST(TifUpdate, AFileHasOneWriterAndIsWhole)
{
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("one.tif");
    TifPointer poDataset = CreateTif(fileName, "COMPRESS=DEFLATE", 300, 200, 1, krv::gobs::eDT_8U);
    WriteAll(*poDataset, Bytes(300 * 200, 7));
    poDataset->Synchronize();
    EXPECT_THROW(OpenTif(fileName, eUpdate), krv::IOException);
    EXPECT_EQ(ReadAll(*OpenTif(fileName)), Bytes(300 * 200, 7));
    poDataset->Close();
    EXPECT_NO_THROW(OpenTif(fileName, eUpdate));

    std::filesystem::permissions(fileName, std::filesystem::perms(0600));
    CreateTif(fileName, "", 300, 200, 1, krv::gobs::eDT_8U)->Synchronize();
    EXPECT_EQ(std::filesystem::status(fileName).permissions(), std::filesystem::perms(0600));

    const TifPointer poOrdered = CreateTif(oFolder.File("cut.tif"), "LAYOUT=COG", 300, 2000, 1, krv::gobs::eDT_8U);
    WriteAll(*poOrdered, Bytes(300 * 2000, 7));
    poOrdered->Close(); // its directories lie before its pixels
    const std::string bytes = ReadFile(oFolder.File("cut.tif"));
    EXPECT_NO_THROW(OpenTif(oFolder.Write("shorter.tif", bytes), eUpdate));
    for (std::size_t nBytes = bytes.size() - 20011; nBytes > bytes.size() / 2; nBytes -= 20011)
        EXPECT_THROW(OpenTif(oFolder.Write("shorter.tif", bytes.substr(0, nBytes)), eUpdate), krv::FileException)
            << nBytes;
}

TEST(TifUpdate, MetadataComeBackByteForByteAndForeignItemsStay)
{
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("m.tif");
    TifPointer poDataset = CreateTif(fileName, "ALPHA=YES", 30, 20, 4, krv::gobs::eDT_8U);
    AuxiliaryData oData = poDataset->ReadAuxiliaryData();
    const std::map<std::string, std::string> oFile = {{"NO_DATA_VALUE", "-9999.0 "},
                                                      {"Software", "me"},
                                                      {"DateTime", "yesterday"},
                                                      {"ResolutionUnit", "inch"},
                                                      {"RasterType", "Point"},
                                                      {"a:b:c", "domain"},
                                                      {"Quoted \"'<&>\n\t\r", " \n\t\r <&>\"' \xC3\xA4 "},
                                                      {"Latin", "\xE4\x01\xFF"},
                                                      {"Stra\xDF"
                                                       "e:B\xFCrgel",
                                                       "of Latin-1"},
                                                      {"\xEF\xBF\xBE \xED\xA0\x80", "no characters"},
                                                      {"", "without a name"},
                                                      {std::string("nul\0", 4), std::string("l\0l", 3)},
                                                      {std::string(1U << 20U, '\xE4'), std::string(3U << 20U, 'x')},
                                                      {"copyright", "in a case of its own"}};
    for (const auto& [key, value] : oFile)
        oData.SetFileMetadataValue(key, value);
    oData.SetChanMetadataValue("Scale", "0.1", 2);
    oData.SetChanMetadataValue("Own", "x", 3);
    oData.SetChanMetadataValue("scale", "7", 3);
    oData.SetChanMetadata({{"colorinterp", "Red"}, {"\nDescription", "a key"}}, 1);
    oData.SetChannelDescription("near infrared", 3);
    oData.SetChanMetadataValue("ColorInterp", "NIR", 3);
    poDataset->WriteAuxiliaryData(oData);
    poDataset->Close();
    const auto Check = [&](const AuxiliaryData& oRead)
    {
        for (const auto& [key, value] : oFile)
        {
            const auto oFound = oRead.GetFileMetadata().find(key);
            ASSERT_NE(oFound, oRead.GetFileMetadata().end()) << key.substr(0, 99);
            EXPECT_TRUE(oFound->first == key && oFound->second == value) << key.substr(0, 99);
        }
        for (unsigned int nChannel = 1; nChannel <= 4; ++nChannel)
        {
            const auto &oGot = oRead.GetChanMetadata(nChannel), &oWanted = oData.GetChanMetadata(nChannel);
            EXPECT_TRUE(std::equal(oGot.begin(), oGot.end(), oWanted.begin(), oWanted.end())) << nChannel;
            EXPECT_EQ(oRead.GetChannelDescription(nChannel), oData.GetChannelDescription(nChannel));
        }
    };
    Check(OpenTif(fileName)->ReadAuxiliaryData());
    const std::string bytes = ReadFile(fileName); // other programs see what is ordinary, and a likeness of the rest
    for (const char* pItem :
         {"<Item name=\"Own\" sample=\"2\">x<", "<Item name=\"SCALE\" sample=\"1\" role=\"scale\">0.1<",
          "<Item name=\"B\xC3\xBCrgel\" domain=\"Stra\xC3\x9F"
          "e\" keyhex=",
          "in a case of its own\0"})
        EXPECT_NE(bytes.find(pItem), std::string::npos) << pItem;
    poDataset = OpenTif(fileName, eUpdate);
    Check(poDataset->ReadAuxiliaryData());
    oData.RemoveFileMetadataValue("Software");
    oData.SetChanMetadataValue("Own", "y", 3);
    poDataset->WriteAuxiliaryData(oData);
    poDataset->Synchronize();
    EXPECT_EQ(OpenTif(fileName)->ReadAuxiliaryData().GetFileMetadataValue("Software"), "");
    EXPECT_EQ(OpenTif(fileName)->ReadAuxiliaryData().GetChanMetadataValue("Own", 3), "y");
    EXPECT_THROW(poDataset->WriteAuxiliaryData(AuxiliaryData(1)), krv::DataException);
    oData.SetFileMetadata({{"SOFTWARE", "other"}, {"a:B:c", "moved"}});
    poDataset->WriteAuxiliaryData(oData);
    for (const char* pValue : {"SOFTWARE=other", "a:B:c=moved"})
    {
        const AuxiliaryData oRead = poDataset->ReadAuxiliaryData();
        const auto oFound = oRead.GetFileMetadata().find(std::string(pValue).substr(0, std::string(pValue).find('=')));
        ASSERT_NE(oFound, oRead.GetFileMetadata().end());
        EXPECT_EQ(oFound->first + "=" + oFound->second, pValue);
    }
    oData.SetFileMetadataValue("Too long", std::string(17U << 20U, 'x'));
    EXPECT_THROW(poDataset->WriteAuxiliaryData(oData), krv::DataException);
    EXPECT_EQ(Judge(fileName).moComplaints, "");
}

TEST(TifUpdate, GeocodingAndReferenceSystemsComeBack)
{
    using krv::ogc::cs::GeocodingInfo;
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("g.tif");
    const auto poUtm = krv::ogc::cs::CreateCRSFromEPSG(32632);
    const auto poFeet = krv::ogc::cs::CreateCRSFromEPSG(2263);
    const auto MakeOwn = [](const std::string& shift)
    {
        return krv::ogc::cs::CreateCRSFromWKT(
            "PROJCS[\"own\",GEOGCS[\"g\",DATUM[\"d\",SPHEROID[\"s\",6378000,298.5]" + shift +
            "],PRIMEM[\"Greenwich\",0],UNIT[\"degree\",0.0174532925199433]],PROJECTION[\"Transverse_Mercator\"],"
            "PARAMETER[\"latitude_of_origin\",10],PARAMETER[\"central_meridian\",12],PARAMETER[\"scale_factor\",0.99],"
            "PARAMETER[\"false_easting\",5],PARAMETER[\"false_northing\",6],UNIT[\"metre\",1]]");
    };
    const auto poOwn = MakeOwn("");
    const auto poShifted = MakeOwn(",TOWGS84[598.1,73.7,418.2]");
    const auto poTurned = MakeOwn(",TOWGS84[598.1,73.7,418.2,0.202,0.045,-2.455,6.7]");
    const GeocodingInfo oPlain(500000.25, 10.5, 0, 5400000.125, 0, -10.25);
    const GeocodingInfo oTurned(1, 0.5, 0.25, 2, 0.125, -0.5);
    const auto poWorld = krv::ogc::cs::CreateCRSFromEPSG(4326);
    for (const auto* poCRS : {poUtm.get(), poFeet.get(), poOwn.get(), poShifted.get(), poTurned.get(), poWorld.get()})
        for (const GeocodingInfo& oInfo : {oPlain, oTurned})
        {
            TifPointer poDataset = CreateTif(fileName, "", 30, 20, 1, krv::gobs::eDT_8U);
            poDataset->SetGeocoding(oInfo);
            poDataset->UpdateCRS(*poCRS);
            poDataset->Close();
            const TifPointer poRead = OpenTif(fileName);
            EXPECT_TRUE(poRead->GetGeocoding() == oInfo);
            const std::unique_ptr<krv::ogc::cs::ICRS> poBack(poRead->ReadCRS());
            ASSERT_TRUE(poBack);
            EXPECT_TRUE(poBack->IsEquivalent(*poCRS)) << poCRS->GetName();
            EXPECT_EQ(poBack->GetEPSG(), poCRS->GetEPSG());
            // By keys that every program reads, not as text.
            EXPECT_EQ(ReadFile(fileName).find("ESRI PE"), std::string::npos) << poCRS->GetName();
        }
}

// Kind and photometric interpretation of each page, as libtiff has them.
std::string KindsOf(const std::string& fileName)
{
    const std::unique_ptr<TIFF, void (*)(TIFF*)> poTiff(TIFFOpen(fileName.c_str(), "rm"), &TIFFClose);
    std::string kinds;
    do
    {
        std::uint32_t nKind = 0;
        std::uint16_t nPhotometric = 0;
        TIFFGetFieldDefaulted(poTiff.get(), TIFFTAG_SUBFILETYPE, &nKind);
        TIFFGetField(poTiff.get(), TIFFTAG_PHOTOMETRIC, &nPhotometric);
        kinds += std::to_string(nKind) + "/" + std::to_string(nPhotometric) + " ";
    } while (TIFFReadDirectory(poTiff.get()) == 1);
    return kinds;
}

// Zones are pages of their own, the validity mask is the image's mask, with its levels; each becomes the other.
TEST(TifUpdate, BitmapsAreZonesOrTheValidityMask)
{
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("k.tif");
    const auto Change = [&fileName](const auto& oChange)
    {
        const TifPointer poDataset = OpenTif(fileName, eUpdate);
        oChange(*poDataset);
        poDataset->Close();
        return KindsOf(fileName);
    };
    using krv::plugins::tif::TifDataset;
    CreateTif(fileName, "", 60, 40, 1, krv::gobs::eDT_8U)->Close();
    const Bytes oBits(60 * 40, 1);
    const auto Add = [&](TifDataset& oDataset)
    {
        EXPECT_EQ(oDataset.CreateBitmap() + oDataset.CreateBitmap(), 3U);
        EXPECT_EQ(oDataset.GetBitmapOverviewManager(), nullptr);
        WriteAll(*IOPointer(oDataset.GetBitmapIO({2})), 1, oBits);
    };
    EXPECT_EQ(Change(Add), "0/1 2/1 2/1 ");
    const auto MakeMask = [](TifDataset& oDataset)
    {
        EXPECT_EQ(FindValidityMask(oDataset), 0U);
        oDataset.SetBitmapDescription(2, "");
        const std::unique_ptr<krv::datasources::IOverviewManager> poLevels(oDataset.GetBitmapOverviewManager());
        poLevels->CreateLevel(2);
        EXPECT_TRUE(poLevels->IsValid(2, 4) == false && poLevels->GetLevels() == std::vector<unsigned int>{2});
        EXPECT_THROW(IOPointer(poLevels->GetOverviewIO(2, {1})), krv::DataException);
    };
    EXPECT_EQ(Change(MakeMask), "0/1 2/1 4/4 5/4 ");
    const auto MakeZone = [&](TifDataset& oDataset)
    {
        EXPECT_EQ(FindValidityMask(oDataset), 2U);
        EXPECT_EQ(oDataset.GetBitmapDescription(1), "Bitmap 1");
        oDataset.SetBitmapDescription(2, "clouds");
        EXPECT_EQ(FindValidityMask(oDataset), 0U);
        EXPECT_TRUE(ReadAll(*IOPointer(oDataset.GetBitmapIO({2})), 1) == oBits);
    };
    EXPECT_EQ(Change(MakeZone), "0/1 2/1 2/1 ");
    // As zones were stored once.
    {
        const std::unique_ptr<TIFF, void (*)(TIFF*)> poTiff(TIFFOpen(fileName.c_str(), "r+"), &TIFFClose);
        TIFFSetDirectory(poTiff.get(), 1);
        TIFFSetField(poTiff.get(), TIFFTAG_SUBFILETYPE, FILETYPE_MASK);
        TIFFRewriteDirectory(poTiff.get());
    }
    const auto Nothing = [](TifDataset& oDataset)
    {
        EXPECT_EQ(FindValidityMask(oDataset), 0U);
        EXPECT_EQ(oDataset.GetBitmapList(), (std::vector<unsigned int>{1, 2}));
    };
    EXPECT_EQ(Change(Nothing), "0/1 4/1 2/1 ");
}

} // namespace
