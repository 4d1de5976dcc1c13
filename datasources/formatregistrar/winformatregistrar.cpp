#include "datasources/formatregistrar/winformatregistrar.h"

#include "datasources/interfaces/formatplugin.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/iomanager/detail/description.h"
#include "datasources/iomanager/detail/xmlsupport.h"
#include "toolkit/core/core.h"
#include "toolkit/core/ownlibrary.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/debugger.h"
#include "toolkit/xml/xmltree.h"

#include <algorithm>
#include <cerrno>
#include <filesystem>
#include <fstream>
#include <memory>
#include <string_view>
#include <system_error>

namespace krv::datasources
{

namespace
{

constexpr char VERSION_SYMBOL[] = "GetQRFFormatVersion";
constexpr char REGISTER_SYMBOL[] = "RegisterQRFFormat";
constexpr char MODULE[] = "qrframework";

std::string EtcFolder(const std::string& home)
{
    return home + "/etc";
}

bool HasRegistry(const std::filesystem::path& oHome)
{
    std::error_code oError;
    return std::filesystem::exists(oHome / "etc" / GetFormatRegistryFilename(), oError);
}

// The library's own reader is enough for a document that is as it should be. What is wrong with another is said by
// the XML parser's exception.
krv::xml::Element ParseDescription(const std::string& path)
{
    try
    {
        return detail::ReadDescription(path);
    }
    catch (const krv::DataException&)
    {
        detail::LoadXmlSupport().mpCheckFile(path);
        throw;
    }
}

// XPaths without prefixes find nothing in a document whose root declares what names without prefixes mean.
bool IsRoot(const krv::xml::Element& oRoot, std::string_view name)
{
    return oRoot.name == name && oRoot.FindAttribute("xmlns") == nullptr;
}

// The system's message text is not used, intended: the fixed text keeps messages equal everywhere, and the loader's own
// words go to the debug output.
std::string WithSystemError(const std::string& message, int nError)
{
    krv::nspio::Debugger::Debug(1, MODULE, IMPLibraryError(), "datasources/formatregistrar/winformatregistrar", 0);
    return message + ", OS msg=" + "Unknown error." + ", OS errno=" + std::to_string(nError);
}

void* FindEntryPoint(void* pLibrary, const char* pSymbol, const char* pMessage, const std::string& libraryFile,
                     const Place& oPlace)
{
    void* const pEntryPoint = IMPFindSymbol(pLibrary, pSymbol);
    if (pEntryPoint != nullptr)
        return pEntryPoint;
    const int nError = errno;
    const std::string message = WithSystemError(std::string(pMessage) + pSymbol, nError);
    IMPCloseLibrary(pLibrary);
    throw krv::LibraryException(libraryFile, krv::LibraryException::eEntryPointNotFound, message, oPlace);
}

} // namespace

std::string GetFormatHome()
{
    const std::string home = IMPGetEnv("KRVHOME");
    if (!home.empty())
        return home;
    const std::filesystem::path oLibrary = krv::core::OwnLibraryPath(reinterpret_cast<const void*>(&FindEntryPoint));
    for (std::filesystem::path oFolder = oLibrary.parent_path(); oFolder != oFolder.root_path();
         oFolder = oFolder.parent_path())
    {
        if (HasRegistry(oFolder))
            return oFolder.string();
    }
    return oLibrary.parent_path().parent_path().string();
}

std::string GetFormatRegistryFilename()
{
    return "qrfformats/availableformats.xml";
}

std::string GetFormatLibraryFilename(const std::string& base, const std::string& extension)
{
    return base + "." + extension;
}

std::string GetFormatLibraryPath(const std::string& libraryFile)
{
    const std::string inHome = GetFormatHome() + "/lib/qrfformats/" + libraryFile;
    if (libraryFile.find('/') == std::string::npos)
        return krv::core::fileio::File(inHome).Exists() ? inHome : libraryFile;
    return libraryFile.starts_with('/') ? libraryFile : inHome;
}

std::vector<std::string> ReadFormatRegistry(const std::string& path)
{
    const krv::xml::Element oRoot = ParseDescription(path);
    std::vector<std::string> oDescriptions;
    for (const krv::xml::Element& oChild : oRoot.children)
    {
        if (IsRoot(oRoot, "Formats") && oChild.name == "Format")
            oDescriptions.push_back(detail::Trimmed(oChild.text));
    }
    return oDescriptions;
}

std::string ReadFormatObject(const std::string& path)
{
    const krv::xml::Element oRoot = ParseDescription(path);
    const krv::xml::Element* const poObject = IsRoot(oRoot, "Format") ? oRoot.FindChild("Object") : nullptr;
    return poObject != nullptr ? detail::Trimmed(poObject->text) : std::string();
}

void RegisterFormatLibraries(DatasetManager* poManager)
{
    const std::string etc = EtcFolder(GetFormatHome());
    const std::vector<std::string> oDescriptions = ReadFormatRegistry(etc + "/" + GetFormatRegistryFilename());
    for (const std::string& description : oDescriptions)
    {
        const std::string path = etc + "/qrfformats/" + description;
        RegisterLibrary(GetFormatLibraryFilename(ReadFormatObject(path), "so"), path, poManager);
    }
    if (oDescriptions.empty())
        throw krv::DataException("No format libraries registered successfully", Place::AtLine(236));
}

void RegisterLibrary(const std::string& libraryFile, const std::string& xmlPath, DatasetManager* poManager)
{
    void* const pLibrary = IMPOpenLibrary(GetFormatLibraryPath(libraryFile));
    if (pLibrary == nullptr)
    {
        const int nError = errno;
        throw krv::LibraryException(libraryFile, krv::LibraryException::eLibraryNotFound,
                                    WithSystemError("QRF format implementation library not found", nError));
    }
    using VersionFunction = int();
    using RegisterFunction = IFileIOBuilder*();
    const auto pVersion = reinterpret_cast<VersionFunction*>(FindEntryPoint(
        pLibrary, VERSION_SYMBOL, "QRF format version symbol not found: symbol=", libraryFile, Place::Current()));
    const auto pRegister = reinterpret_cast<RegisterFunction*>(FindEntryPoint(
        pLibrary, REGISTER_SYMBOL, "QRF format registration symbol not found: symbol=", libraryFile, Place::Current()));

    // A library of another version stays loaded, intended: its entry point ran, and unloading code that ran is not
    // safe.
    if (pVersion() != KRV_QRF_FORMAT_VERSION)
        throw krv::LibraryException(libraryFile, krv::LibraryException::eVersionMismatch,
                                    "QRF format library magic number differs from QRF version");
    std::unique_ptr<IFileIOBuilder> oBuilder(pRegister());
    poManager->Register(oBuilder.get(), xmlPath, false);
    [[maybe_unused]] IFileIOBuilder* const poTakenOver = oBuilder.release();
}

} // namespace krv::datasources
