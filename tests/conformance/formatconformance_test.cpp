#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/ifileformat.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/interfaces/isidecardataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/iomanager/formatcapabilities.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/validitysource.h"
#include "datasources/writer/replacingwriter.h"
#include "gobs/raster/raster.h"
#include "gobs/raster/rasterinfo.h"
#include "tests/support/outputcapture.h"
#include "tests/support/pixels.h"
#include "tests/support/recipe.h"
#include "tests/support/thrown.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/ogc/cs/icrs.h"
#include "tools/conformance/conformance.h"
#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <memory>

using namespace krv::conformance;
using namespace krv::datasources;
using krv::gobs::DataType;
using krv::test::RecipeImage;
using Channels = std::vector<unsigned int>;

namespace
{

// An image that a test file holds, by the recipe of tests/support/recipe.h.
struct Image
{
    unsigned int mnWidth = 300;
    unsigned int mnHeight = 133;
    std::vector<DataType> moTypes = {krv::gobs::eDT_8U, krv::gobs::eDT_8U, krv::gobs::eDT_8U};
    // Each has ceil(size / level) pixels of the channels channel + 1000 * level.
    Channels moLevels;
    unsigned int mnVariant = 0;
};

// What the suite has to know of a format: the ways in which files are laid out, and what it cannot do.
struct FormatTraits
{
    std::string moShortName;
    std::string moLibrary;               // base name in lib/qrfformats
    std::vector<const char*> moVariants; // options of new files
    bool mbMixedTypes;
    bool mbOverviews;
    int mnFiles = 1; // of one image
    bool mbBitmaps = false;
    bool mbWritesAfterFork = true; // in a process forked from one that wrote
    // Files of other programs are read in tests/plugins.
    void MakeFile(const std::string& file, const Image& oImage) const
    {
        const std::unique_ptr<IDataset> oDataset(
            DatasetManager::GetInstance()->NewDataset(file, moShortName, moVariants[oImage.mnVariant]));
        auto& oRaster = dynamic_cast<IRasterDataset&>(*oDataset);
        oRaster.Create(oImage.mnWidth, oImage.mnHeight, oImage.moTypes);
        for (unsigned int nChannel = 1; nChannel <= oImage.moTypes.size(); ++nChannel)
            Write(oRaster.GetRasterIO({nChannel}), nChannel, oImage.moTypes[nChannel - 1]);
        const std::unique_ptr<IOverviewManager> oManager(oRaster.GetOverviewManager());
        for (const unsigned int nLevel : oImage.moLevels)
        {
            oManager->CreateLevel(nLevel);
            for (unsigned int nChannel = 1; nChannel <= oImage.moTypes.size(); ++nChannel)
                Write(oManager->GetOverviewIO(nLevel, {nChannel}), nChannel + 1000 * nLevel,
                      oImage.moTypes[nChannel - 1]);
        }
        oDataset->Close();
    }

    friend void PrintTo(const FormatTraits& oTraits, std::ostream* poStream) { *poStream << oTraits.moShortName; }

private:
    static void Write(IRasterIO* poIO, unsigned int nChannel, const DataType& oType)
    {
        const std::unique_ptr<IRasterIO> oIO(poIO);
        std::string bytes = RecipeImage(oIO->GetFileWidth(), oIO->GetFileHeight(), {nChannel}, oType);
        oIO->WriteWindow(0u, 0u, oIO->GetFileWidth(), oIO->GetFileHeight(),
                         reinterpret_cast<unsigned char*>(bytes.data()));
    }
};

const FormatTraits FORMATS[] = {
    {"DEMO", "demo", {""}, true, true, 1},
    {"JP2",
     "jp2",
     {"", "BLOCKXSIZE=64 BLOCKYSIZE=48", "BLOCKXSIZE=100 BLOCKYSIZE=20 LEVELS=2 PROGRESSION=RPCL BOXES=NO"},
     false,
     false,
     1},
    {"RAW",
     "raw",
     {"", "INTERLEAVE=BIL", "INTERLEAVE=BIP", "BYTEORDER=BIG", "INTERLEAVE=BIL BYTEORDER=BIG",
      "INTERLEAVE=BIP BYTEORDER=BIG"},
     false,
     false,
     2},
#ifdef KRV_PICTURES
    {"GDBALL", "gdball", {"FTYPE:PNG", "FTYPE:PNG COMPRESSION=0"}, false, false, 1, false, false},
#endif
    {"TIF",
     "tif",
     {"TILED=NO BLOCKYSIZE=17", "BLOCKXSIZE=64 BLOCKYSIZE=48 INTERLEAVE=BAND",
      "BLOCKXSIZE=64 BLOCKYSIZE=48 COMPRESS=DEFLATE BIGTIFF=YES",
      "TILED=NO BLOCKYSIZE=17 COMPRESS=DEFLATE INTERLEAVE=BAND",
      "TILED=NO BLOCKYSIZE=17 COMPRESS=LZW PREDICTOR=NO BIGTIFF=YES",
      "BLOCKXSIZE=64 BLOCKYSIZE=48 COMPRESS=LZW INTERLEAVE=BAND", "BLOCKXSIZE=64 BLOCKYSIZE=48 COMPRESS=ZSTD",
      "TILED=NO BLOCKYSIZE=17 COMPRESS=PACKBITS"},
     false,
     true,
     1,
     true},
    {"KRVDSK",
     "krvdsk",
     {"", "BLOCKXSIZE=64 BLOCKYSIZE=48 INTERLEAVE=BAND", "BLOCKXSIZE=50 BLOCKYSIZE=70 COMPRESS=DEFLATE",
      "COMPRESS=ZSTD LEVEL=1 PREDICTOR=NO", "BLOCKXSIZE=64 BLOCKYSIZE=48 COMPRESS=LZ4", "COMPRESS=LZ4 LEVEL=1",
      "BLOCKXSIZE=301 BLOCKYSIZE=7 COMPRESS=LZW INTERLEAVE=BAND"},
     true,
     true,
     1,
     true}};

std::string Name(const ::testing::TestParamInfo<FormatTraits>& oInfo)
{
    return oInfo.param.moShortName;
}

class FormatConformance : public ::testing::TestWithParam<FormatTraits>
{
protected:
    std::string Make(const Image& oImage, const std::string& name = "sample")
    {
        std::string file = moFolder.File(name);
        GetParam().MakeFile(file, oImage);
        return file;
    }

    static std::string Library()
    {
        return std::string(KRV_TEST_HOME) + "/lib/qrfformats/" + GetParam().moLibrary + ".so";
    }

    // The generic checks over one file.
    static void ExpectConformity(const std::string& file)
    {
        const Plugin oPlugin(Library());
        for (const Check& oCheck : GetChecks())
        {
            for (const std::string& finding : krv::conformance::Run(oCheck, oPlugin, file))
                ADD_FAILURE() << oCheck.mpName << ": " << finding;
        }
    }

    krv::conformance::TempFolder moFolder;
};

} // namespace

TEST_P(FormatConformance, EveryLayoutPassesTheChecks)
{
    const FormatTraits& oTraits = GetParam();
    for (unsigned int nVariant = 0; nVariant < oTraits.moVariants.size(); ++nVariant)
    {
        SCOPED_TRACE(oTraits.moVariants[nVariant]);
        Image oImage;
        oImage.mnVariant = nVariant;
        if (oTraits.mbOverviews)
            oImage.moLevels = {2, 4};
        if (oTraits.mbMixedTypes)
            oImage.moTypes = {krv::gobs::eDT_16S, krv::gobs::eDT_C64R, krv::gobs::eDT_8U, krv::gobs::eDT_16S};
        ExpectConformity(Make(oImage));
    }
}

TEST_P(FormatConformance, SmallAndThinImagesPassTheChecks)
{
    for (const auto& [nWidth, nHeight] : {std::pair{1u, 1u}, {1u, 700u}, {700u, 1u}, {256u, 256u}, {257u, 17u}})
    {
        SCOPED_TRACE(std::to_string(nWidth) + " x " + std::to_string(nHeight));
        Image oImage;
        oImage.mnWidth = nWidth;
        oImage.mnHeight = nHeight;
        oImage.moTypes.assign(2, krv::gobs::eDT_16U);
        ExpectConformity(Make(oImage));
    }
}

// A bit is one that is set for any byte but 0: what is held back, what is stored and what is opened again say the same.
TEST_P(FormatConformance, BitmapsReadTheSameBeforeAndAfterTheyAreStored)
{
    if (!GetParam().mbBitmaps)
        GTEST_SKIP() << "no bitmaps";
    for (unsigned int nVariant = 0; nVariant < GetParam().moVariants.size(); ++nVariant)
    {
        SCOPED_TRACE(GetParam().moVariants[nVariant]);
        Image oImage;
        oImage.mnVariant = nVariant;
        const std::string file = Make(oImage, "bits" + std::to_string(nVariant));
        std::unique_ptr<IDataset> poDataset(DatasetManager::GetInstance()->Open(file, eUpdate));
        auto* poBitmaps = dynamic_cast<IBitmapDataset*>(poDataset.get());
        ASSERT_NE(poBitmaps, nullptr);
        const unsigned int nBitmap = poBitmaps->CreateBitmap();
        const auto Read = [&]
        {
            const std::unique_ptr<IRasterIO> poIO(poBitmaps->GetBitmapIO({nBitmap}));
            std::string bits(std::size_t{300} * 133, '?');
            poIO->ReadWindow(0u, 0u, 300u, 133u, reinterpret_cast<unsigned char*>(bits.data()));
            return bits;
        };
        const std::string bytes = {'\0', '\xff', '\2', '\0', '\1', '\x80'};
        std::string expected(std::size_t{300} * 133, '\0');
        for (unsigned int n = 0; n < 6; ++n)
            expected[std::size_t{41 + n / 3} * 300 + 62 + n % 3] = bytes[n] != 0 ? '\1' : '\0';
        {
            const std::unique_ptr<IRasterIO> poIO(poBitmaps->GetBitmapIO({nBitmap}));
            poIO->WriteWindow(62u, 41u, 3u, 2u, reinterpret_cast<unsigned char*>(const_cast<char*>(bytes.data())));
        }
        EXPECT_TRUE(Read() == expected) << "held back";
        poDataset->Close();
        poDataset.reset(DatasetManager::GetInstance()->Open(file, eReadOnly));
        poBitmaps = &dynamic_cast<IBitmapDataset&>(*poDataset);
        EXPECT_TRUE(Read() == expected) << "opened again";
    }
}

// What a file cannot hold becomes the nearest value that it can, at once.
TEST_P(FormatConformance, NarrowSamplesReadTheSameBeforeAndAfterTheyAreStored)
{
    const auto& oCan = DatasetManager::GetInstance()->GetCapabilities(GetParam().moShortName);
    if (!oCan.IsSupported(CAPABILITY_NARROW_SAMPLES))
        GTEST_SKIP() << "no narrow samples";
    for (const auto& [eType, pBits] : {std::pair{krv::gobs::eDT_8U, "4"},
                                       {krv::gobs::eDT_8S, "5"},
                                       {krv::gobs::eDT_16U, "12"},
                                       {krv::gobs::eDT_16S, "9"},
                                       {krv::gobs::eDT_32R, "16"},
                                       {krv::gobs::eDT_32R, "24"}})
    {
        SCOPED_TRACE(std::string("NBITS=") + pBits);
        const DataType oType(eType);
        if (oType.IsReal() && GetParam().moShortName == "JP2")
            continue;
        const std::string file = moFolder.File("narrow");
        std::unique_ptr<IDataset> poDataset(DatasetManager::GetInstance()->NewDataset(
            file, GetParam().moShortName, "BLOCKXSIZE=64 BLOCKYSIZE=64 NBITS=" + std::string(pBits)));
        dynamic_cast<IRasterDataset&>(*poDataset).Create(300, 133, {oType, oType});
        std::string part = RecipeImage(50, 40, {1, 2}, oType);
        std::unique_ptr<IRasterIO> poIO(dynamic_cast<IRasterDataset&>(*poDataset).GetRasterIO({1, 2}));
        poIO->WriteWindow(33u, 21u, 50u, 40u, reinterpret_cast<unsigned char*>(part.data()));
        std::string held(part.size(), '?');
        poIO->ReadWindow(33u, 21u, 50u, 40u, reinterpret_cast<unsigned char*>(held.data()));
        EXPECT_FALSE(held == part) << "the recipe has values that do not fit";
        poIO.reset();
        poDataset->Close();
        BasicReader oReader(file);
        const std::unique_ptr<krv::gobs::Raster> poStored(oReader.ReadRaster(33, 21, 50, 40));
        EXPECT_TRUE(std::string(reinterpret_cast<char*>(poStored->GetBuffer()), held.size()) == held);
    }
}

// What lies beside a file adds what its own format has not said, and goes with it.
TEST_P(FormatConformance, FilesWithCompanionsSayWhatTheseAdd)
{
    const std::string file = Make(Image());
    const auto Open = [&file](AccessMode eMode = eReadOnly)
    {
        return std::unique_ptr<IDataset>(DatasetManager::GetInstance()->Open(file, eMode));
    };
    const auto MakeMask = [this](unsigned int nChannels)
    {
        Image oMask;
        oMask.moTypes.assign(nChannels, krv::gobs::eDT_8U);
        FORMATS[3].MakeFile(moFolder.File("sample.msk"), oMask);
        return RecipeImage(300, 133, {nChannels}, krv::gobs::eDT_8U);
    };
    const auto ReadMask = [](IDataset& oDataset, unsigned int nBitmap)
    {
        std::string bits(std::size_t{300} * 133, '?');
        const std::unique_ptr<IRasterIO> poIO(dynamic_cast<IBitmapDataset&>(oDataset).GetBitmapIO({nBitmap}));
        poIO->ReadWindow(0u, 0u, 300u, 133u, reinterpret_cast<unsigned char*>(bits.data()));
        return bits;
    };
    const auto ToBits = [](std::string bytes)
    {
        std::transform(bytes.begin(), bytes.end(), bytes.begin(), [](char n) { return n != 0 ? '\1' : '\0'; });
        return bytes;
    };
    moFolder.Write("sample.wld", "2\n0\n0\n-2\n11\n19\n");
    moFolder.Write("sample.prj", "EPSG:32633");
    const std::string tags = "<PAMDataset><Metadata><MDI key='beside'>yes</MDI></Metadata><PAMRasterBand band='2'>"
                             "<NoDataValue>7</NoDataValue><Metadata><MDI key='STATISTICS_MEAN'>1</MDI></Metadata>"
                             "</PAMRasterBand></PAMDataset>";
    moFolder.Write("sample.aux.xml", tags);
    const std::string mask = ToBits(MakeMask(1));
    {
        const auto poDataset = Open();
        EXPECT_TRUE(dynamic_cast<IGeocodedDataset&>(*poDataset).GetGeocoding() ==
                    krv::ogc::cs::GeocodingInfo(10, 2, 0, 20, 0, -2));
        EXPECT_EQ(std::unique_ptr<krv::ogc::cs::ICRS>(poDataset->ReadCRS())->GetEPSG(), 32633);
        EXPECT_EQ(poDataset->ReadAuxiliaryData().GetFileMetadataValue("beside"), "yes");
        EXPECT_EQ(poDataset->ReadAuxiliaryData().GetChanMetadataValue("NO_DATA_VALUE", 2), "7");
        EXPECT_TRUE(ReadMask(*poDataset, FindValidityMask(dynamic_cast<IBitmapDataset&>(*poDataset))) == mask);
        for (const Sidecar& oSidecar : dynamic_cast<ISidecarDataset&>(*poDataset).ListSidecars())
            EXPECT_TRUE(oSidecar.mbUsed) << oSidecar.moFile;
    }
    const std::string third = ToBits(MakeMask(3));
    {
        const auto poDataset = Open();
        auto& oBitmaps = dynamic_cast<IBitmapDataset&>(*poDataset);
        EXPECT_EQ(FindValidityMask(oBitmaps), 0u);
        const auto oMasks = FindChannelMasks(oBitmaps);
        ASSERT_EQ(oMasks.size(), 3u);
        EXPECT_TRUE(ReadMask(*poDataset, oMasks.at(3)) == third);
        EXPECT_TRUE(ValiditySource(poDataset.get(), {3}).HasChannelMasks());
    }
    try
    {
        const auto poDataset = Open(eUpdate);
        unsigned char nPixel = 1;
        std::unique_ptr<IRasterIO>(dynamic_cast<IRasterDataset&>(*poDataset).GetRasterIO({1}))
            ->WriteWindow(0u, 0u, 1u, 1u, &nPixel);
        poDataset->Close();
        EXPECT_EQ(Open()->ReadAuxiliaryData().GetChanMetadataValue("STATISTICS_MEAN", 2), "");
        EXPECT_EQ(Open()->ReadAuxiliaryData().GetChanMetadataValue("NO_DATA_VALUE", 2), "7");
    }
    catch (const krv::DataException&)
    {
        EXPECT_EQ(ReadFile(moFolder.File("sample.aux.xml")), tags) << "the format updates no files";
    }
    moFolder.Write("sample.ovr", "levels of the old file");
    Make(Image());
    for (const char* pEnding : {".msk", ".aux.xml", ".ovr"})
        EXPECT_FALSE(std::filesystem::exists(file + pEnding)) << "of the file that was replaced: " << pEnding;
    EXPECT_TRUE(dynamic_cast<IBitmapDataset&>(*Open()).GetBitmapList().empty());
    moFolder.Write("sample.aux.xml", tags);
    EXPECT_EQ(Open()->Delete(), eDone);
    EXPECT_FALSE(std::filesystem::exists(file + ".aux.xml"));
}

// AuxiliaryData keeps the key of a tag that is removed, with an empty value; no file does. A format that does not
// update its files is asked by way of what lies beside them.
TEST_P(FormatConformance, RemovedTagsLeaveNoKeys)
{
    const std::string file = Make(Image());
    const auto Edit = [&file](auto&& fChange)
    {
        auto* const poManager = DatasetManager::GetInstance();
        const bool bUpdates = GetParam().moShortName == "TIF" || GetParam().moShortName == "KRVDSK";
        const std::unique_ptr<IDataset> poDataset(bUpdates ? poManager->Open(file, eUpdate)
                                                           : poManager->OpenFormat("GDBALL", file, eUpdate));
        AuxiliaryData oTags = poDataset->ReadAuxiliaryData();
        fChange(oTags);
        poDataset->WriteAuxiliaryData(oTags);
        poDataset->Close();
        return std::unique_ptr<IDataset>(poManager->Open(file, eReadOnly))->ReadAuxiliaryData();
    };
    const AuxiliaryData oSet = Edit(
        [](AuxiliaryData& oTags)
        {
            oTags.SetFileMetadataValue("own", "1");
            oTags.SetChanMetadataValue("own", "2", 2);
        });
    EXPECT_TRUE(oSet.GetFileMetadata().contains("own") && oSet.GetChanMetadata(2).contains("own"));
    const AuxiliaryData oRemoved = Edit(
        [](AuxiliaryData& oTags)
        {
            oTags.RemoveFileMetadataValue("own");
            oTags.RemoveChanMetadataValue("own", 2);
        });
    EXPECT_FALSE(oRemoved.GetFileMetadata().contains("own") || oRemoved.GetChanMetadata(2).contains("own"));
}

// Files of all formats side by side: the manager gives each to its own, whatever it is called.
void Fill(BasicWriter& oWriter, unsigned char nValue)
{
    oWriter.CreateNewFile(krv::gobs::RasterInfo(20, 10, 1, krv::gobs::eDT_8U));
    const std::unique_ptr<krv::gobs::Raster> oRaster(oWriter.ReadRaster(0, 0, 20, 10));
    std::fill_n(oRaster->GetBuffer(), 200, nValue);
    oWriter.WriteRaster(oRaster.get());
}

// What is not synchronised is lost with a warning, unless an exception says more.
TEST_P(FormatConformance, WritersTakeFreeNamesAndReplaceWhenTheyAreToldTo)
{
    const std::string file = moFolder.File("new.png"), format = GetParam().moShortName; // the generic format goes by it
    const auto Holds = [&](char nValue)
    {
        return krv::test::ReadPixels(BasicReader(file, {1})) == std::string(200, nValue);
    };
    const krv::test::OutputCapture oCapture;
    {
        BasicWriter oFirst(file, {1}, format, ""), oSecond(file, {1}, format, ""), oThird(file, {1}, format, "");
        Fill(oFirst, 1);
        Fill(oSecond, 2);
        oFirst.Synchronize();
        EXPECT_TRUE(oCapture.moWarnings.empty());
        EXPECT_NE(krv::test::Error([&] { oSecond.Synchronize(); }).find("which is not replaced"), std::string::npos);
        EXPECT_THROW(Fill(oThird, 3), krv::IOException);
    }
    EXPECT_EQ(oCapture.moWarnings.size(), 1u) << "the second";
    EXPECT_TRUE(Holds(1));
    {
        ReplacingWriter oDropped(file, {1}, format, "");
        EXPECT_FALSE(oDropped.FileExists());
        Fill(oDropped, 4);
    }
    EXPECT_EQ(oCapture.moWarnings.size(), 2u);
    EXPECT_NE(oCapture.moWarnings.back().moMessage.find(file), std::string::npos);
    try
    {
        ReplacingWriter oFailed(file, {1}, format, "");
        Fill(oFailed, 5);
        throw krv::DataException("somebody else's");
    }
    catch (const krv::DataException&)
    {
    }
    EXPECT_TRUE(Holds(1));
    ReplacingWriter oNew(file, {1}, format, "");
    Fill(oNew, 6);
    EXPECT_TRUE(Holds(1));
    oNew.Synchronize();
    EXPECT_TRUE(Holds(6));
    const std::unique_ptr<IDataset> oClosed(DatasetManager::GetInstance()->NewDataset(file, format, ""));
    dynamic_cast<IRasterDataset&>(*oClosed).Create(20, 10, {krv::gobs::eDT_8U});
    EXPECT_EQ(oClosed->Delete(), eDone);
    EXPECT_EQ(krv::test::Error([&] { oClosed->Synchronize(); }), "data: " + file + ": the dataset is closed");
    EXPECT_TRUE(Holds(6)) << "the new one went, before it had the name";
    EXPECT_THROW(ReplacingWriter(file, {}, format, ""), krv::DataException);
    EXPECT_EQ(oCapture.moWarnings.size(), 2u);
    EXPECT_EQ(std::distance(std::filesystem::directory_iterator(std::filesystem::path(file).parent_path()), {}),
              GetParam().mnFiles);
}

// Of many processes that make one file one gets its name, whichever, and the others are told.
TEST_P(FormatConformance, OneOfManyWritersGetsAName)
{
    if (!GetParam().mbWritesAfterFork)
        GTEST_SKIP() << "its library's threads stay in the first process";
    for (int nRound = 0; nRound < 10; ++nRound)
    {
        const std::string file = moFolder.File("race" + std::to_string(nRound));
        int aGate[2] = {};
        ASSERT_EQ(::pipe(aGate), 0);
        std::vector<pid_t> oWriters;
        for (unsigned char nWriter = 1; nWriter <= 5; ++nWriter)
        {
            oWriters.push_back(::fork());
            if (oWriters.back() != 0)
                continue;
            BasicWriter oWriter(file, {1}, GetParam().moShortName, "");
            Fill(oWriter, nWriter);
            ::close(aGate[1]);
            char nNothing = 0;
            static_cast<void>(::read(aGate[0], &nNothing, 1));
            const std::string error = krv::test::Error([&] { oWriter.Synchronize(); });
            ::_exit(error.empty() ? 0 : error.starts_with("io: ") ? 1 : 2);
        }
        ::close(aGate[1]);
        ::close(aGate[0]);
        unsigned char nWinner = 0;
        for (unsigned char nWriter = 1; nWriter <= 5; ++nWriter)
        {
            int nStatus = 0;
            ::waitpid(oWriters[nWriter - 1], &nStatus, 0);
            ASSERT_TRUE(WIFEXITED(nStatus) && WEXITSTATUS(nStatus) < 2) << nStatus;
            EXPECT_TRUE(nWinner == 0 || WEXITSTATUS(nStatus) == 1) << "two have got the name";
            nWinner = WEXITSTATUS(nStatus) == 0 ? nWriter : nWinner;
        }
        EXPECT_EQ(krv::test::ReadPixels(BasicReader(file, {1})), std::string(200, static_cast<char>(nWinner)));
    }
}

TEST_P(FormatConformance, TheManagerFindsTheFormat)
{
    const std::string file = Make(Image(), "misleading.xyz");
    for (int nTime = 0; nTime < 2; ++nTime)
    {
        for (const FormatTraits& oOther : FORMATS)
        {
            const std::string otherFile = moFolder.File("other");
            oOther.MakeFile(otherFile, Image());
            EXPECT_EQ(BasicReader(otherFile).GetFileFormat()->GetShortName(), oOther.moShortName);
            EXPECT_EQ(BasicReader(file).GetFileFormat()->GetShortName(), GetParam().moShortName);
        }
    }
    EXPECT_EQ(DatasetManager::GetInstance()->GetFormatByName(GetParam().moShortName)->GetShortName(),
              GetParam().moShortName);
}

INSTANTIATE_TEST_SUITE_P(Formats, FormatConformance, ::testing::ValuesIn(FORMATS), Name);
