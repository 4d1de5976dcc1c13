#include "datasources/formatregistrar/winformatregistrar.h"

#include "datasources/interfaces/ifileformat.h"
#include "datasources/iomanager/datasetmanager.h"
#include "tests/support/outputcapture.h"
#include "tests/support/thrown.h"
#include "toolkit/core/core.h"
#include "toolkit/xml/xmlerror.h"
#include "tools/conformance/formathome.h"

#include <gtest/gtest.h>

#include <dlfcn.h>

#include <cerrno>
#include <filesystem>

using namespace krv::datasources;
using krv::conformance::FormatHome;
using krv::test::Thrown;

namespace
{

constexpr char SOURCE_FILE[] = "datasources/formatregistrar/winformatregistrar";

std::string Plugin(const std::string& name)
{
    return std::string(KRV_TEST_PLUGINS) + "/" + name + ".so";
}

// What GetInstance() throws, without the number that the system adds; empty when it succeeds.
std::string LoadError()
{
    std::string error;
    try
    {
        DatasetManager::GetInstance();
    }
    catch (const krv::xml::ParseError& oError) // for everybody, whether they know the XML library or not
    {
        error = std::string("xml: ") + oError.what();
    }
    catch (...)
    {
        error = krv::test::DescribeException();
    }
    const std::size_t nNumber = error.find("errno=");
    if (nNumber == std::string::npos)
        return error;
    EXPECT_GT(std::stoi(error.substr(nNumber + 6)), 0) << error;
    return error.substr(0, nNumber + 6);
}

// After a failure nothing is kept: with the registry mended the next attempt works.
void ExpectNextAttemptWorks(FormatHome& oHome)
{
    oHome.WriteRegistry("<Formats/>");
    FormatHome oMended;
    oMended.Add(Plugin("plain"));
    EXPECT_EQ(LoadError(), "");
    EXPECT_EQ(DatasetManager::GetInstance()->GetFormatList().size(), 1u);
}

} // namespace

TEST(FormatRegistrar, EveryFaultOfALibraryHasItsException)
{
    constexpr char SYSTEM[] = ", OS msg=Unknown error., OS errno=";
    const struct
    {
        const char* mpLibrary;
        std::string moError;
        bool mbWarning = true; // of krv::Exceptions alone
    } FAULTS[] = {
        {"absent", "library 1 absent.so: QRF format implementation library not found" + std::string(SYSTEM)},
        {"missingversion",
         "library 2 missingversion.so: QRF format version symbol not found: symbol=GetQRFFormatVersion" +
             std::string(SYSTEM)},
        {"missingregistration",
         "library 2 missingregistration.so: QRF format registration symbol not found: symbol=RegisterQRFFormat" +
             std::string(SYSTEM)},
        {"wrongversion", "library 3 wrongversion.so: QRF format library magic number differs from QRF version"},
        {"nullbuilder", "data: A format cannot be registered without a builder"},
        {"noformat", "data: A format cannot be registered: its builder has no format description"},
        {"reentrant",
         "data: The dataset manager is being made: a format library must not ask for it while it registers"},
        {"twin", "data: Format already registered: short name=PLAIN"},
        {"throwskrv", "system 7: no licence"},
        {"throwsstandard", "standard: no licence", false},
        {"throwsforeign", "foreign", false},
    };
    for (const auto& oFault : FAULTS)
    {
        SCOPED_TRACE(oFault.mpLibrary);
        FormatHome oHome;
        oHome.Add(Plugin("plain")); // a good one before it changes nothing
        oHome.Add(Plugin(oFault.mpLibrary));
        for (const char* pAttempt : {"first", "second"})
        {
            krv::test::OutputCapture oOutput;
            EXPECT_EQ(LoadError(), oFault.moError) << pAttempt;
            ASSERT_EQ(oOutput.moWarnings.size(), oFault.mbWarning ? 1u : 0u);
            if (oFault.mbWarning)
            {
                EXPECT_NE(oFault.moError.find(oOutput.moWarnings[0].moMessage.substr(0, 10)), std::string::npos);
                EXPECT_EQ(oOutput.moWarnings[0].moSourceFile, "datasources/iomanager/datasetmanager");
                EXPECT_EQ(oOutput.moWarnings[0].mnLine, 506u);
            }
        }
        if (oFault.moError.starts_with("library"))
        {
            const auto oException = Thrown<krv::LibraryException>([] { DatasetManager::GetInstance(); });
            krv::test::ExpectPlace(oException, "RegisterLibrary(", SOURCE_FILE, oException.GetLine());
        }
        ExpectNextAttemptWorks(oHome);
    }
}

TEST(FormatRegistrar, EveryFaultOfTheFilesHasItsException)
{
    const struct
    {
        const char* mpName;
        void (*mpBreak)(FormatHome&);
        std::string moError; // the beginning
    } FAULTS[] = {
        {"empty registry", [](FormatHome& oHome) { oHome.WriteRegistry("<Formats/>"); },
         "data: No format libraries registered successfully"},
        {"registry of something else",
         [](FormatHome& oHome) { oHome.WriteRegistry("<Other><Format>plain.xml</Format></Other>"); },
         "data: No format libraries registered successfully"},
        {"no registry",
         [](FormatHome& oHome)
         { std::filesystem::remove(oHome.GetFolder().File("etc/qrfformats/availableformats.xml")); },
         "xml: "},
        {"malformed registry", [](FormatHome& oHome) { oHome.WriteRegistry("<Formats><Format>plain.xml</Formats>"); },
         "xml: "},
        {"registry with a document type",
         [](FormatHome& oHome) { oHome.WriteRegistry("<!DOCTYPE Formats [<!ENTITY a 'b'>]><Formats/>"); }, "xml: "},
        {"no description",
         [](FormatHome& oHome) { oHome.WriteRegistry("<Formats><Format>absent.xml</Format></Formats>"); }, "xml: "},
        {"malformed description", [](FormatHome& oHome) { oHome.WriteDescription("plain", "<Format>"); }, "xml: "},
        {"description without a library", [](FormatHome& oHome) { oHome.WriteDescription("plain", "<Format/>"); },
         "library 1 .so: QRF format implementation library not found"},
    };
    for (const auto& oFault : FAULTS)
    {
        SCOPED_TRACE(oFault.mpName);
        FormatHome oHome;
        oHome.Add(Plugin("plain"));
        oFault.mpBreak(oHome);
        krv::test::OutputCapture oOutput;
        const std::string error = LoadError();
        EXPECT_EQ(error.substr(0, oFault.moError.size()), oFault.moError) << error;
        EXPECT_EQ(LoadError(), error); // the same anew
        ExpectNextAttemptWorks(oHome);
    }
}

TEST(FormatRegistrar, EmptyRegistryIsReportedAtItsLine)
{
    const FormatHome oHome;
    krv::test::OutputCapture oOutput;
    const auto oException = Thrown<krv::DataException>([] { DatasetManager::GetInstance(); });
    krv::test::ExpectPlace(oException, "RegisterFormatLibraries(", SOURCE_FILE, 236);
}

TEST(FormatRegistrar, RegistersInTheOrderOfTheRegistry)
{
    FormatHome oHome;
    for (const char* pName : {"lowercase", "generic", "plain"})
        oHome.Add(Plugin(pName)); // the registry that this writes has white space around every name
    ASSERT_EQ(LoadError(), "");
    std::vector<std::string> oNames;
    for (const IFileFormat* poFormat : DatasetManager::GetInstance()->GetFormatList())
        oNames.push_back(poFormat->GetShortName());
    EXPECT_EQ(oNames, (std::vector<std::string>{"lower", "GDBALL", "PLAIN"}));
    EXPECT_THROW(DatasetManager::GetInstance()->GetFormatByName("lower"), krv::DataException);
}

TEST(FormatRegistrar, ALibraryOfAnotherVersionStaysLoaded)
{
    for (const auto& [pName, bLoaded] : {std::pair{"wrongversion", true}, {"missingversion", false}})
    {
        FormatHome oHome;
        oHome.Add(Plugin(pName));
        krv::test::OutputCapture oOutput;
        EXPECT_NE(LoadError(), "");
        void* const pLibrary = dlopen(Plugin(pName).c_str(), RTLD_NOLOAD | RTLD_LAZY);
        EXPECT_EQ(pLibrary != nullptr, bLoaded) << pName;
        if (pLibrary != nullptr)
            dlclose(pLibrary);
    }
}

TEST(FormatRegistrar, NamesAndHome)
{
    EXPECT_EQ(GetFormatRegistryFilename(), "qrfformats/availableformats.xml");
    EXPECT_EQ(GetFormatLibraryFilename("tif", "so"), "tif.so");
    {
        const FormatHome oHome;
        EXPECT_EQ(GetFormatHome(), oHome.GetFolder().GetPath());
        EXPECT_EQ(GetFormatLibraryPath("sub/a.so"), oHome.GetFolder().GetPath() + "/lib/qrfformats/sub/a.so");
        EXPECT_EQ(GetFormatLibraryPath("/sub/a.so"), "/sub/a.so");
        EXPECT_EQ(GetFormatLibraryPath("a.so"), "a.so");
        setenv("KRVHOME", "", 1);
        EXPECT_EQ(GetFormatHome(), std::filesystem::canonical(KRV_TEST_HOME).string());
    }
}

// The search finds the script that compilers read, and the loader does not take it.
TEST(FormatRegistrar, MissingAndUnusableLibrariesDifferInTheErrorNumber)
{
    for (const auto& [pName, nError] : {std::pair{"libm.so", ENOEXEC}, {"libnowhere.so", ENOENT}})
    {
        EXPECT_EQ(IMPOpenLibrary(pName), nullptr);
        EXPECT_EQ(errno, nError) << pName << IMPLibraryError();
    }
}
