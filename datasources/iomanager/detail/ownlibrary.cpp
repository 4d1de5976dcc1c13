#include "datasources/iomanager/detail/ownlibrary.h"

#include <dlfcn.h>

#include <system_error>

namespace krv::datasources::detail
{

std::filesystem::path OwnLibraryPath()
{
    Dl_info oInfo;
    if (dladdr(reinterpret_cast<const void*>(&OwnLibraryPath), &oInfo) == 0 || oInfo.dli_fname == nullptr)
        return {};
    std::error_code oError;
    const auto oPath = std::filesystem::canonical(oInfo.dli_fname, oError);
    return oError ? std::filesystem::path(oInfo.dli_fname) : oPath;
}

} // namespace krv::datasources::detail
