#pragma once

#include "datasources/interfaces/ifileiobuilder.h"

// The version of this contract. The registrar calls GetQRFFormatVersion of a library and accepts 0: the library was
// compiled against headers of the same version. A change of any virtual order raises the number that a library reports.
// A plug-in that was built against other headers is refused with LibraryException, before anything of it runs.
#define KRV_QRF_FORMAT_VERSION 0

// Defines the two entry points of a plug-in library for a builder class with a default constructor:
// GetQRFFormatVersion and RegisterQRFFormat, which returns a new builder that the manager takes over.
// To be written once, in one source file of the library. The constructor runs while formats are registered: it opens no
// file.
#define KRV_FORMAT_PLUGIN(Builder)                                                                                     \
    extern "C" __attribute__((visibility("default"))) int GetQRFFormatVersion()                                        \
    {                                                                                                                  \
        return KRV_QRF_FORMAT_VERSION;                                                                                 \
    }                                                                                                                  \
    extern "C" __attribute__((visibility("default"))) krv::datasources::IFileIOBuilder* RegisterQRFFormat()            \
    {                                                                                                                  \
        return new Builder();                                                                                          \
    }
