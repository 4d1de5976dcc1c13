#include "datasources/iomanager/detail/xmlsupport.h"

#include "datasources/iomanager/detail/ownlibrary.h"
#include "toolkit/core/core.h"
#include "toolkit/exceptions/exceptions.h"

#include <link.h>

#include <string_view>

namespace krv::datasources::detail
{

namespace
{

const XmlSupport& Load()
{
    const bool bOwn = !HasXerces();
    const std::string library = OwnLibraryPath().parent_path() / KRV_XML_LIBRARY;
    void* const pLibrary = IMPOpenLibrary(library);
    void* const pFunction = pLibrary != nullptr ? IMPFindSymbol(pLibrary, XML_SUPPORT_SYMBOL) : nullptr;
    if (pFunction == nullptr)
        throw krv::LibraryException(library, krv::LibraryException::eLibraryNotFound,
                                    "The library for XML cannot be loaded: " + IMPLibraryError());
    const XmlSupport& oSupport = *reinterpret_cast<const XmlSupport* (*)()>(pFunction)();
    // Started once for the process: questions come in numbers. It is not ended, since what was loaded while the program
    // ran is torn down before those who would end it.
    if (bOwn)
        oSupport.mpInitialize();
    return oSupport;
}

} // namespace

const XmlSupport& LoadXmlSupport()
{
    static const XmlSupport& oSupport = Load();
    return oSupport;
}

bool HasXerces()
{
    const auto IsXerces = [](dl_phdr_info* pInfo, std::size_t, void*) -> int
    {
        return std::string_view(pInfo->dlpi_name).find("/libxerces-c") != std::string_view::npos;
    };
    return dl_iterate_phdr(IsXerces, nullptr) != 0;
}

} // namespace krv::datasources::detail
