#include "toolkit/ogc/cs/detail/projlibrary.h"

#include "toolkit/core/core.h"
#include "toolkit/exceptions/exceptions.h"

namespace krv::ogc::cs::detail
{

namespace
{

template <typename Function>
void Find(void* pLibrary, const char* pName, Function& pFunction)
{
    pFunction = reinterpret_cast<Function>(IMPFindSymbol(pLibrary, pName));
    if (pFunction == nullptr)
        throw krv::LibraryException(KRV_PROJ_LIBRARY, krv::LibraryException::eEntryPointNotFound,
                                    "The library of reference systems lacks a function: " + IMPLibraryError());
}

ProjLibrary Load()
{
    void* const pLibrary = IMPOpenLibrary(KRV_PROJ_LIBRARY);
    if (pLibrary == nullptr)
        throw krv::LibraryException(KRV_PROJ_LIBRARY, krv::LibraryException::eLibraryNotFound,
                                    "The library of reference systems cannot be loaded: " + IMPLibraryError());
    ProjLibrary oLibrary;
#define KRV_PROJ_FIND(name) Find(pLibrary, #name, oLibrary.name);
    KRV_PROJ_FUNCTIONS(KRV_PROJ_FIND)
#undef KRV_PROJ_FIND
    return oLibrary;
}

} // namespace

const ProjLibrary& Proj()
{
    static const ProjLibrary oLibrary = Load();
    return oLibrary;
}

} // namespace krv::ogc::cs::detail
