#include "datasources/iomanager/datasetmanager.h"

#include "datasources/iomanager/formatcapabilities.h"
#include "tests/support/probe.h"
#include "tests/support/syntheticdataset.h"
#include "tests/support/thrown.h"
#include "toolkit/core/core.h"
#include "tools/conformance/formathome.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <future>
#include <utility>

using namespace krv::datasources;
using krv::test::ExpectNoPlace;
using krv::test::ExpectPlace;
using krv::test::FunctionBuilder;
using krv::test::Thrown;

namespace
{

using Texts = std::vector<std::string>;
constexpr char PLUGINS[] = KRV_TEST_PLUGINS "/";
constexpr char SOURCE_FILE[] = "datasources/iomanager/datasetmanager";
constexpr char CREATE[] = "<Dataset><SupportsCreate/></Dataset>";

// A manager with the plain format from a library and builders of the test's own beside it.
class DatasetManagerTest : public ::testing::Test
{
protected:
    DatasetManagerTest() { moHome.Add(std::string(PLUGINS) + "plain.so"); }

    static DatasetManager& Manager() { return *DatasetManager::GetInstance(); }

    // A builder that takes the files whose first bytes are the short name; the manager owns it.
    FunctionBuilder& Register(const std::string& shortName, bool bPrimary = false, const std::string& capabilities = "")
    {
        auto oBuilder = std::make_unique<FunctionBuilder>(shortName, &moProbe);
        oBuilder->moIdentify = [shortName](const std::string&, const unsigned char* pHeader, unsigned int, int)
        {
            return std::equal(shortName.begin(), shortName.end(), pHeader) ? 0 : 1;
        };
        oBuilder->moOpen = [this](const std::string&, AccessMode)
        {
            return NewDataset();
        };
        moHome.WriteDescription(shortName, "<Format><Capabilities>" + capabilities + "</Capabilities></Format>");
        FunctionBuilder& oResult = *oBuilder;
        Manager().Register(oBuilder.get(), moHome.GetDescriptionPath(shortName), bPrimary);
        [[maybe_unused]] FunctionBuilder* const poTakenOver = oBuilder.release();
        return oResult;
    }

    IDataset* NewDataset()
    {
        return Decorate(moProbe,
                        std::make_unique<krv::test::DatasetWithoutRaster>(std::make_shared<krv::test::ImageModel>()))
            .release();
    }

    std::string File(const std::string& content) { return moHome.GetFolder().Write("file.bin", content); }

    // The builders' calls that opening a file of this content makes.
    Texts CallsOfOpen(const std::string& content)
    {
        moProbe.Arm(0);
        const std::unique_ptr<IDataset> oDataset(Manager().Open(File(content), eReadOnly));
        return moProbe.GetCalls();
    }

    krv::test::Probe moProbe; // outlives the manager's builders
    krv::conformance::FormatHome moHome;
};

} // namespace

TEST_F(DatasetManagerTest, FilesThatNobodyOpens)
{
    const std::string missing = moHome.GetFolder().File("missing.bin");
    const auto ExpectWords = [](const std::string& name, const char* pCause)
    {
        try
        {
            delete Manager().Open(name, eReadOnly);
            ADD_FAILURE() << name;
        }
        catch (const std::exception& oException)
        {
            EXPECT_EQ(oException.what(), name + ": " + pCause);
        }
    };
    ExpectWords(missing, "No such file or directory");
    ExpectWords(moHome.GetFolder().GetPath(), "it is a folder or no regular file");
    ExpectWords(File("unknown"), "no format recognises it");
    for (const std::string& name : {missing, std::string(), moHome.GetFolder().GetPath()})
    {
        const auto oException = Thrown<krv::FileNotFoundException>([&] { Manager().Open(name, eReadOnly); });
        EXPECT_EQ(oException.GetFileName(), name);
        EXPECT_EQ(oException.GetMessage(), "");
        ExpectNoPlace(oException);
        EXPECT_FALSE(Manager().CanOpen(name, eReadOnly));
    }
    for (const std::string& content : {std::string(), std::string("unknown"), std::string(10000, 'x')})
    {
        const std::string name = File(content);
        const auto oException = Thrown<krv::FileFormatException>([&] { Manager().Open(name, eUpdate); });
        EXPECT_EQ(oException.GetFileName(), name);
        EXPECT_EQ(oException.GetMessage(), "");
        ExpectNoPlace(oException);
        EXPECT_FALSE(Manager().CanOpen(name, eUpdate));
    }
}

TEST_F(DatasetManagerTest, BuildersAreAskedLastThenPrimaryThenOthers)
{
    Register("BETA");
    Register("ALPHA", true);
    Register("GAMMA", true);
    const auto CountPrimaries = [](const Texts& oCalls)
    {
        return std::count(oCalls.begin(), oCalls.end(), "ALPHA::Identify") +
               std::count(oCalls.begin(), oCalls.end(), "GAMMA::Identify");
    };

    Texts oCalls = CallsOfOpen("BETA");
    ASSERT_EQ(oCalls.size(), 4u); // the primaries in either order, then the others
    EXPECT_EQ(CountPrimaries({oCalls.begin(), oCalls.begin() + 2}), 2);
    EXPECT_EQ(Texts(oCalls.begin() + 2, oCalls.end()), (Texts{"BETA::Identify", "BETA::Open"}));
    EXPECT_EQ(CallsOfOpen("BETA"), (Texts{"BETA::Identify", "BETA::Open"}));

    oCalls = CallsOfOpen("GAMMA");
    EXPECT_EQ(oCalls.front(), "BETA::Identify");
    EXPECT_EQ(oCalls.back(), "GAMMA::Open");
    EXPECT_EQ(CallsOfOpen("GAMMA"), (Texts{"GAMMA::Identify", "GAMMA::Open"}));

    // Nobody: every builder is asked in both attempts, the last one first and once in each.
    EXPECT_THROW(CallsOfOpen("nobody"), krv::FileFormatException);
    oCalls = moProbe.GetCalls();
    ASSERT_EQ(oCalls.size(), 6u);
    for (const std::size_t nAttempt : {0u, 3u})
    {
        EXPECT_EQ(oCalls[nAttempt], "GAMMA::Identify");
        EXPECT_EQ(oCalls[nAttempt + 1], "ALPHA::Identify");
        EXPECT_EQ(oCalls[nAttempt + 2], "BETA::Identify");
    }
}

TEST_F(DatasetManagerTest, TheLastBuilderIsTheOneThatRecognisedEvenIfItsOpenFailed)
{
    Register("ALPHA", true);
    Register("BETA").moOpen = [](const std::string& name, AccessMode) -> IDataset*
    {
        throw krv::FileFormatException(name, "damaged");
    };
    EXPECT_EQ(Thrown<krv::FileFormatException>([&] { CallsOfOpen("BETA"); }).GetMessage(), "damaged");
    EXPECT_EQ(CallsOfOpen("ALPHA"), (Texts{"BETA::Identify", "ALPHA::Identify", "ALPHA::Open"}));
}

TEST_F(DatasetManagerTest, IdentifyGetsTheFirst4096BytesFilledWithZeros)
{
    std::string seen;
    FunctionBuilder& oBuilder = Register("ALPHA", true);
    oBuilder.moIdentify =
        [&](const std::string& name, const unsigned char* pHeader, unsigned int nLength, int nReserved)
    {
        EXPECT_EQ(name, moHome.GetFolder().File("file.bin"));
        EXPECT_EQ(nLength, 4096u);
        EXPECT_EQ(nReserved, 0);
        seen.assign(reinterpret_cast<const char*>(pHeader), nLength);
        return 0;
    };
    for (const std::size_t nSize : {0u, 1u, 100u, 4095u, 4096u, 4097u, 20000u})
    {
        std::string content(nSize, '\0');
        for (std::size_t nByte = 0; nByte < nSize; ++nByte)
            content[nByte] = static_cast<char>(nByte * 7 + 1);
        CallsOfOpen(content);
        content.resize(4096, '\0');
        EXPECT_EQ(seen, content) << nSize;
    }
}

TEST_F(DatasetManagerTest, ModesAndResultsPassAsTheyAre)
{
    AccessMode eSeen = eReadOnly;
    FunctionBuilder& oBuilder = Register("ALPHA");
    oBuilder.moOpen = [&](const std::string&, AccessMode eMode) -> IDataset*
    {
        eSeen = eMode;
        return nullptr;
    };
    EXPECT_EQ(Manager().Open(File("ALPHA"), eUpdate), nullptr);
    EXPECT_EQ(eSeen, eUpdate);
    EXPECT_TRUE(Manager().CanOpen(File("ALPHA"), eReadOnly)); // null counts as opened
    EXPECT_EQ(eSeen, eReadOnly);

    oBuilder.moOpen = [this](const std::string&, AccessMode)
    {
        return NewDataset();
    };
    EXPECT_TRUE(Manager().CanOpen(File("ALPHA"), eReadOnly));
    EXPECT_EQ(moProbe.GetLive(), 1); // the builder: the dataset went

    for (const auto eFault : {krv::test::Fault::eStandard, krv::test::Fault::eForeign})
    {
        for (const unsigned int nCall : {1u, 2u}) // Identify, Open
        {
            moProbe.Arm(nCall, eFault);
            EXPECT_ANY_THROW(Manager().CanOpen(File("ALPHA"), eReadOnly));
            // The lock was given back: another thread gets it.
            EXPECT_NE(std::async(std::launch::async, [] { return Manager().GetFormatByName("ALPHA"); }).get(), nullptr);
        }
    }
}

TEST_F(DatasetManagerTest, RegisteringTwiceOrNothing)
{
    Register("ALPHA");
    const std::size_t nFormats = Manager().GetFormatList().size();
    FunctionBuilder oTwin("ALPHA", &moProbe);
    const auto oException = Thrown<krv::DataException>([&] { Manager().Register(&oTwin, "", true); });
    EXPECT_EQ(oException.GetMessage(), "Format already registered: short name=ALPHA");
    ExpectPlace(oException, "DatasetManager::Register(", SOURCE_FILE, 201);
    EXPECT_THROW(Manager().Register(nullptr, "", false), krv::DataException);
    oTwin.moFormat.reset();
    EXPECT_THROW(Manager().Register(&oTwin, "", false), krv::DataException);
    EXPECT_EQ(Manager().GetFormatList().size(), nFormats);
    EXPECT_EQ(CallsOfOpen("ALPHA").back(), "ALPHA::Open");
}

TEST_F(DatasetManagerTest, FormatsByNameAndTheirCapabilities)
{
    FunctionBuilder& oUpper = Register("KRVDSK", true, CREATE);
    FunctionBuilder& oLower = Register("lower");
    EXPECT_EQ(Manager().GetFormatList().size(), 3u);
    EXPECT_EQ(Manager().GetFormatList().front()->GetShortName(), "PLAIN");
    EXPECT_EQ(Manager().GetFormatList()[1], oUpper.GetFileFormat());
    EXPECT_EQ(Manager().GetFormatList()[2], oLower.GetFileFormat());

    EXPECT_EQ(Manager().GetFormatByName("krvdsk"), oUpper.GetFileFormat());
    EXPECT_EQ(Manager().GetFormatByName("KrvDsk"), oUpper.GetFileFormat());
    for (const std::string& name : {std::string("lower"), std::string("Absent"), std::string()})
    {
        const auto oException = Thrown<krv::DataException>([&] { Manager().GetFormatByName(name); });
        EXPECT_EQ(oException.GetMessage(), "Format not found: short name=" + name);
        ExpectPlace(oException, "DatasetManager::GetFormatByName(", SOURCE_FILE, 437);
    }

    const FormatCapabilities& oCapabilities = Manager().GetCapabilities("KRVDSK");
    EXPECT_TRUE(oCapabilities.IsSupported(CAPABILITY_CREATE));
    EXPECT_EQ(&Manager().GetCapabilities("KRVDSK"), &oCapabilities);
    EXPECT_FALSE(Manager().GetCapabilities("lower").IsSupported(CAPABILITY_CREATE));
    for (const std::string& name : {std::string("krvdsk"), std::string("LOWER"), std::string("Absent")})
    {
        const auto oException = Thrown<krv::Exception>([&] { Manager().GetCapabilities(name); });
        EXPECT_EQ(oException.GetMessage(), "the format: " + name + " is not registred in the DatasetManager.");
        EXPECT_EQ(typeid(oException), typeid(krv::Exception));
        ExpectPlace(oException, "DatasetManager::GetXMLPath(", SOURCE_FILE, 468);
    }
}

// What the thread sanitizer watches: a name that is not known yet is looked up anew each time.
TEST_F(DatasetManagerTest, CapabilitiesAreAskedForWhileFormatsRegister)
{
    DatasetManager& oManager = Manager();
    std::promise<void> oAsking;
    const auto Ask = [&]
    {
        bool bFirst = true;
        while (!krv::test::Error([&] { oManager.GetCapabilities("F49"); }).empty())
            if (std::exchange(bFirst, false))
                oAsking.set_value();
    };
    const std::future<void> oAsked = std::async(std::launch::async, Ask);
    oAsking.get_future().wait();
    for (unsigned int nFormat = 0; nFormat < 50; ++nFormat)
        Register("F" + std::to_string(nFormat));
    EXPECT_EQ(oAsked.wait_for(std::chrono::seconds(60)), std::future_status::ready);
}

TEST_F(DatasetManagerTest, OpenFormatKnowsTheOtherBuildersOnly)
{
    Register("ALPHA", true);
    FunctionBuilder& oBeta = Register("BETA");
    const std::string name = File("whatever");
    for (const char* pAbsent : {"ALPHA", "beta", "", "ABSENT"})
        EXPECT_EQ(Manager().OpenFormat(pAbsent, name, eReadOnly), nullptr) << pAbsent;
    moProbe.Arm(0);
    EXPECT_NE(std::unique_ptr<IDataset>(Manager().OpenFormat("BETA", name, eUpdate)), nullptr);
    EXPECT_EQ(moProbe.GetCalls(), Texts{"BETA::Open"});

    moProbe.Arm(1, krv::test::Fault::eKrv);
    EXPECT_EQ(Manager().OpenFormat("BETA", name, eReadOnly), nullptr);
    moProbe.Arm(1, krv::test::Fault::eStandard);
    EXPECT_THROW(Manager().OpenFormat("BETA", name, eReadOnly), std::runtime_error);
    moProbe.Arm(1, krv::test::Fault::eForeign);
    EXPECT_THROW(Manager().OpenFormat("BETA", name, eReadOnly), int);
    oBeta.moOpen = nullptr;
    EXPECT_EQ(Manager().OpenFormat("BETA", name, eReadOnly), nullptr);
}

TEST_F(DatasetManagerTest, NewDatasetCreatesOrOpensForUpdate)
{
    const std::string name = File("BETA");
    const auto oException = Thrown<krv::DataException>([&] { Manager().NewDataset(name, "XYZ", ""); });
    EXPECT_EQ(oException.GetMessage(), "Invalid file format type specified for file creation, XYZ");
    ExpectNoPlace(oException);

    Texts oCreated;
    const auto Create = [&](const std::string& fileName, const std::string& options)
    {
        oCreated = {fileName, options};
        return NewDataset();
    };
    AccessMode eSeen = eReadOnly;
    Register("ALPHA", true, CREATE).moCreate = Create;
    FunctionBuilder& oBeta = Register("BETA");
    oBeta.moCreate = Create;
    oBeta.moOpen = [&](const std::string&, AccessMode eMode)
    {
        eSeen = eMode;
        return NewDataset();
    };

    const auto New = [&](const std::string& type, const std::string& options)
    {
        oCreated.clear();
        EXPECT_NE(std::unique_ptr<IDataset>(Manager().NewDataset(name, type, options)), nullptr);
        return oCreated;
    };
    EXPECT_EQ(New("ALPHA", "A=1"), (Texts{name, "A=1"}));
    EXPECT_EQ(New("BETA", "B=2"), Texts()); // cannot create: the existing file is opened
    EXPECT_EQ(eSeen, eUpdate);

    // Types without a format, and names in another letter case, go to the generic builder.
    FunctionBuilder& oGeneric = Register("GDBALL", false, CREATE);
    oGeneric.moCreate = Create;
    EXPECT_EQ(New("XYZ", "C=3 D"), (Texts{name, "FTYPE:XYZ C=3 D"}));
    EXPECT_EQ(New("alpha", ""), (Texts{name, "FTYPE:alpha "}));
    moHome.WriteDescription("GDBALL", "<Format/>");
    EXPECT_EQ(New("XYZ", ""), Texts());
}

TEST_F(DatasetManagerTest, FilesOfTheGenericBuilderStayWithIt)
{
    Register("ALPHA", true);
    const std::string name = File("ALPHA");
    std::FILE* const pFile = std::fopen(name.c_str(), "rb");
    fpAdd(name, "r", pFile, eGenericFile);
    EXPECT_EQ(Manager().Open(name, eReadOnly), nullptr); // there is no generic builder: null, not the other builders
    EXPECT_EQ(CallsOfOpen("ALPHA"), Texts());
    EXPECT_NE(std::unique_ptr<IDataset>(Manager().Open(name, eUpdate)), nullptr); // open under another mode

    Register("GDBALL");
    EXPECT_EQ(CallsOfOpen("ALPHA"), Texts{"GDBALL::Open"});
    fpRemove(pFile);
    fpAdd(name, "r", pFile, 32);
    EXPECT_EQ(CallsOfOpen("ALPHA").back(), "ALPHA::Open");
    fpRemove(pFile);
    std::fclose(pFile);
}

TEST_F(DatasetManagerTest, TheLastCopyReleasesTheBuilders)
{
    Register("ALPHA", true);
    {
        const auto poCopy = std::make_unique<DatasetManager>(Manager());
        DatasetManager oAssigned(*poCopy);
        oAssigned = Manager();
        DatasetManager::DestroyInstance();
        EXPECT_EQ(moProbe.GetLive(), 1);
        EXPECT_TRUE(oAssigned.CanOpen(File("ALPHA"), eReadOnly));
        EXPECT_EQ(oAssigned.GetFormatByName("alpha")->GetShortName(), "ALPHA");
        EXPECT_FALSE(oAssigned.GetCapabilities("ALPHA").IsSupported(CAPABILITY_CREATE));
    }
    EXPECT_EQ(moProbe.GetLive(), 0);
    // A new instance loads the libraries again and knows nothing of what was registered by hand.
    EXPECT_EQ(Manager().GetFormatList().size(), 1u);
    EXPECT_EQ(std::unique_ptr<IDataset>(Manager().Open(File("PLAIN"), eReadOnly))->GetName(), File("PLAIN"));
}
