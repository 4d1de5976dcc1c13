#include "datasources/iomanager/detail/xmlsupport.h"

#include "toolkit/core/ownlibrary.h"

#include <link.h>

#include <string_view>

namespace krv::datasources::detail
{

namespace
{

const XmlSupport& Load()
{
    const bool bOwn = !HasXerces();
    void* const pFunction = krv::core::LoadBesideOwn(reinterpret_cast<const void*>(&Load), KRV_XML_LIBRARY,
                                                     XML_SUPPORT_SYMBOL, "The library for XML");
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
