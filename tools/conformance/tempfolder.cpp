#include "tools/conformance/tempfolder.h"

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <stdexcept>
#include <system_error>

namespace krv::conformance
{

TempFolder::TempFolder() : moPath((std::filesystem::temp_directory_path() / "krvtest.XXXXXX").string())
{
    if (mkdtemp(moPath.data()) == nullptr)
        throw std::runtime_error("no temporary folder: " + moPath);
}

TempFolder::~TempFolder()
{
    std::error_code oIgnored;
    std::filesystem::remove_all(moPath, oIgnored);
}

std::string TempFolder::File(const std::string& name) const
{
    const std::filesystem::path oPath = std::filesystem::path(moPath) / name;
    std::filesystem::create_directories(oPath.parent_path());
    return oPath.string();
}

std::string TempFolder::Write(const std::string& name, const std::string& bytes) const
{
    std::string oPath = File(name);
    WriteFile(oPath, bytes);
    return oPath;
}

std::string ReadFile(const std::string& fileName)
{
    std::ifstream oStream(fileName, std::ios::binary);
    if (!oStream)
        throw std::runtime_error("cannot read " + fileName);
    return {std::istreambuf_iterator<char>(oStream), std::istreambuf_iterator<char>()};
}

void WriteFile(const std::string& fileName, const std::string& bytes)
{
    std::ofstream oStream(fileName, std::ios::binary | std::ios::trunc);
    oStream.write(bytes.data(), static_cast<std::streamsize>(bytes.size()));
    if (!oStream.flush())
        throw std::runtime_error("cannot write " + fileName);
}

} // namespace krv::conformance
