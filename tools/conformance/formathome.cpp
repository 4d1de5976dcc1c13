#include "tools/conformance/formathome.h"

#include "datasources/iomanager/datasetmanager.h"

#include <cstdlib>
#include <filesystem>

using krv::datasources::DatasetManager;

namespace krv::conformance
{

FormatHome::FormatHome()
{
    const char* const pFormer = std::getenv("KRVHOME");
    mbHadHome = pFormer != nullptr;
    moFormerHome = mbHadHome ? pFormer : "";
    DatasetManager::DestroyInstance();
    setenv("KRVHOME", moFolder.GetPath().c_str(), 1);
    WriteRegistry("<Formats/>");
}

FormatHome::~FormatHome()
{
    DatasetManager::DestroyInstance();
    if (mbHadHome)
        setenv("KRVHOME", moFormerHome.c_str(), 1);
    else
        unsetenv("KRVHOME");
}

void FormatHome::Add(const std::string& libraryFile, const std::string& capabilities)
{
    const std::filesystem::path oLibrary = std::filesystem::absolute(libraryFile);
    const std::string name = oLibrary.stem().string();
    const std::string link = moFolder.File("lib/qrfformats/" + name + ".so");
    if (!std::filesystem::is_symlink(link))
        std::filesystem::create_symlink(oLibrary, link);
    WriteDescription(name, "<Format>\n  <Object> " + name + "\n</Object>\n  <Capabilities>" + capabilities +
                               "</Capabilities>\n</Format>\n");
    moEntries += "  <Format>\n    " + name + ".xml </Format>\n";
    WriteRegistry("<Formats>\n" + moEntries + "</Formats>\n");
}

void FormatHome::WriteRegistry(const std::string& xml) const
{
    moFolder.Write("etc/qrfformats/availableformats.xml", xml);
}

void FormatHome::WriteDescription(const std::string& name, const std::string& xml) const
{
    WriteFile(GetDescriptionPath(name), xml);
}

std::string FormatHome::GetDescriptionPath(const std::string& name) const
{
    return moFolder.File("etc/qrfformats/" + name + ".xml");
}

} // namespace krv::conformance
