#pragma once

#include "datasources/api.h"

#include <string>
#include <vector>

namespace krv::datasources
{

class DatasetManager;

// Loads the format libraries. The name of the file stems from the toolkit's first platform and stays: it is the source
// file that exceptions report.

// The installation folder: the environment variable KRVHOME or, when that is unset or empty, the first folder above
// libkrvdatasources itself that holds a registry.
// Where no folder holds one: the folder above the library's own. Looked up anew each time, so that a changed KRVHOME
// counts.
KRV_DATASOURCES_API std::string GetFormatHome();

// The registry's path below the folder "etc" of the home.
KRV_DATASOURCES_API std::string GetFormatRegistryFilename();

// base + "." + extension
KRV_DATASOURCES_API std::string GetFormatLibraryFilename(const std::string& base, const std::string& extension);

// Where a plug-in library is loaded from: a name is looked for in lib/qrfformats of the home and then left to the
// system's search path, a relative path counts from lib/qrfformats, an absolute one stays. Never the current folder.
// Whether the file is there is not looked at.
KRV_DATASOURCES_API std::string GetFormatLibraryPath(const std::string& libraryFile);

// The file names of the format descriptions that a registry lists, in its order; and the base name of the library that
// a description names, empty when it names none. Texts are without surrounding white space. A file that is missing or
// malformed throws the XML parser's own exception (toolkit/xml/xmlerror.h).
KRV_DATASOURCES_API std::vector<std::string> ReadFormatRegistry(const std::string& path);
KRV_DATASOURCES_API std::string ReadFormatObject(const std::string& path);

// Reads the registry and registers the library of every format that it lists with the manager. The first failure ends
// it and passes to the caller. Throws DataException when the registry lists nothing; a registry or description that is
// missing or malformed throws the XML library's own exception.
// poManager: the caller's, not null.
void RegisterFormatLibraries(DatasetManager* poManager);

// Loads one library, checks its version and registers its builder. A library stays loaded until the process ends,
// except one that lacks an entry point. libraryFile: as for GetFormatLibraryPath.
// xmlPath: the format's description, kept by the manager. Throws LibraryException, whose type says what is wrong.
void RegisterLibrary(const std::string& libraryFile, const std::string& xmlPath, DatasetManager* poManager);

} // namespace krv::datasources
