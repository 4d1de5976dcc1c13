#include "datasources/formatregistrar/winformatregistrar.h"

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/ifileformat.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/reader/basicreader.h"
#include "gobs/raster/raster.h"
#include "tests/support/outputcapture.h"
#include "toolkit/core/core.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/xml/xmlerror.h"
#include "tools/conformance/formathome.h"

#include <gtest/gtest.h>

#include <dlfcn.h>

#include <cerrno>
#include <filesystem>

using namespace krv::datasources;
using krv::conformance::FormatHome;

namespace
{

std::string Plugin(const std::string& name)
{
    return std::string(KRV_TEST_PLUGINS) + "/" + name + ".so";
}

// What GetInstance() throws, as one line: the kind, the message without what the system adds, the place; empty when it
// succeeds.
std::string LoadError()
{
    try
    {
        DatasetManager::GetInstance();
    }
    catch (const krv::LibraryException& oException)
    {
        EXPECT_NE(oException.GetFunction().find("RegisterLibrary("), std::string::npos) << oException.GetFunction();
        EXPECT_EQ(oException.GetSourceFile(), "datasources/formatregistrar/winformatregistrar");
        const std::string message = oException.GetMessage();
        const std::size_t nNumber = message.find("errno=");
        if (nNumber != std::string::npos)
        {
            EXPECT_GT(std::stoi(message.substr(nNumber + 6)), 0) << message;
        }
        return "library " + std::to_string(oException.GetType()) + " " + oException.GetLibraryFile() + ": " +
               message.substr(0, nNumber == std::string::npos ? nNumber : nNumber + 6);
    }
    catch (const krv::OSException& oException)
    {
        return "system " + std::to_string(oException.GetError()) + ": " + oException.GetMessage();
    }
    catch (const krv::DataException& oException)
    {
        return "data: " + oException.GetMessage();
    }
    catch (const std::exception& oException)
    {
        return std::string("standard: ") + oException.what();
    }
    catch (int nValue)
    {
        return "foreign: " + std::to_string(nValue);
    }
    catch (...)
    {
        return "xml: " + krv::xml::DescribeCurrentException();
    }
    return "";
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
        {"throwsforeign", "foreign: 42", false},
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
    try
    {
        DatasetManager::GetInstance();
        FAIL();
    }
    catch (const krv::DataException& oException)
    {
        EXPECT_EQ(oException.GetLine(), 236u);
        EXPECT_EQ(oException.GetSourceFile(), "datasources/formatregistrar/winformatregistrar");
        EXPECT_NE(oException.GetFunction().find("RegisterFormatLibraries("), std::string::npos);
    }
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

// Datasets of a library that go wrong in every way: an exception or a plain answer, no crash.
TEST(FormatRegistrar, WaywardDatasets)
{
    FormatHome oHome;
    oHome.Add(Plugin("wayward"));
    const auto Open = [&](const std::string& fault)
    {
        const std::string name = oHome.GetFolder().Write("file.way", "WAYWARD " + fault);
        try
        {
            BasicReader oReader(name);
            const std::unique_ptr<krv::gobs::Raster> oTile(oReader.GetRaster(0));
            return std::string("read");
        }
        catch (const krv::OutOfBoundsException& oException)
        {
            return std::string("bounds");
        }
        catch (const krv::DataException& oException)
        {
            std::string message = oException.GetMessage();
            const std::size_t nFile = message.find(name);
            return nFile == std::string::npos ? message : message.replace(nFile, name.size(), "FILE");
        }
        catch (int nValue)
        {
            return "foreign " + std::to_string(nValue);
        }
    };
    const std::pair<const char*, const char*> EXPECTED[] = {
        {"good", "read"},
        {"identify", "foreign 42"},
        {"open", "foreign 42"},
        {"null", "Format does not support rasters: file=FILE"},
        {"noraster", "Format does not support rasters: file=FILE"},
        {"nochannels", "No channels in dataset: file=FILE"},
        {"nopixels", "bounds"},
        {"toomanychannels", "synthetic: no channel 4"},
        {"nullinfo", "The dataset gave no description of channel 1"},
        {"nullio", "The dataset gave no raster I/O for the channels"},
        {"huge", "The dataset and its raster I/O are of different sizes"},
        {"bits", "Channel 1 is of the type BIT, which no I/O hands out"},
    };
    for (const auto& [pFault, pExpected] : EXPECTED)
        EXPECT_EQ(Open(pFault), pExpected) << pFault;
}
