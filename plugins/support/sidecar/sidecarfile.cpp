#include "plugins/support/sidecar/sidecarfile.h"

#include "plugins/support/file/file.h"
#include "toolkit/core/lettercase.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <array>
#include <filesystem>
#include <system_error>

namespace krv::plugins::support
{

namespace
{

// The names that a file beside another one may have; some may be the same.
std::array<std::string, 5> ListNames(const std::string& base, const std::string& ending)
{
    return {base + ending, base + ToLower(ending), base + ToUpper(ending), ToLower(base + ending),
            ToUpper(base + ending)};
}

bool IsFile(const std::filesystem::path& oPath)
{
    std::error_code oNone;
    return std::filesystem::is_regular_file(oPath, oNone);
}

std::string FindBeside(const std::filesystem::path& oFile, const std::string& base, const std::string& ending)
{
    std::string tried;
    for (const std::string& name : ListNames(base, ending))
    {
        const std::filesystem::path oSidecar = oFile.parent_path() / name;
        if (name != tried && IsFile(oSidecar))
            return oSidecar.string();
        tried = name;
    }
    return {};
}

} // namespace

std::string FindSidecar(const std::string& fileName, const std::string& ending)
{
    const std::filesystem::path oFile(fileName);
    return FindBeside(oFile, oFile.stem().string(), ending);
}

std::string FindAppended(const std::string& fileName, const std::string& ending)
{
    const std::filesystem::path oFile(fileName);
    return FindBeside(oFile, oFile.filename().string(), ending);
}

std::vector<std::string> ListCompanions(const std::string& fileName)
{
    const std::filesystem::path oFile(fileName);
    const std::string base = oFile.filename().string();
    std::vector<std::string> oFound;
    for (const std::string ending : {LEVELS_ENDING, MASK_ENDING, AUX_XML_ENDING})
        for (const std::string& name : ListNames(base, ending))
        {
            const std::filesystem::path oSidecar = oFile.parent_path() / name;
            const std::string other = name.substr(0, base.size());
            const bool bOther = other != base && IsFile(oFile.parent_path() / other);
            if (!bOther && IsFile(oSidecar) &&
                std::find(oFound.begin(), oFound.end(), oSidecar.string()) == oFound.end())
                oFound.push_back(oSidecar.string());
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
    return text;
}

} // namespace krv::plugins::support
