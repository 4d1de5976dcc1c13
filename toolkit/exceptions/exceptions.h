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
// Example: catch (const krv::Exception& oError) { std::cerr << oError.what() << "\n"; } Any thread may throw one, and
// copies share nothing, so that one may go to another thread by std::exception_ptr.
class KRV_TOOLKIT_API Exception : public std::exception
{
public:
    // message: what a user reads. It is copied, as the other texts are.
    explicit Exception(const std::string& message, const Place& oPlace = Place::Current());
    Exception(const std::string& message, const std::string& function, const std::string& sourceFile,
              unsigned int nLine);

    // May throw std::bad_alloc, as all copies of texts do.
    Exception(const Exception&);
    Exception& operator=(const Exception&);

    // Virtual and defined in the library, so that a plug-in's exceptions are caught by the program as what they are.
    ~Exception() override;

    // The message. The pointer is valid as long as the exception.
    const char* what() const noexcept override;

    // The same text as what(), except where a kind (Described) gives what() more words. UTF-8 as far as file names are.
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
// The call can be repeated with other arguments: nothing was changed by the one that failed, unless its header says so.
class KRV_TOOLKIT_API DataException : public Exception
{
public:
    explicit DataException(const std::string& message, const Place& oPlace = Place::Current());

    // A failure that somebody else reports, see Exception; so with this constructor of each kind.
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

    // nType: one of eType. parameter: the name in the source. Both are for programs, the message is for people.
    ParameterException(const std::string& message, int nType, const std::string& parameter,
                       const Place& oPlace = Place::Current());
    ParameterException(const std::string& message, int nType, const std::string& parameter, const std::string& function,
                       const std::string& sourceFile, unsigned int nLine);
    ~ParameterException() override;

    // One of eType.
    // So far eInvalidValue alone.
    int GetType() const { return mnType; }
    // The parameter's name in the source, such as "eDataType".
    const std::string& GetParameter() const { return moParameter; }

private:
    int mnType;
    std::string moParameter; // as the source names it
};

// Something is wrong with a file; the base of the kinds below.
// A program that catches this one gets every failure of a file, whatever the format and the operation.
class KRV_TOOLKIT_API FileException : public Exception
{
public:
    // The message need not repeat the name: what() is the message alone, and callers who show it add GetFileName().
    FileException(const std::string& fileName, const std::string& message, const Place& oPlace = Place::Current());
    FileException(const std::string& fileName, const std::string& message, const std::string& function,
                  const std::string& sourceFile, unsigned int nLine);
    ~FileException() override;

    // The path as it was given to the operation that failed.
    const std::string& GetFileName() const { return moFileName; }

private:
    std::string moFileName; // as it was given
};

// The file is not there or cannot be opened.
// Also for a folder that is missing on the way to the file, and for one that may not be read.
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
// Not for files that are well made but ask for something that the format's plug-in does not serve.
class KRV_TOOLKIT_API FileFormatException : public FileException
{
public:
    // The message says what is wrong and, where that is known, at which place of the file.
    FileFormatException(const std::string& fileName, const std::string& message,
                        const Place& oPlace = Place::Current());
    FileFormatException(const std::string& fileName, const std::string& message, const std::string& function,
                        const std::string& sourceFile, unsigned int nLine);
    ~FileFormatException() override;
};

// Reading or writing failed, such as on a full disk. What a caller's buffer then holds is undefined.
// Repeating may help: the medium, the network or the space on it failed, not the contents.
class KRV_TOOLKIT_API IOException : public FileException
{
public:
    // The message has the system's words for the cause, such as "No space left on device".
    IOException(const std::string& fileName, const std::string& message, const Place& oPlace = Place::Current());
    IOException(const std::string& fileName, const std::string& message, const std::string& function,
                const std::string& sourceFile, unsigned int nLine);
    ~IOException() override;
};

// A call to the operating system failed.
// Example: no thread could be started, or a lock not be taken. Failures of files are IOException instead.
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
    // Numbers are fixed: programs may store them.
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
    std::string moLibraryFile; // as the description names it
    int mnType;
};

// An index outside its range; carries the offending indices.
// Whether indices count from 0 or 1 is said by the operation that throws; channels count from 1 in most.
class KRV_TOOLKIT_API OutOfBoundsException : public Exception
{
public:
    // oIndices: copied. One at least, where the operation knows which it was.
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
