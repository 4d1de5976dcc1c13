#include "plugins/support/sidecar/sidecarfile.h"

#include "plugins/support/file/file.h"
#include "toolkit/core/lettercase.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <filesystem>
#include <string_view>
#include <utility>

#include <sys/stat.h>

namespace krv::plugins::support
{

namespace
{

constexpr std::string_view UTF8_MARK = "\xEF\xBB\xBF"; // some editors begin texts with it

// The names that a file beside another one may have, each once.
std::vector<std::string> ListNames(const std::string& base, const std::string& ending)
{
    std::vector<std::string> oNames;
    for (std::string name : {base + ending, base + ToLower(ending), base + ToUpper(ending), ToLower(base + ending),
                             ToUpper(base + ending)})
        if (std::find(oNames.begin(), oNames.end(), name) == oNames.end())
            oNames.push_back(std::move(name));
    return oNames;
}

bool IsFile(const std::string& name)
{
    struct stat oStatus = {};
    return ::stat(name.c_str(), &oStatus) == 0 && S_ISREG(oStatus.st_mode);
}

// The folder of a file with its slash, and the file's name in it.
std::pair<std::string, std::string> SplitName(const std::string& fileName)
{
    const std::size_t nSlash = fileName.rfind('/');
    const std::size_t nName = nSlash == std::string::npos ? 0 : nSlash + 1;
    return {fileName.substr(0, nName), fileName.substr(nName)};
}

std::string FindBeside(const std::string& folder, const std::string& base, const std::string& ending)
{
    for (const std::string& name : ListNames(base, ending))
        if (IsFile(folder + name))
            return folder + name;
    return {};
}

} // namespace

std::string FindSidecar(const std::string& fileName, const std::string& ending)
{
    const auto [folder, name] = SplitName(fileName);
    return FindBeside(folder, std::filesystem::path(name).stem().string(), ending);
}

std::string FindAppended(const std::string& fileName, const std::string& ending)
{
    const auto [folder, name] = SplitName(fileName);
    return FindBeside(folder, name, ending);
}

std::vector<std::string> ListCompanions(const std::string& fileName)
{
    const auto [folder, base] = SplitName(fileName);
    std::vector<std::string> oFound;
    for (const std::string ending : {LEVELS_ENDING, MASK_ENDING, AUX_XML_ENDING})
        for (const std::string& name : ListNames(base, ending))
        {
            const std::string other = name.substr(0, base.size());
            if ((other == base || !IsFile(folder + other)) && IsFile(folder + name))
                oFound.push_back(folder + name);
        }
    return oFound;
}

std::string ReadSidecar(const std::string& sidecar, std::size_t nMaximum)
{
    const File oFile(sidecar, File::Mode::eRead);
    if (oFile.GetSize() > nMaximum)
        throw FileFormatException(sidecar, sidecar + ": " + std::to_string(oFile.GetSize()) +
                                               " bytes are too many for such a file; at most " +
                                               std::to_string(nMaximum) + " are read");
    std::string text(static_cast<std::size_t>(oFile.GetSize()), '\0');
    oFile.Read(0, text.data(), text.size());
    if (text.starts_with(UTF8_MARK))
        text.erase(0, UTF8_MARK.size());
    return text;
}

} // namespace krv::plugins::support
