// Any bytes as an XML document: as metadata and as the registry of formats.
#include "datasources/iomanager/datasetmanager.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"
#include "toolkit/xml/xmldocument.h"
#include "toolkit/xml/xmltree.h"
#include "toolkit/xml/xmlutil.h"
#include "tools/conformance/formathome.h"

#include <xercesc/sax/SAXParseException.hpp>

namespace
{

using krv::datasources::DatasetManager;

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
    static const krv::conformance::FormatHome oHome;
    oHome.WriteRegistry(std::string(pBytes, nBytes));
    StartManager();
}

} // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***)
{
    krv::nspio::Warning::SetSink([](const std::string&, const std::string&, unsigned int) {});
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
