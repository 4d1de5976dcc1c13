#include "toolkit/core/ownlibrary.h"

#include "toolkit/core/core.h"
#include "toolkit/exceptions/exceptions.h"

#include <dlfcn.h>

#include <system_error>

namespace krv::core
{

std::filesystem::path OwnLibraryPath(const void* pOwn)
{
    Dl_info oInfo;
    if (dladdr(pOwn, &oInfo) == 0 || oInfo.dli_fname == nullptr)
        return {};
    std::error_code oError;
    const auto oPath = std::filesystem::canonical(oInfo.dli_fname, oError);
    return oError ? std::filesystem::path(oInfo.dli_fname) : oPath;
}

void* LoadBesideOwn(const void* pOwn, const std::string& library, const std::string& symbol, const std::string& what)
{
    const std::string path = OwnLibraryPath(pOwn).parent_path() / library;
    void* const pLibrary = IMPOpenLibrary(path);
    void* const pFunction = pLibrary != nullptr ? IMPFindSymbol(pLibrary, symbol) : nullptr;
    if (pFunction == nullptr)
        throw krv::LibraryException(path, krv::LibraryException::eLibraryNotFound,
                                    what + " cannot be loaded: " + IMPLibraryError());
    return pFunction;
}

} // namespace krv::core
