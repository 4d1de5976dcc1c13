#include "operations/home/formathome.h"

#include "datasources/formatregistrar/winformatregistrar.h"
#include "datasources/interfaces/formatplugin.h"
#include "datasources/interfaces/ifileformat.h"
#include "datasources/interfaces/ifileiobuilder.h"
#include "operations/job/exceptions.h"
#include "toolkit/core/core.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/xml/xmltree.h"

#include <fmt/format.h>

#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <map>
#include <memory>
#include <system_error>

namespace krv::operations
{

using namespace krv::datasources;
namespace fs = std::filesystem;

namespace
{

std::string ReadAll(const fs::path& oPath)
{
    std::ifstream oStream(oPath, std::ios::binary);
    if (!oStream)
        throw krv::IOException(oPath.string(), "it cannot be read");
    return {std::istreambuf_iterator<char>(oStream), std::istreambuf_iterator<char>()};
}

// Under another name first, so that who reads the file sees the old one or the new one.
void WriteWhole(const fs::path& oPath, const std::string& text)
{
    const fs::path oPart = oPath.string() + "." + std::to_string(getpid()) + ".part";
    std::ofstream oStream(oPart, std::ios::binary);
    oStream << text;
    oStream.close();
    std::error_code oError;
    if (oStream)
        fs::rename(oPart, oPath, oError);
    if (!oStream || oError)
    {
        std::error_code oIgnored;
        fs::remove(oPart, oIgnored);
        throw krv::IOException(oPath.string(), "it cannot be written" + (oError ? ": " + oError.message() : ""));
    }
}

std::string Trim(const std::string& text)
{
    constexpr char BLANKS[] = " \t\r\n";
    const auto nFirst = text.find_first_not_of(BLANKS);
    return nFirst == std::string::npos ? std::string()
                                       : text.substr(nFirst, text.find_last_not_of(BLANKS) - nFirst + 1);
}

krv::xml::Element ParseRegistry(const fs::path& oPath)
{
    const std::string text = ReadAll(oPath);
    try
    {
        return krv::xml::ParseTree(text.data(), text.size(), oPath.string());
    }
    catch (const krv::DataException& oError)
    {
        throw krv::DataException(oError.GetMessage() + "; mend this registry, or remove it to make it anew");
    }
}

// The descriptions that a registry lists.
std::vector<std::string> ReadRegistry(const fs::path& oPath)
{
    const krv::xml::Element oRoot = ParseRegistry(oPath);
    std::vector<std::string> oEntries;
    for (const krv::xml::Element& oChild : oRoot.children)
        if (oRoot.name == "Formats" && oChild.name == "Format" && !Trim(oChild.text).empty())
            oEntries.push_back(Trim(oChild.text));
    return oEntries;
}

std::string MakeRegistry(const std::vector<std::string>& oEntries)
{
    std::string text = "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<!-- One entry per format plug-in, naming its "
                       "description file in the folder qrfformats beside this one. -->\n<Formats>\n";
    for (const std::string& entry : oEntries)
        text += "  <Format>" + entry + "</Format>\n";
    return text + "</Formats>\n";
}

// The library that a description names, without its ending.
std::string ReadObject(const fs::path& oDescription)
{
    const std::string text = ReadAll(oDescription);
    const krv::xml::Element oRoot = krv::xml::ParseTree(text.data(), text.size(), oDescription.string());
    const krv::xml::Element* const poObject = oRoot.name == "Format" ? oRoot.FindChild("Object") : nullptr;
    if (poObject == nullptr || Trim(poObject->text).empty())
        throw RequestException(oDescription.string() + ": it names no library; add <Object>name</Object> to <Format>");
    return Trim(poObject->text);
}

// The short name of the format that a library offers.
std::string AskPlugin(const fs::path& oLibrary)
{
    void* const pLibrary = IMPOpenLibrary(oLibrary.string());
    if (pLibrary == nullptr)
        throw RequestException(oLibrary.string() + ": it does not load: " + IMPLibraryError());
    const auto pVersion = reinterpret_cast<int (*)()>(IMPFindSymbol(pLibrary, "GetQRFFormatVersion"));
    const auto pRegister = reinterpret_cast<IFileIOBuilder* (*)()>(IMPFindSymbol(pLibrary, "RegisterQRFFormat"));
    if (pVersion == nullptr || pRegister == nullptr)
        throw RequestException(oLibrary.string() + ": it is no format plug-in: an entry point is missing");
    if (pVersion() != KRV_QRF_FORMAT_VERSION)
        throw RequestException(fmt::format("{}: it has version {}, wanted is {}; build it anew for this version",
                                           oLibrary.string(), pVersion(), KRV_QRF_FORMAT_VERSION));
    const std::unique_ptr<IFileIOBuilder> poBuilder(pRegister());
    const IFileFormat* const poFormat = poBuilder != nullptr ? poBuilder->GetFileFormat() : nullptr;
    if (poFormat == nullptr)
        throw RequestException(oLibrary.string() + ": it offers no format");
    return poFormat->GetShortName();
}

// What a home is to list, and where its parts are now.
struct Entry
{
    std::string description; // the name of its file
    fs::path from;           // where that file is
    fs::path library;        // of the plug-in; empty when the system finds it
    std::string format;
    bool link = false; // rather than copied
};

// The entries of the installation, or of the home itself, which has its own.
std::vector<Entry> ListEntries(const fs::path& oHome, const fs::path& oRegistry)
{
    std::vector<Entry> oEntries;
    for (const std::string& description : ReadRegistry(oRegistry))
    {
        Entry oEntry{description, oRegistry.parent_path() / description, {}, {}, true};
        const std::string file = GetFormatLibraryFilename(ReadObject(oEntry.from), "so");
        const fs::path oOwn = oHome / "lib/qrfformats" / file;
        oEntry.library = fs::exists(oOwn) ? oOwn : fs::path(GetFormatLibraryPath(file));
        oEntry.format = AskPlugin(oEntry.library);
        oEntries.push_back(oEntry);
    }
    return oEntries;
}

Entry MakeEntry(const std::string& plugin)
{
    const fs::path oLibrary = fs::absolute(plugin);
    if (!fs::is_regular_file(oLibrary))
        throw RequestException(plugin + ": there is no such library");
    const fs::path oDescription = fs::path(oLibrary).replace_extension(".xml");
    if (!fs::is_regular_file(oDescription))
        throw RequestException(plugin + ": its description " + oDescription.string() + " is missing");
    const std::string object = ReadObject(oDescription);
    if (GetFormatLibraryFilename(object, "so") != oLibrary.filename())
        throw RequestException(fmt::format("{}: it names the library {}, not {}", oDescription.string(),
                                           GetFormatLibraryFilename(object, "so"), oLibrary.filename().string()));
    return {oDescription.filename().string(), oDescription, oLibrary, AskPlugin(oLibrary), false};
}

void CheckFormats(const std::vector<Entry>& oEntries)
{
    std::map<std::string, std::string> oKnown;
    for (const Entry& oEntry : oEntries)
    {
        const auto [oOther, bNew] = oKnown.emplace(oEntry.format, oEntry.description);
        if (!bNew)
            throw RequestException(fmt::format("the format {} is offered by {} and by {}; a home has it once",
                                               oEntry.format, oOther->second, oEntry.description));
    }
}

void PlaceParts(const Entry& oEntry, const fs::path& oHome, const fs::path& oDescriptions)
{
    const fs::path oDescription = oDescriptions / oEntry.description;
    if (!fs::exists(oDescription) || !fs::equivalent(oDescription, oEntry.from))
        WriteWhole(oDescription, ReadAll(oEntry.from));
    if (!fs::is_regular_file(oEntry.library))
        return; // found by the system's search path
    const fs::path oLibrary = oHome / "lib/qrfformats" / oEntry.library.filename();
    if (fs::exists(oLibrary) && fs::equivalent(oLibrary, oEntry.library))
        return;
    if (!oEntry.link)
        return WriteWhole(oLibrary, ReadAll(oEntry.library));
    fs::remove(oLibrary);
    fs::create_symlink(fs::canonical(oEntry.library), oLibrary);
}

} // namespace

HomeResult MakeFormatHome(const HomeRequest& oRequest)
{
    const fs::path oHome = fs::absolute(oRequest.folder), oRegistry = oHome / "etc" / GetFormatRegistryFilename();
    const fs::path oInstalled = GetFormatHome();
    const bool bThere = fs::exists(oRegistry);
    std::vector<Entry> oEntries = bThere ? ListEntries(oHome, oRegistry)
                                         : ListEntries(oInstalled, oInstalled / "etc" / GetFormatRegistryFilename());
    HomeResult oResult;
    for (const std::string& plugin : oRequest.plugins)
    {
        const Entry oNew = MakeEntry(plugin);
        const auto oOld = std::find_if(oEntries.begin(), oEntries.end(),
                                       [&](const Entry& oEntry) { return oEntry.description == oNew.description; });
        if (oOld != oEntries.end())
            *oOld = oNew;
        else
            oEntries.push_back(oNew);
        oResult.added.push_back(oNew.format);
    }
    CheckFormats(oEntries);
    std::vector<std::string> oNames;
    try
    {
        fs::create_directories(oRegistry.parent_path());
        fs::create_directories(oHome / "lib/qrfformats");
        for (const Entry& oEntry : oEntries)
        {
            PlaceParts(oEntry, oHome, oRegistry.parent_path());
            oNames.push_back(oEntry.description);
            oResult.formats.push_back(oEntry.format);
        }
    }
    catch (const fs::filesystem_error& oError)
    {
        throw krv::IOException(oError.path1().string(), "it cannot be made: " + oError.code().message());
    }
    if (!bThere || oNames != ReadRegistry(oRegistry))
        WriteWhole(oRegistry, MakeRegistry(oNames));
    return oResult;
}

} // namespace krv::operations
