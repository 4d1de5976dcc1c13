// Any bytes as an XML document: as metadata and as the registry of formats.
#include "datasources/iomanager/datasetmanager.h"
#include "fuzz/support/inputfile.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"
#include "toolkit/xml/xmldocument.h"
#include "toolkit/xml/xmltree.h"
#include "toolkit/xml/xmlutil.h"

#include <xercesc/sax/SAXParseException.hpp>

#include <cstdlib>
#include <filesystem>
#include <fstream>

namespace
{

using krv::datasources::DatasetManager;

std::filesystem::path MakeHome()
{
    std::string home = (std::filesystem::temp_directory_path() / "krvfuzzXXXXXX").string();
    if (mkdtemp(home.data()) == nullptr)
        std::abort();
    std::filesystem::create_directories(home + "/etc/qrfformats");
    setenv("KRVHOME", home.c_str(), 1);
    return home;
}

const std::filesystem::path& Home()
{
    static const std::filesystem::path oHome = MakeHome();
    return oHome;
}

void WriteFormatFile(const char* pName, const char* pBytes, std::size_t nBytes)
{
    std::ofstream oFile(Home() / "etc/qrfformats" / pName, std::ios::binary | std::ios::trunc);
    oFile.write(pBytes, static_cast<std::streamsize>(nBytes));
    if (!oFile.flush())
        std::abort();
}

// Either kind is an answer; no other exception may get out.
void StartManager()
{
    try
    {
        DatasetManager::GetInstance();
    }
    catch (const krv::Exception&)
    {
    }
    catch (const xercesc::SAXParseException&)
    {
    }
    DatasetManager::DestroyInstance();
}

void TryTree(const char* pBytes, std::size_t nBytes)
{
    try
    {
        krv::xml::ParseTree(pBytes, nBytes);
    }
    catch (const krv::DataException&)
    {
    }
}

void TryDocument(const char* pBytes, std::size_t nBytes)
{
    const krv::xml::XmlSession oSession;
    try
    {
        krv::xml::ParseMemory(pBytes, nBytes, "input");
    }
    catch (const xercesc::SAXParseException&)
    {
    }
}

void TryRegistry(const char* pBytes, std::size_t nBytes)
{
    WriteFormatFile("availableformats.xml", pBytes, nBytes);
    StartManager();
}

} // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***)
{
    krv::nspio::Warning::SetSink([](const std::string&, const std::string&, unsigned int) {});
    Home();
    std::atexit([] { std::filesystem::remove_all(Home()); });
    return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* poBytes, std::size_t nBytes)
{
    const char* const pText = reinterpret_cast<const char*>(poBytes);
    TryTree(pText, nBytes);
    TryDocument(pText, nBytes);
    TryRegistry(pText, nBytes);
    return 0;
}
