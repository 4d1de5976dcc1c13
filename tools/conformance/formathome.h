#pragma once

#include "tools/conformance/tempfolder.h"

#include <string>

namespace krv::conformance
{

// A home of the framework in a temporary folder: KRVHOME names it while the object lives. The dataset manager is ended
// at both ends, so that the next GetInstance() loads what the home of that moment lists.
class FormatHome
{
public:
    FormatHome();
    FormatHome(const FormatHome&) = delete;
    FormatHome& operator=(const FormatHome&) = delete;
    ~FormatHome();

    // Links a plug-in library into the home and lists it. capabilities: XML for the inside of <Capabilities>.
    void Add(const std::string& libraryFile, const std::string& capabilities = "");
    // Replaces the whole registry; the names of its entries are not checked.
    void WriteRegistry(const std::string& xml) const;
    // Replaces one description, name.xml.
    void WriteDescription(const std::string& name, const std::string& xml) const;
    std::string GetDescriptionPath(const std::string& name) const;
    const TempFolder& GetFolder() const { return moFolder; }

private:
    TempFolder moFolder;
    std::string moEntries;
    std::string moFormerHome;
    bool mbHadHome;
};

} // namespace krv::conformance
