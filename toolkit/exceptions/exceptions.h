#pragma once

#include "toolkit/api.h"
#include "toolkit/exceptions/place.h"

#include <exception>
#include <string>
#include <vector>

namespace krv
{

// Root of everything the toolkit throws. what() is the message; the place says where it was thrown. Each kind is made
// either from a place, by default that of the throw, or from the full signature of a function, a source file and a
// line, which are kept as they are: for a failure that somebody else reports, such as another process.
class KRV_TOOLKIT_API Exception : public std::exception
{
public:
    // message: what a user reads. It is copied, as the other texts are.
    explicit Exception(const std::string& message, const Place& oPlace = Place::Current());
    Exception(const std::string& message, const std::string& function, const std::string& sourceFile,
              unsigned int nLine);
    Exception(const Exception&);
    Exception& operator=(const Exception&);
    ~Exception() override;

    // The message. The pointer is valid as long as the exception.
    const char* what() const noexcept override;
    const std::string& GetMessage() const { return moMessage; }
    // The signature of the function that threw; empty where the throw says no place.
    const std::string& GetFunction() const { return moFunction; }
    // The source file without its ending, from the root of the tree: "datasources/reader/basicreader".
    const std::string& GetSourceFile() const { return moSourceFile; }
    // The line in the source file; 0 where the throw says no place.
    unsigned int GetLine() const { return mnLine; }

private:
    std::string moMessage;
    std::string moFunction;
    std::string moSourceFile;
    unsigned int mnLine;
};

// Data or arguments that an operation cannot work with.
class KRV_TOOLKIT_API DataException : public Exception
{
public:
    explicit DataException(const std::string& message, const Place& oPlace = Place::Current());
    DataException(const std::string& message, const std::string& function, const std::string& sourceFile,
                  unsigned int nLine);
    ~DataException() override;
};

// A parameter outside its set of values. It tells which parameter, so that a program may ask its user for another
// value.
class KRV_TOOLKIT_API ParameterException : public Exception
{
public:
    enum eType
    {
        eInvalidValue = 1
    };

    ParameterException(const std::string& message, int nType, const std::string& parameter,
                       const Place& oPlace = Place::Current());
    ParameterException(const std::string& message, int nType, const std::string& parameter, const std::string& function,
                       const std::string& sourceFile, unsigned int nLine);
    ~ParameterException() override;

    // One of eType.
    int GetType() const { return mnType; }
    // The parameter's name in the source, such as "eDataType".
    const std::string& GetParameter() const { return moParameter; }

private:
    int mnType;
    std::string moParameter;
};

// Something is wrong with a file; the base of the kinds below.
class KRV_TOOLKIT_API FileException : public Exception
{
public:
    FileException(const std::string& fileName, const std::string& message, const Place& oPlace = Place::Current());
    FileException(const std::string& fileName, const std::string& message, const std::string& function,
                  const std::string& sourceFile, unsigned int nLine);
    ~FileException() override;

    // The path as it was given to the operation that failed.
    const std::string& GetFileName() const { return moFileName; }

private:
    std::string moFileName;
};

// The file is not there or cannot be opened.
class KRV_TOOLKIT_API FileNotFoundException : public FileException
{
public:
    FileNotFoundException(const std::string& fileName, const std::string& message,
                          const Place& oPlace = Place::Current());
    FileNotFoundException(const std::string& fileName, const std::string& message, const std::string& function,
                          const std::string& sourceFile, unsigned int nLine);
    ~FileNotFoundException() override;
};

// The file is in no known format, or is damaged: what it says of itself cannot be. Reading it again does not help.
class KRV_TOOLKIT_API FileFormatException : public FileException
{
public:
    FileFormatException(const std::string& fileName, const std::string& message,
                        const Place& oPlace = Place::Current());
    FileFormatException(const std::string& fileName, const std::string& message, const std::string& function,
                        const std::string& sourceFile, unsigned int nLine);
    ~FileFormatException() override;
};

// Reading or writing failed, such as on a full disk. What a caller's buffer then holds is undefined.
class KRV_TOOLKIT_API IOException : public FileException
{
public:
    IOException(const std::string& fileName, const std::string& message, const Place& oPlace = Place::Current());
    IOException(const std::string& fileName, const std::string& message, const std::string& function,
                const std::string& sourceFile, unsigned int nLine);
    ~IOException() override;
};

// A call to the operating system failed.
class KRV_TOOLKIT_API OSException : public Exception
{
public:
    // nError: the system's error number (errno).
    OSException(int nError, const std::string& message, const Place& oPlace = Place::Current());
    OSException(int nError, const std::string& message, const std::string& function, const std::string& sourceFile,
                unsigned int nLine);
    ~OSException() override;

    // The system's error number, such as ENOSPC.
    int GetError() const { return mnError; }

private:
    int mnError;
};

// A plug-in library cannot be used. The start of the manager ends with it, and the next call tries again.
class KRV_TOOLKIT_API LibraryException : public Exception
{
public:
    enum eType
    {
        eLibraryNotFound = 1,    // there is no such file, or the system's loader refused it
        eEntryPointNotFound = 2, // the library is no format plug-in
        eVersionMismatch = 3     // it was built for another version of this library
    };

    LibraryException(const std::string& libraryFile, int nType, const std::string& message,
                     const Place& oPlace = Place::Current());
    LibraryException(const std::string& libraryFile, int nType, const std::string& message, const std::string& function,
                     const std::string& sourceFile, unsigned int nLine);
    ~LibraryException() override;

    // The library as the format's description names it.
    const std::string& GetLibraryFile() const { return moLibraryFile; }
    // One of eType.
    int GetType() const { return mnType; }

private:
    std::string moLibraryFile;
    int mnType;
};

// An index outside its range; carries the offending indices.
class KRV_TOOLKIT_API OutOfBoundsException : public Exception
{
public:
    OutOfBoundsException(const std::vector<unsigned int>& oIndices, const std::string& message,
                         const Place& oPlace = Place::Current());
    OutOfBoundsException(const std::vector<unsigned int>& oIndices, const std::string& message,
                         const std::string& function, const std::string& sourceFile, unsigned int nLine);
    ~OutOfBoundsException() override;

    // Those that are out of range, in the order in which the operation got them.
    const std::vector<unsigned int>& GetIndices() const { return moIndices; }

private:
    std::vector<unsigned int> moIndices;
};

} // namespace krv
