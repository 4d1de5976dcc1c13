#include "toolkit/core/core.h"

#include "toolkit/nspio/debugger.h"

#include <dlfcn.h>
#include <link.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <memory>
#include <mutex>
#include <new>
#include <system_error>
#include <vector>

namespace
{

struct ExitFunction
{
    void (*mpFunction)();
    std::string moSourceFile;
    int mnPriority;
};

// Made on first use and never destroyed, since exit functions run while static objects go away.
struct ExitList
{
    std::mutex moMutex; // guards moFunctions
    std::vector<ExitFunction> moFunctions;
};

ExitList& GetExitList()
{
    static ExitList* const poList = new ExitList;
    return *poList;
}

bool TakeNextExitFunction(ExitFunction& oNext)
{
    ExitList& oList = GetExitList();
    const std::lock_guard oLock(oList.moMutex);
    if (oList.moFunctions.empty())
        return false;
    // The first of the highest priority from the back: the one registered last.
    const auto oFound = std::max_element(oList.moFunctions.rbegin(), oList.moFunctions.rend(),
                                         [](const ExitFunction& oFirst, const ExitFunction& oSecond)
                                         { return oFirst.mnPriority < oSecond.mnPriority; });
    oNext = *oFound;
    oList.moFunctions.erase(std::next(oFound).base());
    return true;
}

void RunExitFunctions()
{
    ExitFunction oNext{};
    while (TakeNextExitFunction(oNext))
    {
        krv::nspio::Debugger::Debug(2, "core", "exit function", oNext.moSourceFile, 0);
        oNext.mpFunction();
    }
}

struct OpenFile
{
    std::string moName;
    std::string moMode;
    std::FILE* mpFile;
    unsigned int mnFlags;
};

struct FileTable
{
    std::mutex moMutex; // guards moFiles
    std::vector<OpenFile> moFiles;
};

FileTable& GetFileTable()
{
    static FileTable* const poTable = new FileTable;
    return *poTable;
}

thread_local std::string soLibraryError;

// Whether a library file ends before its section headers do, which stand last: the loader would map what is not there,
// and touching it ends the process.
bool IsCutLibrary(const std::string& fileName)
{
    const std::unique_ptr<std::FILE, int (*)(std::FILE*)> oFile(std::fopen(fileName.c_str(), "rb"), &std::fclose);
    ElfW(Ehdr) oHeader;
    if (oFile == nullptr || std::fread(&oHeader, sizeof oHeader, 1, oFile.get()) != 1 ||
        std::memcmp(oHeader.e_ident, ELFMAG, SELFMAG) != 0)
        return false; // the loader says what it is
    struct stat oStatus;
    if (fstat(fileno(oFile.get()), &oStatus) != 0)
        return false;
    const std::uint64_t nHeaders = std::uint64_t{oHeader.e_shnum} * oHeader.e_shentsize;
    const auto nSize = static_cast<std::uint64_t>(oStatus.st_size);
    return oHeader.e_shoff > nSize || nHeaders > nSize - oHeader.e_shoff;
}

void NoteLibraryError(int nError)
{
    const char* pText = dlerror();
    soLibraryError = pText != nullptr ? pText : "";
    errno = nError;
}

} // namespace

std::string IMPGetEnv(const std::string& name)
{
    const char* pValue = std::getenv(name.c_str());
    return pValue != nullptr ? pValue : std::string();
}

std::string IMPMunge(const std::string& fileName)
{
    return fileName;
}

char* IMPMakeRelativePath(const std::string& target, const std::string& source)
{
    // Where a path really is but for its last component; as far as it exists.
    const auto Place = [](const std::string& name)
    {
        std::error_code oNone;
        const std::filesystem::path oAbsolute = std::filesystem::absolute(name, oNone).lexically_normal();
        const std::filesystem::path oFolder = std::filesystem::weakly_canonical(oAbsolute.parent_path(), oNone);
        return oNone ? oAbsolute : oFolder / oAbsolute.filename();
    };
    const std::string path = Place(source).lexically_relative(Place(target).parent_path()).string();
    auto* const pText = static_cast<char*>(std::malloc(path.size() + 1));
    if (pText == nullptr)
        throw std::bad_alloc();
    std::memcpy(pText, path.c_str(), path.size() + 1);
    return pText;
}

void* IMPOpenLibrary(const std::string& fileName)
{
    if (IsCutLibrary(fileName))
    {
        soLibraryError = fileName + ": the file is shorter than its header says";
        errno = ENOEXEC;
        return nullptr;
    }
    void* pLibrary = dlopen(fileName.c_str(), RTLD_NOW | RTLD_LOCAL);
    if (pLibrary == nullptr)
    {
        // The loader sets no error number: say whether the file is there at all. Its text begins with the name as given
        // when the search found nothing, else with the path that it found or with the name of another library.
        NoteLibraryError(ENOENT);
        struct stat oStatus;
        const bool bPath = fileName.find('/') != std::string::npos;
        if (bPath ? stat(fileName.c_str(), &oStatus) == 0 : !soLibraryError.starts_with(fileName + ": "))
            errno = ENOEXEC;
    }
    return pLibrary;
}

std::string IMPLibraryError()
{
    return soLibraryError;
}

void* IMPFindSymbol(void* pLibrary, const std::string& symbol)
{
    void* pSymbol = dlsym(pLibrary, symbol.c_str());
    if (pSymbol == nullptr)
        NoteLibraryError(ESRCH);
    return pSymbol;
}

void IMPCloseLibrary(void* pLibrary)
{
    dlclose(pLibrary);
}

void _IMPAtExit(void (*pFunction)(), const std::string& sourceFile, int nPriority)
{
    static const int nRegistered = std::atexit(&RunExitFunctions);
    (void)nRegistered;
    ExitList& oList = GetExitList();
    const std::lock_guard oLock(oList.moMutex);
    const bool bKnown = std::any_of(oList.moFunctions.begin(), oList.moFunctions.end(),
                                    [&](const ExitFunction& oEntry) { return oEntry.mpFunction == pFunction; });
    if (!bKnown)
        oList.moFunctions.push_back({pFunction, sourceFile, nPriority});
}

void fpAdd(const std::string& fileName, const std::string& mode, std::FILE* pFile, unsigned int nFlags)
{
    FileTable& oTable = GetFileTable();
    const std::lock_guard oLock(oTable.moMutex);
    oTable.moFiles.push_back({fileName, mode, pFile, nFlags});
}

void fpRemove(std::FILE* pFile)
{
    FileTable& oTable = GetFileTable();
    const std::lock_guard oLock(oTable.moMutex);
    std::erase_if(oTable.moFiles, [&](const OpenFile& oEntry) { return oEntry.mpFile == pFile; });
}

bool fpCompare(const std::string& fileName, const std::string& mode, std::FILE** ppFile,
               bool (*pPredicate)(std::FILE*, void*), void* pContext)
{
    std::vector<std::FILE*> oCandidates;
    {
        FileTable& oTable = GetFileTable();
        const std::lock_guard oLock(oTable.moMutex);
        for (const OpenFile& oEntry : oTable.moFiles)
        {
            if (oEntry.moName == fileName && oEntry.moMode == mode)
                oCandidates.push_back(oEntry.mpFile);
        }
    }
    for (std::FILE* pFile : oCandidates)
    {
        if (pPredicate != nullptr && !pPredicate(pFile, pContext))
            continue;
        if (ppFile != nullptr)
            *ppFile = pFile;
        return true;
    }
    return false;
}

unsigned int fpTestFlag(std::FILE* pFile, unsigned int nFlags)
{
    FileTable& oTable = GetFileTable();
    const std::lock_guard oLock(oTable.moMutex);
    for (const OpenFile& oEntry : oTable.moFiles)
    {
        if (oEntry.mpFile == pFile)
            return oEntry.mnFlags & nFlags;
    }
    return 0;
}

namespace krv::core
{

std::string FType2FormatName(const std::string& fileType)
{
    return fileType;
}

namespace fileio
{

File::File(const std::string& fileName) : moName(fileName) {}

bool File::Exists() const
{
    struct stat oStatus;
    return stat(IMPMunge(moName).c_str(), &oStatus) == 0;
}

} // namespace fileio

} // namespace krv::core
