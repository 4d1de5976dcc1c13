#include "plugins/support/sidecar/sidecarfile.h"

#include "plugins/support/file/file.h"
#include "toolkit/core/lettercase.h"
#include "toolkit/exceptions/exceptions.h"

#include <filesystem>
#include <system_error>

namespace krv::plugins::support
{

namespace
{

std::string FindBeside(const std::filesystem::path& oFile, const std::string& base, const std::string& ending)
{
    const std::string names[] = {base + ending, base + ToLower(ending), base + ToUpper(ending), ToLower(base + ending),
                                 ToUpper(base + ending)};
    std::string tried;
    for (const std::string& name : names)
    {
        const std::filesystem::path oSidecar = oFile.parent_path() / name;
        std::error_code oNone;
        if (name != tried && std::filesystem::is_regular_file(oSidecar, oNone))
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
