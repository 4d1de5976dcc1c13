#include "plugins/gdball/pictures/picturemodule.h"

#include "toolkit/core/core.h"
#include "toolkit/exceptions/exceptions.h"

#include <filesystem>
#include <mutex>
#include <system_error>

#include <dlfcn.h>

namespace krv::plugins::gdball
{

namespace
{

// The module lies beside the library that holds this code, whatever links lead there.
std::string FindLibrary()
{
    Dl_info oInfo = {};
    std::error_code oNone;
    std::filesystem::path oSelf;
    if (dladdr(reinterpret_cast<const void*>(&HasPictures), &oInfo) != 0 && oInfo.dli_fname != nullptr)
        oSelf = std::filesystem::weakly_canonical(oInfo.dli_fname, oNone);
    return (oSelf.parent_path() / "gdballpictures.so").string();
}

} // namespace

bool HasPictures()
{
#ifdef KRV_PICTURES
    return true;
#else
    return false;
#endif
}

const PictureModule& GetPictureModule(const std::string& fileName)
{
    static std::mutex soMutex; // guards the module
    static const PictureModule* spoModule = nullptr;
    const std::lock_guard oLock(soMutex);
    if (spoModule != nullptr)
        return *spoModule;
    using Entry = const PictureModule*();
    void* const pLibrary = IMPOpenLibrary(FindLibrary());
    void* const pEntry = pLibrary != nullptr ? IMPFindSymbol(pLibrary, PICTURE_ENTRY) : nullptr;
    if (pEntry == nullptr)
        throw DataException(fileName + ": pictures are read by libvips, which cannot be loaded: " + IMPLibraryError());
    spoModule = reinterpret_cast<Entry*>(pEntry)();
    return *spoModule;
}

} // namespace krv::plugins::gdball
