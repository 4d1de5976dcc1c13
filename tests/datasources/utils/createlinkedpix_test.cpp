#include "datasources/utils/createlinkedpix.h"

#include "datasources/interfaces/ilinkeddataset.h"
#include "datasources/interfaces/inewfiledataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "tests/support/probe.h"
#include "tests/support/syntheticdataset.h"
#include "tests/support/thrown.h"
#include "toolkit/core/core.h"
#include "toolkit/ogc/cs/crsfactory.h"
#include "tools/conformance/formathome.h"

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <utility>

#include <gtest/gtest.h>

namespace krv::datasources
{

namespace
{

using namespace krv::test;
using krv::conformance::ReadFile;
using Texts = std::vector<std::string>;

// What a test sees of the new dataset.
struct Made
{
    Texts moCalls;
    std::string moOptions;
    std::vector<krv::gobs::DataType> moTypes;
    std::string moSize;
    int mnCode = 0;
    AuxiliaryData moRecord;
    krv::ogc::cs::GeocodingInfo moGeocoding;
};

// Writes its file when it is synchronised, or with its creation already.
class TargetDataset : public Synthetic<DatasetPart, RasterPart, GeocodedPart>, public INewFileDataset
{
public:
    TargetDataset(const ImageModelPtr& poModel, std::string fileName, Made& oMade)
        : Synthetic(poModel), moFileName(std::move(fileName)), moMade(oMade)
    {
    }
    ~TargetDataset() override { moMade.moCalls.emplace_back("gone"); }

    using RasterPart::Create;
    void Create(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes) override
    {
        moMade.moTypes = oTypes;
        moMade.moSize = std::to_string(nWidth) + " x " + std::to_string(nHeight);
    }
    void SetGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo) override { moMade.moGeocoding = oInfo; }
    void UpdateCRS(const krv::ogc::cs::ICRS& oCRS) const override { moMade.mnCode = oCRS.GetEPSG(); }
    void WriteAuxiliaryData(const AuxiliaryData& oData) override { moMade.moRecord = oData; }
    void Synchronize() override
    {
        krv::conformance::WriteFile(moFileName, "link");
        mbNamed = true;
        moMade.moCalls.emplace_back("synchronised");
    }
    FileAccessState Delete() override
    {
        moMade.moCalls.emplace_back("deleted");
        if (mbNamed)
            std::filesystem::remove(moFileName);
        return eDone;
    }
    void KeepExisting() override {}
    bool KeepsPixels() const override { return true; }

private:
    std::string moFileName;
    Made& moMade;
    bool mbNamed = false;
};

// A dataset that says which files its pixels lie in: those that its file lists.
class ChainedDataset : public SyntheticDataset, public ILinkedDataset
{
public:
    ChainedDataset(const ImageModelPtr& poModel, std::string linked)
        : SyntheticDataset(poModel), moLinked(std::move(linked))
    {
    }
    Texts GetLinkedFiles() const override { return {moLinked}; }

private:
    std::string moLinked;
};

class CreateLinkedPixTest : public ::testing::Test
{
protected:
    CreateLinkedPixTest()
    {
        moHome.Add(std::string(KRV_TEST_PLUGINS) + "/plain.so");
        moModel->moTypes = {krv::gobs::eDT_16U, krv::gobs::eDT_BIT, krv::gobs::eDT_32R};
        moModel->moAuxiliary.SetFileMetadataValue("Title", "Alps");
        moModel->moAuxiliary.SetFileMetadataValue("_DBLayout", "x");
        moModel->moAuxiliary.SetChanMetadataValue("Band", "NIR", 3);
        moModel->moGeocoding = {500000, 10, 0, 4000000, 0, -10};
        moModel->moMakeCRS = []
        {
            return krv::ogc::cs::CreateCRSFromEPSG(32632).release();
        };
        // Files that begin with "SOURCE" are the synthetic image, those with "CHAIN" link to the rest of their text.
        FunctionBuilder& oSources = Register("SOURCE");
        oSources.moIdentify = [](const std::string&, const unsigned char* pHeader, unsigned int, int)
        {
            return pHeader[0] == 'S' || pHeader[0] == 'C' ? 0 : 1;
        };
        oSources.moOpen = [this](const std::string& fileName, AccessMode eMode) -> IDataset*
        {
            EXPECT_EQ(eMode, eReadOnly);
            const std::string text = ReadFile(fileName);
            if (text[0] == 'C')
                return new ChainedDataset(moModel, text.substr(6));
            if (!mbRaster)
                return new DatasetWithoutRaster(moModel);
            return Decorate(moProbe, std::make_unique<SyntheticDataset>(moModel)).release();
        };
        FunctionBuilder& oNative = Register("KRVDSK");
        oNative.moCreate = [this](const std::string& fileName, const std::string& options) -> IDataset*
        {
            moMade.moOptions = options;
            if (!mbTargetRaster)
                return new DatasetWithoutRaster(moModel);
            return new TargetDataset(moModel, fileName, moMade);
        };
        moSource = moHome.GetFolder().Write("data/my scene.img", "SOURCE");
        moTarget = moHome.GetFolder().File("links/scene.krv");
    }

    FunctionBuilder& Register(const std::string& shortName)
    {
        auto poBuilder = std::make_unique<FunctionBuilder>(shortName, &moProbe);
        moHome.WriteDescription(shortName,
                                "<Format><Capabilities><Dataset><SupportsCreate/></Dataset></Capabilities></Format>");
        FunctionBuilder& oResult = *poBuilder;
        DatasetManager::GetInstance()->Register(poBuilder.get(), moHome.GetDescriptionPath(shortName), true);
        [[maybe_unused]] FunctionBuilder* const poTakenOver = poBuilder.release();
        return oResult;
    }

    Probe moProbe; // outlives the manager's builders
    krv::conformance::FormatHome moHome;
    ImageModelPtr moModel = std::make_shared<ImageModel>();
    Made moMade;
    bool mbRaster = true;
    bool mbTargetRaster = true;
    std::string moSource;
    std::string moTarget;
};

} // namespace

TEST_F(CreateLinkedPixTest, TakesOverAllButThePixels)
{
    const std::unique_ptr<IDataset> poLink(CreateLinkedPix(moTarget, moSource));
    ASSERT_NE(poLink, nullptr);
    EXPECT_EQ(moMade.moOptions, "FILENOCREATE=../data/my scene.img");
    EXPECT_EQ(moMade.moSize, "21 x 17");
    EXPECT_EQ(moMade.moTypes, (std::vector<krv::gobs::DataType>{krv::gobs::eDT_16U, krv::gobs::eDT_32R}));
    EXPECT_EQ(moMade.moGeocoding, moModel->moGeocoding);
    EXPECT_EQ(moMade.mnCode, 32632);
    EXPECT_EQ(moMade.moRecord.GetFileMetadataValue("Title"), "Alps");
    EXPECT_EQ(moMade.moRecord.GetFileMetadataValue("_DBLayout"), "");
    EXPECT_EQ(moMade.moRecord.GetChanMetadataValue("Band", 3), "NIR"); // as it is, whatever the file's channels
    EXPECT_EQ(moMade.moCalls, Texts{"synchronised"});
    EXPECT_EQ(moProbe.GetLive(), 2); // the builders: the source and its descriptions are gone
}

TEST_F(CreateLinkedPixTest, ChannelsOfSingleBitsAloneMakeAnEmptyList)
{
    moModel->moTypes = {krv::gobs::eDT_BIT, krv::gobs::eDT_BIT};
    moMade.moTypes = {krv::gobs::eDT_8U};
    const std::unique_ptr<IDataset> poLink(CreateLinkedPix(moTarget, moSource));
    EXPECT_NE(poLink, nullptr);
    EXPECT_TRUE(moMade.moTypes.empty());
}

TEST_F(CreateLinkedPixTest, WithoutChannelsThereIsNoLink)
{
    mbRaster = false;
    EXPECT_EQ(CreateLinkedPix(moTarget, moSource), nullptr);
    mbRaster = true;
    moModel->moTypes.clear();
    EXPECT_EQ(CreateLinkedPix(moTarget, moSource), nullptr);
    EXPECT_TRUE(moMade.moOptions.empty()); // nothing was made
    moModel->moTypes = {krv::gobs::eDT_8U};
    mbTargetRaster = false;
    EXPECT_EQ(CreateLinkedPix(moTarget, moSource), nullptr);
    EXPECT_EQ(moProbe.GetLive(), 2);
}

// Wherever the source fails: nothing stays alive, no new file is there, and an old one is as it was.
TEST_F(CreateLinkedPixTest, FailuresLeaveNothing)
{
    bool bThrown = true;
    for (unsigned int nAt = 1; bThrown; ++nAt)
    {
        for (const bool bOld : {false, true})
        {
            std::filesystem::remove(moTarget);
            if (bOld)
                krv::conformance::WriteFile(moTarget, "old");
            moMade.moCalls.clear();
            moProbe.Arm(nAt);
            const std::string error = Error([&] { delete CreateLinkedPix(moTarget, moSource); });
            bThrown = moProbe.HasThrown();
            ASSERT_EQ(error, bThrown ? "io: probe" : "") << nAt;
            ASSERT_EQ(moProbe.GetLive(), 2) << nAt;
            ASSERT_EQ(std::filesystem::exists(moTarget), bOld || !bThrown) << nAt;
            if (bThrown && bOld)
            {
                ASSERT_EQ(ReadFile(moTarget), "old");
            }
            const bool bDiscarded = bThrown && !moMade.moCalls.empty();
            ASSERT_EQ(moMade.moCalls, bDiscarded ? (Texts{"deleted", "gone"})
                                      : bThrown  ? Texts()
                                                 : (Texts{"synchronised", "gone"}))
                << nAt;
        }
        ASSERT_LT(nAt, 100U);
    }
}

TEST_F(CreateLinkedPixTest, AFileIsNotLinkedToItself)
{
    const std::string other = moHome.GetFolder().File("data/other.img");
    std::filesystem::create_symlink(moSource, other);
    for (const std::string& target : {moSource, other})
        EXPECT_EQ(Error([&] { CreateLinkedPix(target, moSource); }),
                  "data: " + target + ": a file cannot be linked to itself");
    EXPECT_EQ(ReadFile(moSource), "SOURCE");
}

TEST_F(CreateLinkedPixTest, ChainsEndWithEightLinks)
{
    const auto Chain = [this](int nLinks)
    {
        std::string last = moSource;
        for (int n = 1; n <= nLinks; ++n)
            last = moHome.GetFolder().Write("chain" + std::to_string(n), "CHAIN " + last);
        return last;
    };
    const std::unique_ptr<IDataset> poLink(CreateLinkedPix(moTarget, Chain(7)));
    EXPECT_NE(poLink, nullptr);
    moMade = {};
    EXPECT_EQ(Error([&] { CreateLinkedPix(moTarget, Chain(8)); }),
              "data: " + moTarget + ": more than 8 links lead to the pixels; link to the file that holds them");
    // A link that would be replaced by one to itself.
    const std::string loop = moHome.GetFolder().File("chain1");
    EXPECT_EQ(Error([&] { CreateLinkedPix(loop, Chain(3)); }),
              "data: " + loop + ": the file would be linked to itself, by way of others");
    EXPECT_EQ(ReadFile(loop), "CHAIN " + moSource);
    EXPECT_TRUE(moMade.moOptions.empty());
    // What is not there is told when pixels are read.
    std::filesystem::remove(moSource);
    delete CreateLinkedPix(moTarget, Chain(7));
    EXPECT_FALSE(moMade.moOptions.empty());
}

TEST(MakeRelativePath, LeadsFromTheFolderOfOneFileToAnother)
{
    const krv::conformance::TempFolder oFolder;
    const std::string top = oFolder.GetPath() + "/";
    std::filesystem::create_directories(top + "a/b");
    std::filesystem::create_directories(top + "real/deep");
    std::filesystem::create_directory_symlink(top + "real/deep", top + "a/alias");
    oFolder.Write("a/x.tif", "");
    std::filesystem::create_symlink(top + "a/x.tif", top + "a/link.tif");
    const auto Path = [](const std::string& target, const std::string& source)
    {
        char* const pText = IMPMakeRelativePath(target, source);
        const std::string path = pText;
        std::free(pText);
        return path;
    };
    const std::string PATHS[][3] = {{"a/t", "a/x.tif", "x.tif"},
                                    {"a/b/t", "a/x.tif", "../x.tif"},
                                    {"t", "a/b/y z", "a/b/y z"},
                                    {"a/t", "a/./b/../x.tif", "x.tif"},
                                    {"a/t", "a/link.tif", "link.tif"},
                                    {"a/alias/t", "a/x.tif", "../../a/x.tif"}, // the folder is elsewhere
                                    {"a/t", "a/alias/y", "../real/deep/y"},
                                    {"a/missing/t", "a/x.tif", "../x.tif"}};
    for (const auto& [target, source, path] : PATHS)
        EXPECT_EQ(Path(top + target, top + source), path) << target << " " << source;
    EXPECT_EQ(Path("t", "/etc/hosts").substr(0, 3), "../");
    EXPECT_EQ(Path("t", "sub/s"), "sub/s");
}

} // namespace krv::datasources
