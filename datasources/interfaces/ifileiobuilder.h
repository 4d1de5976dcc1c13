#pragma once

#include "datasources/api.h"
#include "datasources/interfaces/accessmode.h"

#include <string>

namespace krv::datasources
{

class IDataset;
class IFileFormat;

// The factory of one format; a plug-in registers one. The manager owns it and deletes it with itself.
// The order of the virtual operations is public and fixed.
// One object serves the process: what it keeps between calls is not one dataset's.
class KRV_DATASOURCES_API IFileIOBuilder
{
public:
    virtual ~IFileIOBuilder();

    // The format's description, owned by the builder and alive as long as it.
    virtual IFileFormat* GetFileFormat() = 0;
    // Opens an existing file; the caller owns the result. A failed open leaves nothing open and throws a
    // krv::Exception.
    virtual IDataset* Open(const std::string& fileName, AccessMode eMode) = 0;
    // Creates a new file; the caller owns the result. The image is laid out later by IRasterDataset::Create.
    // options: KEY=VALUE separated by blanks, as the format takes them. Throws DataException for options that it does
    // not know, and for a format that only reads.
    virtual IDataset* Create(const std::string& fileName, const std::string& options) = 0;
    // Returns 0 for a file that this builder opens, anything else to decline it. pHeader: the first nHeaderLength bytes
    // of the file, zeros where the file is shorter. nReserved: always 0. Must be exact and without side effects.
    virtual int Identify(const std::string& fileName, const unsigned char* pHeader, unsigned int nHeaderLength,
                         int nReserved) = 0;
};

} // namespace krv::datasources
