#include "datasources/iomanager/detail/description.h"

#include "toolkit/exceptions/exceptions.h"
#include "toolkit/xml/limits.h"

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <system_error>

namespace krv::datasources::detail
{

krv::xml::Element ReadDescription(const std::string& path)
{
    std::error_code oError;
    if (!std::filesystem::is_regular_file(path, oError))
        throw krv::DataException(path + ": not a regular file");
    std::ifstream oFile(path, std::ios::binary);
    std::string text(
        std::min<std::uintmax_t>(std::filesystem::file_size(path, oError), krv::xml::MAX_DOCUMENT_BYTES + 1), '\0');
    oFile.read(text.data(), static_cast<std::streamsize>(text.size()));
    return krv::xml::ParseTree(text.data(), static_cast<std::size_t>(oFile.gcount()), path);
}

std::string Trimmed(const std::string& text)
{
    constexpr char WHITE[] = " \t\r\n";
    const std::size_t nFirst = text.find_first_not_of(WHITE);
    return nFirst == std::string::npos ? "" : text.substr(nFirst, text.find_last_not_of(WHITE) + 1 - nFirst);
}

} // namespace krv::datasources::detail
