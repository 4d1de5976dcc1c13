#pragma once

#include "toolkit/api.h"

#include <cstdio>
#include <string>

// The operating-system helpers of the toolkit, at global scope, where its older modules look for them.

// The value of an environment variable; empty when it is not set.
// Any thread, as long as none changes the environment.
KRV_TOOLKIT_API std::string IMPGetEnv(const std::string& name);

// The name under which the operating system knows a file. File names need no change on this platform.
KRV_TOOLKIT_API std::string IMPMunge(const std::string& fileName);

// The path of a file as it is written in another one that refers to it: from the folder of `target` to `source`, never
// absolute. Both are taken from the working folder. Folders count by where they really are, the last component of
// `source` stays as it is, a symbolic link too. The caller releases the text with free. Throws std::bad_alloc alone.
KRV_TOOLKIT_API char* IMPMakeRelativePath(const std::string& target, const std::string& source);

// Loads a shared library and returns its handle, or null with the system's last error number set: ENOENT when there is
// no such library, ENOEXEC when it is there and cannot be loaded. A name with a separator is a path; other names are
// looked for on the system's search path. The library is never unloaded here.
// Static objects of the library are made before it returns. Any thread.
KRV_TOOLKIT_API void* IMPOpenLibrary(const std::string& fileName);

// The loader's own words on the last failure of IMPOpenLibrary or IMPFindSymbol in this thread; empty when none.
KRV_TOOLKIT_API std::string IMPLibraryError();

// The address of a symbol, or null with the last error number set.
// pLibrary: a handle of IMPOpenLibrary. The address is valid until the library is closed.
KRV_TOOLKIT_API void* IMPFindSymbol(void* pLibrary, const std::string& symbol);

// Gives a library handle back.
KRV_TOOLKIT_API void IMPCloseLibrary(void* pLibrary);

// Runs a function when the process ends: higher priorities first, equal ones in reverse order of registration. A
// function is registered once, whatever the number of calls. `sourceFile` names the caller in debug output.
// Any thread may register.
KRV_TOOLKIT_API void _IMPAtExit(void (*pFunction)(), const std::string& sourceFile, int nPriority);

// The table of files that the process holds open. An entry has the name and mode text it was opened with and flag bits.
// Bits, to be joined.
enum eFileFlag : unsigned int
{
    eGenericFile = 64 // the generic builder opened it and serves it from then on
};

// Any thread; the table has a lock of its own. The file stays the caller's: nothing here closes it.
KRV_TOOLKIT_API void fpAdd(const std::string& fileName, const std::string& mode, std::FILE* pFile, unsigned int nFlags);

// To be called before the file is closed. A file that is not in the table is no error.
KRV_TOOLKIT_API void fpRemove(std::FILE* pFile);

// Whether the file is in the table under this mode and satisfies the predicate (null: any); then *ppFile is set.
// pContext is handed to the predicate.
// The predicate is called without the lock of the table: it may ask the table.
KRV_TOOLKIT_API bool fpCompare(const std::string& fileName, const std::string& mode, std::FILE** ppFile,
                               bool (*pPredicate)(std::FILE*, void*), void* pContext);

// The flag bits of an open file that are also in nFlags; 0 for a file that is not in the table.
KRV_TOOLKIT_API unsigned int fpTestFlag(std::FILE* pFile, unsigned int nFlags);

namespace krv::core
{

// The short name of the format that holds files of a type. File types carry the formats' short names here.
KRV_TOOLKIT_API std::string FType2FormatName(const std::string& fileType);

namespace fileio
{

// A file by its name.
// Nothing is opened, and the file need not be there.
class KRV_TOOLKIT_API File
{
public:
    explicit File(const std::string& fileName);

    // Asks the system anew each time; a folder exists too. A name that may not be looked at counts as not there.
    bool Exists() const;

    // As it was given.
    const std::string& GetName() const { return moName; }

private:
    std::string moName;
};

} // namespace fileio

} // namespace krv::core
